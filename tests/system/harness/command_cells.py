"""Which command came in which state, as the log tells it: the cells of the table in docs/architecture.md."""
import contextlib
import re
import time

STATES = ("idle", "preparing", "recording", "paused", "stopping", "finishing", "offline")
COMMANDS = ("START", "STOP", "PAUSE", "RESUME", "CANCEL")
EVENTS = (*COMMANDS, *(f"timed {command}" for command in COMMANDS), "STATUS", "USR1", "USR2", "HUP", "INT", "TERM",
          "KILL", "loss", "shortage")
IMPOSSIBLE = {("loss", state): "no device is open" for state in ("idle", "finishing")}  # by construction
CANCELLED_FOR = 0.05  # seconds; the end of a cancelled capture has no line of its own

COMMAND = re.compile(r"^Command is \[(START|STOP|PAUSE|RESUME|CANCEL|STATUS)\b(?:.*\bn=(\d+))?")


class Recorder:
    """Follows the log from line to line."""

    def __init__(self):
        self.state = "idle"
        self.stopping = self.finishing = 0
        self.cancelled = 0.0  # when
        self.offline = False
        self.refused = frozenset()  # the numbers of the STARTs that were refused because there was no room
        self.hit = set()

    def states(self, at):
        """The states that an event at this moment finds."""
        behind = {"stopping"} if self.stopping or at < self.cancelled + CANCELLED_FOR else set()
        behind |= {"finishing"} if self.finishing else set()
        now = {self.state} if self.state != "idle" or not behind else behind
        return now | {"offline"} if self.offline else now

    def event(self, name, at):
        self.hit |= {(name, state) for state in self.states(at)}

    def line(self, text, at):
        command = COMMAND.match(text)
        if command:
            self.event(command[1], at)
            if command[2] and int(command[2]) in self.refused:
                self.event("shortage", at)
        if text.startswith("Capture device lost: "):
            self.event("loss", at)
        self._follow(text, at)

    def _follow(self, text, at):
        if re.search(r"^lmxagentd \(version", text):
            self.state, self.stopping, self.finishing, self.offline = "idle", 0, 0, False
        elif text == "Process prepareCapture" and self.state == "idle":
            self.state = "preparing"
        elif text.endswith(("recording started", "recording resumed")):
            self.state = "recording"
        elif "recording paused (" in text:
            self.state = "paused"
        elif text in ("Process stopCapture", "Process cancelCapture"):
            self._end(text, at)
        elif text == "Submitting Stopped Recording":
            self._submit()
        elif re.search(r"recording stopped \(|^The recording could not be finished", text):
            self.finishing = max(0, self.finishing - 1)
        elif re.search(r"below threshold|^The capture could not be prepared", text) and self.state == "preparing":
            self.state = "idle"
        elif text.startswith(("Got Signal (SIGHUP)", "Unable to acquire the specified video device")):
            self.offline = True
        elif text.startswith("Connecting to lmxserverd tunnel"):
            self.offline = False

    def _end(self, text, at):
        if self.state in ("recording", "paused"):
            self.state = "idle"
            if text == "Process stopCapture":
                self.stopping += 1
            else:
                self.cancelled = at

    def _submit(self):
        if self.stopping:
            self.stopping -= 1
        elif self.state in ("recording", "paused"):  # nobody has stopped it
            self.state = "idle"
        self.finishing += 1


class StateWatch:
    """Waits for states of the recorder."""

    def __init__(self, log, mark):
        self._log, self._seen, self._recorder = log, mark, Recorder()

    def states(self):
        """What the log so far tells."""
        lines = self._log.lines("", after=self._seen)
        self._seen += len(lines)
        for line in lines:
            self._recorder.line(line.text, line.at)
        return self._recorder.states(time.monotonic())

    def wait(self, wanted, timeout):
        """Waits until the recorder is in one of the states `wanted`. @return whether it came to that"""
        end = time.monotonic() + timeout
        while not self.states() & wanted:
            if time.monotonic() > end:
                return False
            with contextlib.suppress(AssertionError):
                self._log.wait("", 0.2, after=self._seen)
        return True


def cells_hit(lines, arrivals=(), refused=()):
    """The (event, state) pairs in the log's lines. `arrivals` are further events and when they came, on the log's
    clock; `refused` the numbers of the STARTs that found no room."""
    recorder = Recorder()
    recorder.refused = frozenset(refused)
    happened = [(line.at, line.text, "") for line in lines] + [(at, "", name) for name, at in arrivals]
    for at, text, name in sorted(happened, key=lambda entry: entry[0]):
        if name:
            recorder.event(name, at)
        else:
            recorder.line(text, at)
    return recorder.hit


def cells_missed(hit):
    """The cells that no event has come to, a line for each event."""
    missed = {event: [state for state in STATES if (event, state) not in hit and (event, state) not in IMPOSSIBLE]
              for event in EVENTS}
    return [f"{event}: {', '.join(states)}" for event, states in missed.items() if states]


def cells_impossible():
    """The cells that can't be reached, and why."""
    return [f"{event}, {state}: {reason}" for (event, state), reason in IMPOSSIBLE.items()]


def arrivals(operations, clock):
    """What `operations` says of events that the log shows too late: signals, and timed commands, which wait for the
    main thread. `clock` leads from the log's clock to the wall clock."""
    found = [(op.verb, op.sent - clock) for op in operations if op.way == "signal"]
    return found + [(f"timed {op.verb}", op.due - clock) for op in operations if op.due]


def refused_for_room(operations):
    return [op.number for op in operations if op.verb == "START" and any(text.startswith("cmdStatus=30")
                                                                         for text in op.replies)]
