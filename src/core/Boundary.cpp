#include "core/Boundary.h"

#include <exception>

#include <wx/log.h>

namespace tavi {

void logEscaped(const char* entry) noexcept
{
    // Lack of memory or a failing log must not break the boundary. wxWidgets' formatting calls are avoided: a
    // destructor of theirs allocates, so they end the process if no memory is left.
    try {
        wxString text = L"Unhandled exception in " + wxString::FromUTF8(entry);
        try {
            throw;
        } catch (const std::exception& error) {
            text += L": " + wxString::FromUTF8(error.what());
        } catch (...) {
        }
        if (wxLog::IsEnabled())
            wxLog::OnLog(wxLOG_Error, text, wxLogRecordInfo(nullptr, 0, nullptr, wxLOG_COMPONENT));
    } catch (...) {
    }
}

} // namespace tavi
