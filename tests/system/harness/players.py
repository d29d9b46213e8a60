"""When players show the frames of a movie of the synthetic devices, and when its ticks are heard."""
import json
import re
import shutil
import subprocess
import sys
import tempfile
from dataclasses import dataclass
from pathlib import Path
from statistics import median

import numpy

from harness import movie

RATE = 48000
TICK = 479 / RATE  # the tick fills the end of each second of the synthetic devices' clock
FPS = 30


@dataclass(frozen=True)
class Timing:
    """Frames as (presentation time, frame counter), and when ticks begin; seconds."""

    frames: list
    ticks: list

    def lateness(self):
        """For each tick: by how many seconds it is heard later than the frame that it belongs to is shown."""
        assert len(self.frames) > FPS and self.ticks, (len(self.frames), self.ticks)
        origin = median(time - number / FPS for time, number in self.frames)
        return [(tick + TICK - origin + 0.5) % 1 - 0.5 for tick in self.ticks]


def _run(command):
    result = subprocess.run([str(word) for word in command], capture_output=True, timeout=150, check=False)
    assert result.returncode == 0, f"{command}: {result.stderr.decode(errors='replace')}"
    return result.stdout.decode()


def _tick_times(samples, start):
    times, quiet_until = [], 0
    for place in numpy.nonzero(numpy.abs(samples) >= 0.2)[0]:
        if place >= quiet_until:
            times.append(start + place / RATE)
            quiet_until = place + RATE // 5
    return times


def _decoded_times(path, stream):
    text = _run(["ffprobe", "-v", "error", "-select_streams", stream, "-show_entries", "frame=pts_time", "-of", "json",
                 path])
    return [float(frame["pts_time"]) for frame in json.loads(text)["frames"]]


def ffmpeg(path):
    """FFmpeg's view, after its edit lists."""
    frames = list(zip(_decoded_times(path, "v:0"), movie.counters(path)))
    return Timing(frames, _tick_times(movie.sound(path, RATE), _decoded_times(path, "a:0")[0]))


def _gstreamer_stream(path, convert, other):
    """Decodes one stream. @return the running times of its buffers, and its bytes"""
    with tempfile.NamedTemporaryFile() as raw:
        # The other stream goes somewhere too: where it is left unlinked, one run in fifty never ends on a busy machine.
        text = _run(["gst-launch-1.0", "-v", "uridecodebin", f"uri={Path(path).resolve().as_uri()}", "name=movie",
                     "movie.", "!", *convert.split(), "!", "identity", "name=tap", "silent=false", "!", "filesink",
                     f"location={raw.name}", "movie.", "!", other, "!", "fakesink"])
        data = Path(raw.name).read_bytes()
    (start,) = set(re.findall(r"tap:sink\) E \(type: segment.*?start=\(guint64\)(\d+)", text))
    times = [(int(h) * 60 + int(m)) * 60 + float(s) - int(start) / 1e9
             for h, m, s in re.findall(r"chain .*?tap:sink.*?pts: (\d+):(\d+):([\d.]+)", text)]
    return times, data


def gstreamer(path):
    """GStreamer's view: running times behind its decoders."""
    times, pixels = _gstreamer_stream(path, "videoconvert ! video/x-raw,format=GRAY8", "audio/x-raw")
    stream = movie.streams(path)["video"]
    cell, row = stream.width // movie.CELLS, stream.height // movie.ROWS // 2
    stride = (stream.width + 3) // 4 * 4
    pictures = numpy.frombuffer(pixels, dtype=numpy.uint8).reshape(-1, stride * stream.height)
    cells = pictures[:, row * stride + cell // 2:row * stride + cell // 2 + movie.CELLS * cell:cell]
    weights = 1 << numpy.arange(movie.CELLS - 1, -1, -1, dtype=numpy.int64)
    numbers = [int(value) for value in (cells >= 128) @ weights]
    assert len(times) == len(numbers), (len(times), len(numbers))
    starts, sound = _gstreamer_stream(path, "audioconvert ! audio/x-raw,format=F32LE,channels=1", "video/x-raw")
    return Timing(list(zip(times, numbers)), _tick_times(numpy.frombuffer(sound, dtype=numpy.float32), starts[0]))


def has_browser():
    return shutil.which("chromium") is not None


def browser(path):
    """Chromium's view through its media element, and of the sound alone through its decoder: (timing, timing)."""
    script = 'ip link set lo up && exec "$0" "$@"'
    with tempfile.TemporaryDirectory() as place:
        # The sandbox's files can't be read from another one. All processes of the browser end with the namespace.
        shutil.copyfile(path, f"{place}/movie.mov")
        result = json.loads(_run(["unshare", "--user", "--map-root-user", "--net", "--pid", "--fork", "--kill-child",
                                  "sh", "-c", script, sys.executable, Path(__file__).with_name("browser.py"),
                                  f"{place}/movie.mov", f"{place}/profile"]))
    assert "error" not in result, result["error"]
    return Timing(result["frames"], result["ticks"]), Timing(result["frames"], result["decodedTicks"])
