"""Reading finished movies: streams, the synthetic camera's frame counter, and sound."""
import json
import subprocess
from dataclasses import dataclass
from pathlib import Path

import numpy

CELLS = 32
ROWS = 18


@dataclass(frozen=True)
class Stream:
    kind: str
    codec: str
    start: float
    duration: float
    rate: str
    width: int
    height: int


def _run(command):
    result = subprocess.run([str(word) for word in command], capture_output=True, timeout=120, check=False)
    assert result.returncode == 0, f"{command}: {result.stderr.decode(errors='replace')}"
    return result


def streams(path):
    """The movie's streams by kind ("video", "audio"). A single word of complaint from ffprobe is a failure."""
    result = _run(["ffprobe", "-v", "warning", "-show_streams", "-of", "json", path])
    assert result.stderr == b"", result.stderr.decode()
    return {
        s["codec_type"]: Stream(s["codec_type"], s["codec_name"], float(s["start_time"]), float(s["duration"]),
                                s.get("avg_frame_rate", ""), s.get("width", 0), s.get("height", 0))
        for s in json.loads(result.stdout)["streams"]
    }


def discover(path):
    """What GStreamer's discoverer says; an error or a warning of it is a failure."""
    text = _run(["gst-discoverer-1.0", "-v", Path(path).resolve()]).stdout.decode()
    for complaint in ("ERROR", "WARNING", "Missing plugins", "error"):
        assert complaint not in text, text
    return text


def decodes(path, *options):
    """Decodes all of the movie, with FFmpeg's `options` for its output; a complaint of the decoder is a failure."""
    result = _run(["ffmpeg", "-v", "warning", "-i", path, *options, "-f", "null", "-"])
    assert result.stderr == b"", result.stderr.decode()


def counters(path, damaged=False):
    """The frame counters of the movie's pictures, in order: the top row of cells, most significant bit left. A picture
    that can't be read is a failure, or None where they may be `damaged`."""
    picture = f"crop=iw:ih/{ROWS}:0:0,scale={CELLS}:1:flags=area"
    result = _run(["ffmpeg", "-v", "error", "-i", path, "-map", "0:v:0", "-fps_mode", "passthrough", "-vf", picture,
                   "-pix_fmt", "gray", "-f", "rawvideo", "-"])
    cells = numpy.frombuffer(result.stdout, dtype=numpy.uint8).reshape(-1, CELLS)
    doubtful = (cells > 70) & (cells < 185)
    assert damaged or not doubtful.any(), f"{doubtful.sum()} cells are neither black nor white"
    weights = 1 << numpy.arange(CELLS - 1, -1, -1, dtype=numpy.int64)
    return [None if bad else int(value) for value, bad in zip((cells >= 128) @ weights, doubtful.any(axis=1))]


def brightness(path, part="null"):
    """The mean brightness (0 … 255) of a part of each picture; `part` is an FFmpeg filter such as crop=W:H:X:Y."""
    result = _run(["ffmpeg", "-v", "error", "-i", path, "-map", "0:v:0", "-fps_mode", "passthrough", "-vf",
                   f"{part},format=yuv420p,extractplanes=y,scale=1:1:flags=area", "-f", "rawvideo", "-"])
    return list(result.stdout)


def runs(values):
    """Splits counters into stretches that rise by one: [(first, last), …]. A doubled or reversed frame is a failure."""
    result = []
    for value in values:
        if result and value == result[-1][1] + 1:
            result[-1] = (result[-1][0], value)
        else:
            assert not result or value > result[-1][1], f"frame {value} after {result[-1][1]}"
            result.append((value, value))
    return result


def frame_times(path):
    """Presentation times of the video frames, seconds."""
    result = _run(["ffprobe", "-v", "error", "-select_streams", "v:0", "-show_entries", "packet=pts_time", "-of",
                   "json", path])
    return sorted(float(packet["pts_time"]) for packet in json.loads(result.stdout)["packets"])


def sound(path, rate=8000, channel=None):
    """The movie's sound as numbers between -1 and 1: mono, or one channel of it."""
    mix = "anull" if channel is None else f"pan=mono|c0=c{channel}"
    result = _run(["ffmpeg", "-v", "error", "-i", path, "-map", "0:a:0", "-af", mix, "-ac", "1", "-ar", str(rate), "-f",
                   "f32le", "-"])
    return numpy.frombuffer(result.stdout, dtype=numpy.float32).astype(numpy.float64)


def best_match(piece, whole):
    """Where `piece` fits best into `whole`, and how well: (offset in samples, correlation coefficient up to 1)."""
    size = len(whole) + len(piece)
    product = numpy.fft.rfft(whole, size) * numpy.conj(numpy.fft.rfft(piece, size))
    raw = numpy.fft.irfft(product, size)[: len(whole) - len(piece) + 1]
    energy = numpy.concatenate(([0.0], numpy.cumsum(whole**2)))
    window = energy[len(piece):] - energy[: len(energy) - len(piece)]
    scaled = raw / numpy.sqrt(numpy.maximum(window, 1e-9) * max(float(numpy.sum(piece**2)), 1e-9))
    offset = int(numpy.argmax(scaled))
    return offset, float(scaled[offset])


def camera_clock(marks, fps):
    """Checks recorded spans against the wall clock, and with that each boundary to within one frame.

    `marks` holds (counter, kind, earliest, latest): the first ("start") or last ("stop") frame of a span and the
    wall-clock bounds of the mark that made it. All frames come from one camera with a constant rate, so there must be
    one moment at which frame 0 was taken that puts every boundary within one frame of its mark.
    @return (earliest, latest) such moment, as seconds
    """
    interval = 1.0 / fps
    low, high, story = float("-inf"), float("inf"), []
    for counter, kind, earliest, latest in marks:
        # The boundary frame was taken in [mark, mark + interval) or [mark - interval, mark); one more frame is allowed.
        before, behind = (interval, 2 * interval) if kind == "start" else (2 * interval, interval)
        here = (earliest - before - counter * interval, latest + behind - counter * interval)
        story.append(f"{kind} frame {counter}: camera opened within {here[0]:.3f} … {here[1]:.3f}")
        low, high = max(low, here[0]), min(high, here[1])
    assert low <= high, "\n".join(story)
    return low, high
