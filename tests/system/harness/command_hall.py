"""A hall under test: one daemon that sequences of commands are played to, by several at once."""
import contextlib
import itertools
import signal
import threading
import time
from concurrent.futures import ThreadPoolExecutor

from .agent import TIMERS
from .command_cells import StateWatch
from .command_model import PROCESS_ENDS, Operation
from .command_peers import PATIENCE, Gone, LocalPeer, TunnelPeer, replies_in
from .command_timed import TimedList
from .commands import command_line, start_parameters, timed_line
from .waiting import let_pass, wait_until

CLOCK = time.time() - time.monotonic()  # from the log's clock to the wall clock
TUNNEL_AWAY = 13.0  # seconds after a SIGHUP; when it comes back the timers file is read again
SMALL_CAMERA = "test://video?size=320x180&fps=30"
JOBS = "/var/lmx/agent/jobs"
ROOM, NO_ROOM = "1", "2000000000"  # megabytes that must be free
SIGNAL_LINES = {"USR1": r"^Got Pause Signal$", "USR2": r"^Got Resume Signal$", "HUP": r"^Got Signal \(SIGHUP\)$",
                "INT": r"^Got Stop Signal", "TERM": r"^Got Termination Signal"}


class Hall:
    """Plays single steps to the daemon and remembers what was done as operations."""

    def __init__(self, agent):
        self.agent = agent
        self._numbers = itertools.count(1)
        self._up = threading.Event()  # the daemon may be talked to
        self._lives = 1  # of the daemon
        self._hang_up = 0.0  # when the last SIGHUP was sent
        self._turn = {"local": threading.Lock(), "tunnel": threading.Lock(), "signal": threading.Lock()}
        self.tunnel = None
        self.short = False
        # The daemon is killed when the thread that has started it ends: the lanes end sooner.
        self._starter = ThreadPoolExecutor(1)
        self.begin_sequence("")
        self._preferences()
        self._start()

    def begin_sequence(self, name):
        self.name, self.operations, self.complaints = name, [], []
        self._titles, self._guard = itertools.count(1), threading.Lock()
        self._timed = TimedList()  # their replies may come in between, on the tunnel when their channel has gone
        # Timed commands from before the sequence answer in it.
        self._unasked = time.time() < self._hang_up + TUNNEL_AWAY
        self._frozen = threading.Event()
        self._first_life = self._lives
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
        self._lives += 1
        sent = time.time()
        status = end()
        done = time.time()
        self.note(verb, way, sent, done)
        if status != {"KILL": 137, "END": 1}.get(verb, 0):
            self.complain(f"{verb}: the daemon ended with status {status}\n{self.agent.errors()}")
        self.tunnel.close()
        begun = time.time()
        self._unasked = bool(self.agent.path(TIMERS).exists() and self.agent.timers())
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
        if event.frozen:
            self._frozen.wait(5)
        let_pass(max(0.0, self._delay(event)), "the sequence says so")
        self._up.wait(PATIENCE)
        if event.verb in ("TERM", "INT", "KILL"):
            self.restart(lambda: self.agent.stop(getattr(signal, "SIG" + event.verb), 40), event.verb)
        elif event.verb == "WAIT":
            return
        elif event.verb == "FREEZE":
            self._freeze(event)
        elif event.way == "signal":
            self._signal(event.verb)
        elif event.verb in ("SHORTAGE", "ROOM"):
            self._change_room(event.verb)
        elif event.verb == "LOSS":
            self._change(RecordingVideoInput=SMALL_CAMERA + "&lost-after=1")
        elif event.verb == "GONE":
            self.note("GONE", "world", *self._change(RecordingVideoInput=SMALL_CAMERA + "&lost-after=0"))
        elif event.verb.startswith("TIMED "):
            self._schedule(event)
        else:
            self.command(event.verb, event.way)

    def _delay(self, event):
        if event.verb == "FREEZE":
            return 0.0
        return self._timed.latest() - event.delay - time.time() if event.verb == "WAIT" else event.delay

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
            return at, tuple(reply for reply in replies_in(text) if "recordStatus" in reply)[-1:]
        if not (self._timed or self._unasked):
            return at, replies_in(text)
        self._wait_read(rf"^Command is \[{line.split(' ')[0]} .*\bn={number}\b")
        peer.send("STATUS n=0")
        came = text
        while "recordStatus" not in text:
            text, at = peer.next()
            came += text
        return at, replies_in(came[:came.index("cmdStatus=0,recordStatus")])

    def _wait_read(self, pattern):
        """Waits for the log's line that says that a command has been read; Gone when the daemon ends before."""
        life, end = self._lives, time.monotonic() + PATIENCE
        while not self.agent.log.lines(pattern, after=self.mark):
            if life != self._lives or not self.agent.alive():
                raise Gone
            assert time.monotonic() < end, f"no log line {pattern}"
            with contextlib.suppress(AssertionError):
                self.agent.log.wait(pattern, 0.2, after=self.mark)

    # Timed commands --------------------------------------------------------------------------------------------

    def _schedule(self, event):
        verb, number = event.verb.split(" ")[1], next(self._numbers)
        title = f"{self.name}-{next(self._titles)}" if verb == "START" else ""
        parameters = self.start_parameters(title, number) if title else {"n": str(number)}
        due = int(time.time()) + event.ahead
        self._timed.add(verb, due, number, title)
        answer = self._ask(timed_line(verb, due, TimerID=f"T{number}", **parameters), event.way, number)
        if answer and answer[3]:
            self._timed.answered(answer[2])

    def wait_timed(self):
        """Waits until all timed commands have run, or have expired while there was no daemon, and notes them."""
        if not self._timed:
            return self.wait_main() if self._unasked else None
        if self._lives != self._first_life:
            self.wait_main()  # until then the timers file may not have been read
        with contextlib.suppress(AssertionError):
            wait_until(lambda: not self._timed.waiting(self._lines()), PATIENCE, "the timed commands")
        self.wait_main()  # no reply of a timed command comes later
        ends = [op for op in self.operations if op.verb in PROCESS_ENDS]
        operations, complaints = self._timed.outcome(self._lines(), CLOCK, ends)
        self.operations += operations
        self.complaints += complaints

    def _lines(self):
        return self.agent.log.lines("", after=self.mark)

    def wait_main(self):
        """Lets the main thread's turn come on both ways: what it did before has been answered."""
        for way in ("local", "tunnel"):
            self.command("RESUME", way)

    # Signals and mishaps ---------------------------------------------------------------------------------------

    def _freeze(self, event):
        """Stops the daemon in a state that lasts for milliseconds only, so that others can be sure to meet it, and
        lets it go again after a while or when the timed command is due."""
        state = event.way
        passing = {"stopping", "finishing"} if state == "finishing" else {state}
        watch = StateWatch(self.agent.log, self.mark)
        sandbox = self.agent.sandbox
        with contextlib.suppress(OSError, TypeError, AssertionError):  # the daemon may be killed meanwhile
            if watch.wait(passing, 5):
                sandbox.freeze()
                let_pass(0.002, "the log's reader catches up")
                while not watch.states() & {state} and watch.states() & passing:
                    sandbox.thaw()
                    let_pass(0.0002, "a little of the daemon's work")
                    sandbox.freeze()
                    let_pass(0.002, "the log's reader catches up")
            self._frozen.set()
            until = self._timed.latest() + 0.005 - time.time() if event.ahead else event.delay
            let_pass(max(0.0, until), "the others meet the daemon in this state")
            sandbox.thaw()
        self._frozen.set()

    def _signal(self, verb):
        with self._turn["signal"]:
            mark, sent = self.agent.log.mark(), time.time()
            if not self.agent.alive():
                return
            self._hang_up = sent if verb == "HUP" else self._hang_up
            try:
                self.agent.sandbox.signal(getattr(signal, "SIG" + verb))
                line = self.agent.log.wait(SIGNAL_LINES[verb], 5, after=mark)
            except (AssertionError, OSError, TypeError):
                self.note(verb, "signal", sent, time.time(), optional=True)
                return
            self.note(verb, "signal", sent, line.at + CLOCK + 0.2)

    def _change(self, **preferences):
        """Changes preferences. @return when, and when they were in force"""
        mark, sent = self.agent.log.mark(), time.time()
        self._preferences(**preferences)
        self.agent.log.wait(r"^Reading preferences\.\.\.$", 5, after=mark)
        let_pass(0.05, "the line comes before the settings are in force")
        return sent, time.time()

    def _change_room(self, verb):
        sent, done = self._change(RecordingDiskSpaceCutoffInMB=NO_ROOM if verb == "SHORTAGE" else ROOM)
        self.note(verb, "world", sent, done)
        self.short = verb == "SHORTAGE"
        if verb == "ROOM":
            short = next(op for op in self.operations if op.verb == "SHORTAGE")
            self.note("GUARD", "world", short.sent, done, optional=True)

    def make_room(self):
        """Ends a shortage."""
        if self.short:
            self._change_room("ROOM")

    def end_of_loss(self, sent):
        """After a sequence with a camera that goes: the daemon ends by itself if a recording has lost it."""
        def has_come(pattern, timeout):
            try:
                return bool(self.agent.log.wait(pattern, timeout, after=self.mark))
            except AssertionError:
                return False
        with contextlib.suppress(OSError):  # it may be about to end
            if self.agent.command("STATUS").fields.get("recordStatus", "0") != "0":
                has_come("^Capture device lost: ", 4)
        lost = has_come("^Capture device lost: ", 0.3)  # a stopped one waits for its last frame
        ended = lost and has_come(r"^The capture device has been disconnected\.$", 8)
        self._preferences()
        for op in list(self.operations):
            if op.verb == "START":
                self.note("LOSS", "world", sent, time.time(), optional=True)
        if ended:
            self.restart(self.agent.wait_exit, "END", "world")

    # At the end ------------------------------------------------------------------------------------------------

    def wait_still(self):
        """Waits until nothing is recorded or finished any more."""
        with contextlib.suppress(AssertionError):
            wait_until(self._is_still, 5, "an idle recorder")

    def _is_still(self):
        try:
            # An empty folder may be left by a kill; one that records holds its journal.
            captures = [name for name in self.agent.repository() if name.startswith(".lmxagentd/") and "/" in name[11:]]
        except FileNotFoundError:  # one is just being removed
            return False
        return not captures and self.agent.command("STATUS").fields["recordStatus"] == "0"

    def wait_quiet(self, timeout):
        """Waits until nothing is recorded, finished or submitted any more, and says whether it came to that."""
        try:
            wait_until(self._is_quiet, timeout, "quiet", interval=0.1)
            return True
        except AssertionError:
            return False

    def unrest(self):
        """What keeps it from being quiet."""
        jobs = self.agent.path(JOBS)
        hidden = [name for name in self.agent.repository() if name.startswith(".")]
        return hidden, sorted(job.name for job in jobs.iterdir()), self.agent.command("STATUS").text

    def _is_quiet(self):
        jobs = self.agent.path(JOBS)
        return self._is_still() and not (jobs.exists() and list(jobs.iterdir()))
