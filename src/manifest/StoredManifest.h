#pragma once

#include <cstddef>

#include "manifest/Manifest.h"

namespace tavi {

// Parses a stored blob: UTF-8 text, compressed with a zlib or gzip header. Returns an empty manifest for an empty text,
// null for a text with an invalid line, which is logged. The text ends at its first zero byte, at the first byte that
// is not UTF-8, or where the compressed data are cut off. One thread at a time.
ManifestRef parseStoredManifest(const void* bytes, std::size_t length);

} // namespace tavi
