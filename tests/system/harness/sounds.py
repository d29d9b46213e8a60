"""Sounds that can be told apart in a movie: sines made for microphones, and what is heard in a stretch of sound."""
import wave

import numpy

from . import movie

RATE = 8000


def sine(path, frequency, seconds=120.0, rate=RATE, channels=1):
    """Writes a sine as a WAV file. @return its path"""
    tone = numpy.sin(2 * numpy.pi * frequency * numpy.arange(int(seconds * rate)) / rate)
    samples = numpy.repeat((tone * 16000).astype("<i2"), channels)
    with wave.open(str(path), "wb") as file:
        file.setnchannels(channels)
        file.setsampwidth(2)
        file.setframerate(rate)
        file.writeframes(samples.tobytes())
    return path


def loudness(sound):
    """Root mean square; a sine at half the full scale has 0.35."""
    return float(numpy.sqrt(numpy.mean(sound**2))) if len(sound) else 0.0


def pitch(sound, rate=RATE):
    """The strongest frequency in hertz, None in silence."""
    if loudness(sound) < 0.005:
        return None
    spectrum = numpy.abs(numpy.fft.rfft(sound * numpy.hanning(len(sound))))
    return float(numpy.argmax(spectrum[1:]) + 1) * rate / len(sound)


def heard(path, step=0.5):
    """What a movie's sound holds, piece by piece of `step` seconds: None for silence, else the pitch, rounded to
    40 Hz: a step of the sound within a piece shifts what is measured."""
    sound = movie.sound(path, RATE)
    size = int(step * RATE)
    pieces = [sound[at: at + size] for at in range(0, len(sound) - size + 1, size)]
    pitches = [pitch(piece) for piece in pieces]
    return [None if one is None else 40 * round(one / 40) for one in pitches]


def is_tone(pitches, frequency):
    """Whether that tone is heard in all the pieces. On a busy machine a sound server without real-time priority loses
    some sound now and then: the step shifts what is measured in its piece."""
    right = sum(one == frequency for one in pitches)
    return right * 2 >= len(pitches) and all(one and abs(one - frequency) <= 40 for one in pitches)


def demodulated(sound, frequency, window, rate):
    """Strength and phase of a tone around each sample, as complex numbers; `window` is a length in seconds."""
    carrier = numpy.exp(-2j * numpy.pi * frequency * numpy.arange(len(sound)) / rate)
    shape = numpy.hanning(round(window * rate) | 1)
    size = len(sound) + len(shape) - 1
    spectrum = numpy.fft.fft(sound * carrier, size) * numpy.fft.fft(2 * shape / shape.sum(), size)
    return numpy.fft.ifft(spectrum)[len(shape) // 2:][: len(sound)]


def burst_middles(sound, frequency, rate):
    """Where bursts of a tone are, seconds: the middle of each."""
    strength = numpy.abs(demodulated(sound, frequency, 0.01, rate))
    there = strength > 0.1
    edges = numpy.flatnonzero(numpy.diff(numpy.concatenate(([False], there, [False])).astype(int)))
    return [float(numpy.average(numpy.arange(first, last), weights=strength[first:last])) / rate
            for first, last in zip(edges[::2], edges[1::2])]


BURST_SECONDS = 0.020
BURST_HERTZ = 1000


def bursts(sound, rate):
    """Where the bursts of pipewire_microphone.c begin, in seconds, in order."""
    time = numpy.arange(int(BURST_SECONDS * rate)) / rate
    burst = numpy.sin(numpy.pi * time / BURST_SECONDS) ** 2 * numpy.exp(2j * numpy.pi * BURST_HERTZ * time)
    size = len(sound) + len(burst)
    match = numpy.abs(numpy.fft.ifft(numpy.fft.fft(sound, size) * numpy.conj(numpy.fft.fft(burst, size))))[:len(sound)]
    loud = match > 0.7 * match.max(initial=0)
    found = []
    for at in numpy.flatnonzero(loud):
        if not found or at > found[-1] + len(burst):
            found.append(at + int(numpy.argmax(match[at:at + len(burst)])))
    return [at / rate for at in found]


UNBROKEN = 0.0004  # seconds of leap; the agent's greatest correction of a clock, half a percent, makes 0.0003 of it


def breaks(sound, hertz, rate):
    """What is broken in a sine. @return the most by which it leaps in time within 60 ms, seconds modulo its period, and
    the least strength of 10 ms as a part of the usual one. Over a packet that the movie's coder has spoilt the medians
    pass."""
    size = rate // 100
    turned = sound * numpy.exp(-2j * numpy.pi * hertz * numpy.arange(len(sound)) / rate)
    pieces = turned[: len(turned) // size * size].reshape(-1, size).mean(axis=1)
    phases = numpy.lib.stride_tricks.sliding_window_view(numpy.unwrap(numpy.angle(pieces)), 5)
    middle = numpy.median(phases, axis=1)
    leaps = numpy.abs(middle[12:] - 2 * middle[6:-6] + middle[:-12]) / (2 * numpy.pi * hertz)
    return float(leaps.max()), float(numpy.abs(pieces).min() / numpy.median(numpy.abs(pieces)))
