"""Random sequences of commands, signals and mishaps, each made from its seed alone."""
import random
from dataclasses import dataclass, field

COMMANDS = {"START": 28, "STOP": 20, "PAUSE": 10, "RESUME": 10, "CANCEL": 6, "STATUS": 18, "BAD": 3, "USR1": 2,
            "USR2": 3}
TIMED = {"START": 10, "STOP": 10, "CANCEL": 2, "PAUSE": 1, "RESUME": 1}
THEMES = {"serial": 28, "parallel": 30, "aimed": 18, "timed": 12, "restart": 7, "hang-up": 2, "shortage": 2, "loss": 1}
WAYS = ("local", "tunnel")
ENDING = ("HUP", "INT", "TERM", "KILL")
AIMED = {"START": 4, "STOP": 4, "PAUSE": 4, "RESUME": 4, "CANCEL": 4, "STATUS": 2, "USR1": 2, "USR2": 2, "HUP": 0.5,
         "INT": 1, "TERM": 1, "KILL": 1, "TIMED START": 1, "TIMED STOP": 1, "TIMED PAUSE": 1, "TIMED RESUME": 1,
         "TIMED CANCEL": 1}
TARGETS = ("idle", "preparing", "recording", "paused", "stopping", "stopping", "finishing", "finishing")


@dataclass(frozen=True)
class Event:
    """One step: what (a verb, "TIMED verb", or a mishap), by which way, how long after the step before. WAIT: until so
    long before the next full second."""

    verb: str
    way: str
    delay: float
    ahead: int = 0  # of a timed command: seconds from now, rounded down

    def __str__(self):
        return f"{self.delay * 1000:4.0f} ms {self.way:6} {self.verb}" + (f" in {self.ahead} s" if self.ahead else "")


@dataclass
class Sequence:
    """Lanes run at the same time; the steps of one lane one after the other."""

    seed: int
    theme: str
    lanes: list = field(default_factory=list)
    last: str = "STOP"
    tool_delay: float = 0.0

    def __str__(self):
        lines = [f"seed {self.seed}, {self.theme}, the tool takes {self.tool_delay} s, {self.last} at the end"]
        for number, lane in enumerate(self.lanes):
            lines += [f"  lane {number}"] + [f"    {event}" for event in lane]
        return "\n".join(lines)

    def prefix(self, count):
        """The same with the first `count` steps, counted lane by lane in turn."""
        longest = max(len(lane) for lane in self.lanes)
        order = [(i, lane) for i in range(longest) for lane in range(len(self.lanes)) if i < len(self.lanes[lane])]
        kept = order[:count]
        lanes = [[self.lanes[l][i] for i, l in kept if l == lane] for lane in range(len(self.lanes))]
        return Sequence(self.seed, self.theme, lanes, self.last, self.tool_delay)

    def length(self):
        return sum(len(lane) for lane in self.lanes)


def chosen(dice, weights):
    return dice.choices(list(weights), list(weights.values()))[0]


def delay(dice):
    """Often nothing at all, so that commands meet; at most 0.4 s."""
    return dice.choice((0.0, 0.0, dice.uniform(0, 0.05), dice.uniform(0, 0.4), dice.uniform(0.2, 0.4)))


def step(dice, way=None):
    verb = chosen(dice, COMMANDS)
    return Event(verb, "signal" if verb.startswith("USR") else way or dice.choice(WAYS), delay(dice))


def sequence(seed, theme=None):
    """The sequence of a seed."""
    dice = random.Random(seed)
    theme = theme or chosen(dice, THEMES)
    made = Sequence(seed, theme, last="CANCEL" if dice.random() < 0.15 else "STOP",
                    tool_delay=dice.choice((0.0, 0.0, 0.2, 0.6)))
    if theme == "parallel":
        made.lanes = [[step(dice, way) for _ in range(dice.randint(2, 6))] for way in WAYS]
        if dice.random() < 0.4:
            made.lanes.append([Event(dice.choice(("USR1", "USR2")), "signal", delay(dice)) for _ in range(2)])
    elif theme == "aimed":
        made.lanes = aimed(dice)
    else:
        made.lanes = [[step(dice) for _ in range(dice.randint(4, 10))]]
    if theme == "timed":
        made.lanes.append([Event("TIMED " + chosen(dice, TIMED), dice.choice(WAYS), dice.uniform(0, 0.1),
                                 dice.choice((1, 1, 2))) for _ in range(dice.randint(1, 5))])
    made.lanes += mishap(dice, theme)
    return made


def aimed(dice):
    """One event that is to find the recorder in a certain state, some of which last for a few milliseconds."""
    verb, target = chosen(dice, AIMED), dice.choice(TARGETS)
    way = "signal" if verb in (*ENDING, "USR1", "USR2") else "local"
    lead = [Event("START", "local", 0.0)] if target not in ("idle", "preparing") else []
    if target == "paused" or (lead and dice.random() < 0.2):
        lead.append(Event("PAUSE", "local", dice.uniform(0.1, 0.3)))
    if target in ("stopping", "finishing"):
        lead.append(Event("STOP", dice.choice(WAYS), dice.uniform(0.1, 0.4)))
    moment = {"idle": 0.0, "recording": 0.2, "paused": 0.05, "preparing": dice.uniform(0.005, 0.03),
              "stopping": dice.uniform(0.0, 0.02), "finishing": dice.uniform(0.0, 0.05)}[target]
    if verb.startswith("TIMED"):
        before = sum(event.delay for event in lead) + moment
        start = [Event("START", "tunnel", 0.0)] if target == "preparing" else []
        return [[Event(verb, "local", 0.0, 2), Event("WAIT", "world", before % 1), *lead, *start]]
    if target == "preparing":
        return [[Event("START", "tunnel", 0.0)], [Event(verb, way, moment)]]
    return [[*lead, Event(verb, way, moment)]]


def mishap(dice, theme):
    """The lane of what goes wrong."""
    if theme == "restart":
        return [[Event(dice.choice(("TERM", "INT", "KILL", "KILL")), "signal", dice.uniform(0, 1.5))]]
    if theme == "hang-up":
        return [[Event("HUP", "signal", dice.uniform(0, 1.0))]]
    if theme == "shortage":
        return [[Event("SHORTAGE", "world", dice.uniform(0, 0.5)), Event("ROOM", "world", dice.uniform(0.3, 1.0))]]
    if theme == "loss":
        return [[Event("LOSS", "world", dice.uniform(0, 0.4))]]
    return []
