#include "StoredManifest.h"

#include <zlib.h>

#include "Database.h"
#include "Text.h"

namespace service {

void writeManifest(Database& state, const std::string& text)
{
    uLongf size = compressBound(static_cast<uLong>(text.size()));
    std::string packed(size, '\0');
    if (compress(reinterpret_cast<Bytef*>(packed.data()), &size, reinterpret_cast<const Bytef*>(text.data()),
                 static_cast<uLong>(text.size())) != Z_OK)
        throw Failure{L"the manifest cannot be compressed"};
    packed.resize(size);

    Transaction transaction(state);
    state.run("DELETE FROM manifest");
    Statement(state, "INSERT INTO manifest(contents) VALUES(?)").bindBlob(1, packed).next();
    transaction.commit();
}

std::string readManifest(Database& state)
{
    Statement row(state, "SELECT contents FROM manifest LIMIT 1");
    std::string packed = row.next() ? row.blob(0) : std::string();
    z_stream stream = {};
    if (packed.empty() || inflateInit(&stream) != Z_OK)
        return std::string();
    stream.next_in = reinterpret_cast<Bytef*>(packed.data());
    stream.avail_in = static_cast<uInt>(packed.size());
    std::string text;
    int result = Z_OK;
    while (result == Z_OK) {
        char part[65536];
        stream.next_out = reinterpret_cast<Bytef*>(part);
        stream.avail_out = sizeof part;
        result = inflate(&stream, Z_NO_FLUSH);
        text.append(part, sizeof part - stream.avail_out);
    }
    inflateEnd(&stream);
    if (result != Z_STREAM_END)
        throw Failure{L"the stored manifest is damaged"};
    return text;
}

} // namespace service
