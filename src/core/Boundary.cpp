#include "core/Boundary.h"

#include <exception>

#include "core/LogLine.h"
#include "core/Utf8.h"

namespace tavi {

void logEscaped(const char* entry) noexcept
{
    // The conversion of the text may run out of memory, too.
    try {
        try {
            throw;
        } catch (const std::exception& error) {
            logError(L"Unhandled exception in %hs: %ls", entry, fromUtf8(error.what()).wc_str());
        } catch (...) {
            logError(L"Unhandled exception in %hs", entry);
        }
    } catch (...) {
    }
}

} // namespace tavi
