#include "exclusions/ExclusionRules.h"

namespace tavi {
namespace {

constexpr const wchar_t* kVolumePlaces[] = {L"System Volume Information", L"RECYCLER", L"MSOCache", L"Config.msi",
                                            L"hiberfil.sys"};
constexpr const wchar_t* kMemoryKey = L"System\\CurrentControlSet\\Control\\Session Manager\\Memory Management";
constexpr const wchar_t* kRecordingKey =
    L"Software\\Microsoft\\Windows\\CurrentVersion\\Media Center\\Service\\Recording";
constexpr const wchar_t* kLocalUserData[] = {L"\\Microsoft\\Outlook", L"\\Microsoft\\Media Player", L"\\Identities"};
constexpr const wchar_t* kProgramUserData[] = {L"\\Intuit\\QuickBooks",
                                               L"\\Intuit\\QuickBooks Pro",
                                               L"\\Intuit\\Quicken",
                                               L"\\Quicken",
                                               L"\\Qualcomm\\Eudora",
                                               L"\\Palm",
                                               L"\\palmOne",
                                               L"\\Sony Handheld"};

wxString inside(const wxString& folder, const wxString& name)
{
    return folder.EndsWith(L"\\") ? folder + name : folder + L"\\" + name;
}

template <std::size_t kCount>
void addCarvedOut(const ExclusionSources& sources, const RuleSink& add, const wxString& folder,
                  const wchar_t* const (&places)[kCount])
{
    for (const wchar_t* const place : places) {
        if (sources.exists(folder + place))
            add(folder + place, kCarvedOut);
    }
}

void addUserFolders(const ExclusionSources& sources, const RuleSink& add, const wchar_t* name)
{
    for (const wxString& folder : sources.userFolders(name))
        add(folder, kGrayed);
}

std::optional<wxString> addSpecialFolder(const ExclusionSources& sources, const RuleSink& add, SpecialFolder folder)
{
    auto path = sources.specialFolder(folder);
    if (path)
        add(*path, kGrayed);
    return path;
}

void addRegistryFolder(const ExclusionSources& sources, const RuleSink& add, const wchar_t* key, const wchar_t* value,
                       const wxString& below = wxString())
{
    if (const auto folder = sources.registryText(key, value))
        add(*folder + below, kGrayed);
}

} // namespace

void addMachineRules(const ExclusionSources& sources, const RuleSink& add)
{
    for (const wxString& mountPoint : sources.mountPoints()) {
        if (mountPoint.empty())
            continue;
        for (const wchar_t* const place : kVolumePlaces)
            add(mountPoint + place, kGrayed);
    }
    // Two sizes follow the name. A text without sizes leaves an empty path, which is added like any other.
    for (const wxString& file : sources.registryTexts(kMemoryKey, L"PagingFiles"))
        add(file.BeforeLast(L' ').BeforeLast(L' '), kGrayed);

    const wxString windowsFolder = sources.windowsFolder();
    if (const auto prefetch = sources.registryText(wxString(kMemoryKey) + L"\\PrefetchParameters", L"RootDirPath"))
        add(inside(windowsFolder, *prefetch), kGrayed);
    if (const auto temporary = sources.temporaryFolder())
        add(*temporary, kGrayed);
    add(inside(windowsFolder, L"Temp"), kGrayed);
    add(inside(windowsFolder, L"assembly"), kGrayed);
    for (const wxString& name : sources.dollarEntries(windowsFolder))
        add(inside(windowsFolder, name), kGrayed);
    if (const wxString data = sources.serviceDataFolder(); !data.empty())
        add(data, kGrayed);
    addSpecialFolder(sources, add, SpecialFolder::recycleBin);
    addUserFolders(sources, add, L"CD Burning");
    addUserFolders(sources, add, L"Cache");
    addRegistryFolder(sources, add, L"Software\\Microsoft\\Windows\\CurrentVersion\\Internet Settings",
                      L"ActiveXCache");
    addRegistryFolder(sources, add, L"Software\\Microsoft\\SchedulingAgent", L"TasksFolder");
    addRegistryFolder(sources, add, kRecordingKey, L"RecordPath", L"\\TempRec");
    if (!sources.keepsUserPlaces())
        addUserRules(sources, add);
}

void addUserRules(const ExclusionSources& sources, const RuleSink& add)
{
    addSpecialFolder(sources, add, SpecialFolder::commonAdminTools);
    for (const wchar_t* const name : {L"Cookies", L"History", L"Local Settings"})
        addUserFolders(sources, add, name);
    for (const wxString& folder : sources.userFolders(L"Local AppData")) {
        add(folder, kGrayed);
        addCarvedOut(sources, add, folder, kLocalUserData);
    }
    for (const wchar_t* const name : {L"NetHood", L"PrintHood", L"Recent"})
        addUserFolders(sources, add, name);
    for (const auto folder :
         {SpecialFolder::system, SpecialFolder::windows, SpecialFolder::commonFiles, SpecialFolder::commonFiles32})
        addSpecialFolder(sources, add, folder);
    for (const auto folder : {SpecialFolder::programFiles, SpecialFolder::programFiles32}) {
        if (const auto path = addSpecialFolder(sources, add, folder))
            addCarvedOut(sources, add, *path, kProgramUserData);
    }
}

} // namespace tavi
