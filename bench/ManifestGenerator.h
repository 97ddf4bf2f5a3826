#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "manifest/Manifest.h"

namespace tavi::bench {

// The generated set: files with long paths in folders of fifty, three versions each, with digests of 40 digits. The
// order changes nothing else. The text is never in memory as a whole.
enum class FileOrder { walk, random };

struct StoredText {
    std::string file;
    std::string title;
    std::uint64_t textBytes; // uncompressed
};

// Returns the path of a file. The last kNameLength characters are its name.
constexpr std::size_t kPathLength = 81;
constexpr std::size_t kNameLength = 19;
std::string generatedPath(std::uint32_t number);

// Returns the compressed text in the data folder, generated on first use.
StoredText storedText(const std::string& dataFolder, std::uint32_t files, FileOrder order);
std::vector<char> readBlob(const std::string& file);
// Returns the manifest. Throws unless it holds exactly `files` files.
ManifestRef checked(ManifestRef manifest, std::uint32_t files);
ManifestRef loadSet(const std::string& file, std::uint32_t files);

} // namespace tavi::bench
