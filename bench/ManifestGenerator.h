#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "manifest/Manifest.h"

namespace tavi::bench {

// The bench set: files with 81-character paths in folders of about fifty, three versions each, 40-digit digests as aux
// texts. The same for the same number of files, whatever the order; never in memory as a text.
enum class FileOrder { kWalk, kRandom };

struct StoredText {
    std::string file;
    // Of the uncompressed text.
    std::uint64_t textBytes;
};

// The path of file `number`; its last kFolderCut characters are the name.
constexpr std::size_t kPathLength = 81;
constexpr std::size_t kFolderCut = 19;
std::string generatedPath(std::uint32_t number);

// The compressed text in the data folder, made there if it is not there yet.
StoredText storedText(const std::string& dataFolder, std::uint32_t files, FileOrder order);
std::vector<char> readBlob(const std::string& file);
// Returns the manifest. Throws unless it holds all `files` of the set.
ManifestRef whole(ManifestRef manifest, std::uint32_t files);
ManifestRef loadSet(const std::string& file, std::uint32_t files);

// What no reader of a blob can do without: it is inflated into 64 KB and forgotten. Throws unless `expected` bytes came
// out.
void inflateOnly(std::vector<char>& blob, std::uint64_t expected);

} // namespace tavi::bench
