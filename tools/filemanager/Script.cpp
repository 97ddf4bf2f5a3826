#include "Script.h"

#include <psapi.h>
#include <shlobj.h>
#include <tlhelp32.h>
#include <winternl.h>

#include <algorithm>
#include <atomic>
#include <cstdint>
#include <cwchar>

namespace filemanager {
namespace {

constexpr DWORD kAnswerLimit = 60000;
constexpr DWORD kPollMilliseconds = 10;

std::wstring trimmed(const std::wstring& text)
{
    const auto first = text.find_first_not_of(L" \t\r");
    return first == std::wstring::npos ? L"" : text.substr(first, text.find_last_not_of(L" \t\r") - first + 1);
}

std::vector<std::wstring> split(const std::wstring& text, wchar_t separator)
{
    std::vector<std::wstring> parts;
    for (std::size_t at = 0; at <= text.size();) {
        const std::size_t end = std::min(text.find(separator, at), text.size());
        parts.push_back(trimmed(text.substr(at, end - at)));
        at = end + 1;
    }
    return parts;
}

// The words from `first` on as the one command that they were.
std::wstring joined(const std::vector<std::wstring>& words, std::size_t first)
{
    std::wstring line = words[first];
    for (std::size_t at = first + 1; at < words.size(); ++at)
        line += L" | " + words[at];
    return line;
}

int number(const std::wstring& text)
{
    wchar_t* end = nullptr;
    const long value = std::wcstol(text.c_str(), &end, 10);
    if (text.empty() || *end)
        throw Failure{text + L" is not a number"};
    return static_cast<int>(value);
}

DWORD milliseconds(const std::wstring& text)
{
    return static_cast<DWORD>(std::max(0, number(text)));
}

DWORD_PTR ask(HWND target, UINT message, WPARAM wParam = 0, LPARAM lParam = 0)
{
    DWORD_PTR answer = 0;
    if (!SendMessageTimeoutW(target, message, wParam, lParam, SMTO_NORMAL, kAnswerLimit, &answer))
        throw Failure{L"the window is gone or does not answer"};
    return answer;
}

template <class Struct>
DWORD_PTR ask(HWND target, UINT message, WPARAM wParam, Struct* argument)
{
    return ask(target, message, wParam, reinterpret_cast<LPARAM>(argument));
}

std::wstring textOf(HWND target)
{
    std::wstring text(ask(target, WM_GETTEXTLENGTH) + 1, L'\0');
    text.resize(ask(target, WM_GETTEXT, text.size(), text.data()));
    return text.compare(0, 1, L"\xFFFF") == 0 ? L"" : text; // an icon's resource number
}

std::wstring titleOf(HWND target)
{
    wchar_t title[256] = L"";
    InternalGetWindowText(target, title, 256);
    return title;
}

std::wstring classOf(HWND target)
{
    wchar_t name[64] = L"";
    GetClassNameW(target, name, 64);
    return name;
}

BOOL CALLBACK collect(HWND found, LPARAM list)
{
    reinterpret_cast<std::vector<HWND>*>(list)->push_back(found);
    return TRUE;
}

std::vector<HWND> children(HWND parent)
{
    std::vector<HWND> found;
    EnumChildWindows(parent, collect, reinterpret_cast<LPARAM>(&found));
    return found;
}

std::vector<HWND> openWindows()
{
    std::vector<HWND> found;
    EnumWindows(collect, reinterpret_cast<LPARAM>(&found));
    const auto foreign = [](HWND target) {
        DWORD process = 0;
        GetWindowThreadProcessId(target, &process);
        return process != GetCurrentProcessId() || !IsWindowVisible(target);
    };
    found.erase(std::remove_if(found.begin(), found.end(), foreign), found.end());
    return found;
}

// Of windows with one title the one that a user could work with: a dialog is disabled while it has a box open.
HWND findWindow(const std::wstring& title, bool enabled)
{
    const auto found = openWindows();
    const auto match = std::find_if(found.begin(), found.end(), [&](HWND target) {
        return titleOf(target) == title && (!enabled || IsWindowEnabled(target));
    });
    return match == found.end() ? nullptr : *match;
}

void clickButton(HWND button)
{
    if (!IsWindowEnabled(button))
        throw Failure{L"the button is disabled"};
    // Sent, it would return only when a box that it opens is closed again.
    PostMessageW(button, BM_CLICK, 0, 0);
}

void selectRow(HWND list, int row)
{
    const auto rows = static_cast<int>(ask(list, LVM_GETITEMCOUNT));
    row += row < 0 ? rows : 0;
    if (row < 0 || row >= rows)
        throw Failure{L"the list has " + std::to_wstring(rows) + L" rows"};
    LVITEMW item = {};
    item.stateMask = LVIS_SELECTED | LVIS_FOCUSED;
    ask(list, LVM_SETITEMSTATE, static_cast<WPARAM>(-1), &item);
    item.state = item.stateMask;
    ask(list, LVM_SETITEMSTATE, static_cast<WPARAM>(row), &item);
}

// The point that a mouse would press: the middle of a control, or the beginning of a row of a list.
POINT pressPoint(HWND target, const std::wstring* row)
{
    RECT box = {};
    if (!row) {
        GetClientRect(target, &box);
    } else {
        box.left = LVIR_LABEL;
        if (!ask(target, LVM_GETITEMRECT, static_cast<WPARAM>(number(*row)), &box))
            throw Failure{L"the list has no row " + *row};
        box.right = std::min(box.right, box.left + 40);
    }
    POINT point = {(box.left + box.right) / 2, (box.top + box.bottom) / 2};
    ClientToScreen(target, &point);
    return point;
}

void dumpList(HWND list, Output& output)
{
    wchar_t text[512] = L"";
    const auto header = reinterpret_cast<HWND>(ask(list, LVM_GETHEADER));
    const auto columns = static_cast<int>(ask(header, HDM_GETITEMCOUNT));
    std::wstring line = L" ";
    for (int at = 0; at < columns; ++at) {
        HDITEMW column = {};
        column.mask = HDI_TEXT;
        column.pszText = text;
        column.cchTextMax = 512;
        ask(header, HDM_GETITEMW, static_cast<WPARAM>(at), &column);
        line += (at ? L"\t" : L" ") + std::wstring(text);
    }
    output.line(line);
    const WPARAM rows = ask(list, LVM_GETITEMCOUNT);
    for (WPARAM row = 0; row < rows; ++row) {
        line = (ask(list, LVM_GETITEMSTATE, row, LVIS_SELECTED) & LVIS_SELECTED) ? L"*" : L" ";
        for (int at = 0; at < columns; ++at) {
            LVITEMW cell = {};
            cell.iSubItem = at;
            cell.pszText = text;
            cell.cchTextMax = 512;
            text[0] = L'\0';
            ask(list, LVM_GETITEMTEXTW, row, &cell);
            line += (at ? L"\t" : L" ") + std::wstring(text);
        }
        output.line(line);
    }
}

void dumpControls(HWND dialog, Output& output)
{
    for (const HWND child : children(dialog)) {
        if (IsWindowVisible(child))
            output.line(std::to_wstring(static_cast<WORD>(GetDlgCtrlID(child))) + L"\t" + classOf(child) + L"\t" +
                        textOf(child) + (IsWindowEnabled(child) ? L"" : L" [disabled]"));
    }
}

// Wine 8 answers 0 to GetGuiResources, but keeps the table of this process's GDI objects where the system keeps its
// own.
std::size_t wineGdiObjects()
{
    struct Entry {
        std::uint64_t object;
        DWORD owner;
        WORD unique;
        BYTE type;
        BYTE flags;
        std::uint64_t user;
    };
    constexpr std::size_t kTableOfPeb = sizeof(void*) == 4 ? 0x94 : 0xF8;
    PROCESS_BASIC_INFORMATION process = {};
    NtQueryInformationProcess(GetCurrentProcess(), ProcessBasicInformation, &process, sizeof process, nullptr);
    const auto peb = reinterpret_cast<const BYTE*>(process.PebBaseAddress);
    const auto table = *reinterpret_cast<const Entry* const*>(peb + kTableOfPeb);
    MEMORY_BASIC_INFORMATION memory = {};
    if (!table || !VirtualQuery(table, &memory, sizeof memory))
        return 0;
    return static_cast<std::size_t>(std::count_if(table, table + memory.RegionSize / sizeof(Entry),
                                                  [](const Entry& entry) { return entry.type != 0; }));
}

// Wine 8 does not count handles either; every value that can be one is tried there.
DWORD handleCount()
{
    DWORD count = 0;
    GetProcessHandleCount(GetCurrentProcess(), &count);
    for (ULONG_PTR value = count ? 0x10000 : 4; value < 0x10000; value += 4) {
        DWORD flags = 0;
        count += GetHandleInformation(reinterpret_cast<HANDLE>(value), &flags) ? 1u : 0u;
    }
    return count;
}

std::wstring watchedLibrary;
std::atomic<int> timesUnmapped{0};

struct LibraryNotice {
    ULONG flags;
    const UNICODE_STRING* path;
    const UNICODE_STRING* name;
};

// Called by the loader, under its lock.
void CALLBACK noteLibrary(ULONG reason, const LibraryNotice* notice, void*)
{
    constexpr ULONG kUnmapped = 2;
    timesUnmapped += reason == kUnmapped && lstrcmpiW(notice->name->Buffer, watchedLibrary.c_str()) == 0;
}

std::wstring objectCounts()
{
    const std::size_t gdi = GetGuiResources(GetCurrentProcess(), GR_GDIOBJECTS);
    const DWORD handles = handleCount();
    int threads = 0;
    const HANDLE snapshot = CreateToolhelp32Snapshot(TH32CS_SNAPTHREAD, 0);
    THREADENTRY32 entry = {};
    entry.dwSize = sizeof entry;
    for (BOOL more = Thread32First(snapshot, &entry); more; more = Thread32Next(snapshot, &entry))
        threads += entry.th32OwnerProcessID == GetCurrentProcessId();
    CloseHandle(snapshot);
    PROCESS_MEMORY_COUNTERS memory = {};
    GetProcessMemoryInfo(GetCurrentProcess(), &memory, sizeof memory);
    return L"handles " + std::to_wstring(handles) + L", gdi " + std::to_wstring(gdi ? gdi : wineGdiObjects()) +
           L", threads " + std::to_wstring(threads) + L", memory " + std::to_wstring(memory.PagefileUsage / 1024) +
           L" KB, unloads " + std::to_wstring(timesUnmapped.load());
}

} // namespace

const std::vector<Script::Command>& Script::commands()
{
    using S = Script;
    using A = Arguments;
    static const std::vector<Command> table = {
        {L"go", L"PATH", L"opens a folder; without PATH the list of drives", 0, 1,
         [](S& s, const A& a) { s.onWindow([&] { s.folder_.navigate(a.empty() ? L"" : a[0]); }); }},
        {L"select", L"NAME | ...", L"selects these items and no other", 1, SIZE_MAX,
         [](S& s, const A& a) { s.onWindow([&] { s.folder_.select(a); }); }},
        {L"select-all", L"", L"selects every item", 0, 0,
         [](S& s, const A&) { s.onWindow([&] { s.folder_.selectAll(true); }); }},
        {L"select-none", L"", L"selects nothing", 0, 0,
         [](S& s, const A&) { s.onWindow([&] { s.folder_.selectAll(false); }); }},
        {L"menu", L"", L"prints the menu of the selection, or of the background, and how long the handlers took", 0, 0,
         [](S& s, const A&) { s.menu(); }},
        {L"menu-background", L"", L"prints the menu of the folder's background", 0, 0,
         [](S& s, const A&) { s.onWindow([&] { s.folder_.makeMenu(true); }); }},
        {L"invoke", L"TEXT", L"invokes the item with this text of the menu of the selection", 1, 1,
         [](S& s, const A& a) { s.onWindow([&] { s.folder_.invoke(false, a[0]); }); }},
        {L"wait", L"MS", L"waits", 1, 1, [](S& s, const A& a) { s.pause(milliseconds(a[0])); }},
        {L"wait-window", L"TITLE | MS", L"waits until a window with this title can be used", 2, 2,
         [](S& s, const A& a) {
             s.waitUntil([&] { return findWindow(a[0], true) != nullptr; }, milliseconds(a[1]), L"no window " + a[0]);
         }},
        {L"wait-closed", L"TITLE | MS", L"waits until no window has this title", 2, 2,
         [](S& s, const A& a) {
             s.waitUntil([&] { return findWindow(a[0], false) == nullptr; }, milliseconds(a[1]),
                         L"still a window " + a[0]);
         }},
        {L"wait-text", L"TITLE | ID | TEXT | MS", L"waits until a control's text contains TEXT", 4, 4,
         [](S& s, const A& a) {
             const HWND target = s.control(a[0], a[1]);
             s.waitUntil([&] { return textOf(target).find(a[2]) != std::wstring::npos; }, milliseconds(a[3]),
                         L"the text never was " + a[2]);
         }},
        {L"click", L"TITLE | ID", L"presses a button", 2, 2,
         [](S& s, const A& a) { clickButton(s.control(a[0], a[1])); }},
        {L"select-row", L"TITLE | ID | ROW", L"selects a row of a list, from 0; -1 is the last", 3, 3,
         [](S& s, const A& a) { selectRow(s.control(a[0], a[1]), number(a[2])); }},
        {L"close-window", L"TITLE", L"closes a window", 1, 1,
         [](S& s, const A& a) { PostMessageW(s.window(a[0]), WM_CLOSE, 0, 0); }},
        {L"text", L"TITLE | ID", L"prints a control's text", 2, 2,
         [](S& s, const A& a) { s.output_.line(textOf(s.control(a[0], a[1]))); }},
        {L"dump-list", L"TITLE | ID", L"prints the rows of a list, cells parted by tabs, selected ones marked *", 2, 2,
         [](S& s, const A& a) { dumpList(s.control(a[0], a[1]), s.output_); }},
        {L"dump-controls", L"TITLE", L"prints the visible controls of a window", 1, 1,
         [](S& s, const A& a) { dumpControls(s.window(a[0]), s.output_); }},
        {L"where", L"TITLE | ID | ROW", L"prints the screen position of a control, or of a row of a list", 2, 3,
         [](S& s, const A& a) {
             const POINT point = pressPoint(s.control(a[0], a[1]), a.size() > 2 ? &a[2] : nullptr);
             s.output_.line(std::to_wstring(point.x) + L" " + std::to_wstring(point.y));
         }},
        {L"windows", L"", L"prints the titles of the open windows", 0, 0,
         [](S& s, const A&) {
             for (const HWND target : openWindows())
                 s.output_.line(titleOf(target) + (IsWindowEnabled(target) ? L"" : L" [disabled]"));
         }},
        {L"page", L"CLSID", L"opens the property page that this class has for the selection, in a sheet named Page", 1,
         1, [](S& s, const A& a) { s.openPage(a[0]); }},
        {L"watch", L"DLL", L"has counts print how often DLL was unmapped; from then on nothing but unload frees it", 1,
         1, [](S& s, const A& a) { s.watch(a[0]); }},
        {L"unload", L"DLL [| MS [| TITLE ...]]",
         L"has COM free unused servers and prints whether DLL is still mapped; with MS tries until it is not, and "
         L"closes "
         L"windows with these titles meanwhile",
         1, SIZE_MAX, [](S& s, const A& a) { s.unload(a); }},
        {L"hold", L"CLSID", L"keeps a COM class at work until the end", 1, 1,
         [](S& s, const A& a) { s.onWindow([&] { s.hold(a[0]); }); }},
        {L"counts", L"", L"prints this process's handles, GDI objects, threads, private memory and unloads", 0, 0,
         [](S& s, const A&) { s.output_.line(objectCounts()); }},
        {L"expect", L"TEXT | ...", L"fails unless the command before printed each TEXT", 1, SIZE_MAX,
         [](S& s, const A& a) { s.expect(a, true); }},
        {L"expect-not", L"TEXT | ...", L"fails if the command before printed one of them", 1, SIZE_MAX,
         [](S& s, const A& a) { s.expect(a, false); }},
        {L"repeat", L"N | COMMAND", L"runs a command N times; only the last prints", 2, SIZE_MAX,
         [](S& s, const A& a) { s.repeat(a); }},
        {L"retry", L"MS | COMMAND", L"runs a command until it does not fail", 2, SIZE_MAX,
         [](S& s, const A& a) { s.retry(a); }},
        {L"try", L"COMMAND", L"runs a command that may fail, and prints why it did", 1, SIZE_MAX,
         [](S& s, const A& a) { s.tryLine(joined(a, 0)); }},
        {L"exit", L"[CODE]", L"closes the file manager; with CODE ends the process at once", 0, 1,
         [](S& s, const A& a) {
             if (!a.empty())
                 ExitProcess(static_cast<UINT>(number(a[0])));
             s.ended_ = true;
         }},
    };
    return table;
}

std::wstring Script::commandsHelp()
{
    std::wstring help;
    for (const Command& command : commands()) {
        std::wstring usage = std::wstring(L"  ") + command.name + L" " + command.arguments;
        usage.resize(std::max<std::size_t>(usage.size() + 2, 39), L' ');
        help += usage + command.help + L"\n";
    }
    return help;
}

Script::Script(FolderWindow& window, Output& output, std::wstring text)
    : folder_(window), owner_(window.handle()), output_(output), text_(std::move(text)),
      stop_(CreateEventW(nullptr, TRUE, FALSE, nullptr))
{
}

Script::~Script()
{
    for (IUnknown* const factory : held_)
        factory->Release();
    if (thread_)
        CloseHandle(thread_);
    CloseHandle(stop_);
}

void Script::start()
{
    thread_ = CreateThread(nullptr, 0, threadBody, this, 0, nullptr);
    if (!thread_)
        throw Failure{L"cannot start the script"};
}

int Script::finish()
{
    SetEvent(stop_);
    if (WaitForSingleObject(thread_, kAnswerLimit) != WAIT_OBJECT_0)
        ExitProcess(1);
    return failed_ ? 1 : 0;
}

DWORD WINAPI Script::threadBody(void* script)
{
    static_cast<Script*>(script)->play();
    return 0;
}

void Script::play()
{
    try {
        for (const std::wstring& line : split(text_, L'\n')) {
            ++lineNumber_;
            if (line.empty() || line[0] == L'#')
                continue;
            // The echo of a command is none of the output that the next one may ask about.
            output_.stopRecord();
            output_.line(L"> " + line);
            runLine(line);
            if (ended_)
                break;
        }
    } catch (const Failure& failure) {
        fail(failure.text);
    }
    if (!ended_)
        return;
    PostMessageW(owner_, WM_CANCELMODE, 0, 0);
    PostMessageW(owner_, WM_CLOSE, 0, 0);
    if (WaitForSingleObject(stop_, kAnswerLimit) != WAIT_OBJECT_0)
        abandon(L"the window does not close");
}

void Script::fail(const std::wstring& text)
{
    output_.error(L"line " + std::to_wstring(lineNumber_) + L": " + text);
    failed_ = ended_ = true;
}

// A window that hangs in a handler must not keep the process for ever.
void Script::abandon(const std::wstring& text)
{
    fail(text);
    TerminateProcess(GetCurrentProcess(), 1);
}

void Script::runLine(const std::wstring& line)
{
    const std::size_t space = std::min(line.find(L' '), line.size());
    const std::wstring name = line.substr(0, space);
    const std::wstring rest = trimmed(line.substr(space));
    const Arguments arguments = rest.empty() ? Arguments{} : split(rest, L'|');
    const auto command =
        std::find_if(commands().begin(), commands().end(), [&](const Command& known) { return name == known.name; });
    if (command == commands().end())
        throw Failure{L"unknown command " + name};
    if (arguments.size() < command->fewest || arguments.size() > command->most)
        throw Failure{std::wstring(L"usage: ") + command->name + L" " + command->arguments};
    if (name.compare(0, 6, L"expect") != 0)
        output_.startRecord();
    command->run(*this, arguments);
}

void Script::onWindow(const std::function<void()>& action)
{
    std::wstring failure;
    std::function<void()> guarded = [&] {
        try {
            action();
        } catch (const Failure& caught) {
            failure = caught.text;
        }
    };
    DWORD_PTR answer = 0;
    if (!SendMessageTimeoutW(owner_, FolderWindow::kRunMessage, 0, reinterpret_cast<LPARAM>(&guarded), SMTO_NORMAL,
                             kAnswerLimit, &answer)) {
        if (IsWindow(owner_))
            abandon(L"the file manager does not answer");
        failure = L"the file manager was closed";
    }
    if (!failure.empty())
        throw Failure{failure};
}

void Script::pause(DWORD duration)
{
    if (WaitForSingleObject(stop_, duration) == WAIT_OBJECT_0)
        throw Failure{L"the file manager was closed"};
}

void Script::waitUntil(const std::function<bool()>& met, DWORD limit, const std::wstring& otherwise)
{
    const DWORD start = GetTickCount();
    while (!met()) {
        if (GetTickCount() - start >= limit)
            throw Failure{otherwise};
        pause(kPollMilliseconds);
    }
}

HWND Script::window(const std::wstring& title) const
{
    const HWND found = title == L"." ? owner_ : findWindow(title, true);
    if (!found)
        throw Failure{L"no window " + title};
    return found;
}

HWND Script::control(const std::wstring& title, const std::wstring& id) const
{
    const HWND parent = window(title);
    auto found = children(parent);
    // Controls inside controls may repeat a dialog's numbers; its own come first.
    std::stable_partition(found.begin(), found.end(), [parent](HWND child) { return GetParent(child) == parent; });
    const auto match = std::find_if(found.begin(), found.end(), [wanted = static_cast<WORD>(number(id))](HWND child) {
        return static_cast<WORD>(GetDlgCtrlID(child)) == wanted;
    });
    if (match != found.end())
        return *match;
    throw Failure{L"no control " + id + L" in " + title};
}

void Script::repeat(const Arguments& arguments)
{
    const std::wstring line = joined(arguments, 1);
    for (int count = number(arguments[0]); count > 0; --count) {
        output_.mute(count > 1);
        runLine(line);
    }
}

// Times the handlers alone, without the printing.
void Script::menu()
{
    onWindow([this] {
        const auto menu = folder_.makeMenu(false);
        output_.line(L"handlers took " + std::to_wstring(menu->handlerMicroseconds()) + L" us");
    });
}

// The sheet runs a loop of its own: only the page is made while the script waits.
void Script::openPage(const std::wstring& classId)
{
    HPROPSHEETPAGE page = nullptr;
    onWindow([&] { page = folder_.makePage(classId); });
    auto* const action = new std::function<void()>([this, page] { folder_.showPage(page); });
    PostMessageW(owner_, FolderWindow::kRunMessage, TRUE, reinterpret_cast<LPARAM>(action));
}

void Script::watch(const std::wstring& library)
{
    using Register = LONG(NTAPI*)(ULONG, decltype(&noteLibrary), void*, void**);
    const auto address =
        reinterpret_cast<void*>(GetProcAddress(GetModuleHandleW(L"ntdll.dll"), "LdrRegisterDllNotification"));
    void* cookie = nullptr;
    watchedLibrary = library;
    if (!address || reinterpret_cast<Register>(address)(0, noteLibrary, nullptr, &cookie) != 0)
        throw Failure{L"the loader does not report libraries"};
    // Wine's printing library, which the common dialogs bring, leaves a mutex behind at each of its own unloads.
    LoadLibraryW(L"comdlg32.dll");
    onWindow([this] { folder_.stopFreeing(); });
}

void Script::unload(const Arguments& arguments)
{
    const std::wstring& library = arguments[0];
    const auto isGone = [&] {
        for (std::size_t at = 2; at < arguments.size(); ++at) {
            if (const HWND late = findWindow(arguments[at], true))
                PostMessageW(late, WM_CLOSE, 0, 0);
        }
        onWindow([] {
            CoFreeUnusedLibrariesEx(0, 0);
            CoFreeUnusedLibrariesEx(0, 0);
        });
        return GetModuleHandleW(library.c_str()) == nullptr;
    };
    if (arguments.size() > 1)
        waitUntil(isGone, milliseconds(arguments[1]), library + L" is still mapped");
    output_.line(library + (isGone() ? L" is not mapped" : L" is still mapped"));
}

void Script::hold(const std::wstring& classId)
{
    CLSID id = {};
    IUnknown* factory = nullptr;
    HRESULT result = CLSIDFromString(classId.c_str(), &id);
    if (SUCCEEDED(result))
        result = CoGetClassObject(id, CLSCTX_INPROC_SERVER, nullptr, IID_IUnknown, reinterpret_cast<void**>(&factory));
    if (FAILED(result))
        throw Failure{L"no class " + classId + L": " + hexCode(result)};
    held_.push_back(factory);
}

void Script::retry(const Arguments& arguments)
{
    std::wstring failure;
    const auto succeeds = [&] {
        try {
            output_.mute(!failure.empty());
            runLine(joined(arguments, 1));
            failure.clear();
        } catch (const Failure& caught) {
            failure = caught.text;
        }
        output_.mute(false);
        return failure.empty();
    };
    waitUntil(succeeds, milliseconds(arguments[0]), L"still failing: " + joined(arguments, 1));
}

void Script::tryLine(const std::wstring& line)
{
    try {
        runLine(line);
    } catch (const Failure& failure) {
        output_.line(L"failed: " + failure.text);
    }
}

void Script::expect(const Arguments& texts, bool present)
{
    for (const std::wstring& text : texts) {
        if ((output_.record().find(text) != std::wstring::npos) != present)
            throw Failure{(present ? L"expected: " : L"not expected: ") + text};
    }
}

} // namespace filemanager
