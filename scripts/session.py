"""Runs Windows programs in a Wine prefix, and sends commands to the two stand-ins, the file manager and the service.

    with Session(build / "my-prefix", build / "my-output") as session:
        session.windows("cmd", "/c", "exit")
        manager = session.start_manager(r"C:\\users")
        print(manager.order("menu"))

The exit code of a Windows program is known modulo 256 only: Unix has no more."""
import contextlib
import fcntl
import os
import pathlib
import re
import shutil
import signal
import subprocess
import sys
import tempfile
import time

root = pathlib.Path(__file__).resolve().parent.parent
build = root / "build"
VERSION = re.search(r"project\(tavishell VERSION ([0-9.]+)", (root / "CMakeLists.txt").read_text(encoding="utf-8"))[1]
MODULE_CLASS = "{5E0C31A7-8D42-4B19-A6F3-2C7D90E1B845}"

# Of this program and of those under Wine (scripts/wine-run sets the same).
os.environ.update(LC_ALL="C.UTF-8", TZ="UTC0")
time.tzset()
sys.stdout.reconfigure(line_buffering=True)


class Failure(Exception):
    """An error whose text says everything."""


def run(main):
    """Runs the main function of a script. SIGTERM ends it like Ctrl-C: what it started is ended too."""
    signal.signal(signal.SIGTERM, lambda *_: sys.exit(130))
    try:
        sys.exit(main())
    except KeyboardInterrupt:
        sys.exit(130)
    except (Failure, subprocess.SubprocessError) as failure:
        sys.exit(f"error: {failure}")


def build_of(arch):
    """Returns the build folder of an architecture, i686 or x86_64."""
    return build if arch == "i686" else build / arch


def make(arch, script, *words):
    """Runs a script of this folder for one architecture, or for both."""
    subprocess.run([str(root / "scripts" / script), *words], env=os.environ | {"TAVISHELL_ARCH": arch}, check=True)


def windows_path(path):
    return "Z:" + str(path).replace("/", "\\")


def wait_for(seconds, what, predicate):
    """Calls the predicate until it returns a true value, and returns that."""
    end = time.monotonic() + seconds
    while not (value := predicate()):
        if time.monotonic() > end:
            raise Failure(f"waited {seconds} s in vain for {what}")
        time.sleep(0.02)
    return value


class Program:
    """A running program. It prints to files, since Wine's own processes may inherit its output and outlive it."""

    def __init__(self, name, command, out, environment, script=None):
        self.name = name
        self.output_file, self.errors_file = out / f"{name}.txt", out / f"{name}.errors"
        with contextlib.ExitStack() as files:
            output, errors = (files.enter_context(open(path, "wb")) for path in (self.output_file, self.errors_file))
            source = files.enter_context(open(script, "rb")) if script else subprocess.PIPE
            # A group of its own: scripts/wine-run may still be at work with other programs when this one is killed.
            self.process = subprocess.Popen(command, stdin=source, stdout=output, stderr=errors, env=environment,
                                            start_new_session=True)

    def output(self):
        """Returns the complete lines that the program has printed."""
        text = self.output_file.read_bytes().decode(errors="replace").replace("\r\n", "\n")
        return text[:text.rfind("\n") + 1]

    def errors(self):
        return self.errors_file.read_text(encoding="utf-8", errors="replace")

    def alive(self):
        return self.process.poll() is None

    def kill(self):
        if self.alive():
            os.killpg(self.process.pid, signal.SIGKILL)
            self.process.wait()
        if self.process.stdin:
            with contextlib.suppress(OSError):
                self.process.stdin.close()

    def wait(self, seconds):
        """Returns the exit code, or None if the program had to be killed."""
        try:
            return self.process.wait(seconds)
        except subprocess.TimeoutExpired:
            self.kill()
            return None

    def send(self, command):
        """Sends a command to a stand-in that was started without a script."""
        try:
            self.process.stdin.write(command.encode() + b"\n")
            self.process.stdin.flush()
        except OSError:
            raise Failure(f"{self.name} has ended: {self.errors()}") from None

    def await_output(self, seconds, pattern, start=0):
        """Waits until a complete line after `start` characters of the output matches, and returns the match."""
        def found():
            # Asked first, since a program may end right after its answer.
            alive = self.alive()
            match = re.search(pattern, self.output()[start:], re.M)
            if not match and not alive:
                raise Failure(f"{self.name} has ended: {self.errors()}")
            return match
        return wait_for(seconds, f"{pattern} from {self.name}", found)

    def order(self, command, seconds=120):
        """Sends a command, waits for its end and returns the lines that the program answered."""
        start = len(self.output())
        self.send(command)
        answer, result = self.await_output(seconds, r"^> .*\n((?:.*\n)*?)(done|failed: .*)$", start).groups()
        if result != "done":
            raise Failure(f"{self.name}: {command}: {result}")
        return answer.rstrip("\n")


class Session:
    """The programs in one prefix. They print to files in the folder `out` and end with the session, as does Wine's server."""

    def __init__(self, prefix, out, arch="i686"):
        """The architecture is that of the file manager and of the prefix: a 64-bit Windows runs programs of both word sizes."""
        self.prefix, self.out = pathlib.Path(prefix), pathlib.Path(out)
        self.drive = self.prefix / "drive_c"
        self.folder = build_of(arch)
        self.module = self.folder / "tavishell.dll"
        self.environment = os.environ | {"WINEARCH": "win32" if arch == "i686" else "win64"}
        self.programs = []

    def __enter__(self):
        self.prefix.parent.mkdir(parents=True, exist_ok=True)
        self.lock = open(f"{self.prefix}.session", "w", encoding="utf-8")
        try:
            fcntl.flock(self.lock, fcntl.LOCK_EX | fcntl.LOCK_NB)
        except OSError:
            self.lock.close()
            raise Failure(f"another script uses {self.prefix}") from None
        shutil.rmtree(self.out, ignore_errors=True)
        self.out.mkdir(parents=True)
        return self

    def __exit__(self, *_):
        previous = {number: signal.signal(number, signal.SIG_IGN) for number in (signal.SIGINT, signal.SIGTERM)}
        self.end()
        self.lock.close()
        for number, handler in previous.items():
            signal.signal(number, handler)

    def end(self):
        for program in self.programs:
            program.kill()
        self.programs.clear()
        self.stop_server()

    def stop_server(self):
        """Ends Wine's server and thereby every program of the prefix."""
        subprocess.run(["timeout", "-k5", "60", "wineserver", "-k"], env=self.environment | {"WINEPREFIX": str(self.prefix)},
                       stderr=subprocess.DEVNULL, check=False)

    def command(self, *command):
        return [str(word) for word in (root / "scripts/wine-run", self.prefix, *command)]

    def windows(self, *command, check=True, timeout=120):
        """Runs a Windows program to its end; returns its exit code, output and errors."""
        with tempfile.TemporaryDirectory() as folder:
            program = Program("program", self.command(*command), pathlib.Path(folder), self.environment, os.devnull)
            try:
                code = program.wait(timeout)
            finally:
                program.kill()
            text = program.output_file.read_text(encoding="utf-8", errors="replace")
            if code is None or check and code != 0:
                end = f"still running after {timeout} s" if code is None else f"exit code {code}"
                raise Failure(f"{' '.join(map(str, command))}: {end}\n{text}{program.errors()}")
            return subprocess.CompletedProcess(command, code, text, program.errors())

    def service_program(self):
        """Returns the service, a 32-bit program also on a 64-bit Windows, unless only 64-bit programs are built."""
        program = "tools/service/taviservice.exe"
        return build / program if (build / program).exists() else self.folder / program

    def service(self, *arguments):
        return self.windows(self.service_program(), *arguments)

    def register(self, module):
        self.windows(r"C:\windows\system32\regsvr32.exe", "/s", module)

    def spawn(self, name, *command, script=None):
        """Starts a program of this machine, which takes its input from the file `script`, else from send and order."""
        program = Program(name, [str(word) for word in command], self.out, self.environment, script)
        self.programs.append(program)
        return program

    def start(self, name, *command, script=None):
        """Starts a Windows program likewise."""
        return self.spawn(name, *self.command(*command), script=script)

    def start_manager(self, folder, *options, name="manager", script=None):
        return self.start(name, self.folder / "tools/filemanager/explorer.exe", folder, *options, script=script)

    def start_service(self, *arguments, name="service"):
        """Starts the service: BYTES_PER_SECOND, SEARCH_MS."""
        service = self.start(name, self.service_program(), "run", *arguments)
        service.await_output(60, "^ready$")
        return service
