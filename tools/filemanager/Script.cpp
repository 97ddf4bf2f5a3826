#include "Script.h"

#include <psapi.h>
#include <shlobj.h>
#include <tlhelp32.h>
#include <winternl.h>

#include <algorithm>
#include <cstdint>
#include <cwchar>

namespace filemanager {
namespace {

constexpr DWORD kAnswerLimit = 60000;
constexpr DWORD kMenuLimit = 5000;
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

void setText(HWND control, const std::wstring& text)
{
    for (const HWND child : children(control))
        control = classOf(child) == L"Edit" ? child : control;
    ask(control, WM_SETTEXT, 0, text.data());
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
           L" KB";
}

struct KeyName {
    const wchar_t* name;
    WORD key;
};
constexpr KeyName kKeys[] = {
    {L"ENTER", VK_RETURN}, {L"ESC", VK_ESCAPE}, {L"TAB", VK_TAB}, {L"BACK", VK_BACK}, {L"UP", VK_UP},
    {L"DOWN", VK_DOWN},    {L"HOME", VK_HOME},  {L"END", VK_END}, {L"F5", VK_F5},     {L"MENU", VK_APPS},
};

} // namespace

const std::vector<Script::Command>& Script::commands()
{
    using S = Script;
    using A = Arguments;
    static const std::vector<Command> table = {
        {L"go", L"PATH", L"opens a folder; without PATH the list of drives", 0, 1,
         [](S& s, const A& a) { s.onWindow([&] { s.folder_.navigate(a.empty() ? L"" : a[0]); }); }},
        {L"open", L"NAME", L"opens a folder of the list", 1, 1,
         [](S& s, const A& a) { s.onWindow([&] { s.folder_.openItem(a[0]); }); }},
        {L"up", L"", L"opens the parent folder", 0, 0, [](S& s, const A&) { s.onWindow([&] { s.folder_.up(); }); }},
        {L"refresh", L"", L"reads the folder again", 0, 0,
         [](S& s, const A&) { s.onWindow([&] { s.folder_.refresh(); }); }},
        {L"select", L"NAME | ...", L"selects these items and no other", 1, SIZE_MAX,
         [](S& s, const A& a) { s.onWindow([&] { s.folder_.select(a); }); }},
        {L"select-all", L"", L"selects every item", 0, 0,
         [](S& s, const A&) { s.onWindow([&] { s.folder_.selectAll(true); }); }},
        {L"select-none", L"", L"selects nothing", 0, 0,
         [](S& s, const A&) { s.onWindow([&] { s.folder_.selectAll(false); }); }},
        {L"menu", L"", L"prints the menu of the selection, or of the background if nothing is selected", 0, 0,
         [](S& s, const A&) { s.onWindow([&] { s.folder_.makeMenu(false); }); }},
        {L"menu-background", L"", L"prints the menu of the folder's background", 0, 0,
         [](S& s, const A&) { s.onWindow([&] { s.folder_.makeMenu(true); }); }},
        {L"show-menu", L"", L"opens the menu on screen and goes on; press ESC closes it", 0, 0,
         [](S& s, const A&) { s.showMenu(); }},
        {L"invoke", L"TEXT", L"invokes the item with this text of the menu of the selection", 1, 1,
         [](S& s, const A& a) { s.onWindow([&] { s.folder_.invoke(false, a[0]); }); }},
        {L"invoke-background", L"TEXT", L"the same of the background's menu", 1, 1,
         [](S& s, const A& a) { s.onWindow([&] { s.folder_.invoke(true, a[0]); }); }},
        {L"press", L"KEY", L"ENTER ESC TAB BACK UP DOWN HOME END F5 MENU: to the open menu or to the focus", 1, 1,
         [](S& s, const A& a) { s.press(a[0]); }},
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
        {L"set-text", L"TITLE | ID | TEXT", L"writes into an edit control, also one inside the named control", 3, 3,
         [](S& s, const A& a) { setText(s.control(a[0], a[1]), a[2]); }},
        {L"browse", L"TITLE | PATH", L"selects a folder in the system's folder browser", 2, 2,
         [](S& s, const A& a) { ask(s.window(a[0]), BFFM_SETSELECTIONW, TRUE, a[1].data()); }},
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
        {L"unload", L"DLL", L"has COM free unused servers and tells whether DLL is still mapped", 1, 1,
         [](S& s, const A& a) {
             s.onWindow([] {
                 CoFreeUnusedLibrariesEx(0, 0);
                 CoFreeUnusedLibrariesEx(0, 0);
             });
             s.output_.line(a[0] + (GetModuleHandleW(a[0].c_str()) ? L" is still mapped" : L" is not mapped"));
         }},
        {L"hold", L"CLSID", L"keeps a COM class at work until the end", 1, 1,
         [](S& s, const A& a) { s.onWindow([&] { s.hold(a[0]); }); }},
        {L"counts", L"", L"prints this process's handles, GDI objects, threads and private memory", 0, 0,
         [](S& s, const A&) { s.output_.line(objectCounts()); }},
        {L"expect", L"TEXT | ...", L"fails unless the command before printed each TEXT", 1, SIZE_MAX,
         [](S& s, const A& a) { s.expect(a, true); }},
        {L"expect-not", L"TEXT | ...", L"fails if the command before printed one of them", 1, SIZE_MAX,
         [](S& s, const A& a) { s.expect(a, false); }},
        {L"repeat", L"N | COMMAND", L"runs a command N times; only the last prints", 2, SIZE_MAX,
         [](S& s, const A& a) { s.repeat(a); }},
        {L"try", L"COMMAND", L"runs a command that may fail, and prints why it did", 1, SIZE_MAX,
         [](S& s, const A& a) { s.tryLine(joined(a, 0)); }},
        {L"exit", L"", L"closes the file manager", 0, 0, [](S& s, const A&) { s.ended_ = true; }},
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

GUITHREADINFO Script::inputState() const
{
    GUITHREADINFO info = {};
    info.cbSize = sizeof info;
    GetGUIThreadInfo(GetWindowThreadProcessId(owner_, nullptr), &info);
    return info;
}

void Script::showMenu()
{
    PostMessageW(owner_, WM_CONTEXTMENU, reinterpret_cast<WPARAM>(GetDlgItem(owner_, listControl)), -1);
    waitUntil([this] { return (inputState().flags & GUI_INMENUMODE) != 0; }, kMenuLimit, L"the menu does not open");
}

void Script::press(const std::wstring& name)
{
    const auto known =
        std::find_if(std::begin(kKeys), std::end(kKeys), [&](const KeyName& key) { return name == key.name; });
    if (known == std::end(kKeys))
        throw Failure{L"unknown key " + name};
    const GUITHREADINFO state = inputState();
    const HWND target = state.hwndMenuOwner ? state.hwndMenuOwner
                        : state.hwndFocus   ? state.hwndFocus
                                            : GetDlgItem(owner_, listControl);
    PostMessageW(target, WM_KEYDOWN, known->key, 1);
    PostMessageW(target, WM_KEYUP, known->key, static_cast<LPARAM>(0xC0000001));
}

void Script::repeat(const Arguments& arguments)
{
    const std::wstring line = joined(arguments, 1);
    for (int count = number(arguments[0]); count > 0; --count) {
        output_.mute(count > 1);
        runLine(line);
    }
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
