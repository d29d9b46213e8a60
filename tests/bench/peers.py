"""The peers: bare pipelines in gst-launch-1.0, ffmpeg, and a small echo server."""
import re
import signal
import subprocess
import time
from dataclasses import dataclass
from pathlib import Path

HERE = Path(__file__).resolve().parent
TOP = HERE.parents[1]
BUILT = TOP / "build/release/tests/bench"
X264 = re.compile(rb"x264 - core [^\0]*?options: ([^\0]+)\0")
# What cameras of two kinds deliver and a movie does not hold: GStreamer's name, and FFmpeg's conversion to the movie's.
FULL_RANGE_601 = "1:4:0:0"
FROM_FULL_RANGE_601 = ("colorspace=ispace=smpte170m:iprimaries=bt709:itrc=bt709:irange=pc:all=bt709:range=tv:"
                       "format=yuv420p")
RECORDED = "video/x-raw,format=I420,pixel-aspect-ratio=1/1,framerate=30/1,colorimetry=bt709"
SOUND = "audioconvert ! audioresample ! audio/x-raw,format=F32LE,layout=interleaved,rate=48000,channels=2"


@dataclass(frozen=True)
class Picture:
    """What is recorded. Bit rate and effort are the daemon's for the preset "Video:Better"; x264_options() of a movie
    of each tells whether that is still true."""

    width: int
    height: int

    def __str__(self):
        return f"{self.width}x{self.height}"

    @property
    def kilobits(self):
        return max(150, int(205.0 * (self.width * self.height * 30 / 1e6) ** 0.75))

    @property
    def effort(self):
        return "veryfast" if self.width * self.height <= 1280 * 720 else "superfast"


def x264_options(movie):
    """The encoder's own note of its settings in the movie's first picture."""
    with open(movie, "rb") as file:
        found = X264.search(file.read(4 << 20))
    assert found, f"{movie} holds no note of x264"
    return found[1].decode()


def synthetic_sources(picture, camera="lmxtestcamera size={}", microphone="audiotestsrc is-live=true"):
    """The launch lines of the daemon's synthetic camera, as the plug-in has it, and microphone."""
    video = (f"{camera.format(picture)} ! video/x-raw,format=I420,width={picture.width},height={picture.height},"
             "framerate=30/1,pixel-aspect-ratio=1/1")
    audio = (f"{microphone} wave=ticks freq=1000 samplesperbuffer=480 ! "
             "audio/x-raw,format=F32LE,layout=interleaved,rate=48000,channels=2")
    return video, audio


def file_sources(movie):
    """The launch lines of the daemon's file camera."""
    video = (f"uridecodebin name=file uri={Path(movie).as_uri()} file. ! queue ! videoconvert ! videoscale ! "
             "videorate ! video/x-raw,format=I420,pixel-aspect-ratio=1/1,framerate=30/1 ! identity sync=true")
    return video, f"file. ! queue ! {SOUND} ! identity sync=true"


def mjpeg_sources(movie):
    """The launch lines of a file camera whose pictures' colours are converted: as webcams deliver them."""
    video = (f"uridecodebin name=file uri={Path(movie).as_uri()} file. ! queue ! "
             f"capssetter caps=video/x-raw,colorimetry={FULL_RANGE_601} ! videoconvert dither=none ! videorate ! "
             f"{RECORDED} ! identity sync=true")
    return video, f"file. ! queue ! {SOUND} ! identity sync=true"


def rtsp_sources(uri):
    """The launch lines of the daemon's network camera. The stream tells its colours itself."""
    video = (f"rtspsrc name=camera location={uri} protocols=tcp latency=300 camera. ! application/x-rtp,media=video ! "
             f"decodebin ! queue ! videoconvert dither=none ! videorate ! {RECORDED}")
    return video, f"camera. ! application/x-rtp,media=audio ! decodebin ! queue ! {SOUND}"


def launch_words(picture, sources, target, first=""):
    """A pipeline with the daemon's encoders into a growing, crash-proof file. `first` goes in front of the encoder."""
    video, audio = sources
    line = (f"{video} {first} ! x264enc tune=zerolatency speed-preset={picture.effort} pass=qual quantizer=22 "
            f"bitrate={picture.kilobits} vbv-buf-capacity=2000 key-int-max=60 byte-stream=false aud=false option-string=scenecut=0 ! "
            "video/x-h264,stream-format=avc,alignment=au ! "
            "qtmux name=mux fragment-duration=500 fragment-mode=first-moov-then-finalise ! "
            f"filesink location={target} buffer-mode=unbuffered {audio} ! avenc_aac bitrate=192000 ! mux.")
    return line.split()


def ffmpeg_file(movie):
    """What ffmpeg reads: a file at its own pace."""
    return ["-re", "-i", str(movie)]


def ffmpeg_rtsp(uri):
    return ["-rtsp_transport", "tcp", "-analyzeduration", "500000", "-i", uri]


def ffmpeg_words(picture, source, target, conversion="null"):
    """A command of ffmpeg with the daemon's settings; `source` of ffmpeg_file() or ffmpeg_rtsp(), `conversion` a filter
    of the pictures."""
    rate = f"{picture.kilobits}k"
    return ["ffmpeg", "-v", "error", "-nostdin", *source, "-vf", conversion, "-r", "30", "-c:v", "libx264", "-preset", picture.effort,
            "-tune", "zerolatency", "-crf", "22", "-maxrate", rate, "-bufsize", f"{picture.kilobits * 2}k",
            "-g", "60", "-keyint_min", "6", "-sc_threshold", "0", "-x264-params", "scenecut=0", "-pix_fmt", "yuv420p",
            "-c:a", "aac", "-b:a", "128k", "-ar", "48000", "-ac", "2",
            "-movflags", "empty_moov+default_base_moof", "-frag_duration", "500000", "-f", "mov", "-y", str(target)]


class Process:
    """A peer that runs for a while; stop() lets it close its file."""

    def __init__(self, words, environment, stdout=subprocess.DEVNULL):
        self.begun = time.monotonic()
        self.process = subprocess.Popen(words, env=environment, stdin=subprocess.DEVNULL, stdout=stdout,
                                        stderr=subprocess.PIPE)

    @property
    def pid(self):
        return self.process.pid

    def ended(self):
        return self.process.poll() is not None

    def kill(self):
        self.process.kill()
        self.process.communicate()

    def stop(self, timeout=15):
        self.process.send_signal(signal.SIGINT)
        try:
            _, errors = self.process.communicate(timeout=timeout)
        except subprocess.TimeoutExpired:
            self.process.kill()
            _, errors = self.process.communicate()
            raise AssertionError("a peer did not end: " + errors.decode(errors="replace")) from None
        return errors.decode(errors="replace")


def gst_words(picture, sources, target):
    return ["gst-launch-1.0", "-q", "-e", *launch_words(picture, sources, target)]


def seconds_to_first_buffer(picture, target, environment):
    """From exec to the line in which the element in front of the encoder tells of its first frame."""
    words = launch_words(picture, synthetic_sources(picture), target, "! identity name=first silent=false")
    peer = Process(["gst-launch-1.0", "-v", *words], environment, subprocess.PIPE)
    try:
        for line in peer.process.stdout:
            if b"first: last-message = chain" in line:
                return time.monotonic() - peer.begun
        raise AssertionError("the peer gave no frame")
    finally:
        peer.stop()


def make_camera_file(picture, seconds, folder, environment):
    """A movie to play as a camera, of decent quality."""
    path = Path(folder) / f"camera-{picture}.mov"
    camera = f"videotestsrc num-buffers={int(seconds * 30)} pattern=smpte horizontal-speed=4"
    video, audio = synthetic_sources(picture, camera, f"audiotestsrc num-buffers={int(seconds * 100)}")
    line = (f"{video} ! x264enc speed-preset=veryfast bitrate={2 * picture.kilobits} key-int-max=60 ! qtmux name=mux ! "
            f"filesink location={path} {audio} ! avenc_aac ! mux.")
    subprocess.run(["gst-launch-1.0", "-q", *line.split()], env=environment, check=True, timeout=120)
    return path


def make_mjpeg_camera_file(picture, seconds, folder):
    """A movie of JPEG pictures to play as a camera: 4:2:2, full range, BT.601, as webcams deliver them."""
    path = Path(folder) / f"mjpeg-{picture}.mov"
    subprocess.run(["ffmpeg", "-v", "error", "-nostdin", "-f", "lavfi", "-i", f"testsrc2=size={picture}:rate=30",
                    "-f", "lavfi", "-i", "sine=frequency=440:sample_rate=48000", "-t", str(seconds),
                    "-vf", "scale=out_color_matrix=bt601:out_range=full", "-pix_fmt", "yuvj422p", "-c:v", "mjpeg",
                    "-q:v", "5", "-c:a", "aac", "-ac", "2", "-y", str(path)], check=True, timeout=300)
    return path


def built(name):
    """A peer that was built with the tests: the program `roundtrip`, or the directory `plugins` of the camera."""
    path = BUILT / name
    assert path.exists(), f"{path} is not built; scripts/build --tests release does that"
    return path
