"""stop: from STOP to the finished movie in the repository."""
import contextlib
import os
import plistlib
import subprocess
import threading
import time

from ground import REPOSITORY, FirstFrame, movie_streams
from harness.waiting import wait_until
from measuring import median, threads
from report import Result, Row

TIME_SHIFT = "/var/lmx/agent/timeshift"


def seconds_from_stop(agent, uuid):
    """STOP and wait for the movie under its name."""
    path = agent.sandbox.root / f"{REPOSITORY.lstrip('/')}/{uuid}.mov"
    arrived = []

    def watch():
        while not path.exists():
            time.sleep(0.0003)
        arrived.append(time.monotonic())

    watcher = threading.Thread(target=watch, daemon=True)
    watcher.start()
    begin = time.monotonic()
    assert agent.command("STOP").text == "cmdStatus=0"
    watcher.join(120)
    assert arrived, "no movie 120 s after STOP"
    agent.wait_recorded(uuid, timeout=60)
    agent.wait_tool_call(uuid, event="end")
    return arrived[0] - begin, path


def timed(action):
    begin = time.monotonic()
    action()
    return time.monotonic() - begin


def copy(path, target, sync):
    subprocess.run(["cp", str(path), str(target)], check=True)
    if sync:
        subprocess.run(["sync", str(target)], check=True)


def copies(path, count, cold=False, sync=False):
    """Seconds that cp takes for the movie's bytes, into the same directory; with `sync` until they are on the disk."""
    target = path.with_name("copy.tmp")
    spent = []
    for _ in range(count):
        with open(path, "rb") as file:
            os.fsync(file.fileno())
            if cold:
                os.posix_fadvise(file.fileno(), 0, 0, os.POSIX_FADV_DONTNEED)
            else:
                while file.read(1 << 20):
                    pass
        spent.append(timed(lambda: copy(path, target, sync)))
        target.unlink()
    return spent


def renames(path, count):
    """Seconds of rename and a sync of the directory."""
    other = path.with_name("renamed.tmp")

    def rename(one, two):
        os.rename(one, two)
        directory = os.open(two.parent, os.O_RDONLY)
        os.fsync(directory)
        os.close(directory)

    spent = []
    for _ in range(count):
        spent.append(timed(lambda: rename(path, other)))
        os.rename(other, path)
    return spent


def cached_share(path):
    """Which part of a file is in memory, per cent; none when there is no fincore."""
    with contextlib.suppress(OSError, subprocess.CalledProcessError, ValueError):
        out = subprocess.run(["fincore", "-b", "-n", "-r", "-o", "RES", str(path)], capture_output=True, check=True)
        return 100 * int(out.stdout) / path.stat().st_size
    return None


def rows_for(name, stopped, path, count):
    ours = [1000 * value for value in stopped]
    peers = {"rename + sync": renames(path, count), "cp, warm cache": copies(path, count),
             "cp, cold cache": copies(path, count, cold=True), "cp + sync, warm cache": copies(path, count, sync=True)}
    rows = []
    for peer, spent in peers.items():
        theirs = [1000 * value for value in spent]
        rows.append(Row(name, median(ours), "ms", median(theirs), peer, limit=100,
                        samples={"ours": ours, "peer": theirs}))
    return rows


def live(ground):
    """Recordings of ten seconds in real time."""
    seconds, count = ground.pick((10, 3), (5, 1), (1, 1))
    with ground.agent(RecordingVideoInput="test://video?size=640x360") as agent:
        stopped = []
        for turn in range(count):
            assert agent.start_recording(f"LIVE-{turn}").text == "cmdStatus=0"
            FirstFrame(agent)
            time.sleep(seconds)
            spent, path = seconds_from_stop(agent, f"LIVE-{turn}")
            stopped.append(spent)
        note = f"live {seconds} s: {path.stat().st_size / 1e6:.1f} MB, {count} recordings"
        return Result(rows_for(f"STOP → movie, {seconds} s live", stopped, path, count), [note])


class FastHour:
    """Media made as fast as the machine can. A mark lies on the wall clock, and such a camera's frames run ahead of it:
    the operator's file of the time shift brings the mark of the end behind the last frame."""

    def __init__(self, agent, wanted):
        self.agent, self.wanted = agent, wanted
        self.begin = time.monotonic()
        assert agent.start_recording("HOUR").text == "cmdStatus=0"
        self.path = agent.sandbox.root / f"{REPOSITORY.lstrip('/')}/HOUR.mov"

    def elapsed(self):
        return int(self.agent.command("STATUS").fields["elapsedTime"])

    def record(self):
        """Records `wanted` seconds of media and pauses."""
        wait_until(lambda: self.elapsed() >= self.wanted, 900, "the media", interval=0.1)
        speed = self.elapsed() / (time.monotonic() - self.begin)
        # Further ahead than the media gets until the shift has been read and the pause has come.
        ahead = self.elapsed() + speed * 4 - (time.monotonic() - self.begin)
        file = self.agent.path(TIME_SHIFT)
        file.with_suffix(".tmp").write_bytes(plistlib.dumps({"TimeShiftSeconds": -int(ahead)}))
        file.with_suffix(".tmp").rename(file)
        time.sleep(0.8)  # the main loop reads it at each turn
        assert self.agent.command("PAUSE").text == "cmdStatus=0"
        self.made_in = time.monotonic() - self.begin

    def settle(self):
        """Lets the camera run past the mark of the end, and the sound catch up, which lags far behind a fast picture:
        the end of the file is timed, not the wait for media. Nothing but the encoder's thread tells when it is done."""
        def encoding():
            return sum(ran for name, ran, _ in threads(self.agent.sandbox.daemon_pid).values() if name == "asrc:src")

        def quiet():
            before = encoding()
            time.sleep(2)
            return encoding() - before < 0.002
        time.sleep(2)
        wait_until(quiet, 600, "the end of the sound")


def hour(ground):
    """A long recording, made fast."""
    wanted = ground.pick(3600, 300, 10)
    with ground.agent(RecordingVideoInput="test://video?size=640x360&speed=max",
                      RecordingAudioInput="test://audio?speed=max") as agent:
        fast = FastHour(agent, wanted)
        fast.record()
        fast.settle()
        spent, path = seconds_from_stop(agent, "HOUR")
        lengths = movie_streams(path)
        assert min(lengths.values()) >= wanted, lengths
        size = path.stat().st_size
        rows = rows_for(f"STOP → movie, {wanted / 60:.3g} min", [spent], path, ground.pick(3, 1, 1))
        with open(path, "rb") as file:
            os.posix_fadvise(file.fileno(), 0, 0, os.POSIX_FADV_DONTNEED)
        left = cached_share(path)
        notes = [f"{lengths['video']:.0f} s of media, {size / 1e6:.1f} MB, made in {fast.made_in:.0f} s "
                 f"({lengths['video'] / fast.made_in:.0f} times real time); one STOP",
                 "the fast camera goes on at full speed until the capture is closed, so STOP works beside two busy "
                 "threads, and writes the sound that lags behind the fast picture (its last fragment): both count as "
                 "ours"]
        if left is not None:
            notes.append(f"cold: dropped with posix_fadvise before each cp, {left:.0f} % of the file left in memory")
        return Result(rows, notes)


def stop(ground):
    """STOP → finished movie in the repository, ten seconds live and an hour of media, against rename and cp."""
    short, long = live(ground), hour(ground)
    return Result(short.rows + long.rows, [*short.notes, *long.notes,
                  "Our figure begins before STOP is sent and holds the wait for the frame that ends the recording (up "
                  "to one interval), the sync of file and directory, and the rename; plain cp syncs nothing."])
