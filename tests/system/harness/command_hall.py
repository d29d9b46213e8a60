"""A hall under test: one daemon that sequences of commands are played to, by several at once."""
import contextlib
import itertools
import queue
import re
import signal
import socket
import threading
import time
from concurrent.futures import ThreadPoolExecutor

from .agent import DEFAULTS
from .command_model import Operation
from .commands import command_line, start_parameters, timed_line
from .tunnel_server import TunnelServer
from .waiting import let_pass, wait_until

PATIENCE = 20.0  # seconds for any single answer
CLOCK = time.time() - time.monotonic()  # from the log's clock to the wall clock
SMALL_CAMERA = "test://video?size=320x180&fps=30"
ROOM, NO_ROOM = "1", "2000000000"  # megabytes that must be free
SIGNAL_LINES = {"USR1": r"^Got Pause Signal$", "USR2": r"^Got Resume Signal$", "HUP": r"^Got Signal \(SIGHUP\)$",
                "INT": r"^Got Stop Signal", "TERM": r"^Got Termination Signal"}


class Gone(Exception):
    """The daemon, or the connection to it, has gone before it answered."""


def replies_in(text):
    return tuple("cmdStatus=" + piece for piece in text.split("cmdStatus=")[1:])


class TunnelPeer:
    """The server's end of the tunnel. Takes every connection; replies are read as they come."""

    def __init__(self, agent):
        self._server = TunnelServer(agent)
        self._replies = queue.Queue()
        self.open = threading.Event()
        self._connections = self._sent_on = 0
        self._closed = False
        self._thread = threading.Thread(target=self._serve, daemon=True)
        self._thread.start()

    def _serve(self):
        while not self._closed:
            try:
                self._server.accept(0.2)
                self._server.peer.settimeout(None)
                self._connections += 1
                self.open.set()
                while True:
                    self._replies.put((self._server.reply().rstrip("\n"), time.time()))
            except TimeoutError:
                continue
            except (EOFError, OSError, ValueError, AssertionError):
                self.open.clear()

    def send(self, line):
        """What has come unasked before is not an answer."""
        while not self._replies.empty():
            self._replies.get_nowait()
        self._sent_on = self._connections
        try:
            self._server.send(line)
        except OSError as error:
            raise Gone from error

    def next(self):
        """The next reply and when it came; Gone when the connection that was asked has ended without one."""
        end = time.monotonic() + PATIENCE
        while time.monotonic() < end:
            asked = self.open.is_set() and self._sent_on == self._connections
            with contextlib.suppress(queue.Empty):
                return self._replies.get(timeout=0.2 if asked else 0.0)
            if not asked:
                raise Gone
        raise AssertionError("no reply on the tunnel")

    def close(self):
        self._closed = True
        with contextlib.suppress(OSError):  # closing alone would not wake the thread
            self._server.peer.shutdown(socket.SHUT_RDWR)
        self._thread.join(5)
        self._server.close()


class LocalPeer:
    """One connection to the local socket."""

    def __init__(self, agent):
        self._peer = agent.connect(PATIENCE)

    def send(self, line):
        try:
            self._peer.sendall(line.encode() + b"\n")
        except OSError as error:
            raise Gone from error

    def next(self):
        try:
            data = self._peer.recv(1 << 20)
        except TimeoutError:
            raise AssertionError("no reply on the local socket") from None
        except OSError as error:
            raise Gone from error
        if not data:
            raise Gone
        return data.decode(), time.time()

    def close(self):
        self._peer.close()


class Hall:
    """Plays single steps to the daemon and remembers what was done as operations."""

    def __init__(self, agent):
        self.agent = agent
        self._numbers = itertools.count(1)
        self._up = threading.Event()  # the daemon may be talked to
        self._turn = {"local": threading.Lock(), "tunnel": threading.Lock(), "signal": threading.Lock()}
        self.tunnel = None
        # The daemon is killed when the thread that has started it ends: the lanes end sooner.
        self._starter = ThreadPoolExecutor(1)
        self.begin_sequence("")
        self._preferences()
        self._start()

    def begin_sequence(self, name):
        self.name, self.operations, self.complaints = name, [], []
        self._titles, self._guard = itertools.count(1), threading.Lock()
        self._timed = []
        self._waiting = {"local": 0, "tunnel": 0}  # timed commands whose replies may come in between
        self.mark = self.agent.log.mark()

    def close(self):
        if self.tunnel:
            self.tunnel.close()
        self._starter.shutdown()

    def note(self, *details, **more):
        with self._guard:
            self.operations.append(Operation(*details, **more))

    def complain(self, text):
        with self._guard:
            self.complaints.append(text)

    # The process -----------------------------------------------------------------------------------------------

    def _preferences(self, **changes):
        self.agent.preferences(**{"RecordingVideoInput": SMALL_CAMERA, "RecordingDiskSpaceCutoffInMB": ROOM, **changes})

    def _start(self):
        self._starter.submit(self.agent.prepare).result()
        self.tunnel = TunnelPeer(self.agent)
        self.agent.start()
        wait_until(lambda: self.tunnel.open.is_set(), PATIENCE, "the tunnel")
        self._up.set()

    def restart(self, end, verb, way="signal"):
        """Has `end` end the daemon, and starts it anew."""
        self._up.clear()
        sent = time.time()
        status = end()
        done = time.time()
        self.note(verb, way, sent, done)
        if status != {"KILL": 137, "END": 1}.get(verb, 0):
            self.complain(f"{verb}: the daemon ended with status {status}\n{self.agent.errors()}")
        self.tunnel.close()
        begun = time.time()
        self._start()
        self.note("RESTART", "world", begun, time.time())

    def expect_alive(self):
        """Starts the daemon again if it has ended by itself, which is a complaint."""
        if not self.agent.alive():
            self.complain("the daemon has ended by itself")
            self.restart(self.agent.wait_exit, "TERM", "world")

    # Commands --------------------------------------------------------------------------------------------------

    def step(self, event):
        """Does what `event` says and notes it."""
        now = time.time()
        let_pass(event.delay if event.verb != "WAIT" else 1 - (now + event.delay) % 1, "the sequence says so")
        self._up.wait(PATIENCE)
        if event.verb in ("TERM", "INT", "KILL"):
            self.restart(lambda: self.agent.stop(getattr(signal, "SIG" + event.verb), 40), event.verb)
        elif event.verb == "WAIT":
            return
        elif event.way == "signal":
            self._signal(event.verb)
        elif event.verb in ("SHORTAGE", "ROOM"):
            self._change_room(event.verb)
        elif event.verb == "LOSS":
            self._preferences(RecordingVideoInput=SMALL_CAMERA + "&lost-after=1")
        elif event.verb.startswith("TIMED "):
            self._schedule(event)
        else:
            self.command(event.verb, event.way)

    def command(self, verb, way):
        number = next(self._numbers)
        title, line = self._line(verb, number)
        answer = self._ask(line, way, number)
        if answer is not None:
            way, sent, done, replies = answer
            self.note(verb, way, sent, done, replies, title, optional=not replies, number=number)

    def _line(self, verb, number):
        if verb == "BAD":
            return "", f"START RecordingMetadata_RECORDING_UUID=BAD,n={number}"
        if verb != "START":
            return "", f"{verb} n={number}"
        title = f"{self.name}-{next(self._titles)}"
        return title, command_line("START", self.start_parameters(title, number))

    @staticmethod
    def start_parameters(title, number):
        return {**start_parameters(title), "RecordingMetadata_TITLE": "Talk " + title, "n": str(number)}

    def _ask(self, line, way, number):
        """Sends a line. @return the way it took, when it was sent, when it was answered, what may be its reply; None
        when the daemon could not be reached"""
        if way == "tunnel" and not self.tunnel.open.is_set():
            way = "local"
        with self._turn[way]:
            try:
                peer = self.tunnel if way == "tunnel" else self._connect()
            except Gone:
                return None
            sent = time.time()
            try:
                peer.send(line)
                done, replies = self._answer(peer, line, way, number)
            except Gone:
                done, replies = time.time() + 1.0, ()
            finally:
                if way == "local":
                    peer.close()
        return way, sent, done, replies

    def _connect(self):
        for _ in range(50):
            try:
                return LocalPeer(self.agent)
            except OSError:
                self._up.wait(PATIENCE)
                let_pass(0.1, "the daemon is being started again, or is ending")
        raise Gone

    def _answer(self, peer, line, way, number):
        """Reads the reply. While timed commands wait, theirs may come before it: then a STATUS behind it shows where
        it must be among all that has come. That is sent alone, since of two lines that arrive together one is lost."""
        text, at = peer.next()
        if line.startswith("STATUS"):
            while "recordStatus" not in text:
                text, at = peer.next()
            return at, replies_in(text)[-1:]
        if not self._waiting[way]:
            return at, replies_in(text)
        self.agent.log.wait(rf"^Command is \[{line.split(' ')[0]} .*\bn={number}\b", PATIENCE, after=self.mark)
        peer.send("STATUS n=0")
        came = text
        while "recordStatus" not in text:
            text, at = peer.next()
            came += text
        return at, replies_in(came[:came.index("cmdStatus=0,recordStatus")])

    # Timed commands --------------------------------------------------------------------------------------------

    def _schedule(self, event):
        verb, number = event.verb.split(" ")[1], next(self._numbers)
        title = f"{self.name}-{next(self._titles)}" if verb == "START" else ""
        parameters = self.start_parameters(title, number) if title else {"n": str(number)}
        due = int(time.time()) + event.ahead
        self._waiting[event.way] += 1
        mark = self.agent.log.mark()
        if self._ask(timed_line(verb, due, TimerID=f"T{number}", **parameters), event.way, number) is None:
            return
        if self.agent.log.wait("^(Not s|S)cheduling ", 5, after=mark).text.startswith("Scheduling"):
            self._timed.append((due, number, verb, title))  # otherwise its time had passed when it was read

    def wait_timed(self):
        """Waits until all timed commands have run, and notes them."""
        if not self._timed:
            return
        running = r"^Running deferred command: "
        ran = [self.agent.log.wait(running, PATIENCE, after=self.mark, count=i + 1) for i in range(len(self._timed))]
        for line, (due, number, verb, title) in zip(ran, sorted(self._timed)):
            if not line.text.endswith(verb):
                self.complain(f"the timed {verb} {title} was due, but this ran: {line.text}")
            self.note(verb, "timed", float(due), line.at + CLOCK + 0.3, (), title, number=number, due=due)
        for way in self._waiting:  # waits for the main thread: no reply of a timed command comes later
            self.command("RESUME", way)

    # Signals and mishaps ---------------------------------------------------------------------------------------

    def _signal(self, verb):
        with self._turn["signal"]:
            mark, sent = self.agent.log.mark(), time.time()
            if not self.agent.alive():
                return
            try:
                self.agent.sandbox.signal(getattr(signal, "SIG" + verb))
                line = self.agent.log.wait(SIGNAL_LINES[verb], 5, after=mark)
            except (AssertionError, OSError, TypeError):
                self.note(verb, "signal", sent, time.time(), optional=True)
                return
            self.note(verb, "signal", sent, line.at + CLOCK + 0.2)

    def _change_room(self, verb):
        mark, sent = self.agent.log.mark(), time.time()
        self._preferences(RecordingDiskSpaceCutoffInMB=NO_ROOM if verb == "SHORTAGE" else ROOM)
        self.agent.log.wait(r"^Reading preferences\.\.\.$", 5, after=mark)
        let_pass(0.05, "the line comes before the settings are in force")
        done = time.time()
        self.note(verb, "world", sent, done)
        if verb == "ROOM":
            short = next(op for op in self.operations if op.verb == "SHORTAGE")
            self.note("GUARD", "world", short.sent, done, optional=True)

    def end_of_loss(self, sent):
        """After a sequence with a camera that goes: the daemon ends by itself if its last recording has lost it."""
        lost = [op for op in self.operations if op.verb == "START"]
        try:
            self.agent.log.wait(r"^The capture device has been disconnected\.$", 9, after=self.mark)
            ended = True
        except AssertionError:
            ended = False
        self._preferences()
        for _ in lost:
            self.note("LOSS", "world", sent, time.time(), optional=True)
        if ended:
            self.restart(self.agent.wait_exit, "END", "world")

    # At the end ------------------------------------------------------------------------------------------------

    def wait_quiet(self, timeout):
        """Waits until nothing is recorded, finished or submitted any more, and says whether it came to that."""
        try:
            wait_until(self._is_quiet, timeout, "quiet", interval=0.1)
            return True
        except AssertionError:
            return False

    def _is_quiet(self):
        status = self.agent.command("STATUS").fields["recordStatus"]
        begun, ended = self.agent.submitted(), self.agent.submitted("end")
        movies = len(self.agent.log.lines(r"recording stopped \(duration: "))
        captures = [name for name in self.agent.repository() if name.startswith(".lmxagentd/")]
        return status == "0" and not captures and len(begun) >= movies and len(ended) >= len(begun) - self.kills()

    def kills(self):
        """How many tools may have been killed with the daemon."""
        return len(self.agent.log.lines(r"lmxagentd \(version .*starting"))
