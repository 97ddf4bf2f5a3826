#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "manifest/Manifest.h"

namespace tavi {

// A stored blob in pieces of less than 1 MB, none of them empty: the address space of a 32-bit host is fragmented.
using BlobPieces = std::vector<std::string>;
BlobPieces piecesOf(std::string_view blob);

// Parses a stored blob: UTF-8 text, compressed with a zlib or gzip header. Returns an empty manifest for an empty text,
// null for a text with an invalid line, which is logged. The text ends at its first zero byte, at the first byte that
// is not UTF-8, or where the compressed data are cut off or damaged. Throws std::bad_alloc. One thread at a time.
ManifestRef parseStoredManifest(const BlobPieces& blob);

} // namespace tavi
