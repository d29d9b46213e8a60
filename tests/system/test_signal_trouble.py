"""Trouble with what camera and microphone deliver: told when it has lasted, told when it is over, or not at all."""
import subprocess

import pytest
from harness.log_reader import Level

# Six seconds of black and silence, then six of colour and tone, again and again.
DARK = ("-f lavfi -t 6 -i color=black:size=320x180:rate=30 -f lavfi -t 6 -i testsrc2=size=320x180:rate=30 "
        "-f lavfi -t 6 -i anullsrc=r=48000:cl=mono -f lavfi -t 6 -i sine=frequency=440:sample_rate=48000 "
        "-filter_complex [0][2][1][3]concat=n=2:v=1:a=1 -c:v libx264 -preset ultrafast -pix_fmt yuv420p -c:a aac")
INSIDE = "/var/lmx/dark.mp4"
BLACK, SILENT = "^The picture has been black for", "^The microphone has been silent for"
SEEN, HEARD = "^The picture was black for .* all right again$", "^The microphone was silent for .* all right again$"


@pytest.fixture
def dark(agent):
    """An agent whose camera, with its sound, is such a movie."""
    subprocess.run(["ffmpeg", "-v", "error", *DARK.split(), str(agent.path(INSIDE))], check=True, timeout=60)

    def start(**preferences):
        agent.preferences(RecordingVideoInput=f"file://{INSIDE}", RecordingAudioInput="Automatic", **preferences)
        return agent.start()
    return start


def test_black_and_silent_is_told_once_each_and_so_is_the_end(dark):
    agent = dark(SignalWarningSeconds="3")
    assert agent.start_recording("DARK").text == "cmdStatus=0"
    begun = [agent.log.wait(text, 20, level=Level.WARNING) for text in (BLACK, SILENT)]
    over = [agent.log.wait(text, 20, level=Level.NOTICE) for text in (SEEN, HEARD)]
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.wait_tool_call("DARK")
    for first, last in zip(begun, over):
        assert 1 < last.at - first.at < 6, (first, last)
    for text in (BLACK, SILENT, SEEN, HEARD):
        assert len(agent.log.lines(text)) == 1, text


@pytest.mark.parametrize("wish", ["off", "20"])
def test_nothing_is_told_when_it_is_off_or_too_short(dark, wish):
    agent = dark(SignalWarningSeconds=wish)
    assert agent.start_recording("DARK").text == "cmdStatus=0"
    agent.let_record(13)
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.wait_tool_call("DARK")
    assert not agent.log.lines("black|silent")


def test_one_kind_can_be_left_out(dark):
    agent = dark(SignalWarningSeconds="3", SignalBlackLevel="off", SignalFrozenDifference="off")
    assert agent.start_recording("DARK").text == "cmdStatus=0"
    agent.log.wait(HEARD, 30, level=Level.NOTICE)
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.wait_tool_call("DARK")
    assert not agent.log.lines("^The picture (has|was|did)")
