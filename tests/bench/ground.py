"""What all benchmarks stand on: the binary under test, a directory of their own, GStreamer's catalogue, daemons."""
import contextlib
import os
import shutil
import subprocess
import tempfile
import time
from pathlib import Path

from harness.agent import Agent, REPOSITORY
from harness.waiting import wait_until
from measuring import other_load
from peers import built

# "full" gives figures to quote, "quick" a look, "smoke" only shows that everything can still be measured.
LENGTHS = ("full", "quick", "smoke")
# Seconds between the Unix epoch and that of the daemon's marks, 2001-01-01.
REFERENCE_DATE = 978307200


def make_catalogue(path, element, **environment):
    """GStreamer's catalogue of plug-ins, which must know `element`."""
    subprocess.run(["gst-inspect-1.0", element], env={**os.environ, "GST_REGISTRY": str(path), **environment},
                   check=True, stdout=subprocess.DEVNULL, timeout=120)


class Ground:
    """One run of the benchmarks, of one of LENGTHS. close() removes everything."""

    def __init__(self, binary, length):
        self.length = length
        self.folder = Path(tempfile.mkdtemp(prefix="lmx-bench-", dir="/tmp"))
        # A copy: whoever builds meanwhile must not change what is measured.
        self.binary = self.folder / "lmxagentd"
        shutil.copy2(binary, self.binary)
        self.registry = self.folder / "registry.bin"
        make_catalogue(self.registry, "fakesink")
        self._environment = None

    def pick(self, full, quick, smoke):
        """How much to measure in a run of this length."""
        return {"full": full, "quick": quick, "smoke": smoke}[self.length]

    def close(self):
        shutil.rmtree(self.folder)

    @property
    def environment(self):
        """For the peers: a catalogue of plug-ins as warm as the daemon's, with the synthetic camera in it."""
        if self._environment is None:
            plugins = {"GST_PLUGIN_PATH": str(built("plugins"))}
            catalogue = self.folder / "peers-registry.bin"
            make_catalogue(catalogue, "lmxtestcamera", **plugins)
            self._environment = {**os.environ, **plugins, "GST_REGISTRY": str(catalogue), "GST_REGISTRY_UPDATE": "no"}
        return self._environment

    @contextlib.contextmanager
    def agent(self, start=True, **preferences):
        """A daemon in a sandbox of its own, which recorded nothing yet."""
        agent = Agent(self.binary, self.registry)
        try:
            agent.preferences(RecordingCapturePreset="Video:Better", **preferences)
            yield agent.start() if start else agent
        except AssertionError as problem:
            raise AssertionError(f"{problem}\n{agent.report()}") from problem
        finally:
            agent.close()

    def describe_load(self):
        load = other_load()
        return f"{load:.2f} busy cores by others before it began"


def journals(agent):
    """The journals of the captures that are not finished yet. Plain files of the host: nothing is mounted over them."""
    return list((agent.sandbox.root / (REPOSITORY.lstrip("/") + "/.lmxagentd")).glob("*/journal"))


class FirstFrame:
    """When the recorder took its first frame, from the journal, in which a run of frames begins with a line of its own:
    `seen` on our monotonic clock, `captured` the frame's own time stamp as Unix time."""

    def __init__(self, agent, timeout=10.0):
        end = time.monotonic() + timeout
        while True:
            for journal in journals(agent):
                with contextlib.suppress(FileNotFoundError):
                    text = journal.read_text()
                    if "\nrun " in text:
                        self.seen = time.monotonic()
                        self._parse(text)
                        return
            assert time.monotonic() < end, "no first frame in the journal"
            time.sleep(0.0003)

    def _parse(self, text):
        lines = [line.split() for line in text.splitlines()]
        offset = next(float(words[3]) for words in lines if words[0] == "capture")
        run = next(float(words[1]) for words in lines if words[0] == "run")
        self.captured = run + offset + REFERENCE_DATE


@contextlib.contextmanager
def recording(agent, uuid):
    """A recording that flows inside the block and is finished and submitted behind it."""
    reply = agent.start_recording(uuid)
    assert reply.text == "cmdStatus=0", reply.text
    FirstFrame(agent)
    yield
    agent.command("STOP")
    agent.wait_recorded(uuid, timeout=60)
    agent.wait_tool_call(uuid, event="end")


def idle(agent):
    """Waits until the recorder is idle and no capture is left unfinished."""
    wait_until(lambda: agent.command("STATUS").fields["recordStatus"] == "0" and not journals(agent), 20,
               "an idle recorder")


def movie_streams(path):
    """{kind: (duration, packets)}"""
    from harness.movie import streams
    return {kind: stream.duration for kind, stream in streams(path).items()}
