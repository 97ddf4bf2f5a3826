#include "core/Boundary.h"

#include <exception>

#include <wx/log.h>

namespace tavi {

void logEscaped(const char* entry) noexcept
{
    // Out of memory or a failing log must not undo the boundary.
    try {
        try {
            throw;
        } catch (const std::exception& error) {
            wxLogError("Unhandled exception in %s: %s", wxString::FromUTF8(entry), wxString::FromUTF8(error.what()));
        } catch (...) {
            wxLogError("Unhandled exception in %s", wxString::FromUTF8(entry));
        }
    } catch (...) {
    }
}

} // namespace tavi
