#pragma once

#include <string>

namespace filemanager {

// The threads of this process.
int threadCount();

// Returns this process's handles, GDI objects, threads, private memory and unloads of the watched library as one line.
std::wstring objectCounts();

// From now on the line says how often the loader unmapped this library. One library for the life of the process.
void watchUnloads(const std::wstring& library);

} // namespace filemanager
