"""Movies of sixteen known colours in any way of writing them, and the colours that a movie shows."""
import subprocess

import numpy

# Seven colours and one more above, greys below.
COLOURS = numpy.array([
    [[191, 191, 191], [191, 191, 0], [0, 191, 191], [0, 191, 0], [191, 0, 191], [191, 0, 0], [0, 0, 191], [20, 200, 90]],
    [[0, 0, 0], [16, 16, 16], [17, 17, 17], [64, 64, 64], [128, 128, 128], [200, 200, 200], [238, 238, 238],
     [255, 255, 255]]])
EXACT = "flags=accurate_rnd+full_chroma_int+full_chroma_inp"


def make(path, size, pixels, code, *, conversion="", rate=10, seconds=2):
    """Makes a movie.

    @param pixels      FFmpeg's name of the raw format
    @param code        arguments for FFmpeg's encoder
    @param conversion  of the colours, in the notation of FFmpeg's scale filter: "out_color_matrix=bt709:out_range=pc"
    """
    width, height = size
    picture = COLOURS.repeat(height // 2, axis=0).repeat(width // 8, axis=1).astype(numpy.uint8).tobytes()
    scale = f"scale={EXACT}" + (":" + conversion if conversion else "")
    subprocess.run(["ffmpeg", "-v", "error", "-y", "-f", "rawvideo", "-pix_fmt", "rgb24", "-s", f"{width}x{height}", "-r",
                    str(rate), "-i", "-", "-vf", f"{scale},format={pixels}", *code.split(), str(path)],
                   input=picture * (rate * seconds), check=True, timeout=60)


def shown(path):
    """The colours in the middle of the bars of a picture inside the movie, as a player shows them: its tags count."""
    probe = subprocess.run(["ffprobe", "-v", "error", "-select_streams", "v:0", "-show_entries", "stream=width,height",
                            "-of", "csv=p=0", str(path)], capture_output=True, check=True, timeout=60).stdout
    width, height = map(int, probe.split()[0].split(b","))
    raw = subprocess.run(["ffmpeg", "-v", "error", "-ss", "0.5", "-i", str(path), "-frames:v", "1", "-vf",
                          f"scale={EXACT}:in_color_matrix=auto:in_range=auto,format=rgb24", "-f", "rawvideo", "-"],
                         capture_output=True, check=True, timeout=60).stdout
    picture = numpy.frombuffer(raw, dtype=numpy.uint8).reshape(height, width, 3).astype(int)
    rows = [height * (2 * row + 1) // 4 for row in range(2)]
    columns = [width * (2 * column + 1) // 16 for column in range(8)]
    # The average of a small patch, without what the encoder's rounding does to single pixels.
    return numpy.array([[picture[y - 8:y + 8, x - 8:x + 8].reshape(-1, 3).mean(axis=0) for x in columns] for y in rows])


def distance(path):
    """The greatest difference between a colour that is shown and the one that was meant, of 255."""
    return float(abs(shown(path) - COLOURS).max())


def tags(path):
    """How the movie says that its colours are to be read: range, matrix, transfer, primaries."""
    keys = ("color_range", "color_space", "color_transfer", "color_primaries")
    out = subprocess.run(["ffprobe", "-v", "error", "-select_streams", "v:0", "-show_entries", "stream=" + ",".join(keys),
                          "-of", "default=nw=1", str(path)], capture_output=True, check=True, timeout=60, text=True).stdout
    found = dict(line.split("=") for line in out.split())
    return tuple(found[key] for key in keys)
