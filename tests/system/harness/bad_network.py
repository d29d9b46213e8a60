"""A bad network between the agent and a network camera, and a camera whose picture and sound can be compared."""
import json
import subprocess
import wave

import numpy

from . import movie
from .guest import Guest
from .numbered import make_movie
from .sandbox import HARNESS

BEEP = 0.1  # seconds
RATE = 48000
PITCHES = 16


class BadNetwork(Guest):
    """A line that listens on a port of its own and leads to a camera's. Runs from start() to close()."""

    def __init__(self, agent, camera, port=8550):
        super().__init__(agent)
        self.uri = camera.uri.replace(":8554/", f":{port}/")
        self._command = ["/usr/bin/python3", str(HARNESS / "rtsp_proxy.py"), str(port), "8554"]

    def start(self):
        self.run(self._command, network=True, stdin=subprocess.PIPE, stdout=subprocess.PIPE, ready="ready")
        return self

    def set(self, **settings):
        """Changes what rtsp_proxy.Line says; `do` is one of its deeds. Returns when it is so."""
        self.process.stdin.write(json.dumps(settings).encode() + b"\n")
        self.process.stdin.flush()
        self._wait_for("done")


def lecture(path, seconds=40, rate=25, size=(320, 180)):
    """Writes a movie with numbered pictures, and a beep at the beginning of each second. Its pitch tells which of 16
    seconds it is. @return its path"""
    sound = numpy.zeros(seconds * RATE)
    times = numpy.arange(int(BEEP * RATE)) / RATE
    for second in range(seconds):
        sound[second * RATE: second * RATE + len(times)] = numpy.sin(2 * numpy.pi * frequency(second) * times)
    with wave.open(str(path.with_suffix(".wav")), "wb") as file:
        file.setnchannels(1)
        file.setsampwidth(2)
        file.setframerate(RATE)
        file.writeframes((sound * 12000).astype("<i2").tobytes())
    silent = make_movie(path.with_suffix(".silent.mp4"), range(seconds * rate), rate=rate, size=size, group=rate)
    subprocess.run(["ffmpeg", "-v", "error", "-y", "-i", silent, "-i", path.with_suffix(".wav"), "-c:v", "copy", "-c:a",
                    "aac", "-b:a", "96k", path], check=True, timeout=60)
    return path


def frequency(second):
    return 400 + 100 * (second % PITCHES)


def beeps(path, rate=8000):
    """Where beeps begin in a movie's sound: [(seconds, which of 16), …]."""
    sound = movie.sound(path, rate)
    step = rate // 200
    loud = numpy.array([numpy.sqrt(numpy.mean(sound[at: at + step] ** 2))
                        for at in range(0, len(sound) - step + 1, step)]) > 0.05
    found, quiet = [], 10
    for number, one in enumerate(loud):
        if one and quiet >= 10:
            piece = sound[number * step: number * step + int(0.06 * rate)]
            spectrum = numpy.abs(numpy.fft.rfft(piece * numpy.hanning(len(piece)), rate))
            which = round((int(numpy.argmax(spectrum[200:])) + 200 - 400) / 100) % PITCHES
            found.append((number * step / rate, which))
        quiet = 0 if one else quiet + 1
    return found


def lip_errors(path, rate=25):
    """By how much each beep of a lecture comes later than the picture that it belongs to, None where no picture near
    that one is shown within a second: [(seconds, error), …]. The beep that the beginning cuts is left out."""
    pictures = [(time, number) for time, number in zip(movie.frame_times(path), movie.counters(path, damaged=True))
                if number is not None]
    errors = []
    for heard, which in beeps(path):
        if heard < BEEP:
            continue
        near = [heard - time - _ahead(number, which, rate) / rate for time, number in pictures if abs(time - heard) < 1]
        errors.append((heard, min(near, key=abs) if near else None))
    return errors


def _ahead(number, which, rate):
    """How many pictures after this one the nearest beep of that pitch begins."""
    period = PITCHES * rate
    return (which * rate - number + period // 2) % period - period // 2
