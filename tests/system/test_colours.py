"""Grey stays grey and red stays red, whatever a camera's way of writing them."""
import pytest
from harness import colour_bars
from harness.pipewire_hall import PipeWireHall, VirtualDevice

NEAR = 3  # of 255
HD = (1280, 720)
SD = (640, 360)
X264 = "-c:v libx264 -preset ultrafast -qp 4"
FULL_601 = "out_color_matrix=bt601:out_range=pc"
LIMITED_601 = "out_color_matrix=bt601:out_range=tv"
LIMITED_709 = "out_color_matrix=bt709:out_range=tv"
FULL_709 = "out_color_matrix=bt709:out_range=pc"
TAGS_709 = "-colorspace bt709 -color_primaries bt709 -color_trc bt709"
TAGS_601 = "-colorspace smpte170m -color_primaries smpte170m -color_trc smpte170m"

CAMERAS = {
    "webcam-jpeg-420.avi": (HD, "yuvj420p", "-c:v mjpeg -q:v 1 -qmin 1", FULL_601),
    "webcam-jpeg-422.avi": (SD, "yuvj422p", "-c:v mjpeg -q:v 1 -qmin 1", FULL_601),
    "webcam-yuyv.avi": (HD, "yuyv422", "-c:v rawvideo", LIMITED_601),
    "webcam-yuyv.mkv": (SD, "yuyv422", "-c:v rawvideo", LIMITED_601),
    "grabber-uyvy.avi": (HD, "uyvy422", "-c:v rawvideo", LIMITED_601),
    "grabber-uyvy.mov": (HD, "uyvy422", f"-c:v rawvideo -vtag 2vuy -movflags write_colr {TAGS_709}", LIMITED_709),
    "screen-rgb.mov": (SD, "rgb24", "-c:v rawvideo", ""),
    "screen-bgr.avi": (HD, "bgr24", "-c:v rawvideo", ""),
    "ptz-709.mp4": (HD, "yuv420p", f"{X264} {TAGS_709} -color_range tv", LIMITED_709),
    "ptz-709-full.mp4": (HD, "yuvj420p", f"{X264} {TAGS_709} -color_range pc", FULL_709),
    "ptz-601.mp4": (SD, "yuv420p", f"{X264} {TAGS_601} -color_range tv", LIMITED_601),
    "ptz-601-full.ts": (HD, "yuvj420p", f"{X264} {TAGS_601} -color_range pc", FULL_601),
    "ptz-without-tags-hd.ts": (HD, "yuv420p", X264, LIMITED_709),
    "ptz-without-tags-sd.ts": (SD, "yuv420p", X264, LIMITED_601),
    "ten-bits.mkv": (SD, "yuv422p10le", f"{X264} {TAGS_709}", LIMITED_709),
    "444.mkv": (SD, "yuv444p", f"{X264} {TAGS_709}", LIMITED_709),
}


@pytest.mark.parametrize("name", CAMERAS)
def test_colours_of_a_camera_are_those_of_the_movie(agent, name):
    size, pixels, code, conversion = CAMERAS[name]
    colour_bars.make(agent.path("/var/lmx") / name, size, pixels, code, conversion=conversion)
    agent.preferences(RecordingType="Video", RecordingVideoInput=f"file:///var/lmx/{name}",
                      RecordingCapturePreset="Video:Best")
    agent.start()
    agent.record("R", 1)
    assert colour_bars.tags(agent.movie("R")) == ("tv", "bt709", "bt709", "bt709")
    assert colour_bars.distance(agent.movie("R")) <= NEAR


@pytest.mark.parametrize("pixels, caps", [("nv12", "nv12"), ("yuyv422", "yuy2"), ("bgr0", "bgrx")])
def test_colours_of_a_camera_that_does_not_tell_them(agent, pixels, caps):
    width, height = HD
    colour_bars.make(agent.path("/var/lmx/picture"), HD, pixels, "-f rawvideo", rate=1, seconds=1,
                     conversion="" if pixels == "bgr0" else LIMITED_601)
    node = "props,media.class=Video/Source,node.name=colours,node.description=colours"
    launch = (f"filesrc location={agent.path('/var/lmx/picture')} ! rawvideoparse format={caps} width={width} "
              f"height={height} framerate=10/1 ! imagefreeze is-live=true ! pipewiresink mode=provide "
              f"stream-properties={node}")
    with PipeWireHall(agent) as hall, VirtualDevice(hall, "colours", ["gst-launch-1.0", "-q", *launch.split()]) as camera:
        agent.preferences(RecordingType="Video", RecordingVideoInput=camera.id, RecordingCapturePreset="Video:Best")
        agent.start(env=hall.env)
        agent.record("R", 1)
    assert colour_bars.distance(agent.movie("R")) <= NEAR
