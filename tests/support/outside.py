# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0
"""What is tried from outside: programs as a person or a test runner starts them, and
what comes of it."""
import collections
import contextlib
import functools
import itertools
import os
import pathlib
import re
import signal
import subprocess
import tempfile
import time

TREE = pathlib.Path(__file__).resolve().parents[2]
BUILD = pathlib.Path(os.environ.get("QUILLMARK_BUILD") or TREE / "build/release").resolve()
DEVICE_RUN = TREE / "device/run"

# Programs are started as a shell in front starts them, however the tests were.
for number in (signal.SIGHUP, signal.SIGINT, signal.SIGQUIT, signal.SIGTERM):
    if signal.getsignal(number) == signal.SIG_IGN:
        signal.signal(number, signal.SIG_DFL)


# ---- programs ------------------------------------------------------------------------

# The status is as a shell has it: 128 + N for signal N.
Outcome = collections.namedtuple("Outcome", "status out err")


@contextlib.contextmanager
def started(*words, env=None, **options):
    """The process of a program with these words, killed in the end if it is still there.

    A variable of env that is None is taken away; the options are those of Popen."""
    variables = os.environ | {"container": None, "LC_ALL": "C", "QUILLMARK_BUILD": BUILD}
    variables |= env or {}
    variables = {name: value for name, value in variables.items() if value is not None}
    process = subprocess.Popen(words, env=variables, **{"cwd": TREE} | options)
    try:
        yield process
    finally:
        process.kill()
        process.wait()


@contextlib.contextmanager
def at_a_terminal(*words):
    """A program at a terminal of its own: its process, and the terminal, until closed."""
    terminal, other_side = os.openpty()
    with open(terminal, "rb+", buffering=0) as terminal, \
            started("setsid", "--ctty", *words, stdin=other_side, stdout=other_side,
                    stderr=other_side) as process:
        os.close(other_side)
        yield process, terminal


def status_of(process, seconds=60):
    """With what it ends within that time."""
    status = process.wait(seconds)
    return status if status >= 0 else 128 - status


def run(*words, text="", **options):
    """Runs a program to its end, with that text as its input."""
    pipes = {"stdin": subprocess.PIPE, "stdout": subprocess.PIPE, "stderr": subprocess.PIPE}
    with started(*words, **pipes | options) as process:
        out, err = process.communicate(text.encode(), 60)
        return Outcome(status_of(process), out.decode(), err.decode())


def output_of(*words, **options):
    """What a program prints that succeeds."""
    outcome = run(*words, **options)
    assert outcome.status == 0, f"{words}\n{outcome.out}{outcome.err}"
    return outcome.out


def eventually(condition, seconds=10):
    """Whether the condition holds, now or within that time."""
    end = time.monotonic() + seconds
    while not condition():
        if time.monotonic() >= end:
            return False
        time.sleep(0.01)
    return True


# Words of a COMMAND that says "ready" and what signals it gets, and ends with 7 a
# quarter of a second after the last one.
SIGNAL_SAYER = ("/usr/bin/python3", TREE / "tests/support/say_signals.py")


lengths = itertools.count()


def unique_length():
    """A length to sleep that nobody else on this machine has."""
    return f"9{os.getpid()}.{next(lengths)}"


def is_running(word):
    """Whether a process of this machine has that word among its arguments."""
    for arguments in pathlib.Path("/proc").glob("[0-9]*/cmdline"):
        with contextlib.suppress(OSError):  # it has ended
            if word.encode() in arguments.read_bytes().split(b"\0"):
                return True
    return False


# ---- files ---------------------------------------------------------------------------

def content(path):
    """The text of a file: nothing of one that is not there."""
    try:
        return pathlib.Path(path).read_bytes().decode()
    except FileNotFoundError:
        return ""


def make_program(path, script):
    path.write_text(script)
    path.chmod(0o700)


# ---- builds --------------------------------------------------------------------------

# What the build was configured with.
CACHE = dict(re.findall(r"^(\w+):\w+=(.*)", content(BUILD / "CMakeCache.txt"), re.M))


def configure(directory, *options, **others):
    """Configures a build there. The status, and what was said, a blank after each word."""
    outcome = run("cmake", "-B", directory, *options, **others)
    return outcome.status, " ".join((outcome.out + outcome.err).split()) + " "


def install_library(directory, *options):
    """Builds the library alone in the directory, and installs it. Gives the prefix."""
    build, prefix = directory / "build", directory / "prefix"
    output_of("cmake", "-S", TREE, "-B", build, "-DQUILLMARK_BUILD_TOOLS=OFF", *options)
    output_of("cmake", "--build", build)
    output_of("cmake", "--install", build, "--prefix", prefix)
    return prefix


# ---- the device ----------------------------------------------------------------------

# What ps prints first.
PS_HEADER = "USER     PID   PPID  VSIZE  RSS     WCHAN    PC         NAME"


def on_device(*command, options=(), **others):
    """Runs COMMAND on the device that has these options of device/run. Without what that says
    of being in place."""
    outcome = run(DEVICE_RUN, *options, "--", *command, **others)
    return outcome._replace(err=re.sub(
        r"^device/run: in place: (this container|asked for,) .*\n", "", outcome.err, flags=re.M))


def shell(script, **others):
    """Runs a script of the device's shell."""
    return on_device("sh", "-c", script, **others)


@functools.cache
def way():
    """What the device is here: "namespace", "in-place", or "" where it does not start."""
    known = os.environ.get("QUILLMARK_TEST_WAY")
    return on_device("printenv", "QUILLMARK_DEVICE").out.strip() if known is None else known


# What device/run says of a COMMAND that is not ended by SIGTERM.
GOES_ON = "device/run: COMMAND goes on 10 s after SIGTERM, and is ended with its device\n"


class SignalledDevice:
    """A device in a process group of its own; what it says goes to a file."""

    def __init__(self, process, said):
        self.process = process
        self.said = said

    def out(self):
        """What it has said, but for what device/run says of being in place."""
        lines = content(self.said).splitlines(keepends=True)
        return "".join(one for one in lines if not one.startswith("device/run: in place: "))

    def says(self, text):
        return eventually(lambda: text in self.out())

    def signal(self, number):
        os.kill(self.process.pid, number)

    def signal_group(self, number):
        os.killpg(self.process.pid, number)

    def status(self):
        return status_of(self.process)


# ---- a machine to try device/run on that changes the root it runs in -----------------

def libraries():
    for path in pathlib.Path("/").glob("lib*"):
        if path.is_symlink():
            yield from ("--symlink", path.readlink(), path)
        else:
            yield from ("--ro-bind", path, path)


def on_machine(script, refuses_namespaces=True, is_container=False, user=0, sysctls=None,
               options=()):
    """Runs a script, whose $1 is device/run, in a sandbox with a root of its own.

    Unless told otherwise it refuses further namespaces and shows no sign of a container.
    The sysctls are a machine's own values in the place of the kernel's: what is not among
    them is not there, but for what bwrap itself wants to read. The options are bwrap's."""
    # A nested /proc can be mounted only where the outer one has nothing on top, as the
    # one of bwrap's own making has.
    words = (f"bwrap --unshare-user --uid {user} --gid {user} --disable-userns "
             "--unshare-pid --proc /proc" if refuses_namespaces else
             "unshare --user --map-root-user --mount --pid --fork --mount-proc "
             "--kill-child bwrap --bind /proc /proc").split()
    words += ("--die-with-parent --unshare-net --unshare-ipc --unshare-uts "
              "--unshare-cgroup-try --ro-bind /usr /usr --dev /dev --tmpfs /tmp --dir /run "
              "--dir /var/lib --dir /etc --ro-bind /etc/passwd /etc/passwd --dir /bin "
              "--symlink /usr/bin/mksh /bin/mksh --symlink /usr/bin/dash /bin/sh").split()
    words += [*libraries(), "--ro-bind", TREE, TREE, "--ro-bind", BUILD, BUILD]
    if is_container:
        words += ["--symlink", "/dev/null", "/.dockerenv"]
    with tempfile.TemporaryDirectory() as directory:
        if sysctls:
            words += ["--tmpfs", "/proc/sys"]
            sysctls = {"kernel/overflowuid": 65534, "kernel/overflowgid": 65534} | sysctls
            for key, value in sysctls.items():
                file = pathlib.Path(directory, key)
                file.parent.mkdir(exist_ok=True)
                file.write_text(f"{value}\n")
                words += ["--ro-bind", file, f"/proc/sys/{key}"]
        words += [*options, "--chdir", "/", "--setenv", "PATH", "/usr/sbin:/usr/bin",
                  "--", "bash", "-c", script, DEVICE_RUN, DEVICE_RUN]
        return run(*words)
