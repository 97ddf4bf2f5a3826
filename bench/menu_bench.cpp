#include <algorithm>
#include <filesystem>
#include <fstream>
#include <stdexcept>

#include <windows.h>
#include <shlobj.h>
#include <shlwapi.h>
#include <sqlite3.h>

#include "bench/Bench.h"
#include "bench/InstalledService.h"
#include "core/Handles.h"
#include "core/Module.h"
#include "core/ScopeGuard.h"
#include "manifest/CurrentManifest.h"
#include "statedb/StateLookups.h"
#include "ui/ContextMenu.h"
#include "ui/Selection.h"
#include "ui/Translations.h"

namespace tavi::bench {
namespace {

constexpr unsigned kFiles = 10000;
constexpr unsigned kManyItems = 70000;

// A folder of empty files, and the shell's own data objects for them and for many more that do not exist.
class BenchFolder {
  public:
    BenchFolder()
    {
        for (unsigned i = 0; i < kFiles; ++i)
            std::ofstream{std::filesystem::path(root_.path() + L"\\" + name(i))};
        ItemIdList list, first;
        RefPtr<IShellFolder> desktop;
        SHGetDesktopFolder(desktop.out());
        if (FAILED(SHParseDisplayName(root_.path().c_str(), nullptr, list.out(), 0, nullptr)) ||
            FAILED(desktop->BindToObject(list.get(), nullptr, IID_IShellFolder, folder_.outVoid())) ||
            FAILED(folder_->ParseDisplayName(nullptr, nullptr, name(0).data(), nullptr, first.out(), nullptr)))
            throw std::runtime_error("no item of a file");
        // Copies of the first item, each with another number in its name.
        const std::wstring from = name(0);
        for (unsigned i = 0; i < kManyItems; ++i) {
            lists_.push_back(items_.emplace_back(ILClone(first.get())).get());
            auto* const begin = reinterpret_cast<wchar_t*>(items_.back().get());
            wchar_t* const end = begin + ILGetSize(first.get()) / sizeof(wchar_t);
            wchar_t* const place = std::search(begin, end, from.begin(), from.end());
            if (place == end)
                throw std::runtime_error("no name in an item");
            name(i).copy(place, from.size());
        }
    }
    RefPtr<IDataObject> data(unsigned items) const
    {
        RefPtr<IDataObject> data;
        auto* const lists = const_cast<LPCITEMIDLIST*>(lists_.data());
        if (FAILED(folder_->GetUIObjectOf(nullptr, items, lists, IID_IDataObject, nullptr, data.outVoid())))
            throw std::runtime_error("no data object");
        return data;
    }
    // Makes only the calls that every handler of this selection needs: the shell's, the file system's, and one query of
    // the database for each file. Returns the number of files found.
    unsigned requiredCalls(IDataObject* data, sqlite3_stmt* states) const
    {
        FORMATETC request{static_cast<CLIPFORMAT>(RegisterClipboardFormatW(L"Shell IDList Array")), nullptr,
                          DVASPECT_CONTENT, -1, TYMED_HGLOBAL};
        STGMEDIUM medium{};
        data->GetData(&request, &medium);
        const auto* bytes = static_cast<const BYTE*>(GlobalLock(medium.hGlobal));
        const auto* array = reinterpret_cast<const CIDA*>(bytes);
        unsigned found = 0;
        for (UINT i = 1; i <= array->cidl; ++i) {
            const auto* item = reinterpret_cast<LPCITEMIDLIST>(bytes + array->aoffset[i]);
            STRRET text{};
            wchar_t name[MAX_PATH];
            folder_->GetDisplayNameOf(item, SHGDN_FORPARSING, &text);
            StrRetToBufW(&text, item, name, MAX_PATH);
            found += GetFileAttributesW(name) != INVALID_FILE_ATTRIBUTES;
            sqlite3_bind_text(states, 1, toUtf8(name).c_str(), -1, SQLITE_TRANSIENT);
            sqlite3_step(states);
            sqlite3_reset(states);
        }
        GlobalUnlock(medium.hGlobal);
        ReleaseStgMedium(&medium);
        return found;
    }

  private:
    static std::wstring name(unsigned i)
    {
        return L"file " + std::to_wstring(10000 + i) + L".txt";
    }

    const test::TemporaryFolder root_;
    RefPtr<IShellFolder> folder_;
    std::vector<ItemIdList> items_;
    std::vector<LPCITEMIDLIST> lists_;
};

} // namespace

void runMenu(Bench& bench)
{
    const test::InstalledService service;
    service.createTables();
    service.database(L"taviconf.dat").execDML("INSERT INTO filesystem VALUES(1,'C:\\users')");
    OleInitialize(nullptr);
    const ScopeGuard ole([] { OleUninitialize(); });
    setModuleInstance(GetModuleHandleW(nullptr));
    // The module looks for versions only once the watcher has loaded a manifest, here an empty one.
    for (int polls = 0; polls < 500 && !getCurrentManifest(); ++polls)
        Sleep(10);
    const BenchFolder folder;
    const RefPtr<IDataObject> some = folder.data(kFiles), many = folder.data(kManyItems);
    FolderStateTable states;
    sqlite3* database = nullptr;
    sqlite3_stmt* query = nullptr;
    sqlite3_open(toUtf8(service.file(L"taviconf.dat")).c_str(), &database);
    sqlite3_prepare_v2(database, "SELECT state FROM filesystem WHERE folder=?", -1, &query, nullptr);
    std::size_t found = 0, selected = 0, all = 0;
    const auto requiredCalls = [&] {
        sqlite3_exec(database, "BEGIN", nullptr, nullptr, nullptr);
        found = folder.requiredCalls(some.get(), query);
        sqlite3_exec(database, "COMMIT", nullptr, nullptr, nullptr);
    };
    const auto menuQuery = [&] {
        Selection selection;
        captureSelection(nullptr, some.get(), states, selection);
        selected = selection.paths.size();
        const HMENU menu = CreatePopupMenu();
        insertMenuItems(menu, 0, 1, CMF_NORMAL, selection);
        DestroyMenu(menu);
    };
    const auto shortMenu = [&] {
        const HMENU menu = CreatePopupMenu();
        insertMenuItems(menu, 0, 1, CMF_NORMAL, {{}, {}, Coverage::all, false, {}});
        DestroyMenu(menu);
    };
    const auto collectSome = [&] { collectPaths(nullptr, some.get(), GetDriveTypeW); };
    const auto collectMany = [&] { all = collectPaths(nullptr, many.get(), GetDriveTypeW).size(); };
    const auto times = leastProcessorSeconds(bench.repetitions, {requiredCalls, menuQuery, collectSome, collectMany});
    double inEnglish = kNoBound, inGerman = kNoBound;
    const auto leastIn = [&](const wchar_t* language, double& least) {
        freeTranslations();
        loadTranslations({language});
        least = std::min(least, leastProcessorSeconds(1, {shortMenu})[0]);
    };
    for (int i = 0; i < bench.repetitions; ++i) {
        leastIn(L"en", inEnglish);
        leastIn(L"de", inGerman);
    }
    sqlite3_finalize(query);
    sqlite3_close(database);
    if (!isTranslated())
        throw std::runtime_error("no German texts");
    if (found != kFiles || selected != kFiles || all != kManyItems)
        throw std::runtime_error("files are missing from the selection");
    bench.report("menu query / required calls, 10000 files", times[1] / times[0], 1.6, "x");
    bench.report("an item of 70000 / an item of 10000", times[3] / times[2] * kFiles / kManyItems, 1.3, "x");
    bench.report("a menu in German / a menu in English", inGerman / inEnglish, 1.2, "x");
    bench.report("menu query, 10000 files", times[1] * 1e3, kNoBound, "ms");
    freeTranslations();
    stopManifestWatcher();
    for (int polls = 0; polls < 500 && isWatcherActive(); ++polls)
        Sleep(10);
}

} // namespace tavi::bench
