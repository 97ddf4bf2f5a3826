#include "Script.h"

#include "common/Text.h"
#include "Controls.h"
#include "Counts.h"

namespace filemanager {
namespace {

using tools::Arguments;
using tools::Commands;
using tools::Failure;
using tools::toNumber;

constexpr DWORD kPollMs = 10;
// After the window is gone, the thread may still wait for input that never comes.
constexpr DWORD kInputMs = 1000;
constexpr std::size_t kAnyNumber = SIZE_MAX;

[[noreturn]] void abandon(const std::wstring& text)
{
    tools::printError(text);
    TerminateProcess(GetCurrentProcess(), 1);
    std::abort();
}

} // namespace

// TITLE is the whole title of a window, or . for the file manager's own, ID the number of a control (the file manager's
// list is 1000), MS a time in milliseconds.
std::vector<tools::Command> Script::commandTable()
{
    using A = const Arguments&;
    return {
        // Selects these items of the folder and no other.
        {L"select", L"[NAME | ...]", 0, kAnyNumber, [this](A a) { onWindow([&] { folder_.select(a); }); }},
        // Prints the menu of the selection, or of the background if there is none, and how long the handlers took.
        {L"menu", L"", 0, 0, [this](A) { onWindow([&] { printMenu(); }); }},
        // Performs the item with this text of that menu.
        {L"invoke", L"TEXT", 1, 1, [this](A a) { onWindow([&] { folder_.invoke(a[0]); }); }},
        // Opens the property page that the class offers for the selection, in a sheet with the title Properties.
        {L"page", L"CLSID", 1, 1, [this](A a) { openPage(a[0]); }},
        {L"wait", L"MS", 1, 1, [this](A a) { pause(toNumber(a[0])); }},
        // Waits until a window with this title can be used.
        {L"wait-window", L"TITLE | MS", 2, 2,
         [this](A a) { waitUntil([&] { return findWindow(a[0], true); }, a[1], L"no window " + a[0]); }},
        {L"wait-closed", L"TITLE | MS", 2, 2,
         [this](A a) { waitUntil([&] { return !findWindow(a[0], false); }, a[1], L"still a window " + a[0]); }},
        // Waits until the text of a control contains TEXT.
        {L"wait-text", L"TITLE | ID | TEXT | MS", 4, 4,
         [this](A a) {
             const HWND target = control(a);
             const auto hasText = [&] { return textOf(target).find(a[2]) != std::wstring::npos; };
             waitUntil(hasText, a[3], L"the text never was " + a[2]);
         }},
        {L"click", L"TITLE | ID", 2, 2, [this](A a) { clickButton(control(a)); }},
        {L"select-row", L"TITLE | ID | ROW", 3, 3, [this](A a) { selectRow(control(a), a[2]); }},
        {L"close-window", L"TITLE", 1, 1, [this](A a) { PostMessageW(window(a[0]), WM_CLOSE, 0, 0); }},
        {L"text", L"TITLE | ID", 2, 2, [this](A a) { tools::print(textOf(control(a))); }},
        {L"dump-list", L"TITLE | ID", 2, 2, [this](A a) { printList(control(a)); }},
        {L"dump-controls", L"TITLE", 1, 1, [this](A a) { printControls(window(a[0])); }},
        // Prints the position on the screen of a control, or of a row of a list.
        {L"where", L"TITLE | ID [| ROW]", 2, 3,
         [this](A a) {
             const POINT point = clickPoint(control(a), a.size() > 2 ? &a[2] : nullptr);
             tools::print(std::to_wstring(point.x) + L" " + std::to_wstring(point.y));
         }},
        // Has counts print how often DLL was unmapped. From then on nothing but unload frees it.
        {L"watch", L"DLL", 1, 1, [this](A a) { watch(a[0]); }},
        // Has COM free unused servers and prints whether DLL is still mapped. With MS it tries until DLL is not, and
        // closes windows with these titles meanwhile.
        {L"unload", L"DLL [| MS [| TITLE ...]]", 1, kAnyNumber, [this](A a) { unload(a); }},
        // Keeps a COM class in use until the process ends.
        {L"hold", L"CLSID", 1, 1, [this](A a) { onWindow([&] { hold(a[0]); }); }},
        {L"counts", L"", 0, 0, [](A) { tools::print(objectCounts()); }},
        // Runs a command until it does not fail.
        {L"retry", L"MS | COMMAND", 2, kAnyNumber, [this](A a) { retry(a); }},
        // Runs a command; if it fails, prints the reason and goes on.
        {L"try", L"COMMAND", 1, kAnyNumber,
         [this](A a) {
             if (const auto failure = failureOf(Commands::join(a, 0)))
                 tools::print(L"not done: " + *failure);
         }},
        // Closes the file manager; with CODE ends the process at once.
        {L"exit", L"[CODE]", 0, 1,
         [this](A a) {
             if (!a.empty())
                 ExitProcess(static_cast<UINT>(toNumber(a[0])));
             ended_ = true;
         }},
    };
}

Script::Script(FolderWindow& window) : folder_(window), owner_(window.handle()), commands_(commandTable())
{
    thread_.reset(CreateThread(nullptr, 0, threadRoutine, this, 0, nullptr));
}

DWORD WINAPI Script::threadRoutine(void* script)
{
    static_cast<Script*>(script)->perform();
    return 0;
}

int Script::finish()
{
    SetEvent(stop_.get());
    if (WaitForSingleObject(thread_.get(), kInputMs) != WAIT_OBJECT_0)
        ExitProcess(failed_ ? 1 : 0);
    return failed_ ? 1 : 0;
}

void Script::perform()
{
    Commands::Step step = Commands::Step::done;
    while (step == Commands::Step::done && !ended_)
        step = commands_.runNext();
    if (step == Commands::Step::endOfInput)
        return;
    failed_ = step == Commands::Step::failed;
    PostMessageW(owner_, WM_CANCELMODE, 0, 0);
    PostMessageW(owner_, WM_CLOSE, 0, 0);
    if (WaitForSingleObject(stop_.get(), kAnswerMs) != WAIT_OBJECT_0)
        abandon(L"the window does not close");
}

void Script::onWindow(const std::function<void()>& action) const
{
    std::optional<Failure> failure;
    const std::function<void()> guarded = [&] {
        try {
            action();
        } catch (const Failure& caught) {
            failure = caught;
        }
    };
    DWORD_PTR answer = 0;
    if (!SendMessageTimeoutW(owner_, FolderWindow::kRunMessage, 0, reinterpret_cast<LPARAM>(&guarded), SMTO_NORMAL,
                             kAnswerMs, &answer)) {
        // The window may still run the action, which is on this stack.
        if (IsWindow(owner_))
            abandon(L"the file manager does not answer");
        failure = Failure{L"the file manager was closed"};
    }
    if (failure)
        throw Failure(*failure);
}

void Script::pause(std::int64_t milliseconds) const
{
    if (WaitForSingleObject(stop_.get(), static_cast<DWORD>(milliseconds)) == WAIT_OBJECT_0)
        throw Failure{L"the file manager was closed"};
}

void Script::waitUntil(const std::function<bool()>& met, const std::wstring& limitMs,
                       const std::wstring& otherwise) const
{
    const DWORD start = GetTickCount();
    while (!met()) {
        if (GetTickCount() - start >= toNumber(limitMs))
            throw Failure{otherwise};
        pause(kPollMs);
    }
}

HWND Script::window(const std::wstring& title) const
{
    const HWND found = title == L"." ? owner_ : findWindow(title, true);
    if (!found)
        throw Failure{L"no window " + title};
    return found;
}

HWND Script::control(const Arguments& arguments) const
{
    return findControl(window(arguments[0]), arguments[1]);
}

void Script::printMenu() const
{
    const ShellMenu menu = folder_.createMenu();
    menu.print();
    tools::print(L"handlers took " + std::to_wstring(menu.handlerMicroseconds()) + L" us");
}

// The property sheet runs a message loop until it is closed. The script waits for the page only.
void Script::openPage(const std::wstring& classId) const
{
    HPROPSHEETPAGE page = nullptr;
    onWindow([&] { page = folder_.createPage(classId); });
    PostMessageW(owner_, FolderWindow::kShowPageMessage, 0, reinterpret_cast<LPARAM>(page));
}

void Script::watch(const std::wstring& library) const
{
    watchUnloads(library);
    // The common dialogs load Wine's printing library, which leaves a mutex behind at each unload of its own.
    LoadLibraryW(L"comdlg32.dll");
    onWindow([this] { folder_.stopFreeing(); });
}

void Script::unload(const Arguments& arguments) const
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
        waitUntil(isGone, arguments[1], library + L" is still mapped");
    tools::print(library + (isGone() ? L" is not mapped" : L" is still mapped"));
}

void Script::hold(const std::wstring& classId)
{
    CLSID id = {};
    ComPtr<IUnknown> factory;
    check(CLSIDFromString(classId.c_str(), &id), L"no class " + classId);
    check(CoGetClassObject(id, CLSCTX_INPROC_SERVER, nullptr, IID_IUnknown,
                           reinterpret_cast<void**>(factory.GetAddressOf())),
          L"no class " + classId);
    held_.push_back(factory);
}

std::optional<std::wstring> Script::failureOf(const std::wstring& line) const
{
    try {
        commands_.run(line);
    } catch (const Failure& failure) {
        return failure.text;
    }
    return std::nullopt;
}

void Script::retry(const Arguments& arguments) const
{
    const std::wstring line = Commands::join(arguments, 1);
    waitUntil([&] { return !failureOf(line); }, arguments[0], L"still failing: " + line);
}

} // namespace filemanager
