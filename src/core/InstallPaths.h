#pragma once

#include <wx/string.h>

#include "core/Handles.h"

// The paths of the backup service's files. Each call reads the registry; any thread.
namespace tavi {

wxString getInstallKeyName();
wxString getSettingsKeyName();

// Each opens one of the two keys; null if that fails. The service is a 32-bit program, so they are in the registry's
// 32-bit view, also for a 64-bit module.
RegistryKey openInstallKey(REGSAM access) noexcept;
RegistryKey openSettingsKey(REGSAM access) noexcept;

// The service's files, by the numbers that it uses for them.
enum class ConfigFile { database = 0, key = 1 };
enum class DataFile {
    stateDatabase = 0,
    log = 1,
    logDatabase = 2,
    changes = 3,
    filterLog = 4,
    cache = 5,
    map = 6,
    directory = 7, // the directory itself
};

// Returns the full path of a file, or its bare name with a backslash if the service's directory is not known: then
// DataFile::directory gives an empty path. Empty for any other number. Logs a directory that cannot be read.
wxString getConfigFilePath(ConfigFile file);
wxString getDataFilePath(DataFile file);

} // namespace tavi
