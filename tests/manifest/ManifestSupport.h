#pragma once

#include <sstream>

#include <wx/mstream.h>
#include <wx/zstream.h>

#include "core/Utf8.h"
#include "manifest/StoredManifest.h"

namespace tavi::test {

inline std::string packed(const std::string& text, int format = wxZLIB_ZLIB)
{
    wxMemoryOutputStream blob;
    wxZlibOutputStream(blob, 1, format).Write(text.data(), text.size());
    const auto* start = static_cast<const char*>(blob.GetOutputStreamBuffer()->GetBufferStart());
    return {start, static_cast<std::size_t>(blob.GetLength())};
}

inline ManifestRef stored(const std::string& blob)
{
    return parseStoredManifest(piecesOf(blob));
}

// Returns the versions in the layout of eight fields.
inline std::string dump(const ManifestPatchList& patches)
{
    std::ostringstream out;
    for (std::size_t i = 0; i < patches.size(); ++i)
        out << std::dec << patches[i].timestamp() << ':' << patches[i].modifiedTime() << ':' << patches[i].ctime()
            << ':' << patches[i].fileSize() << ':' << patches[i].aux1() << ':' << toUtf8(view(patches[i].auxText()))
            << ':' << patches[i].aux2() << ':' << std::oct << patches[i].attributes() << ' ';
    return out.str();
}

// Returns "hash[user]" if either is not the initial one, then each file and its versions.
inline std::string dump(const ManifestRef& manifest)
{
    if (!manifest)
        return "none";
    std::string out;
    if (manifest->hash() != "da39a3ee5e6b4b0d3255bfef95601890afd80709" || !manifest->userText().empty())
        out = toUtf8(view(manifest->hash() + "[" + manifest->userText() + "] "));
    for (std::uint32_t file = 0; file < manifest->fileCount(); ++file)
        out += toUtf8(view(manifest->filePath(file))) + " = " + dump(manifest->patches(file));
    return out;
}

} // namespace tavi::test
