"""A network camera: an RTSP server in the agent's network that shows what a launch line of GStreamer makes."""
import signal
import subprocess

from .guest import Guest
from .sandbox import HARNESS

H264 = "h264parse config-interval=-1 ! rtph264pay name=pay0 pt=96 config-interval=-1"
H265 = "h265parse config-interval=-1 ! rtph265pay name=pay0 pt=96 config-interval=-1"
JPEG = "jpegparse ! rtpjpegpay name=pay0 pt=26"
SOUND = ("audiotestsrc is-live=true wave=sine freq=440 samplesperbuffer=960 ! audio/x-raw,rate=48000,channels=1 ! "
         "avenc_aac ! rtpmp4gpay name=pay1 pt=97")


def picture(size=(320, 180), rate=30, group=30, pattern="smpte"):
    """The launch line of a camera with this size, rate and distance of key frames in frames. Its element "mode" holds
    the caps and may be given others while the camera runs."""
    return (f"videotestsrc is-live=true pattern={pattern} horizontal-speed=2 ! capsfilter name=mode "
            f"caps=\"{mode(size, rate)}\" ! x264enc tune=zerolatency speed-preset=ultrafast "
            f"key-int-max={group} option-string=scenecut=0 ! {H264}")


def mode(size=(320, 180), rate=30):
    return f"video/x-raw,format=I420,width={size[0]},height={size[1]},framerate={rate}/1"


def showing(path, payloader=H264, sound=False):
    """The launch line of a camera that shows a movie from the host once, at its own pace, with its AAC sound if so
    wanted; the stream ends with it."""
    if not sound:
        return f"filesrc location={path} ! qtdemux ! {payloader}"
    return (f"filesrc location={path} ! qtdemux name=file file.video_0 ! queue ! {payloader} "
            f"file.audio_0 ! queue ! aacparse ! rtpmp4gpay name=pay1 pt=97")


class RtspCamera(Guest):
    """Runs from start() to close() or kill(); a camera that was killed may be started again."""

    def __init__(self, agent, launch=None, port=8554, mount="hall", user=None, password=None, transport="both",
                 key_frame_after=0.0):
        super().__init__(agent)
        self._location = f"127.0.0.1:{port}/{mount}"
        self._login = f"{user}:{password}@" if user else ""
        self._command = ["/usr/bin/python3", str(HARNESS / "rtsp_server.py"), launch or picture(), "--port", str(port),
                         "--mount", mount, "--transport", transport, "--key-frame-after", str(key_frame_after)]
        if user:
            self._command += ["--user", user, "--password", password]

    @property
    def uri(self):
        """What the preferences name, with user and password if there are any."""
        return f"rtsp://{self._login}{self._location}"

    def start(self):
        """Returns once the camera listens."""
        self.run(self._command, network=True, stdin=subprocess.PIPE, stdout=subprocess.PIPE, ready="ready")
        return self

    def change(self, element, name, value):
        """Sets a property of the running launch line."""
        self.process.stdin.write(f"set {element} {name} {value}\n".encode())
        self.process.stdin.flush()

    def viewers(self):
        """How many have watched at once, each time that it changed."""
        return [int(line.split()[1]) for line in self.errors().splitlines() if line.startswith("viewers ")]

    def stall(self):
        """Stops the camera without closing its connections, as one that hangs."""
        self.process.send_signal(signal.SIGSTOP)

    def go_on(self):
        self.process.send_signal(signal.SIGCONT)
