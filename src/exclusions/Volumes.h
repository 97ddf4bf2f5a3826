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

// The system's functions that the table is made from; tests put others in their place.
struct VolumeFunctions {
    decltype(&FindFirstVolumeW) findFirst = FindFirstVolumeW;
    decltype(&FindNextVolumeW) findNext = FindNextVolumeW;
    decltype(&FindVolumeClose) findClose = FindVolumeClose;
    decltype(&QueryDosDeviceW) queryDevice = QueryDosDeviceW;
    decltype(&GetDriveTypeW) driveType = GetDriveTypeW;
    decltype(&GetVolumePathNamesForVolumeNameW) pathNames = GetVolumePathNamesForVolumeNameW;
    // The kernel's own; null where the system does not have them: then device names stay as they are.
    NTSTATUS(NTAPI* openLink)(HANDLE* link, ACCESS_MASK access, OBJECT_ATTRIBUTES* attributes) = nullptr;
    NTSTATUS(NTAPI* queryLink)(HANDLE link, UNICODE_STRING* target, ULONG* bytes) = nullptr;
    NTSTATUS(NTAPI* closeLink)(HANDLE link) = nullptr;

    // With the kernel's three, if it has all of them.
    static VolumeFunctions system();
};

// The mount points of all fixed volumes, each with the kernel device that backs it. Any thread; a refresh makes readers
// wait.
class VolumeTable {
  public:
    explicit VolumeTable(const VolumeFunctions& functions) : functions_(functions) {}

    void refreshVolumes();
    // Drive roots and folders, ending in a backslash.
    std::set<wxString> mountPoints() const;
    // The mount point that was last reported for a device; empty for an unknown one.
    wxString mountPointOf(const wxString& device) const;

  private:
    wxString resolveLink(const wxString& device) const;
    void addVolume(const wxString& name);

    const VolumeFunctions functions_;
    mutable CriticalSection lock_;
    std::unordered_map<wxString, wxString, PathHash> mountPoints_;
    std::unordered_map<wxString, wxString, PathHash> devices_;
};

// The process's table.
VolumeTable& volumeTable();

} // namespace tavi
