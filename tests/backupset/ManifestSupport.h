#pragma once

#include <cstdio>
#include <string>

#include <gtest/gtest.h>
#include <zlib.h>

#include "backupset/ManifestParser.h"
#include "backupset/StoredManifest.h"
#include "core/Text.h"

namespace tavi::test {

// gzip instead of zlib with windowBits 31.
inline std::string packed(const std::string& text, int windowBits = 15)
{
    z_stream stream{};
    deflateInit2(&stream, 1, Z_DEFLATED, windowBits, 8, Z_DEFAULT_STRATEGY);
    std::string out(deflateBound(&stream, static_cast<uLong>(text.size())) + 64, '\0');
    stream.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(text.data()));
    stream.avail_in = static_cast<uInt>(text.size());
    stream.next_out = reinterpret_cast<Bytef*>(out.data());
    stream.avail_out = static_cast<uInt>(out.size());
    EXPECT_EQ(deflate(&stream, Z_FINISH), Z_STREAM_END);
    out.resize(stream.total_out);
    deflateEnd(&stream);
    return out;
}

inline ManifestRef held(const Manifest* manifest)
{
    if (manifest)
        manifest->AddRef();
    return ManifestRef(manifest);
}

inline ManifestRef stored(const std::string& blob)
{
    return held(parseStoredManifest(blob.data(), blob.size()));
}

inline std::string utf8(const wxString& text)
{
    return toUtf8(view(text));
}

// The versions as the fields of the longest layout, attributes in octal.
inline std::string dump(const ManifestPatchList& patches)
{
    std::string out;
    for (std::size_t i = 0; i < patches.size(); ++i) {
        const ManifestPatch patch = patches[i];
        char octal[16];
        std::snprintf(octal, sizeof octal, "%o", static_cast<unsigned>(patch.attributes()));
        for (const auto& field : {std::to_string(patch.timestamp()), std::to_string(patch.modifiedTime()),
                                  std::to_string(patch.ctime()), std::to_string(patch.fileSize()),
                                  std::to_string(patch.aux1()), utf8(patch.auxText()), std::to_string(patch.aux2())})
            out += field + ':';
        out += octal + std::string(" ");
    }
    return out;
}

// "hash[user]" if either is not the initial one, then each file and its versions.
inline std::string dump(const ManifestRef& manifest)
{
    if (!manifest)
        return "none";
    std::string out;
    if (manifest->hash() != "da39a3ee5e6b4b0d3255bfef95601890afd80709" || !manifest->userText().empty())
        out = utf8(manifest->hash()) + '[' + utf8(manifest->userText()) + "] ";
    for (std::uint32_t file = 0; file < manifest->fileCount(); ++file)
        out += utf8(manifest->filePath(file)) + " = " + dump(manifest->patches(file));
    return out;
}

} // namespace tavi::test
