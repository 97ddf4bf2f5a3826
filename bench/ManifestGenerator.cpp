#include "bench/ManifestGenerator.h"

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <numeric>
#include <random>
#include <stdexcept>

#include <wx/wfstream.h>
#include <wx/zstream.h>

#include "manifest/StoredManifest.h"

namespace tavi::bench {
namespace {

constexpr std::uint32_t kSeed = 20261121;
constexpr std::uint32_t kFilesPerFolder = 50;

// Returns a generator of random values below a limit. They depend on the file's number only, so that a set has the same
// content in any order.
auto valuesOf(std::uint32_t number)
{
    return [state = (std::uint64_t{kSeed} << 32) | number](std::uint64_t limit) mutable {
        std::uint64_t z = (state += 0x9E3779B97F4A7C15u);
        z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9u;
        z = (z ^ (z >> 27)) * 0x94D049BB133111EBu;
        return static_cast<std::uint32_t>((z ^ (z >> 31)) % limit);
    };
}

void appendFile(std::uint32_t number, std::string& text)
{
    auto below = valuesOf(number);
    const auto word = [&] { return below(std::uint64_t{1} << 32); };
    text += generatedPath(number) + '\n';
    std::uint32_t modified = 1500000000u + below(200000000);
    const std::uint32_t created = modified - below(100000000);
    for (int version = 0; version < 3; ++version) {
        char line[160];
        std::snprintf(line, sizeof line, "%u:%u:%u:%u:0:%08x%08x%08x%08x%08x:0:%o\n", modified + below(86400), modified,
                      created, below(version == 0 ? 90000000 : 9000000), word(), word(), word(), word(), word(),
                      below(8) == 0 ? 0x21u : 0x20u);
        text += line;
        modified += 1 + below(10000000);
    }
    text += '\n';
}

} // namespace

std::string generatedPath(std::uint32_t number)
{
    const std::uint32_t folder = number / kFilesPerFolder;
    char path[kPathLength + 1];
    std::snprintf(path, sizeof path,
                  "C:\\Users\\Somebody\\Documents\\Projects\\area-%03u\\part-%03u\\set-%02u\\paper-%04u-%04x.txt",
                  folder / 1000 % 1000, folder / 25 % 40, folder % 25, number % 10000, valuesOf(number)(0x10000));
    return path;
}

StoredText storedText(const std::string& dataFolder, std::uint32_t files, FileOrder order)
{
    const char* const orderName = order == FileOrder::walk ? "walk" : "random";
    const std::string name = dataFolder + "/manifest-" + std::to_string(files) + "-" + orderName;
    StoredText made{name + ".z", ", " + std::to_string(files) + " files, " + orderName + " order", 0};
    // This file is written last: without it the blob may be incomplete.
    if (std::ifstream(name + ".size") >> made.textBytes)
        return made;

    std::vector<std::uint32_t> numbers(files);
    std::iota(numbers.begin(), numbers.end(), 0u);
    std::mt19937 random(kSeed);
    if (order == FileOrder::random)
        std::shuffle(numbers.begin(), numbers.end(), random);

    wxFFileOutputStream file(made.file, "wb");
    wxZlibOutputStream out(file);
    std::string text = "USER\n_hash|0123456789abcdef0123456789abcdef01234567\nbench\n\n\nFILES\n";
    for (const std::uint32_t number : numbers) {
        appendFile(number, text);
        // The text ends with its last line, without a newline.
        if (number == numbers.back())
            text.resize(text.size() - 2);
        else if (text.size() < 60000)
            continue;
        if (!out.WriteAll(text.data(), text.size()))
            throw std::runtime_error("cannot write " + made.file);
        made.textBytes += text.size();
        text.clear();
    }
    if (!out.Close() || !file.Close())
        throw std::runtime_error("cannot write " + made.file);
    std::ofstream(name + ".size") << made.textBytes << '\n';
    return made;
}

std::vector<char> readBlob(const std::string& file)
{
    std::vector<char> blob(static_cast<std::size_t>(std::filesystem::file_size(file)));
    if (!std::ifstream(file, std::ios::binary).read(blob.data(), static_cast<std::streamsize>(blob.size())))
        throw std::runtime_error("cannot read " + file);
    return blob;
}

ManifestRef checked(ManifestRef manifest, std::uint32_t files)
{
    if (!manifest || manifest->fileCount() != files)
        throw std::runtime_error("the manifest is not the generated set");
    return manifest;
}

ManifestRef loadSet(const std::string& file, std::uint32_t files)
{
    std::vector<char> blob = readBlob(file);
    const BlobPieces pieces = piecesOf({blob.data(), blob.size()});
    std::vector<char>().swap(blob); // an empty list would keep the memory
    return checked(parseStoredManifest(pieces), files);
}

} // namespace tavi::bench
