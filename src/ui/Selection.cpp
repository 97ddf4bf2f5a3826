#include "ui/Selection.h"

#include <cstring>
#include <string>

#include <shlwapi.h>

#include "core/Handles.h"
#include "core/LogLine.h"
#include "core/Utf8.h"
#include "manifest/CurrentManifest.h"
#include "statedb/Database.h"
#include "statedb/StateLookups.h"

namespace tavi {
namespace {

// Records whether there are items with a property and items without it.
class CoverageRecord {
  public:
    void add(bool hasProperty) noexcept
    {
        (hasProperty ? with_ : without_) = true;
    }
    bool isMixed() const noexcept
    {
        return with_ && without_;
    }
    Coverage coverage() const noexcept
    {
        return isMixed() ? Coverage::some : with_ ? Coverage::all : Coverage::none;
    }

  private:
    bool with_ = false;
    bool without_ = false;
};

// The data object's global memory, locked.
class Medium {
  public:
    explicit Medium(IDataObject& data) noexcept
    {
        const auto format = static_cast<CLIPFORMAT>(RegisterClipboardFormatW(L"Shell IDList Array"));
        FORMATETC request{format, nullptr, DVASPECT_CONTENT, -1, TYMED_HGLOBAL};
        held_ = SUCCEEDED(data.GetData(&request, &medium_));
        if (held_ && medium_.tymed == TYMED_HGLOBAL && medium_.hGlobal)
            bytes_ = static_cast<const unsigned char*>(GlobalLock(medium_.hGlobal));
    }
    ~Medium()
    {
        if (bytes_)
            GlobalUnlock(medium_.hGlobal);
        if (held_)
            ReleaseStgMedium(&medium_);
    }
    Medium(const Medium&) = delete;
    Medium& operator=(const Medium&) = delete;
    const unsigned char* bytes() const noexcept
    {
        return bytes_;
    }
    std::size_t size() const noexcept
    {
        return bytes_ ? GlobalSize(medium_.hGlobal) : 0;
    }

  private:
    STGMEDIUM medium_{};
    bool held_ = false;
    const unsigned char* bytes_ = nullptr;
};

// The item id lists of a memory block that any program may have filled. Reads nothing outside the block.
class IdListArray {
  public:
    IdListArray(const unsigned char* bytes, std::size_t size) noexcept : bytes_(bytes), size_(size)
    {
        // One count, then one offset for the parent and each child.
        const std::size_t words = size / sizeof(UINT);
        if (words >= 2 && readWord(0) <= words - 2)
            count_ = readWord(0);
        else
            size_ = 0;
    }
    std::size_t count() const noexcept
    {
        return count_;
    }
    // Returns the parent for index 0, else a child, or null for a list that does not end inside the block.
    LPCITEMIDLIST list(std::size_t index) const noexcept
    {
        if (size_ == 0)
            return nullptr;
        const std::size_t start = readWord(1 + index);
        for (std::size_t at = start; at <= size_ - sizeof(USHORT) && at < size_;) {
            USHORT bytes;
            std::memcpy(&bytes, bytes_ + at, sizeof(bytes));
            if (bytes == 0)
                return reinterpret_cast<LPCITEMIDLIST>(bytes_ + start);
            if (bytes < sizeof(USHORT))
                return nullptr;
            at += bytes;
        }
        return nullptr;
    }

  private:
    UINT readWord(std::size_t index) const noexcept
    {
        UINT word;
        std::memcpy(&word, bytes_ + index * sizeof(UINT), sizeof(word));
        return word;
    }

    const unsigned char* bytes_;
    std::size_t size_;
    std::size_t count_ = 0;
};

RefPtr<IShellFolder> bindParent(LPCITEMIDLIST parent)
{
    RefPtr<IShellFolder> desktop;
    if (FAILED(SHGetDesktopFolder(desktop.out())) || parent->mkid.cb == 0)
        return desktop;
    RefPtr<IShellFolder> folder;
    if (FAILED(desktop->BindToObject(parent, nullptr, IID_IShellFolder, folder.outVoid())))
        return RefPtr<IShellFolder>();
    return folder;
}

bool isAccepted(const wchar_t* name, std::size_t length, DriveTypeQuery driveType)
{
    constexpr std::size_t kDriveRootChars = 3;
    return length != 0 && name[0] != L':' && (length != kDriveRootChars || driveType(name) == DRIVE_FIXED);
}

void collectItems(IDataObject& data, DriveTypeQuery driveType, PathSet& paths)
{
    const Medium medium(data);
    const IdListArray items(medium.bytes(), medium.size());
    const LPCITEMIDLIST parent = items.list(0);
    const RefPtr<IShellFolder> folder = parent ? bindParent(parent) : RefPtr<IShellFolder>();
    if (!folder)
        return;
    paths.reserve(paths.size() + items.count());
    for (std::size_t i = 1; i <= items.count(); ++i) {
        const LPCITEMIDLIST child = items.list(i);
        STRRET text{};
        wchar_t name[MAX_PATH];
        if (child && SUCCEEDED(folder->GetDisplayNameOf(child, SHGDN_FORPARSING, &text)) &&
            SUCCEEDED(StrRetToBufW(&text, child, name, MAX_PATH))) {
            const std::size_t length = std::wcslen(name);
            if (isAccepted(name, length, driveType))
                paths.emplace(name, length);
        }
    }
}

bool isDirectory(const wxString& path)
{
    const DWORD attributes = GetFileAttributesW(path.wc_str());
    return attributes != INVALID_FILE_ATTRIBUTES && (attributes & FILE_ATTRIBUTE_DIRECTORY);
}

} // namespace

PathSet collectPaths(LPCITEMIDLIST folder, IDataObject* data, DriveTypeQuery driveType)
{
    PathSet paths;
    wchar_t path[MAX_PATH];
    if (folder && SHGetPathFromIDListW(folder, path))
        paths.emplace(path);
    if (data)
        collectItems(*data, driveType, paths);
    return paths;
}

Coverage summarizeStates(const PathSet& paths, FolderStateTable& states)
{
    CoverageRecord record;
    if (paths.empty())
        return record.coverage();
    try {
        const FolderStateTable::ReadScope reading(states);
        for (const wxString& path : paths) {
            const FolderState state = states.getFolderState(path);
            record.add(state == FolderState::offAllOn || state == FolderState::allOn);
            if (record.isMixed())
                break;
        }
    } catch (const DbException& error) {
        // The other items would fail, too, and each may have to wait for the database's timeout.
        logWarning(L"Failed to retrieve folder state (%d: %ls)", error.code(), error.message().wc_str());
        record.add(false);
    }
    return record.coverage();
}

void summarizeVersions(Selection& selection, const Manifest* manifest)
{
    CoverageRecord record;
    selection.hasFolder = false;
    if (manifest) {
        std::wstring folder;
        for (const wxString& path : selection.paths) {
            if (record.isMixed() && selection.hasFolder)
                break;
            const bool directory = isDirectory(path);
            selection.hasFolder |= directory;
            if (record.isMixed())
                continue;
            if (directory) {
                folder = view(path);
                if (folder.back() != L'\\')
                    folder.push_back(L'\\');
                record.add(manifest->hasBackedUpUnder(folder, kAnyTime));
            } else {
                record.add(manifest->isBackedUp(view(path), kAnyTime));
            }
        }
    }
    selection.restoreMode = record.coverage();
    selection.displayName = selection.paths.size() == 1 ? selection.paths.begin()->AfterLast(L'\\') : wxString();
}

void captureSelection(LPCITEMIDLIST folder, IDataObject* data, FolderStateTable& states, Selection& selection)
{
    selection = Selection();
    selection.paths = collectPaths(folder, data, GetDriveTypeW);
    selection.stateSummary = summarizeStates(selection.paths, states);
    const ManifestRef manifest = getCurrentManifest();
    summarizeVersions(selection, manifest.get());
}

} // namespace tavi
