#pragma once

#include <wx/string.h>

// Where the backup service keeps its files. Read from the registry afresh at every call; any thread.
namespace tavi {

wxString getInstallKeyName();
wxString getSettingsKeyName();

enum ConfigFile { kConfigDatabase = 0, kKeyFile = 1 };
enum DataFile {
    kStateDatabase = 0,
    kLogFile = 1,
    kLogDatabase = 2,
    kChangesFile = 3,
    kFilterLog = 4,
    kCacheFile = 5,
    kMapFile = 6,
    kDataDirectory = 7,
};

// Full path of a service file. With the directory value missing it is the bare file name; empty for a selector not
// listed above. Ask for kDataDirectory to learn whether the directory is known.
wxString getConfigFilePath(int selector);
wxString getDataFilePath(int selector);

} // namespace tavi
