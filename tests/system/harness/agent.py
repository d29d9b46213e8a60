"""The daemon as a test sees it: preferences in, commands over the local socket, log, movies and tool calls out."""
import base64
import json
import plistlib
import re
import signal
import socket
import subprocess
from pathlib import Path

from .commands import exchange, start_line
from .document import read_document
from .log_reader import Level, LogReader
from .sandbox import HARNESS, Sandbox
from .waiting import wait_until

REPOSITORY = "/var/lmx/agent/recordings"
PREFERENCES = "/Library/Preferences/com.zandor.lmxagentd.plist"
TIMERS = "/var/lmx/agent/timers"
SERVER_UUID = "5E1F0A52-6B1D-4E8C-9A52-0F6C4C1B7E11"
SECRET = bytes(range(16))
DEFAULTS = {
    "CameraName": "Hall 3",
    "CameraUUID": "0B7C9E54-22A1-4C57-8E57-3D1F2B6A9C01",
    "ServerUUID": SERVER_UUID,
    "LumexURL": "lumex.example.test",
    "TunnelHost": "127.0.0.1",
    "TunnelPort": "8175",
    "RecordingRepositoryPath": REPOSITORY,
    "RecordingType": "Audio+Video",
    "RecordingVideoInput": "test://video?size=640x360&fps=30",
    "RecordingAudioInput": "test://audio",
    "RecordingCapturePreset": "Video:Good",
    "RecordingVideoMaximumFrameRate": "30",
    "RecordingDiskSpaceCutoffInMB": "1",
    "PreviewIntervalInMilliseconds": "400",
}


class Agent:
    """One daemon in one sandbox. close() ends and removes everything."""

    def __init__(self, binary, registry=None):
        self.sandbox = Sandbox(binary)
        self.log = LogReader(self.sandbox.root / "dev/log")
        self.registry = registry
        self.set_tool()
        self.secret(base64.b64encode(SECRET).decode())
        self.preferences()

    # What the daemon reads -------------------------------------------------------------------------------------

    def preferences(self, **changes):
        """Replaces the preferences file atomically: the defaults with `changes`; None leaves a key out."""
        content = {key: value for key, value in {**DEFAULTS, **changes}.items() if value is not None}
        self.preferences_bytes(plistlib.dumps(content))

    def preferences_bytes(self, data):
        path = self.path(PREFERENCES)
        temporary = path.with_suffix(".tmp")
        temporary.write_bytes(data)
        temporary.rename(path)

    def secret(self, text):
        """Writes the shared secret's file; None removes it."""
        path = self.path(f"/var/lmx/agent/secrets/{SERVER_UUID}.plist")
        if text is None:
            path.unlink()
        else:
            path.write_bytes(plistlib.dumps({"lmx_secret": text}))

    def set_tool(self, *rules, present=True):
        """Puts the stand-in tool in place with `rules` (see lumex_stand_in.py), or takes it away."""
        tool = self.path("/usr/bin/lumex")
        if present:  # never absent meanwhile: a job may be about to start it
            new = tool.with_suffix(".new")
            new.write_bytes((HARNESS / "lumex_stand_in.py").read_bytes())
            new.chmod(0o755)
            new.rename(tool)
        else:
            tool.unlink(missing_ok=True)
        script = self.path("/var/tool/script.json")
        script.with_suffix(".tmp").write_text(json.dumps(rules))
        script.with_suffix(".tmp").rename(script)

    def release_tool(self):
        """Lets hanging tools go on."""
        self.path("/var/tool/release").touch()

    # Its life --------------------------------------------------------------------------------------------------

    def prepare(self, env=None, **sandbox_options):
        """Sets up the sandbox with its network but holds the daemon back until start(). A server that listens by then
        is reached at the first attempt, instead of five seconds later."""
        self.sandbox.prepare(env=self._environment(env), **sandbox_options)
        return self

    def start(self, wait=True, env=None, **sandbox_options):
        if not self.sandbox.held():
            sandbox_options["env"] = self._environment(env)
        self.sandbox.start(**sandbox_options)
        if wait:
            self.wait_started()
        return self

    def run(self, *arguments, env=None, **options):
        """Runs the program with `arguments` to its end, beside the daemon when that runs."""
        return self.sandbox.run(*arguments, env=self._environment(env), **options)

    def popen(self, *arguments, env=None):
        """Starts the program with `arguments` and does not wait for its end."""
        return self.sandbox.popen(arguments, env=self._environment(env))

    def in_network(self, *command):
        """Runs a command in the agent's network namespace."""
        subprocess.run([*self.sandbox.entering("net"), *command], check=True)

    def _environment(self, env):
        environment = dict(env or {})
        if self.registry:
            inside = self.sandbox.root / "var/cache/gstreamer.registry"
            if not inside.exists():
                inside.write_bytes(Path(self.registry).read_bytes())
            environment |= {"GST_REGISTRY": "/var/cache/gstreamer.registry", "GST_REGISTRY_UPDATE": "no"}
        return environment

    def wait_started(self, timeout=20.0):
        """Waits until the local socket answers."""
        def answers():
            assert self.sandbox.process.poll() is None, "the daemon has ended:\n" + self.report()
            try:
                return self.command("STATUS", timeout=timeout)
            except (FileNotFoundError, ConnectionRefusedError):
                return None
        return wait_until(answers, timeout, "the local socket")

    def stop(self, number=signal.SIGTERM, timeout=20.0):
        """Ends the daemon with a signal. @return its exit status"""
        self.sandbox.signal(number)
        return self.sandbox.wait(timeout)

    def kill9(self):
        return self.stop(signal.SIGKILL)

    def wait_exit(self, timeout=20.0):
        return self.sandbox.wait(timeout)

    def alive(self):
        return self.sandbox.process is not None and self.sandbox.process.poll() is None

    def close(self):
        self.sandbox.kill()
        self.log.close()
        self.sandbox.remove()

    def errors(self):
        return self.sandbox.errors.read_text(errors="replace") if self.sandbox.errors.exists() else ""

    def report(self):
        return f"--- log\n{self.log.tail()}\n--- standard error\n{self.errors()}"

    # Talking to it ---------------------------------------------------------------------------------------------

    def connect(self, timeout=20.0):
        peer = socket.socket(socket.AF_UNIX, socket.SOCK_STREAM)
        peer.settimeout(timeout)
        try:
            peer.connect(str(self.sandbox.root / "var/run/lmxagentd.comm"))
        except OSError:
            peer.close()
            raise
        return peer

    def command(self, line, timeout=20.0):
        """Sends one line on a connection of its own. @return the reply"""
        with self.connect(timeout) as peer:
            return exchange(peer, line)

    def send(self, line):
        """Sends one line that gets no reply; a STATUS behind it proves that none came."""
        before = self.log.mark()
        with self.connect() as peer:
            peer.sendall(line.encode() + b"\n")
            # Sent before the line is done, the STATUS might join its chunk and wait with it.
            self.log.wait(rf"^Command: {re.escape(line.split(' ')[0])} took", after=before, timeout=5)
            return exchange(peer, "STATUS").text

    def start_recording(self, uuid, minutes="60", unattended="60", timeout=20.0, **parameters):
        return self.command(start_line(uuid, minutes, unattended, **parameters), timeout)

    def let_record(self, seconds):
        """Waits until the running recording holds so many whole seconds of media; pauses don't count. A timed command that
        is due answers whoever is connected just then: such an answer has no time."""
        wait_until(lambda: int(self.command("STATUS").fields.get("elapsedTime", 0)) >= seconds, seconds + 20,
                   f"{seconds} s of media", interval=0.1)

    def wait_idle(self):
        """Waits until no recording runs or is being finished."""
        wait_until(lambda: self.command("STATUS").fields["recordStatus"] == "0", 30, "an idle recorder")

    def record(self, uuid, seconds=1, **parameters):
        """Makes a recording from START to STOP and waits for its movie. @return the replies to START and STOP"""
        start = self.start_recording(uuid, **parameters)
        assert start.text == "cmdStatus=0", start.text
        self.let_record(seconds)
        mark = self.log.mark()
        stop = self.command("STOP")
        assert stop.text == "cmdStatus=0", stop.text
        self.wait_recorded(uuid, after=mark)
        return start, stop

    # What it leaves behind -------------------------------------------------------------------------------------

    def path(self, inside):
        return self.sandbox.path(inside)

    def movie(self, uuid):
        return self.path(f"{REPOSITORY}/{uuid}.mov")

    def repository(self):
        """Every file and directory below the repository, hidden ones too."""
        top = self.path(REPOSITORY)
        return sorted(str(entry.relative_to(top)) for entry in top.rglob("*"))

    def document(self, uuid, directory=REPOSITORY):
        """The properties document of a recording."""
        return read_document(self.path(f"{directory}/{uuid}.xml"))

    def timers(self):
        """The scheduled commands, as they are stored."""
        return plistlib.loads(self.path(TIMERS).read_bytes())

    def tool_calls(self, event="begin", having="--submit"):
        path = self.path("/var/tool/calls.jsonl")
        lines = path.read_text().splitlines() if path.exists() else []
        calls = [json.loads(line) for line in lines]
        return [c for c in calls if c["event"] == event and having in c["arguments"]]

    def submitted(self, event="begin"):
        """The recordings whose submission has begun or ended, in order."""
        return [call["arguments"][4] for call in self.tool_calls(event)]

    def wait_tool_call(self, uuid, timeout=30.0, event="begin"):
        """The call of the tool that submits recording `uuid`."""
        def called():
            return [c for c in self.tool_calls(event) if uuid in c["arguments"]]
        return wait_until(called, timeout, f"submission of {uuid}; {self.log.tail(40)}")[0]

    def wait_recorded(self, uuid, timeout=30.0, after=0):
        """Waits for the line that reports the movie in place. @return the duration in it, seconds"""
        path = re.escape(f"{REPOSITORY}/{uuid}.mov")
        line = self.log.wait(rf'^"{path}" recording stopped \(duration: \d+s\)$', timeout, after, level=Level.NOTICE)
        return int(re.search(r"(\d+)s\)$", line.text)[1])
