"""Which command came in which state, as the log tells it: the cells of the table in docs/architecture.md."""
import re

STATES = ("idle", "preparing", "recording", "paused", "stopping", "finishing", "offline")
COMMANDS = ("START", "STOP", "PAUSE", "RESUME", "CANCEL")
EVENTS = (*COMMANDS, *(f"timed {command}" for command in COMMANDS), "STATUS", "USR1", "USR2", "HUP", "INT", "TERM",
          "KILL", "loss", "shortage")
IMPOSSIBLE = {("loss", state) for state in ("idle", "preparing", "finishing", "offline")}  # no device is open then
CANCELLED_FOR = 0.05  # seconds; the end of a cancelled capture has no line of its own

SEEN = (  # what happens, by a line of the log
    (r"^Command is \[(START|STOP|PAUSE|RESUME|CANCEL|STATUS)\b", "{0}"),
    (r"^Running deferred command: (\w+)", "timed {0}"),
    (r"^Got Pause Signal$", "USR1"),
    (r"^Got Resume Signal$", "USR2"),
    (r"^Got Signal \(SIGHUP\)$", "HUP"),
    (r"^Got Stop Signal", "INT"),
    (r"^Got Termination Signal", "TERM"),
    (r"^\d+ MB is below threshold", "shortage"),
    (r"^Process killed$", "KILL"),
)


class Recorder:
    """Follows the log from line to line."""

    def __init__(self):
        self.state = "idle"
        self.stopping = self.finishing = 0
        self.cancelled = 0.0  # when
        self.offline = False
        self.hit = set()

    def states(self, at):
        """The states that an event at this moment finds."""
        behind = {"stopping"} if self.stopping or at < self.cancelled + CANCELLED_FOR else set()
        behind |= {"finishing"} if self.finishing else set()
        now = {self.state} if self.state != "idle" or not behind else behind
        return now | {"offline"} if self.offline else now

    def line(self, text, at):
        for pattern, name in SEEN:
            match = re.search(pattern, text)
            if match:
                self.hit |= {(name.format(*match.groups()), state) for state in self.states(at)}
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
            self.hit.add(("loss", self.state))
            self.state = "idle"
        self.finishing += 1


def cells_hit(lines, kills=()):
    """The (event, state) pairs in the log's lines; `kills` are the moments of kill -9, on the log's clock."""
    recorder = Recorder()
    for at, text in sorted([*((line.at, line.text) for line in lines), *((at, "Process killed") for at in kills)],
                           key=lambda entry: entry[0]):
        recorder.line(text, at)
    return recorder.hit


def cells_missed(hit):
    """The cells that no event has come to, a line for each event."""
    missed = {event: [state for state in STATES if (event, state) not in hit | IMPOSSIBLE] for event in EVENTS}
    return [f"{event}: {', '.join(states)}" for event, states in missed.items() if states]
