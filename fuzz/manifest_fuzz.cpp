#include <cstdint>
#include <cstdlib>
#include <string>

#include <zlib.h>
#include <wx/log.h>

#include "core/Utf8.h"
#include "manifest/StoredManifest.h"

namespace {

using namespace tavi;

void require(bool condition)
{
    if (!condition)
        std::abort();
}

std::string packed(const std::uint8_t* bytes, std::size_t length)
{
    std::string out(compressBound(static_cast<uLong>(length)), '\0');
    uLongf size = static_cast<uLongf>(out.size());
    compress2(reinterpret_cast<Bytef*>(out.data()), &size, bytes, static_cast<uLong>(length), 1);
    out.resize(size);
    return out;
}

// Looks up every file by its path and by a prefix of it.
void checkLookups(const Manifest& manifest)
{
    for (std::uint32_t file = 0; file < manifest.fileCount(); ++file) {
        const wxString path = manifest.filePath(file);
        const auto patches = manifest.findPatches(view(path));
        require(patches && !patches->empty() && patches->size() == manifest.patches(file).size());
        for (std::size_t i = 0; i < patches->size(); ++i)
            (void)(*patches)[i].auxText();
        const std::wstring_view prefix = view(path).substr(0, file % (path.length() + 1));
        // Half a surrogate pair also matches the whole pair, which 32-bit wide characters do not show.
        if (!prefix.empty() && prefix.back() >= 0xD800 && prefix.back() <= 0xDBFF)
            continue;
        bool visited = false;
        manifest.forEachUnder(prefix, [&](std::uint32_t other) {
            require(view(manifest.filePath(other)).substr(0, prefix.size()) == prefix);
            visited = visited || other == file;
            return true;
        });
        require(visited);
    }
}

} // namespace

// If the first byte is even, the other bytes are a text, which is compressed here; otherwise they are a blob.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t length)
{
    static const bool quiet = wxLog::EnableLogging(false);
    (void)quiet;
    if (length == 0)
        return 0;
    if (bytes[0] % 2 != 0) {
        const ManifestRef manifest =
            parseStoredManifest(piecesOf({reinterpret_cast<const char*>(bytes) + 1, length - 1}));
        if (manifest)
            checkLookups(*manifest);
        return 0;
    }
    // The parser keeps an incomplete character for the next text. A malformed text clears it, so that an input does not
    // depend on the one before.
    const std::uint8_t malformed[] = {0xFF};
    const std::string clearing = packed(malformed, 1);
    parseStoredManifest(piecesOf(clearing));

    const std::string blob = packed(bytes + 1, length - 1);
    const ManifestRef stored = parseStoredManifest(piecesOf(blob));
    if (stored)
        checkLookups(*stored);
    // If the whole text is well-formed, the wide text must give the same manifest.
    const std::string text(reinterpret_cast<const char*>(bytes + 1), length - 1);
    const wxString wide = fromUtf8(text);
    if (toUtf8(view(wide)) != text || text.find('\0') != std::string::npos)
        return 0;
    const ManifestRef parsed = Manifest::parse(wide);
    require(bool(stored) == bool(parsed));
    if (!stored)
        return 0;
    require(stored->textLength() == parsed->textLength() && stored->hash() == parsed->hash());
    require(stored->userText() == parsed->userText() && stored->fileCount() == parsed->fileCount());
    for (std::uint32_t file = 0; file < stored->fileCount(); ++file) {
        require(stored->filePath(file) == parsed->filePath(file));
        require(stored->patches(file).size() == parsed->patches(file).size());
    }
    return 0;
}
