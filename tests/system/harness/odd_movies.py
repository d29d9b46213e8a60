"""Movies as people have them, made by FFmpeg: each entry of MOVIES is a file name and how to make it.

A movie of these is a camera for the agent ("file:///…"). They last SECONDS unless their text says otherwise; those with
sound have a sine of 440 Hz.
"""
import fcntl
import subprocess

SECONDS = 4
H264 = "-c:v libx264 -preset ultrafast -pix_fmt yuv420p"
AAC = "-c:a aac"


def pictures(size="320x180", rate="30", seconds=SECONDS):
    return f"-f lavfi -t {seconds} -i testsrc2=size={size}:rate={rate}"


def tone(seconds=SECONDS, rate=48000):
    return f"-f lavfi -t {seconds} -i sine=frequency=440:sample_rate={rate}"


BOTH = f"{pictures()} {tone()}"
MOVIES = {
    # containers and codecs
    "plain.mp4": f"{BOTH} {H264} {AAC}",
    "plain.ts": f"{BOTH} {H264} {AAC}",
    "plain.mkv": f"{BOTH} {H264} -c:a libopus",
    "plain.webm": f"{pictures('160x90')} {tone()} -c:v libvpx -deadline realtime -cpu-used 8 -c:a libopus",
    "plain.avi": f"{BOTH} -c:v mjpeg -pix_fmt yuvj420p -c:a pcm_s16le",
    "4k-mjpeg.mov": f"{pictures('3840x2160', '10', 2)} -c:v mjpeg -q:v 10 -pix_fmt yuvj422p",
    # picture
    "silent.mp4": f"{pictures()} {H264}",
    "25fps.mp4": f"{pictures(rate='25')} {tone()} {H264} {AAC}",
    "ntsc.mp4": f"{pictures(rate='30000/1001')} {tone()} {H264} {AAC}",
    "variable-rate.mkv": f"{BOTH} -vf select=lt(mod(n\\,60)\\,30)+not(mod(n\\,3)) -fps_mode vfr {H264} {AAC}",
    "interlaced.ts": f"{pictures(rate='50', size='720x576')} {tone()} -vf interlace=scan=tff:lowpass=0 -c:v mpeg2video "
                     f"-flags +ildct+ilme -b:v 4M {AAC}",
    "rotated.mp4": "plain.mp4, with a mark that it is to be turned",
    "wide-pixels.mp4": f"{pictures('360x288', '25')} {tone()} -vf setsar=16/11 {H264} {AAC}",
    "odd-size.mkv": f"{pictures()} {tone()} -vf scale=853:479 -c:v libx264 -preset ultrafast -pix_fmt yuv444p {AAC}",
    "gray.mkv": f"{BOTH} -c:v mjpeg -pix_fmt yuvj420p -vf format=gray,format=yuvj420p {AAC}",
    "gray-only.mkv": f"{BOTH} -c:v ffv1 -pix_fmt gray {AAC}",
    "ten-bits.mkv": f"{BOTH} -c:v libx264 -preset ultrafast -pix_fmt yuv422p10le {AAC}",
    "one-frame.mp4": f"{pictures()} -frames:v 1 {H264}",
    # sound
    "mono.mp4": f"{BOTH} {H264} {AAC} -ac 1",
    "44100.mp4": f"{pictures()} {tone(rate=44100)} {H264} {AAC}",
    "surround.mkv": f"{BOTH} {H264} -c:a ac3 -ac 6",
    "short-sound.mp4": f"{pictures()} {tone(2)} {H264} {AAC}",
    "long-sound.mp4": f"{pictures(seconds=2)} {tone()} {H264} {AAC}",
    "sound-only.m4a": f"{tone()} {AAC}",
    # changes in mid-stream: parts of a transport stream one after the other
    "size-changes.ts": ["320x180 30 yuv420p", "640x480 30 yuv420p", "176x144 30 yuv420p"],
    "rate-changes.ts": ["320x180 30 yuv420p", "320x180 15 yuv420p"],
    "format-changes.ts": ["320x180 30 yuv420p", "320x180 30 yuv444p"],
}
# Files that are no movies, by their content.
BROKEN = {"empty.mp4": b"", "text.mp4": b"This is a note about a lecture, not the lecture.\n" * 40}


def movie_file(directory, name):
    """Makes the movie once for all workers of a test run. @return its path in the host"""
    path = directory / name
    with open(directory / ".lock", "w", encoding="utf-8") as lock:
        fcntl.flock(lock, fcntl.LOCK_EX)
        if not path.exists():
            _make(directory, name, path)
    return path


def _make(directory, name, path):
    temporary = directory / ("new-" + name)
    if name in BROKEN:
        temporary.write_bytes(BROKEN[name])
    elif name == "truncated.mp4":  # its index is at the end
        whole = _made(directory, "plain.mp4").read_bytes()
        temporary.write_bytes(whole[: len(whole) * 2 // 3])
    elif name == "rotated.mp4":
        _ffmpeg("-i", _made(directory, "plain.mp4"), *"-c copy -metadata:s:v:0 rotate=90".split(), temporary)
    elif isinstance(MOVIES[name], list):
        temporary.write_bytes(b"".join(_part(directory, number, part) for number, part in enumerate(MOVIES[name])))
    else:
        _ffmpeg(*_words(MOVIES[name]), temporary)
    temporary.rename(path)


def _made(directory, name):
    path = directory / name
    if not path.exists():
        _make(directory, name, path)
    return path


def _part(directory, number, text):
    """Two seconds of a transport stream whose times follow those of the part before."""
    size, rate, pixels = text.split()
    path = directory / "part.ts"
    _ffmpeg(*_words(f"{pictures(size, rate, 2)} {tone(2)} -c:v libx264 -preset ultrafast -pix_fmt {pixels}"),
            *_words(f"{AAC} -output_ts_offset {2 * number}"), path)
    return path.read_bytes()


def _words(text):
    return text.split()


def _ffmpeg(*arguments):
    subprocess.run(["ffmpeg", "-v", "error", "-y", *map(str, arguments)], check=True, timeout=120)
