"""Long runs: scripts/endure [KIND...] [--minutes N | --rounds N] [--short] [--seed N]; without KIND all of them.

  service  runs restores while a hostile service sends garbage to the module (10 minutes)
  unload   loads and unloads the module at random moments, and ends its host with everything open (1,000 rounds)
  kill     kills the host while it writes a large restore request, and starts it again (200 rounds)
  menus    opens menus of changing selections while the manifest is reloaded again and again (10,000 menus)
  fuzz     runs each fuzzer over its corpus, then on new inputs (3 minutes each)

Prints a table of figures and their bounds; fails when a figure is out of bounds. --short runs every kind for less than a minute."""
import argparse
import collections
import contextlib
import itertools
import operator
import os
import random
import re
import resource
import shutil
import sqlite3
import subprocess
import time

from session import MODULE_CLASS, Failure, Session, build, build_of, make, root, run, wait_for

ARCH = os.environ.get("TAVISHELL_ARCH") or "i686"
# A click that reached a dialog at its end leaves windows open: close them.
UNLOAD = "unload tavishell.dll | 60000 | Restore Files | Restoring... | Properties"
COUNTS = re.compile(r"^handles (\d+), gdi (\d+), threads (\d+), memory (\d+) KB, unloads (\d+)$", re.M)


def positive(text):
    if not re.fullmatch("[1-9][0-9]{0,5}", text):
        raise argparse.ArgumentTypeError(f"not a number from 1 to 999999: {text}")
    return int(text)


def samples(host):
    """Returns the minimum of three counts in a row each: a thread that starts, or a pipe that is opened, is no growth."""
    counts = [[int(number) for number in line[:4]] for line in COUNTS.findall(host.output())]
    return [[min(column) for column in zip(*counts[at:at + 3])] for at in range(0, len(counts) - 2, 3)]


def counts(between="wait 0"):
    return ["counts", "wait 400", between, "counts", "wait 400", between, "counts"]


# --- windows that a user opens and closes: FILE, MS, BUTTON and PAGE are chosen at random

DIALOG = "select FILE", "retry 60000 | invoke Restore Previous Version"
QUESTION = *DIALOG, "retry 20000 | click Restore Files | 1003"
PAGE = "select FILE", f"retry 60000 | page {MODULE_CLASS}"
OPENING = {"menu": ("select FILE", "menu", "wait MS"),
           "dialog": DIALOG,
           "question": QUESTION,
           "progress": (*QUESTION, "retry 20000 | click Tavi Remote Backup | 6", "wait-closed Restore Files | 60000"),
           "page": PAGE,
           "asking-page": (*PAGE, "retry 20000 | click Properties | 1003")}
CLOSING = {"menu": (),
           "dialog": ("retry 20000 | click Restore Files | 2",),
           "question": ("retry 20000 | click Tavi Remote Backup | 2",),
           # The service's report of the end may have closed it.
           "progress": ("try retry 2500 | click Restoring... | BUTTON",),
           "page": ("retry 20000 | PAGE",),
           "asking-page": ("retry 20000 | click Tavi Remote Backup | 2",)}


def opening(*windows):
    file, pause = f"file{random.randint(1, 8)}.txt", str(random.randrange(700))
    return [command.replace("FILE", file).replace("MS", pause) for window in windows for command in OPENING[window]]


def closing(*windows):
    button, page = str(random.choice((2, 8))), random.choice(("click Properties | 2", "close-window Properties"))
    return [command.replace("BUTTON", button).replace("PAGE", page) for window in windows for command in CLOSING[window]]


def first_time():
    """Wine allocates much when a window is painted first, and when more windows are open than ever before, and keeps it."""
    # A command must not find a window that is about to close.
    settled = [f"wait-closed {title} | 60000" for title in ("Tavi Remote Backup", "Restore Files", "Properties")]
    commands = []
    # Behind its question is the page.
    for window, *behind in (("dialog",), ("question",), ("page",), ("asking-page", "page")):
        commands += opening(window) + ["wait 1500"] + closing(window, *behind) + settled
    # The first click on a dialog may have reached that of the question, at its end.
    commands += opening("progress", "dialog", "question") + ["wait 1500"] + closing("question", "dialog")
    commands += ["wait 1500", "try click Restore Files | 2"] + closing("progress") + settled
    return commands + ["wait-closed Restoring... | 60000"]


class Run:
    """The runs, one kind after the other. In each, the host reads its commands from a script, and the service gets orders."""

    def __init__(self, session, options):
        self.session, self.options = session, options
        self.folder = session.drive / "tavi-endure"
        self.state = self.folder / "service/data/tavistate.dat"
        self.figures, self.kind = [], ""

    def length(self, full, short, per_minute):
        """Returns the number of rounds to run."""
        options = self.options
        return options.rounds or options.minutes and options.minutes * per_minute or (short if options.short else full)

    def figure(self, name, value, bound="-"):
        verdict = ""
        if bound != "-":
            relation, limit = bound.split()
            holds = {"<=": operator.le, ">=": operator.ge, "=": operator.eq}[relation]
            verdict = "ok" if value is not None and holds(value, int(limit)) else "FELL SHORT"
        self.figures.append((self.kind, name, "none" if value is None else value, bound, verdict))

    # --- a machine with a backup and the module, and the two programs

    def sql(self, statement, *values, database=None):
        with contextlib.closing(sqlite3.connect(database or self.state, timeout=60, isolation_level=None)) as connection:
            return connection.execute(statement, values).fetchall()

    def machine(self, files):
        """Prepares the machine. Its manifest lists so many more files below Documents\\Large, with three versions each."""
        self.session.stop_server()
        self.session.windows("cmd", "/c", "exit", timeout=600)
        shutil.rmtree(self.folder, ignore_errors=True)
        documents = self.folder / "Documents"
        for name, text in [(f"file{i}.txt", os.urandom(1000 * i)) for i in range(1, 9)] + [
                ("a.txt", os.urandom(400000)), ("Folder/in.txt", b"inside"), ("Large/first.txt", b"inside")]:
            (documents / name).parent.mkdir(parents=True, exist_ok=True)
            (documents / name).write_bytes(text)
        self.session.service("install", r"C:\tavi-endure\service")
        self.session.service("backup", r"C:\tavi-endure\Documents")
        self.sql(r"""
            WITH RECURSIVE f(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM f WHERE i < ?), v(n) AS (VALUES (1), (2), (3))
            INSERT INTO versions SELECT printf('C:\tavi-endure\Documents\Large\%03d\report %06d.txt', i / 200, i),
            1700000000 + n * 86400, 1000 + i, 133000000000000000, 133000000000000000, 32, lower(hex(randomblob(20))) FROM f, v""",
                 files, database=self.folder / "service/history.dat")
        # A run over Documents itself would record these files as deleted.
        self.session.service("backup", r"C:\tavi-endure\Documents\Folder")
        (documents / "new.txt").write_text("new")
        self.session.register(self.session.module)

    def start_host(self, name, commands=None):
        script = None
        if commands:
            script = self.session.out / f"{name}.script"
            script.write_text("".join(f"{command}\n" for command in commands), encoding="utf-8")
        return self.session.start_manager(r"C:\tavi-endure\Documents", "--hidden", name=name, script=script)

    def while_alive(self, host):
        """Yields twice a second until the host has ended, and records its exit code."""
        printed, since = 0, time.monotonic()
        while host.alive():
            yield
            time.sleep(0.5)
            if len(host.output()) > printed:
                printed, since = len(host.output()), time.monotonic()
            elif time.monotonic() > since + 180:
                raise Failure("the host hangs")
        self.check_end(host)

    def check_end(self, host):
        code = host.wait(60)
        self.figure("host's exit code", code, "= 0")
        if code != 0:
            print("\n".join(host.output().splitlines()[-5:]), host.errors())

    def start_service(self, *arguments):
        return self.session.start_service(*arguments, name=f"{self.kind}-service")

    def end_service(self, service):
        service.order("stop")
        self.figure("service's exit code", service.wait(60), "= 0")

    def check_log(self):
        log = "".join(path.read_text(encoding="utf-8", errors="replace") for path in self.folder.glob("service/*/tavi.log"))
        # A cancel finds no command pipe while the service restarts: that is no error.
        lines = [line for line in re.findall(".*(?:Unhandled|Error:).*", log) if "Unable to open command pipe" not in line]
        self.figure("errors in the module's log", len(lines), "= 0")

    def check_flat(self, host, count, kilobytes):
        """From the first quarter to the last half, counts do not grow, and memory grows by so much at most."""
        # The first sample does not count: much is created once.
        rows = samples(host)[1:]
        self.figure("samples", len(rows), f"= {count}")
        for at, name in enumerate(("handles", "GDI objects", "threads", "memory KB")):
            column = [row[at] for row in rows]
            grown = max(column[len(column) // 2:]) - max(column[:(len(column) + 3) // 4]) if len(column) > 1 else None
            self.figure(f"{name}: growth", grown, f"<= {kilobytes if at == 3 else 0}")

    # --- service: rounds with a restore, each with a sample after its windows are closed

    def run_service(self):
        count, part = self.length(30, 2, 3), 3 if self.options.short else 1
        self.machine(1)
        # At this rate a restore takes longer than its window is open.
        service = self.start_service(20000)
        host = self.start_host("service")
        # Garbage after which the window of a restore stays open, and any.
        harmless = itertools.cycle(f"garbage {what}" for what in ("count", "short", "type", "cut", "random", "snapshot"))
        hostile = itertools.cycle(("garbage length", "garbage huge", "garbage stall", "hostile 3", "garbage random",
                                   "garbage flood", "restart 200"))

        def attack(orders, seconds):
            end = time.monotonic() + seconds / part
            while time.monotonic() < end:
                order = next(orders)
                service.order(order)
                if order in ("garbage flood", "hostile 3"):
                    # The rest of a flood would delay the next messages for minutes.
                    time.sleep(1)
                    service.order("restart 200")
                host.order("menu")
                time.sleep(0.5)

        # The module stays mapped: the next kind tests unloads.
        for command in ("select a.txt", "menu", f"hold {MODULE_CLASS}", *first_time()):
            host.order(command)
        worked = 0
        print("%8s %8s %8s %8s %10s" % ("seconds", "handles", "gdi", "threads", "memory KB"))
        start = time.monotonic()
        for _ in range(count + 1):
            for command in ("select a.txt", "invoke Restore Previous Version", "wait-window Restore Files | 60000",
                            "select-row Restore Files | 1002 | 0", "click Restore Files | 1003",
                            "wait-window Tavi Remote Backup | 60000", "click Tavi Remote Backup | 6",
                            "wait-closed Restore Files | 60000", "try wait-window Restoring... | 5000"):
                host.order(command)
            attack(harmless, 4)
            worked += "not done" not in host.order("try text Restoring... | 1010")
            attack(hostile, 6)
            # The module looks for the service every 5 seconds; until then, it has a handle less.
            for command in ("try click Restoring... | 2", "wait-closed Restoring... | 60000", "wait 10000", "select", "menu",
                            *counts()):
                host.order(command)
            print("%8d %8d %8d %8d %10d" % (time.monotonic() - start, *samples(host)[-1]))
        host.send("exit")
        self.check_end(host)
        self.end_service(service)
        self.figure("rounds with a window at work", worked, ">= 1")
        self.check_log()
        self.check_flat(host, count, 1024)

    # --- unload: at each unload a window is open or about to close; at each end of the host several are open

    @staticmethod
    def unload_round():
        windows = "menu", "menu", "dialog", "question", "progress", "page", "asking-page"
        one, two = random.choice(windows), random.choice(windows)
        # `progress` waits until no dialog is open, so it comes first.
        opened = [two, one] if two == "progress" else [one, two]
        if one == two or random.randrange(3) or "page" in one + two:
            opened = [one]
        commands = opening(opened[0]) + [f"wait {random.randrange(100)}"] + opening(*opened[1:])
        # The last window is in front.
        commands += [f"wait {random.randrange(500)}", "unload tavishell.dll"] + closing(*reversed(opened))
        return commands + random.choice(([], [f"wait {random.randrange(700)}"])) + [UNLOAD]

    @staticmethod
    def end_script():
        windows = [window for window in ("menu", "progress", "dialog", "page", "question") if random.randrange(3)]
        windows += [] if random.randrange(4) else ["asking-page"]
        code = random.choice((0, 7))
        return opening(*windows) + [f"wait {random.randrange(900)}", f"exit {code}" if code else "exit"], code

    def run_unload(self):
        count = self.length(1000, 8, 30)
        every = count // 50 if count > 100 else 2
        self.machine(20000)
        service = self.start_service(20000, 300)
        # At the first counts the module is not loaded.
        commands = ["watch tavishell.dll", *counts(), *first_time(), UNLOAD]
        for number in range(1, count + 1):
            commands += self.unload_round() + (counts() if number % every == 0 else [])
        host = self.start_host("unload", commands + ["exit"])
        garbage = itertools.cycle(("count", "short", "type", "cut", "random", "length", "stall", "huge", "flood", "random"))

        def send_garbage():
            kind = next(garbage)
            service.order(f"garbage {kind}")
            if kind == "flood":
                service.order("restart 200")

        for _ in self.while_alive(host):
            send_garbage()
        ends = []
        for number in range(1, (count + 19) // 20 + 2):
            commands, expected = self.end_script()
            end = self.start_host(f"end-{number}", commands)
            send_garbage()
            ends.append((end.wait(300), expected))
            if ends[-1][0] != expected:
                print(f"end {number}: {ends[-1][0]} instead of {expected}\n", "\n".join(end.output().splitlines()[-3:]))
        self.end_service(service)
        threads = [row[2] for row in samples(host)]
        self.figure("unloads", int((COUNTS.findall(host.output()) or ["0"])[-1][-1]), f">= {count}")
        self.figure("threads left by the unloads", max(threads) - threads[0] if threads else None, "= 0")
        self.figure("ends of the host", len(ends), ">= 1")
        self.figure("ends with a wrong code", sum(code != expected for code, expected in ends), "= 0")
        self.figure("ends that hung", sum(code is None for code, _ in ends), "= 0")
        self.check_log()
        self.check_flat(host, count // every, 4096)

    # --- kill: the host ends while it writes a request, and starts again

    def run_kill(self):
        files, count = 30000, self.length(200, 6, 15)
        self.machine(files)
        journal = self.state.with_name(self.state.name + "-journal")
        done = collections.Counter()

        def journal_start():
            """Returns the first byte; one that is not zero says that the database itself has changed, that the journal is hot."""
            return journal.read_bytes()[:1] if journal.exists() else b""

        def requests_written():
            return self.sql("SELECT count(*) FROM restores")[0][0]

        requests = took = 0
        # Round 0 is not killed: it measures how long the writing takes. After the last kill, one more start is checked.
        for number in range(count + 2):
            host = self.start_host("kill")
            for command in ("select Large", "retry 60000 | invoke Restore Files in Folder",
                            "retry 20000 | click Restore Files | 1003", "wait-window Tavi Remote Backup | 60000"):
                host.order(command)
            # The module has opened the database by now.
            done["late"] += journal_start() not in (b"", b"\0")
            done["unsound"] += self.sql("PRAGMA integrity_check") != [("ok",)]
            check = self.sql("""
                SELECT (SELECT count(*) FROM restores), (SELECT count(*) FROM restores r
                    WHERE (SELECT count(*) FROM restore_files f WHERE f.restore_id = r.rowid) <> ?) +
                    (SELECT count(*) FROM restore_files WHERE restore_id NOT IN (SELECT rowid FROM restores))""", files + 1)
            if check != [(requests, 0)]:
                done["wrong"] += 1
                print(f"round {number}: requests and broken ones: {check}, expected {requests}, 0")
            if number > count:
                break
            if requests >= 3:
                self.sql("DELETE FROM restore_files")
                self.sql("DELETE FROM restores")
                requests = 0
            sent = time.monotonic()
            host.send("click Tavi Remote Backup | 6")
            if number == 0:
                wait_for(120, "the request", requests_written)
                took = time.monotonic() - sent
            else:
                # Round i waits for a random moment in the i-th part of 1.3 times the duration of the writing.
                time.sleep((number - 1 + random.random()) * 1.3 * took / count)
            host.kill()
            if start := journal_start():
                done["middle"] += 1
                done["hot"] += start != b"\0"
            elif requests_written() > requests:
                done["after"] += 1
                requests += 1
            else:
                done["before"] += 1
        self.figure("kills", done["before"] + done["middle"] + done["after"] - 1, f"= {count}")
        self.figure("kills before the writing", done["before"])
        self.figure("kills amid the writing", done["middle"], f">= {count // 5}")
        self.figure("of these with the database changed", done["hot"])
        # Round 0 is one of them.
        self.figure("kills after the writing", done["after"] - 1)
        self.figure("hot journals left by the next start", done["late"], "= 0")
        self.figure("starts with a broken request", done["wrong"], "= 0")
        self.figure("starts with an unsound database", done["unsound"], "= 0")
        self.check_log()

    # --- menus: the two manifests differ in one folder, so that each reload changes the menu of that folder

    def run_menus(self):
        count, warm_up = self.length(10000, 300, 1000), 100
        batches = (count + 99) // 100 if count > 200 else 2
        every = max(batches // 20, 1)
        self.machine(20000)
        manifests = {}
        manifests["without"] = self.sql("SELECT contents FROM manifest")[0][0]
        (self.folder / "Documents/Flip").mkdir()
        (self.folder / "Documents/Flip/flip.txt").write_text("flip")
        self.session.service("backup", r"C:\tavi-endure\Documents\Flip")
        manifests["with"] = self.sql("SELECT contents FROM manifest")[0][0]
        service = self.start_service()
        # With this time in the future, the watcher reloads the manifest at each poll, every 5 seconds.
        self.session.windows("reg", "add", r"HKLM\Software\Tavi\params", "/reg:32", "/v", "options.manifestmtime", "/d",
                             "2099-01-01 00:00:00", "/f")
        commands = ["select a.txt", "menu", f"hold {MODULE_CLASS}", "wait 3000", *["menu"] * warm_up, "select Flip", "menu"]
        commands += counts()
        for batch in range(1, batches + 1):
            for number in range(100):
                some = f"select file{random.randint(1, 4)}.txt | file{random.randint(5, 8)}.txt"
                others = ["select Folder", "select new.txt", "select", "select Large | file1.txt", some, some, some, some, some]
                commands += ["select Flip" if number % 10 == 0 else random.choice(others), "menu"]
                commands += ["wait 420"] if number % 10 == 9 else []
            # The module keeps the manifest of the newest menu: take each count after a new menu.
            commands += counts("menu") if batch % every == 0 else []
        host = self.start_host("menus", commands + ["exit"])
        wanted, turns = "", 0
        for _ in self.while_alive(host):
            # The newest menu of the folder shows which manifest is in use.
            newest = re.findall(r"^> select Flip\ndone\n> menu\n((?:(?!>).*\n)*?)done$", host.output()[-60000:], re.M)[-1:]
            shown = newest and ("with" if "Restore Files in Folder" in newest[0] else "without")
            if shown and wanted in ("", shown):
                turns += shown == wanted
                wanted = "without" if shown == "with" else "with"
                self.sql("UPDATE manifest SET contents = ?", manifests[wanted])
        self.end_service(service)
        # The warm-up has two menus more.
        times = sorted(int(time) for time in re.findall(r"^handlers took (\d+) us$", host.output(), re.M)[warm_up + 2:])
        median, most, latest = (times[max(int(len(times) * part), 1) - 1] if times else None for part in (0.5, 0.99, 1))
        self.figure("menus", len(times), f">= {batches * 100}")
        self.figure("reloads seen in a menu", turns, f">= {batches * 7 // 10}")
        self.figure("menu, median us", median, ">= 1")
        bound = f"<= {(median or 0) * 10}"
        self.figure("menu, 99th of 100, us", most, bound)
        # In the short run, one delay of the machine would decide.
        self.figure("menu, latest, us", latest, "-" if self.options.short else bound)
        self.check_log()
        self.check_flat(host, batches // every, 4096)

    # --- fuzz: natively, under the sanitizers

    def run_fuzz(self):
        seconds = self.options.minutes * 60 if self.options.minutes else 5 if self.options.short else 180
        folder = build / "native-address"
        make("", "install", "build", "native")
        if not (folder / "CMakeCache.txt").exists():
            subprocess.run(["cmake", "--preset", "native-address"], cwd=root, check=True, stdout=subprocess.DEVNULL)
        subprocess.run(["cmake", "--build", folder, "-j", str(os.cpu_count()), "--target", "fuzz/all", "--", "--quiet"], check=True)
        for program in sorted(folder.glob("fuzz/*_fuzz")):
            name = program.name.removesuffix("_fuzz")
            found = self.session.out / f"{name}.found"
            found.mkdir()
            corpus = [path for path in (root / "fuzz/corpus" / name,) if path.exists()]
            rounds = [f"-runs={self.options.rounds}"] if self.options.rounds else []
            more = f"-max_total_time={seconds}", *rounds, f"-seed={self.options.seed}", "-print_final_stats=1", found

            def fuzz(what, limit, *arguments):
                """Returns the output and the processor time, to which other programs of the machine add nothing."""
                start = resource.getrusage(resource.RUSAGE_CHILDREN).ru_utime
                common = program, f"-artifact_prefix={found}/"
                fuzzer = self.session.spawn(f"fuzz-{name}", *common, *arguments, *corpus, script=os.devnull)
                self.figure(f"{name}: exit code {what}", fuzzer.wait(limit), "= 0")
                return fuzzer.errors(), resource.getrusage(resource.RUSAGE_CHILDREN).ru_utime - start

            _, start_time = fuzz("over the corpus", 600, "-runs=0")
            text, total_time = fuzz("of the fuzzing", seconds + 300, *more)
            inputs = re.search(r"^stat::number_of_executed_units: *(\d+)", text, re.M)
            speed = inputs and int(int(inputs[1]) / max(total_time - start_time, 0.01))
            self.figure(f"{name}: inputs a second", speed, f">= {2000 if name == 'message' else 1}")

    def run(self, kind):
        print(f"== {kind} (seed {self.options.seed})")
        self.kind, start, code = kind, time.monotonic(), 0
        random.seed(self.options.seed)
        try:
            getattr(self, f"run_{kind}")()
        except (Failure, OSError, sqlite3.Error, subprocess.SubprocessError) as failure:
            code = 1
            print(f"error: {failure}")
        self.session.end()
        self.figure("exit code of all", code, "= 0")
        print(f"{kind} took {time.monotonic() - start:.0f} s")


KINDS = [name.removeprefix("run_") for name in vars(Run) if name.startswith("run_")]


def main():
    parser = argparse.ArgumentParser(usage=__doc__)
    parser.add_argument("kinds", nargs="*", choices=[*KINDS, []])
    length = parser.add_mutually_exclusive_group()
    length.add_argument("--minutes", type=positive)
    length.add_argument("--rounds", type=positive)
    parser.add_argument("--short", action="store_true")
    parser.add_argument("--seed", type=positive, default=random.randint(1, 99999))
    options = parser.parse_args()
    make(ARCH, "build", "tavishell", "filemanager", "taviservice")
    folder = build_of(ARCH)
    with Session(folder / "endure-prefix", folder / "endure", ARCH) as session:
        runs = Run(session, options)
        for kind in options.kinds or KINDS:
            runs.run(kind)
    for figure in [("kind", "figure", "value", "bound", ""), *runs.figures]:
        print("%-8s %-36s %10s %10s  %s" % figure)
    if any(figure[-1] == "FELL SHORT" for figure in runs.figures):
        raise Failure("not everything endures")


run(main)
