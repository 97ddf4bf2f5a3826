#include <algorithm>
#include <stdexcept>

#include <windows.h>
#include <shlobj.h>
#include <shlwapi.h>
#include <sqlite3.h>

#include "bench/Bench.h"
#include "bench/BenchInstall.h"
#include "core/Handles.h"
#include "core/Module.h"
#include "manifest/CurrentManifest.h"
#include "statedb/StateLookups.h"
#include "ui/ContextMenu.h"
#include "ui/Selection.h"

namespace tavi::bench {
namespace {

constexpr unsigned kFiles = 10000;
constexpr unsigned kManyItems = 70000;

// A folder of empty files, and the shell's own data objects for them and for many more that do not exist.
class BenchFolder {
  public:
    BenchFolder(std::wstring path, unsigned files) : path_(std::move(path)), files_(files)
    {
        CreateDirectoryW(path_.c_str(), nullptr);
        for (unsigned i = 0; i < files_; ++i)
            CloseHandle(CreateFileW(file(i).c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, 0, nullptr));
        LPITEMIDLIST list = nullptr;
        if (FAILED(SHParseDisplayName(path_.c_str(), nullptr, &list, 0, nullptr)))
            throw std::runtime_error("no item list of the folder");
        RefPtr<IShellFolder> desktop;
        SHGetDesktopFolder(desktop.out());
        desktop->BindToObject(list, nullptr, IID_IShellFolder, folder_.outVoid());
        ILFree(list);
        for (unsigned i = 0; i < files_; ++i) {
            std::wstring name = file(i).substr(path_.size() + 1);
            LPITEMIDLIST item = nullptr;
            if (FAILED(folder_->ParseDisplayName(nullptr, nullptr, name.data(), nullptr, &item, nullptr)))
                throw std::runtime_error("no item of a file");
            items_.push_back(item);
        }
        // Copies of the first item, each with another number in its name.
        const std::wstring name = file(0).substr(path_.size() + 1, 10);
        for (unsigned i = files_; i < kManyItems; ++i) {
            items_.push_back(ILClone(items_[0]));
            auto* const begin = reinterpret_cast<wchar_t*>(items_.back());
            wchar_t* const end = begin + ILGetSize(items_.back()) / sizeof(wchar_t);
            wchar_t* const place = std::search(begin, end, name.begin(), name.end());
            if (place == end)
                throw std::runtime_error("no name in an item");
            file(i).copy(place, name.size(), path_.size() + 1);
        }
    }
    BenchFolder(const BenchFolder&) = delete;
    BenchFolder& operator=(const BenchFolder&) = delete;
    ~BenchFolder()
    {
        for (LPITEMIDLIST item : items_)
            ILFree(item);
        for (unsigned i = 0; i < files_; ++i)
            DeleteFileW(file(i).c_str());
        RemoveDirectoryW(path_.c_str());
    }
    std::wstring file(unsigned i) const
    {
        return path_ + L"\\file " + std::to_wstring(10000 + i) + L".txt";
    }
    RefPtr<IDataObject> data(unsigned items) const
    {
        RefPtr<IDataObject> data;
        if (FAILED(folder_->GetUIObjectOf(nullptr, items, const_cast<LPCITEMIDLIST*>(items_.data()), IID_IDataObject,
                                          nullptr, data.outVoid())))
            throw std::runtime_error("no data object");
        return data;
    }
    // The calls that no handler of this selection can do without: the shell's, the file system's and, unless `states`
    // is null, one question to the database for each file. Returns how many files there were.
    unsigned requiredCalls(IDataObject* data, sqlite3_stmt* states) const
    {
        FORMATETC request{static_cast<CLIPFORMAT>(RegisterClipboardFormatW(L"Shell IDList Array")), nullptr,
                          DVASPECT_CONTENT, -1, TYMED_HGLOBAL};
        STGMEDIUM medium{};
        data->GetData(&request, &medium);
        const auto* array = static_cast<const CIDA*>(GlobalLock(medium.hGlobal));
        unsigned found = 0;
        for (UINT i = 1; i <= array->cidl; ++i) {
            const auto* item =
                reinterpret_cast<LPCITEMIDLIST>(reinterpret_cast<const BYTE*>(array) + array->aoffset[i]);
            STRRET text{};
            wchar_t name[MAX_PATH];
            folder_->GetDisplayNameOf(item, SHGDN_FORPARSING, &text);
            StrRetToBufW(&text, item, name, MAX_PATH);
            found += GetFileAttributesW(name) != INVALID_FILE_ATTRIBUTES;
            if (states) {
                sqlite3_bind_text(states, 1, toUtf8(name).c_str(), -1, SQLITE_TRANSIENT);
                sqlite3_step(states);
                sqlite3_reset(states);
            }
        }
        GlobalUnlock(medium.hGlobal);
        ReleaseStgMedium(&medium);
        return found;
    }

  private:
    std::wstring path_;
    unsigned files_;
    RefPtr<IShellFolder> folder_;
    std::vector<LPITEMIDLIST> items_;
};

void menuBench(Bench& bench)
{
    const BenchInstall install(bench.dataFolder() + "/menu");
    install.stateDatabase().execDML("CREATE TABLE manifest(contents BLOB)");
    install.configDatabase().execDML("CREATE TABLE filesystem(state INTEGER, folder TEXT PRIMARY KEY);"
                                     "INSERT INTO filesystem VALUES(1,'C:\\users')");
    wchar_t temporary[MAX_PATH];
    GetTempPathW(MAX_PATH, temporary);
    OleInitialize(nullptr);
    {
        const BenchFolder folder(std::wstring(temporary) + L"tavi-menu-bench", kFiles);
        const RefPtr<IDataObject> some = folder.data(kFiles), many = folder.data(kManyItems);
        FolderStateTable states;
        setModuleInstance(GetModuleHandleW(nullptr));
        // The watcher loads the empty manifest first, so that the versions of every file are asked for.
        for (int i = 0; i < 500 && !getCurrentManifest(); ++i)
            Sleep(10);
        sqlite3* database = nullptr;
        sqlite3_stmt* bare = nullptr;
        sqlite3_open(toUtf8(view(getConfigFilePath(kConfigDatabase))).c_str(), &database);
        sqlite3_prepare_v2(database, "SELECT state FROM filesystem WHERE folder=?", -1, &bare, nullptr);
        unsigned found = 0;
        std::size_t selected = 0, all = 0;
        const auto times = medianSeconds(bench.repetitions(),
                                         {
                                             [&] { found = folder.requiredCalls(some.get(), nullptr); },
                                             [&] {
                                                 sqlite3_exec(database, "BEGIN", nullptr, nullptr, nullptr);
                                                 found = folder.requiredCalls(some.get(), bare);
                                                 sqlite3_exec(database, "COMMIT", nullptr, nullptr, nullptr);
                                             },
                                             [&] {
                                                 Selection selection;
                                                 captureSelection(nullptr, some.get(), states, selection);
                                                 selected = selection.paths.size();
                                                 const HMENU menu = CreatePopupMenu();
                                                 insertMenuItems(menu, 0, 1, CMF_NORMAL, selection);
                                                 DestroyMenu(menu);
                                             },
                                             [&] { collectPaths(nullptr, some.get(), GetDriveTypeW); },
                                             [&] { all = collectPaths(nullptr, many.get(), GetDriveTypeW).size(); },
                                         });
        sqlite3_finalize(bare);
        sqlite3_close(database);
        if (found != kFiles || selected != kFiles || all != kManyItems)
            throw std::runtime_error("files are missing from the selection");
        bench.report({"menu query / required calls, 10000 files", times[2] / times[1], 1.3, "x"});
        bench.report({"menu query / the system calls among them", times[2] / times[0], kNoBound, "x"});
        bench.report({"an item of 70000 / an item of 10000", times[4] / times[3] * kFiles / kManyItems, 1.3, "x"});
        bench.report({"menu query, 10000 files", times[2] * 1e3, kNoBound, "ms"});
        stopManifestWatcher();
        for (int i = 0; i < 500 && isWatcherActive(); ++i)
            Sleep(10);
    }
    OleUninitialize();
}
const Group menuGroup("menu", menuBench);

} // namespace
} // namespace tavi::bench
