"""Pictures that carry their number as the synthetic camera's do (movie.counters reads it), and movies of them."""
import subprocess

import numpy

from . import movie


def picture(number, width=320, height=180):
    """A gray picture with its number in the top row of cells."""
    frame = numpy.full((height, width), 90, dtype=numpy.uint8)
    for cell in range(movie.CELLS):
        bit = number >> (movie.CELLS - 1 - cell) & 1
        left, right = cell * width // movie.CELLS, (cell + 1) * width // movie.CELLS
        frame[: height // movie.ROWS, left:right] = 255 if bit else 0
    return frame.tobytes()


def make_movie(path, numbers, rate="30", size=(320, 180), filters="null", group=30,
               keep_times=False, codec=("libx264", "-preset", "superfast", "-bf", "0")):
    """Writes a movie, H.264 or what FFmpeg's `codec` gives, with a picture for each number, without sound. `keep_times`: those that `filters` set, else
    the pictures are `rate` a second. @return its path"""
    frames = b"".join(picture(number, *size) for number in numbers)
    times = "passthrough" if keep_times else "cfr"
    subprocess.run(["ffmpeg", "-v", "error", "-f", "rawvideo", "-pix_fmt", "gray", "-s", f"{size[0]}x{size[1]}", "-r",
                    str(rate), "-i", "-", "-vf", filters, "-c:v", *codec, "-g",
                    str(group), "-fps_mode", times, "-pix_fmt", "yuv420p", str(path)],
                   input=frames, check=True, timeout=60)
    return path
