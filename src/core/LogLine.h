#pragma once

// The module's only way to write to wxWidgets' log. The calls of wxWidgets itself allocate while they format: without
// memory they write to a null buffer, or throw in a destructor, and so end the host.
namespace tavi {

// Each logs one line, with the conversions of std::wprintf (a wide text is %ls, a narrow one %hs). Text beyond 4095
// characters is cut. Without memory the line is dropped. Any thread.
void logError(const wchar_t* format, ...) noexcept;
void logWarning(const wchar_t* format, ...) noexcept;
void logInfo(const wchar_t* format, ...) noexcept;

} // namespace tavi
