#include "Manifest.h"

#include <cinttypes>
#include <cstdio>

#include <zlib.h>

#include "common/Text.h"
#include "Database.h"

namespace service {
namespace {

// Returns seconds since 1970, the unit of the manifest's times.
std::uint32_t unixSeconds(std::uint64_t fileTime)
{
    constexpr std::uint64_t kEpoch = 116444736000000000;
    constexpr std::uint64_t kTicksPerSecond = 10000000;
    return static_cast<std::uint32_t>((fileTime - kEpoch) / kTicksPerSecond);
}

std::string versionLine(const Version& version)
{
    if (version.size == kDeletedSize)
        return std::to_string(version.time) + ":0:0:-1:0::0:0";
    char numbers[160];
    std::snprintf(numbers, sizeof numbers, "%" PRId64 ":%" PRIu32 ":%" PRIu32 ":%" PRId64 ":0:", version.time,
                  unixSeconds(version.modified), unixSeconds(version.created), version.size);
    char attributes[32];
    std::snprintf(attributes, sizeof attributes, ":0:%" PRIo32, version.attributes);
    return numbers + tools::toUtf8(version.content) + attributes;
}

std::string manifestText(History& history)
{
    std::string text = "USER\nwritten by taviservice\n\n\nFILES\n";
    std::wstring current;
    history.forEach([&](const std::wstring& path, const Version& version) {
        if (path != current) {
            // An empty line separates two files. At the end of the text it would be one more version.
            text += (current.empty() ? "" : "\n\n") + tools::toUtf8(path);
            current = path;
        }
        text += "\n" + versionLine(version);
    });
    return text;
}

std::string compressed(const std::string& text)
{
    uLongf size = compressBound(static_cast<uLong>(text.size()));
    std::string bytes(size, '\0');
    if (compress(reinterpret_cast<Bytef*>(bytes.data()), &size, reinterpret_cast<const Bytef*>(text.data()),
                 static_cast<uLong>(text.size())) != Z_OK)
        throw tools::Failure{L"the manifest cannot be compressed"};
    bytes.resize(size);
    return bytes;
}

} // namespace

void publishManifest(const Installation& installation, History& history)
{
    Database state(installation.stateDatabase());
    Transaction transaction(state);
    state.run("DELETE FROM manifest");
    Statement(state, "INSERT INTO manifest(contents) VALUES(?)").bindBlob(1, compressed(manifestText(history))).next();
    transaction.commit();
    announceManifest();
}

} // namespace service
