#!/usr/bin/python3
"""Measures the picture encoder's settings: bits, CPU and likeness for slides, a speaker and motion.

Usage: encoder_quality.py HEIGHT "x264enc options"…, for example
  encoder_quality.py 720 "speed-preset=veryfast quantizer=22 bitrate=2531"
Prints a line for each setting and clip. The other options are those of src/capture/gst/encoding.cpp.
"""
import os
import subprocess
import sys
import tempfile
from pathlib import Path

SECONDS = 16
FIXED = ("x264enc tune=zerolatency pass=qual vbv-buf-capacity=2000 key-int-max=60 byte-stream=false aud=false "
         "option-string=scenecut=0")
FONT = "/usr/share/fonts/truetype/dejavu/DejaVuSans.ttf"
LOSSLESS = "-c:v libx264 -preset ultrafast -qp 0 -pix_fmt yuv420p -r 30".split()


def ffmpeg(*arguments):
    return subprocess.run(["ffmpeg", "-v", "info", "-y", *[str(word) for word in arguments]], check=True,
                          capture_output=True, text=True).stderr


def slide(number, width, height):
    size = height // 18
    text = (f"The first of {number} important points about small waves\nSpeed depends on depth {number}\n"
            f"f(x) = a sin(k x - w t) + b cos(k x + w t)\nQuestions before the break, please ({number})")
    return (f"color=0xF8F8F0:size={width}x{height}:rate=30:duration={SECONDS // 4},"
            f"drawtext=fontfile={FONT}:fontsize={size * 2}:fontcolor=0x203060:x=w/16:y=h/12:text='Lecture {number}',"
            f"drawtext=fontfile={FONT}:fontsize={size}:fontcolor=black:x=w/12:y=h/3:line_spacing={size // 2}:"
            f"text='{text}',drawbox=x={width * 2 // 3}:y={height * 2 // 3}:w={width // 5}:h={height // 5}:"
            f"color=0x30{number + 1}070@1:t=fill")


def make_clips(folder, height):
    """Slides; a photograph-like still with small movements and a camera's noise; constant motion."""
    width = height * 16 // 9
    slides = ";".join(f"{slide(n, width, height)}[s{n}]" for n in range(4)) + ";[s0][s1][s2][s3]concat=n=4"
    ffmpeg("-filter_complex", slides, *LOSSLESS, folder / "slides.mkv")
    still = "mandelbrot=size=1920x1080:start_scale=0.02:end_scale=0.02:start_x=-0.745:start_y=0.113:maxiter=3000"
    ffmpeg("-f", "lavfi", "-i", still, "-frames:v", 1, folder / "still.png")
    speaker = ("gblur=sigma=1.2,zoompan=z='1.35+0.05*sin(on/60)':x='iw/8+30*sin(on/40)':y='ih/8+12*sin(on/25)':d=1:"
               f"s={width}x{height}:fps=30,noise=c0s=5:c0f=t+u,format=yuv420p")
    ffmpeg("-loop", 1, "-framerate", 30, "-i", folder / "still.png", "-t", SECONDS, "-vf", speaker, *LOSSLESS,
           folder / "speaker.mkv")
    ffmpeg("-f", "lavfi", "-i", f"testsrc2=size={width}x{height}:rate=30:duration={SECONDS}", *LOSSLESS,
           folder / "motion.mkv")


def measure(clip, options):
    """@return megabits a second, share of a core, likeness (SSIM)"""
    out = clip.with_name("encoded.mkv")
    with subprocess.Popen(["ffmpeg", "-v", "error", "-i", clip, "-f", "yuv4mpegpipe", "-"],
                          stdout=subprocess.PIPE) as source:
        encoder = subprocess.Popen(["gst-launch-1.0", "-q", "fdsrc", "fd=0", "!", "y4mdec", "!", *FIXED.split(),
                                    *options.split(), "!", "matroskamux", "!", "filesink", f"location={out}"],
                                   stdin=source.stdout)
        source.stdout.close()
        _, status, used = os.wait4(encoder.pid, 0)
    assert status == 0, options
    likeness = ffmpeg("-i", out, "-i", clip, "-lavfi", "[0:v][1:v]ssim", "-f", "null", "-").split("All:")[1].split()[0]
    return out.stat().st_size * 8 / SECONDS / 1e6, (used.ru_utime + used.ru_stime) / SECONDS, float(likeness)


def main():
    with tempfile.TemporaryDirectory() as place:
        make_clips(Path(place), int(sys.argv[1]))
        for options in sys.argv[2:]:
            for name in ("slides", "speaker", "motion"):
                rate, share, likeness = measure(Path(place) / f"{name}.mkv", options)
                print(f"{options}  {name:8} {rate:5.2f} Mbit/s  {share:.2f} of a core  SSIM {likeness:.4f}", flush=True)


if __name__ == "__main__":
    main()
