#include "bench/ManifestGenerator.h"

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <numeric>
#include <random>
#include <stdexcept>

#include <zlib.h>

#include "manifest/StoredManifest.h"

namespace tavi::bench {
namespace {

constexpr std::uint32_t kSeed = 20261121;
constexpr std::uint32_t kFilesPerFolder = 50;
constexpr int kVersions = 3;

// Every file's values come from its number alone, so that the order changes nothing else.
class Values {
  public:
    explicit Values(std::uint32_t number) : state_((std::uint64_t{kSeed} << 32) | number) {}
    std::uint64_t next()
    {
        std::uint64_t z = (state_ += 0x9E3779B97F4A7C15u);
        z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9u;
        z = (z ^ (z >> 27)) * 0x94D049BB133111EBu;
        return z ^ (z >> 31);
    }
    std::uint32_t below(std::uint32_t limit)
    {
        return static_cast<std::uint32_t>(next() % limit);
    }

  private:
    std::uint64_t state_;
};

class DeflatedFile {
  public:
    explicit DeflatedFile(const std::string& name) : file_(name, std::ios::binary), out_(1 << 16)
    {
        deflateInit(&stream_, Z_DEFAULT_COMPRESSION);
    }
    DeflatedFile(const DeflatedFile&) = delete;
    DeflatedFile& operator=(const DeflatedFile&) = delete;
    ~DeflatedFile()
    {
        deflateEnd(&stream_);
    }
    void write(std::string& text)
    {
        bytes_ += text.size();
        deflate(text, Z_NO_FLUSH);
        text.clear();
    }
    std::uint64_t finish()
    {
        std::string none;
        deflate(none, Z_FINISH);
        file_.close();
        if (!file_)
            throw std::runtime_error("the bench data could not be written");
        return bytes_;
    }

  private:
    void deflate(std::string& text, int flush)
    {
        stream_.next_in = reinterpret_cast<Bytef*>(text.data());
        stream_.avail_in = static_cast<uInt>(text.size());
        do {
            stream_.next_out = out_.data();
            stream_.avail_out = static_cast<uInt>(out_.size());
            ::deflate(&stream_, flush);
            file_.write(reinterpret_cast<const char*>(out_.data()),
                        static_cast<std::streamsize>(out_.size() - stream_.avail_out));
        } while (stream_.avail_out == 0);
    }

    std::ofstream file_;
    std::vector<Bytef> out_;
    z_stream stream_{};
    std::uint64_t bytes_ = 0;
};

void appendFile(std::uint32_t number, std::string& text)
{
    Values values(number);
    text += generatedPath(number) + '\n';
    std::uint32_t modified = 1500000000u + values.below(200000000);
    const std::uint32_t created = modified - values.below(100000000);
    for (int version = 0; version < kVersions; ++version) {
        char digest[41];
        for (int i = 0; i < 40; i += 8)
            std::snprintf(digest + i, 9, "%08x", static_cast<unsigned>(values.next() & 0xFFFFFFFFu));
        char line[160];
        std::snprintf(line, sizeof line, "%u:%u:%u:%u:0:%s:0:%o\n", modified + values.below(86400), modified, created,
                      values.below(version == 0 ? 90000000 : 9000000), digest, values.below(8) == 0 ? 0x21u : 0x20u);
        text += line;
        modified += 1 + values.below(10000000);
    }
    text += '\n';
}

} // namespace

std::string generatedPath(std::uint32_t number)
{
    const std::uint32_t folder = number / kFilesPerFolder;
    Values values(number);
    char path[kPathLength + 1];
    std::snprintf(path, sizeof path,
                  "C:\\Users\\Somebody\\Documents\\Projects\\area-%03u\\part-%03u\\set-%02u\\paper-%04u-%04x.txt",
                  folder / 1000 % 1000, folder / 25 % 40, folder % 25, number % 10000,
                  static_cast<unsigned>(values.next() & 0xFFFF));
    return path;
}

StoredText storedText(const std::string& dataFolder, std::uint32_t files, FileOrder order)
{
    const std::string name =
        dataFolder + "/manifest-" + std::to_string(files) + (order == FileOrder::kWalk ? "-walk" : "-random");
    StoredText made{name + ".z", 0};
    // Written last: without it the blob may be half of one.
    if (std::ifstream(name + ".size") >> made.textBytes)
        return made;

    std::vector<std::uint32_t> numbers(files);
    std::iota(numbers.begin(), numbers.end(), 0u);
    std::mt19937 random(kSeed);
    if (order == FileOrder::kRandom)
        std::shuffle(numbers.begin(), numbers.end(), random);

    DeflatedFile out(made.file);
    std::string text = "USER\n_hash|0123456789abcdef0123456789abcdef01234567\nbench\n\n\nFILES\n";
    for (const std::uint32_t number : numbers) {
        appendFile(number, text);
        if (text.size() > 60000)
            out.write(text);
    }
    // The text ends with its last line, without a newline.
    text.resize(text.size() - 2);
    out.write(text);
    made.textBytes = out.finish();
    std::ofstream(name + ".size") << made.textBytes << '\n';
    return made;
}

std::vector<char> readBlob(const std::string& file)
{
    std::ifstream in(file, std::ios::binary | std::ios::ate);
    std::vector<char> blob(in ? static_cast<std::size_t>(in.tellg()) : 0);
    in.seekg(0);
    if (!in.read(blob.data(), static_cast<std::streamsize>(blob.size())))
        throw std::runtime_error("cannot read " + file);
    return blob;
}

ManifestRef whole(ManifestRef manifest, std::uint32_t files)
{
    if (!manifest)
        throw std::runtime_error("the bench set is no manifest");
    if (manifest->fileCount() != files)
        throw std::runtime_error("the manifest lacks files");
    return manifest;
}

ManifestRef loadSet(const std::string& file, std::uint32_t files)
{
    const std::vector<char> blob = readBlob(file);
    return whole(parseStoredManifest(blob.data(), blob.size()), files);
}

// What no reader can do without: the same blob, inflated into 64 KB and forgotten.
void inflateOnly(std::vector<char>& blob, std::uint64_t expected)
{
    std::vector<Bytef> out(64 * 1024);
    z_stream stream{};
    inflateInit2(&stream, 15 + 32);
    stream.next_in = reinterpret_cast<Bytef*>(blob.data());
    stream.avail_in = static_cast<uInt>(blob.size());
    std::uint64_t total = 0;
    for (int status = Z_OK; status == Z_OK; total += out.size() - stream.avail_out) {
        stream.next_out = out.data();
        stream.avail_out = static_cast<uInt>(out.size());
        status = inflate(&stream, Z_NO_FLUSH);
    }
    inflateEnd(&stream);
    if (total != expected)
        throw std::runtime_error("the bench set does not inflate");
}

} // namespace tavi::bench
