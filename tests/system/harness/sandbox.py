"""A private machine for one daemon: own mount, network and process namespaces over a directory of ordinary files.

The files live outside the namespaces, so that tests read and write them, and reach the daemon's sockets, by their
paths in the host; the mounts exist only while a daemon runs and vanish with it.
"""
import os
import signal
import subprocess
from pathlib import Path

from .temporary import short_directory
from .waiting import wait_until

HARNESS = Path(__file__).resolve().parent
DIRECTORIES = (
    "Library/Preferences", "dev/shm", "etc", "opt", "proc", "root", "tmp", "sys", ".hostbin", "usr/bin", "var/run",
    "var/cache", "var/lmx/agent/secrets", "var/lmx/agent/recordings", "var/tool",
)
HOST_COMMANDS = ("sh", "dash", "env", "python3", "sleep", "cat", "true", "false", "setpriv", "kill")


class Program(subprocess.Popen):
    """A child process that is killed at the end of its block, so that a failed check inside does not wait for it."""

    def __exit__(self, *details):
        self.kill()
        return super().__exit__(*details)


class Sandbox:
    """The directory and the process tree. One tree at a time; the directory outlives it until remove()."""

    def __init__(self, binary):
        self.binary = Path(binary)
        self._directory = short_directory()
        self.base = Path(self._directory.name)
        self.root = self.base / "root"
        self.errors = self.base / "stderr.txt"
        self._ready = self.base / "ready"  # made by sandbox_init.sh when all is set up
        self._held = self.base / "held"  # the daemon waits until it is gone
        self.process = None
        self._daemon = None
        self._lay_out()

    def _lay_out(self):
        for name in DIRECTORIES:
            (self.root / name).mkdir(parents=True, exist_ok=True)
        for device in ("null", "zero", "full", "random", "urandom"):
            (self.root / "dev" / device).touch()
        (self.root / "opt/lmxagentd").touch()
        for entry in Path("/usr").iterdir():
            target = self.root / "usr" / entry.name
            if entry.is_symlink():
                target.symlink_to(os.readlink(entry))
            elif entry.is_dir():
                target.mkdir(exist_ok=True)
            else:
                target.touch()
        for name in ("bin", "sbin", "lib", "lib32", "lib64", "libx32"):
            if os.path.islink("/" + name):
                (self.root / name).symlink_to(os.readlink("/" + name))
        for name in HOST_COMMANDS:
            (self.root / "usr/bin" / name).symlink_to("/.hostbin/" + name)

    def prepare(self, **options):
        """Sets up everything, with the options of start(), but holds the daemon back until start()."""
        self._held.touch()
        self._launch(**options)
        wait_until(self._ready.exists, what="the sandbox")

    def held(self):
        """Whether start() only lets the daemon go."""
        return self._held.exists()

    def start(self, **options):
        """Starts the daemon: `arguments` for it, its environment `env`, `mounts` as sandbox_init.sh reads them,
        `prefix` a command in front of the daemon's."""
        if self.held():
            assert not options, "too late: they belong to prepare()"
            self._held.unlink()
        else:
            self._launch(**options)
        wait_until(lambda: self.daemon_pid or self.process.poll() is not None, what="the daemon's process")

    def _launch(self, arguments=(), env=None, mounts=(), prefix=()):
        assert self.process is None, "a daemon runs already"
        self._daemon = None
        self._ready.unlink(missing_ok=True)
        with open(self.errors, "ab") as errors:
            self.process = subprocess.Popen(self._command(arguments, prefix), env=self._environment(env, mounts),
                                            stdin=subprocess.DEVNULL, stdout=errors, stderr=errors,
                                            start_new_session=True)

    def popen(self, arguments, env=None, mounts=(), prefix=()):
        """Starts the program as a person at a shell does, beside the daemon when one runs. @return the Program"""
        if self.daemon_pid:
            command = [*self.entering("mount", "net", "pid", "root", "wd"), *prefix, "/opt/lmxagentd", *arguments]
        else:
            command = self._command(arguments, prefix)
        return Program(command, env=self._environment(env, mounts), stdin=subprocess.DEVNULL, stdout=subprocess.PIPE,
                       stderr=subprocess.PIPE)

    def entering(self, *parts):
        """The prefix that runs a command in these parts of the sandbox: "net" for its network, others as nsenter names
        its options."""
        user = [] if os.geteuid() == 0 else ["--user", "--preserve-credentials"]
        (init,) = children_of(self.process.pid)
        return ["nsenter", "--target", str(self.daemon_pid or init), *user, *(f"--{part}" for part in parts), "--"]

    def run(self, *arguments, timeout=30, **options):
        """Runs the program to its end. @return what subprocess.run returns"""
        with self.popen(arguments, **options) as process:
            output, errors = process.communicate(timeout=timeout)
        return subprocess.CompletedProcess(arguments, process.returncode, output.decode(), errors.decode())

    def _command(self, arguments, prefix):
        user = [] if os.geteuid() == 0 else ["-U", "-r"]
        return ["setpriv", "--pdeathsig", "KILL", "--", "unshare", *user, "-m", "-n", "-p", "-f", "--kill-child",
                "sh", str(HARNESS / "sandbox_init.sh"), str(self.root), str(self.binary),
                *prefix, "/opt/lmxagentd", *arguments]

    @staticmethod
    def _environment(env, mounts):
        return {"PATH": "/usr/bin:/usr/sbin", "HOME": "/root", "LANG": "C.UTF-8", "TMPDIR": "/tmp",
                "LMX_MOUNTS": "\n".join(mounts), **(env or {})}

    @property
    def daemon_pid(self):
        """The daemon's process as the host numbers it, None when there is none (any more)."""
        if self._daemon is None and self.process is not None:
            for init in children_of(self.process.pid):
                for child in children_of(init):
                    if _name(child) == "lmxagentd":
                        self._daemon = child
        return self._daemon

    def pid_inside(self):
        """The daemon's process as the sandbox numbers it."""
        status = Path(f"/proc/{self.daemon_pid}/status").read_text()
        return int(next(l for l in status.splitlines() if l.startswith("NSpid:")).split()[-1])

    def path(self, inside):
        """The host's path of what the sandbox calls `inside`. Leads through the daemon while it runs, since file
        systems mounted in there are visible nowhere else."""
        view = Path(f"/proc/{self.daemon_pid}/root") if self.daemon_pid else self.root
        if not view.exists():
            view = self.root
        return view / inside.lstrip("/")

    def signal(self, number):
        os.kill(self.daemon_pid, number)

    def freeze(self):
        """Stops the daemon, and returns when none of its threads runs any more."""
        self.signal(signal.SIGSTOP)
        tasks = Path(f"/proc/{self.daemon_pid}/task")
        wait_until(lambda: all(_state(task) == "T" for task in tasks.iterdir()), what="the daemon standing still")

    def thaw(self):
        self.signal(signal.SIGCONT)

    def wait(self, timeout=20.0):
        """The daemon's exit status, 128 + n when signal n ended it. The process tree is gone afterwards."""
        try:
            status = self.process.wait(timeout)
        except subprocess.TimeoutExpired:
            raise AssertionError(f"the daemon has not ended within {timeout} s") from None
        self.process = None
        self._daemon = None
        return status

    def kill(self):
        """Ends the whole process tree at once, whatever it does."""
        if self.process is None:
            return
        for init in children_of(self.process.pid):
            os.kill(init, signal.SIGKILL)
        self.process.kill()
        self.process.wait(10)
        self._held.unlink(missing_ok=True)
        self.process = None
        self._daemon = None

    def remove(self):
        self.kill()
        self._directory.cleanup()


def children_of(pid):
    try:
        return [int(word) for word in Path(f"/proc/{pid}/task/{pid}/children").read_text().split()]
    except (FileNotFoundError, ProcessLookupError):
        return []


def _state(task):
    """The scheduler's letter for a thread; T when a signal has stopped it, or when it has ended."""
    try:
        return (task / "stat").read_text().rpartition(") ")[2][0]
    except (FileNotFoundError, ProcessLookupError):
        return "T"


def _name(pid):
    try:
        return Path(f"/proc/{pid}/comm").read_text().strip()
    except (FileNotFoundError, ProcessLookupError):
        return ""
