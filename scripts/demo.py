"""scripts/demo [--64] [--language LANGUAGE] [--stay]: shows the module from start to end with real mouse and key input.

Installation, menus, dialogs, restores, a copy, the progress window with a service that dies, a cancel, and
the removal. Leaves a picture of each step in build/demo/; fails if a menu, a dialog or a restored file is not as expected.
  --64        shows the 64-bit file manager on a 64-bit Windows; its pictures are in build/x86_64/demo/
  --language  shows the module to a user of that language, for example de, with pictures in build/demo-de/
  --stay      leaves the file manager open afterwards"""
import argparse
import gettext
import os
import re
import shutil
import subprocess
import time

from session import MODULE_CLASS, VERSION, Failure, Session, build, build_of, make, root, run, wait_for, windows_path

# For the worst machine.
LIMIT_S = 120
LIMIT_MS = 1000 * LIMIT_S
DAY_S = 86400
# Of each language: the locale of its user, and how that shows a time.
LANGUAGES = {"en": ("C", "%m/%d/%Y %I:%M %p"), "de": ("de_DE", "%d.%m.%Y %H:%M")}
YES, NO = 6, 7
TODAY = int(time.time()) // DAY_S * DAY_S + DAY_S * 3 // 4
RUNS = [TODAY - days * DAY_S for days in (21, 14, 7)]
# Before which run, how many seconds before it: file, text, lines.
SAVED = ((0, 5400, "Budget.txt", "Budget, first draft", 60),
         (0, 7200, "Letter to Ana.txt", "Dear Ana", 12),
         (0, 9000, "Résumé.txt", "Curriculum vitæ", 40),
         (0, 9600, "Reports/Draft.txt", "Not for publication", 5),
         (0, 8400, "Reports/Quarter 1.txt", "First quarter", 80),
         (0, 4800, "Reports/Quarter 2.txt", "Second quarter", 30),
         (1, 4200, "Budget.txt", "Budget, with the new numbers", 75),
         (1, 6000, "Résumé.txt", "Curriculum vitæ, renewed", 42),
         (2, 3000, "Budget.txt", "Budget, as approved", 90),
         (2, 3600, "Reports/Quarter 2.txt", "Second quarter, complete", 85))
LAKE = "Lake Garda, July 2026"
PHOTOS = [f"{LAKE}/IMG_2026071{photo}_093012_panorama.dng" for photo in range(1, 9)]
FOLDER = r"C:\users\demo\Documents"
UNINSTALL = r"HKLM\Software\Microsoft\Windows\CurrentVersion\Uninstall"

failures = []


def chapter(title):
    print(f"== {title}")


def show(text):
    print("".join(f"    {line}\n" for line in text.splitlines()), end="")


def expect(what, expected, found):
    if found == expected:
        print(f"  as expected: {what}")
    else:
        failures.append(what)
        print(f"  NOT AS EXPECTED: {what}\n    expected:\n{expected}\n    found:\n{found}")


def content(path):
    return (path.read_bytes(), int(path.stat().st_mtime)) if path.exists() else None


class Screen:
    """The X server with its mouse and keys: that of the desktop, or one of its own without a monitor."""

    def __init__(self, session):
        self.session, self.own = session, "DISPLAY" not in os.environ
        if self.own:
            server = session.spawn("screen", *"Xvfb -displayfd 1 -screen 0 1024x768x24 -dpi 96 -nolisten tcp -noreset".split())
            session.environment["DISPLAY"] = ":" + server.await_output(LIMIT_S, r"^(\d+)$")[1]
            # Its exit code is 1 whenever it paints the root window.
            self.tool("display", "-window", "root", "-size", "1024x768", "gradient:#5b7fa3-#2f4a66", check=False)

    def tool(self, *command, check=True):
        result = subprocess.run(command, env=self.session.environment, capture_output=True, timeout=LIMIT_S, check=False)
        if check and result.returncode != 0:
            raise Failure(f"{' '.join(command)}: {result.stderr.decode(errors='replace')}")
        return result

    def picture(self, name, moving=False):
        """Saves a picture. Unless a progress bar moves, two in a row are equal: nothing is drawn any more."""
        prints = [b""]

        def at_rest():
            prints.append(self.tool("import", "-silent", "-window", "root", "png:-").stdout)
            return moving or prints[-1] == prints[-2]
        wait_for(LIMIT_S, "the screen to come to rest", at_rest)
        path = self.session.out / f"{name}.png"
        path.write_bytes(prints[-1])
        print(f"  picture: {path.relative_to(root)}")

    def focus(self, title):
        """Gives the keyboard to a window: without a window manager nothing else does."""
        search = "xdotool", "search", "--onlyvisible", "--name", f"^{title}$", "windowfocus", "--sync"
        wait_for(LIMIT_S, f"the focus of {title}", lambda: self.tool(*search, check=False).returncode == 0)

    def press(self, *keys):
        self.tool("xdotool", "key", "--clearmodifiers", *keys)

    def click(self, place, button=1):
        self.tool("xdotool", "mousemove", *place.split(), "click", str(button))

    def windows(self):
        """Returns the number of visible windows of the file manager, which include its menus."""
        return len(self.tool("xdotool", "search", "--onlyvisible", "--class", "explorer.exe", check=False).stdout.split())


class Demo:
    def __init__(self, session, screen, package, language):
        self.session, self.screen, self.package = session, screen, package
        locale, self.time_format = LANGUAGES[language]
        self.texts = gettext.NullTranslations()
        if language != "en":
            # Without such a locale on this machine, Wine would take names for ASCII.
            locales = build / "locales"
            if not (locales / f"{locale}.UTF-8").exists():
                locales.mkdir(exist_ok=True)
                subprocess.run(["localedef", "-i", locale, "-f", "UTF-8", str(locales / f"{locale}.UTF-8")], check=True)
            session.environment |= {"LOCPATH": str(locales), "TAVISHELL_LOCALE": f"{locale}.UTF-8"}
            with open(session.folder / f"resources/{language}.mo", "rb") as catalogue:
                self.texts = gettext.GNUTranslations(catalogue)
        self.text = self.texts.gettext
        self.dialog, self.progress, self.question = map(self.text, ("Restore Files", "Restoring...", "Tavi Remote Backup"))
        self.documents = session.drive / "users/demo/Documents"
        self.data = session.drive / "ProgramData/Tavi/data"
        self.installed = session.drive / "Program Files/Tavi/tavishell.dll"
        # The content and the time of each file at each run.
        self.versions = []
        self.manager = self.windows = None

    # --- a machine with a backup

    def write(self, moment, name, text, lines):
        path = self.documents / name
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_bytes("".join(f"{text}, line {line}\r\n" for line in range(1, lines + 1)).encode())
        os.utime(path, (moment, moment))

    def prepare(self):
        session = self.session
        if self.installed.parent.exists():
            # An earlier demo ended before its last step.
            shutil.rmtree(session.prefix)
        session.windows("cmd", "/c", "exit", timeout=600)
        if not (session.drive / "windows/Fonts/marlett.ttf").exists():
            session.stop_server()
            # The 32-bit Wine does not look where its package puts them: letters would replace the buttons of a caption.
            shutil.copytree("/usr/share/wine/fonts", session.drive / "windows/Fonts", dirs_exist_ok=True)
        for folder in (session.drive / "users/demo", self.data.parent):
            shutil.rmtree(folder, ignore_errors=True)
        for folder in ("Desktop", f"Documents/{LAKE}"):
            (session.drive / "users/demo" / folder).mkdir(parents=True)
        # On its own screen Wine draws the frames itself; on a desktop the window manager does.
        managed = "N" if self.screen.own else "Y"
        session.windows("reg", "add", r"HKCU\Software\Wine\X11 Driver", "/v", "Managed", "/d", managed, "/f")
        session.service("install", r"C:\ProgramData\Tavi")
        for number, moment in enumerate(RUNS):
            for _, before, *file in (saved for saved in SAVED if saved[0] == number):
                self.write(moment - before, *file)
            if number == 1:
                (self.documents / "Reports/Draft.txt").unlink()
            if number == 2:
                for photo in PHOTOS:
                    (self.documents / photo).write_bytes(os.urandom(5000000))
            session.service("backup", FOLDER, moment)
            self.versions.append({path.relative_to(self.documents).as_posix(): content(path)
                                  for path in self.documents.rglob("*") if path.is_file()})
        # The reason for a restore: a file is spoilt, others are deleted.
        self.write(RUNS[2] + 2 * DAY_S, "Budget.txt", "oops", 1)
        self.write(RUNS[2] + 2 * DAY_S, "Scratch.txt", "Never backed up", 3)
        for name in ("Reports/Quarter 1.txt", *PHOTOS):
            (self.documents / name).unlink()
        self.manager = session.start_manager(FOLDER)
        self.order(f"wait-window {FOLDER} - File Manager")
        self.screen.picture("01-file-manager")
        self.windows = self.screen.windows()

    def check_restored(self, name, target, number):
        expect(f"{target} as of run {number + 1}", True, content(self.documents.parent / target) == self.versions[number][name])

    # --- installation and removal

    def msiexec(self, option):
        return self.session.windows("msiexec", "/qn", option, windows_path(self.package), check=False, timeout=600).returncode

    def listed(self):
        """Returns the entry in the list of programs."""
        entries = self.session.windows("reg", "query", UNINSTALL, "/s", check=False).stdout.split("\n\n")
        return "\n".join(entry.strip() for entry in entries if "Tavi" in entry)

    def install(self):
        expect("the exit code of the installation", 0, self.msiexec("/i"))
        show(self.listed())
        expect("the version in the list of programs", [VERSION], re.findall(r"DisplayVersion\s+REG_SZ\s+(.*)", self.listed()))

    def remove(self):
        # Wine does not delete the file of a module that a program uses, not even at the next start.
        self.order(f"unload tavishell.dll | {LIMIT_MS}")
        expect("the exit code of the removal", 0, self.msiexec("/x"))
        expect("the entry in the list of programs", "", self.listed())
        expect("the class", 1, self.session.windows("reg", "query", rf"HKCR\CLSID\{MODULE_CLASS}", check=False).returncode)
        expect("the folder of the module", False, self.installed.parent.exists())
        self.check_menu("19-menu-after-the-removal", self.place("Budget.txt"))
        self.manager.send("exit")
        expect("the exit code of the file manager", 0, self.manager.wait(LIMIT_S))

    # --- the file manager

    def order(self, command):
        """Sends a command to the file manager; one that waits gets its limit."""
        return self.manager.order(f"{command} | {LIMIT_MS}" if command.startswith("wait-") else command, 2 * LIMIT_S)

    def place(self, name):
        rows = [row[2:].split("\t")[0] for row in self.order("dump-list . | 1000").splitlines()[1:]]
        return self.order(f"where . | 1000 | {rows.index(name)}")

    def click(self, control):
        self.screen.click(self.order(f"where {control}"))

    def shown(self, moment):
        return time.strftime(self.time_format, time.localtime(moment))

    def key(self, text):
        """Returns the key of a button with that English text."""
        return "alt+" + re.search("&(.)", self.text(text))[1].lower()

    def open_menu(self, place, command=""):
        """Opens a menu, highlights the command and returns the menu's lines. The list of backed-up files is read in the background:
        a menu that opens right after the module was loaded lacks the command."""
        def offered():
            start = len(self.manager.output())
            self.screen.click(place, 3)
            menu = self.manager.await_output(LIMIT_S, r"^menu:\n((?:  .*\n)*?  Properties.*)$", start)[1]
            wait_for(LIMIT_S, "the menu on the screen", lambda: self.screen.windows() > self.windows)
            if command not in menu:
                self.close_menu()
            return menu.splitlines() if command in menu else None
        menu = wait_for(LIMIT_S, f"the command {command}", offered)
        if command:
            usable = [line for line in menu if not line.startswith("  ---")]
            self.screen.press(*["Down"] * (1 + next(at for at, line in enumerate(usable) if line.startswith(f"  {command}"))))
        return menu

    def close_menu(self):
        self.screen.press("Escape")
        wait_for(LIMIT_S, "the end of the menu", lambda: self.screen.windows() <= self.windows)

    def check_menu(self, picture, place, command="", help_text="", name=""):
        lines = []
        if command:
            command, help_text = self.text(command), self.text(help_text).replace("%s", name)
            lines = [f'  {command} [bitmap] verb=TaviRestore help="{help_text}"']
        menu = self.open_menu(place, command)
        expect(picture[3:], lines, [line for line in menu if "verb=Tavi" in line])
        self.screen.picture(picture)
        self.close_menu()

    def open_dialog(self, name, command):
        self.open_menu(self.place(name), self.text(command))
        self.screen.press("Return")
        self.await_window(self.dialog)
        show(self.order(f"text {self.dialog} | 1001"))
        show(self.order(f"dump-list {self.dialog} | 1002"))

    def check_rows(self, title, *rows):
        """Compares the rows of the dialog; the last one is selected."""
        rows = "".join(f"\n{'*' if row == rows[-1] else ' '} {row}" for row in rows)
        expect("the dialog's rows", f"  {title}{rows}", self.order(f"dump-list {self.dialog} | 1002"))

    def await_window(self, title):
        self.order(f"wait-window {title}")
        self.screen.focus(title)

    def await_restore(self):
        self.order(f"wait-closed {self.dialog}")
        self.order(f"wait-window {self.progress}")

    def answer(self, button):
        self.await_window(self.question)
        self.click(f"{self.question} | {button}")
        self.await_restore()

    def close_progress(self, picture=None):
        """Closes the progress window while no service runs: the restore stays requested."""
        expect("the progress window", self.text("Waiting to begin restore..."), self.order(f"text {self.progress} | 1010"))
        self.screen.focus(self.progress)
        if picture:
            self.screen.picture(picture)
        self.screen.press(self.key("C&lose"))
        self.order(f"wait-closed {self.progress}")

    def await_progress(self, control, text, picture):
        self.order(f"wait-text {self.progress} | {control} | {text}")
        self.screen.picture(picture, moving=True)

    # --- the chapters

    def menus(self):
        folder, folder_help = "Restore Files in Folder", "Restore files in %s from the Tavi servers."
        self.check_menu("02-menu-of-a-file", self.place("Budget.txt"), "Restore Previous Version",
                        "Restore an older version of %s from the Tavi servers.", "Budget.txt")
        self.check_menu("03-menu-of-a-new-file", self.place("Scratch.txt"))
        self.screen.click(self.place("Budget.txt"))
        self.screen.tool("xdotool", "keydown", "ctrl")
        self.screen.click(self.place("Résumé.txt"))
        self.screen.tool("xdotool", "keyup", "ctrl")
        self.check_menu("04-menu-of-two-files", self.place("Résumé.txt"), "Restore Previous Versions",
                        "Restore older versions of the selected files.")
        self.check_menu("05-menu-of-a-folder", self.place("Reports"), folder, folder_help, "Reports")
        self.check_menu("06-menu-of-the-background", self.order("where . | 1000"), folder, folder_help, "Documents")

    def requests(self):
        times = [self.shown(moment) for moment in RUNS]
        chapter("one file, restored in place")
        self.open_dialog("Budget.txt", "Restore Previous Version")
        versions = [files["Budget.txt"] for files in self.versions]
        self.check_rows("\t".join(map(self.text, ("Backup Time", "Modified Time", "File Size"))),
                        *(f"{at}\t{self.shown(modified)}\t{len(data) / 1024:.1f} {self.text('KB')}"
                          for at, (data, modified) in zip(times, versions)))
        self.screen.picture("07-versions-of-a-file")
        self.click(f"{self.dialog} | 1002 | 1")
        self.click(f"{self.dialog} | 1003")
        self.await_window(self.question)
        self.screen.picture("08-question")
        self.answer(YES)
        self.close_progress("09-waiting")

        chapter("one file, copied elsewhere")
        self.open_dialog("Résumé.txt", "Restore Previous Version")
        self.click(f"{self.dialog} | 1002 | 0")
        self.screen.press(self.key("&Copy To..."))
        self.await_window(self.text("Restore File As"))
        self.screen.press("ctrl+a")
        self.screen.tool("xdotool", "type", "--clearmodifiers", r"C:\users\demo\Desktop\Resume of last month.txt")
        self.screen.picture("10-copy-to")
        self.screen.press("Return")
        self.await_restore()
        self.close_progress()

        chapter("a folder, restored as it was at the first run")
        self.open_dialog("Reports", "Restore Files in Folder")
        self.check_rows(self.text("Backup Time"), *times)
        self.screen.press("Home")
        self.screen.picture("11-versions-of-a-folder")
        self.screen.press(self.key("&Restore"))
        self.answer(NO)
        self.close_progress()

    def request_photos(self):
        self.open_dialog(LAKE, "Restore Files in Folder")
        self.screen.press(self.key("&Restore"))
        self.answer(YES)

    def photos(self):
        return [photo for photo in PHOTOS if (self.documents / photo).exists()]

    def restores(self):
        chapter("the service starts to work")
        service = self.session.start_service()
        service.order(f"wait-idle {LIMIT_S}")
        show(service.output())
        service.order("stop")
        for name, target, number in (("Budget.txt", "Documents/Budget.txt", 1),
                                     ("Résumé.txt", "Desktop/Resume of last month.txt", 0),
                                     ("Reports/Draft.txt", "Documents/Reports/Draft.txt", 0),
                                     ("Reports/Quarter 1.txt", "Documents/Reports/Quarter 1.txt", 0),
                                     ("Reports/Quarter 2.txt", "Documents/Reports/Quarter 2 (1).txt", 0),
                                     ("Reports/Quarter 2.txt", "Documents/Reports/Quarter 2.txt", 2)):
            self.check_restored(name, target, number)

        chapter("a large restore")
        service = self.session.start_service(1000000, 15000)
        self.request_photos()
        self.await_progress(1010, self.text("Finding file on server..."), "12-search")
        self.await_progress(1013, f"{self.text('Mb')}/s", "13-speed")
        self.await_progress(1011, self.texts.ngettext("%lu second", "%lu seconds", 2).split()[1], "14-time-left")
        service.order("rate 0")
        self.order(f"wait-closed {self.progress}")
        for photo in PHOTOS:
            self.check_restored(photo, f"Documents/{photo}", 2)
            (self.documents / photo).unlink()

        chapter("a service that dies and comes back, and a cancel")
        service.order("rate 4000000")
        self.request_photos()
        wait_for(LIMIT_S, "the first photo", self.photos)
        service.order("rate 1")
        service.kill()
        self.await_progress(1013, f"0.0 {self.text('b')}/s", "15-service-gone")
        service = self.session.start_service(0, 1000 * LIMIT_S)
        self.await_progress(1010, self.text("Finding file on server..."), "16-service-back")
        self.click(f"{self.progress} | 2")
        self.order(f"wait-closed {self.progress}")
        service.await_output(LIMIT_S, "^restore [0-9]*: cancelled")
        expect("some photos are there, some are not", True, 0 < len(self.photos()) < len(PHOTOS))
        for photo in self.photos():
            self.check_restored(photo, f"Documents/{photo}", 2)
        self.screen.picture("17-cancelled")
        service.order("stop")

    def property_page(self):
        # The shell does not ask the module for it; the file manager calls the page's table directly.
        self.order("select Budget.txt")
        # COM may have unloaded the module, and so its list of backed-up files.
        self.order(f"retry {LIMIT_MS} | page {MODULE_CLASS}")
        self.await_window("Properties")
        self.screen.picture("18-property-page")
        self.screen.press("Escape")
        self.order("wait-closed Properties")

    def play(self):
        chapter("a machine with a backup")
        self.prepare()
        chapter("the installation, beside the open file manager")
        self.install()
        chapter("menus")
        self.menus()
        self.requests()
        self.restores()
        chapter("the same versions as a page of a property sheet")
        self.property_page()
        expect("nothing in the file manager's errors", "", self.manager.errors())
        expect("nothing in the module's log", "", (self.data / "tavi.log").read_text(encoding="utf-8"))

    def stay(self):
        self.session.start_service()
        if self.screen.own:
            print(f"The windows are on display {self.session.environment['DISPLAY']}, which has no monitor.")
        print("Close the file manager or press Ctrl-C here to end.")
        self.manager.process.wait()


def main():
    parser = argparse.ArgumentParser(usage="scripts/demo [--64] [--language LANGUAGE] [--stay]")
    parser.add_argument("--64", dest="arch", action="store_const", const="x86_64", default="i686")
    parser.add_argument("--language", choices=LANGUAGES, default="en")
    parser.add_argument("--stay", action="store_true")
    options = parser.parse_args()
    word_size = {"i686": "x86", "x86_64": "x64"}[options.arch]

    chapter("the build")
    make(options.arch, "build", "tavishell", "filemanager")
    make("i686", "build", "taviservice")
    make("", "package", word_size)
    os.environ["TAVISHELL_SCREEN"] = "1"
    folder = build_of(options.arch)
    name = "demo" if options.language == "en" else f"demo-{options.language}"
    with Session(folder / f"{name}-prefix", folder / name, options.arch) as session:
        screen = Screen(session)
        demo = Demo(session, screen, build / f"tavishell-{VERSION}-{word_size}.msi", options.language)
        try:
            demo.play()
            if options.stay:
                demo.stay()
            else:
                chapter("the removal, beside the open file manager")
                demo.remove()
        except (Failure, subprocess.SubprocessError):
            screen.picture("failed", moving=True)
            raise
    if failures:
        raise Failure(f"not as expected: {len(failures)} of the above")
    print(f"everything was as expected; the pictures are in {session.out.relative_to(root)}/")


run(main)
