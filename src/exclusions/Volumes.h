#pragma once

#include <map>
#include <set>
#include <string>
#include <unordered_map>

#include <windows.h>
#include <winternl.h>
#include <wx/string.h>

#include "core/CriticalSection.h"
#include "core/Paths.h"

namespace tavi {

// The system functions that the table calls; tests replace them.
struct VolumeFunctions {
    decltype(&FindFirstVolumeW) findFirst = FindFirstVolumeW;
    decltype(&FindNextVolumeW) findNext = FindNextVolumeW;
    decltype(&FindVolumeClose) findClose = FindVolumeClose;
    decltype(&QueryDosDeviceW) queryDevice = QueryDosDeviceW;
    decltype(&GetDriveTypeW) driveType = GetDriveTypeW;
    decltype(&GetVolumePathNamesForVolumeNameW) pathNames = GetVolumePathNamesForVolumeNameW;
    // Native functions of ntdll.dll. Without openLink device names are not resolved.
    NTSTATUS(NTAPI* openLink)(HANDLE* link, ACCESS_MASK access, OBJECT_ATTRIBUTES* attributes) = nullptr;
    NTSTATUS(NTAPI* queryLink)(HANDLE link, UNICODE_STRING* target, ULONG* bytes) = nullptr;
    NTSTATUS(NTAPI* closeLink)(HANDLE link) = nullptr;

    // Returns the system's functions, the native ones only if there are all three.
    static VolumeFunctions system();
};

// The mount points of all fixed volumes, each with its kernel device. Any thread; a refresh blocks readers.
class VolumeTable {
  public:
    explicit VolumeTable(const VolumeFunctions& functions) : functions_(functions) {}

    void refreshVolumes();
    // Drive roots and folders, ending in a backslash.
    std::set<wxString> mountPoints() const;
    // Returns the mount point that was last reported for a device, or an empty text. For others, like the list.
    wxString mountPointOf(const wxString& device) const;

  private:
    wxString resolveLink(const wxString& device) const;
    void addVolume(const wxString& name);

    const VolumeFunctions functions_;
    mutable CriticalSection lock_;
    std::unordered_map<wxString, wxString, PathHash> mountPoints_;
    std::unordered_map<wxString, wxString, PathHash> devices_;
};

// Returns the table of this process.
VolumeTable& volumeTable();

} // namespace tavi
