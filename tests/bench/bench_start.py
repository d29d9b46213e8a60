"""start: from START to the first frame that the recorder takes."""
import time

from ground import FirstFrame, idle
from measuring import median
from peers import Picture, seconds_to_first_buffer
from report import Result, Row

PICTURE = Picture(1280, 720)


def one_start(agent, uuid):
    """(seconds to the reply, to the first frame seen in the journal, to that frame's own time stamp)"""
    begin, wall = time.monotonic(), time.time()
    reply = agent.start_recording(uuid)
    replied = time.monotonic() - begin
    assert reply.text == "cmdStatus=0", reply.text
    frame = FirstFrame(agent)
    time.sleep(1)
    agent.command("STOP")
    agent.wait_recorded(uuid)
    idle(agent)
    return replied, frame.seen - begin, frame.captured - wall


def start(ground):
    """START sent → first frame recorded, camera closed before, against exec → first frame of gst-launch-1.0."""
    count = ground.pick(10, 3, 1)
    ours, peers = [], []
    with ground.agent(RecordingVideoInput=f"test://video?size={PICTURE}") as agent:
        time.sleep(2)  # the daemon warms its plug-ins up behind its start
        for turn in range(count):
            ours.append(one_start(agent, f"START-{turn}"))
            target = ground.folder / "first.mov"
            peers.append(1000 * seconds_to_first_buffer(PICTURE, target, ground.environment))
            target.unlink(missing_ok=True)
    replied, seen, captured = ([1000 * value for value in column] for column in zip(*ours))
    name = "gst-launch-1.0, exec"
    rows = [Row("START → first frame taken", median(seen), "ms", median(peers), name, limit=200,
                samples={"ours": seen, "peer": peers}),
            Row("START → that frame's own time", median(captured), "ms", limit=200, samples={"ours": captured}),
            Row("START → reply", median(replied), "ms", samples={"ours": replied}),
            Row("first START after the daemon's", seen[0], "ms", seen[-1], f"START number {count}")]
    return Result(rows, [
        f"median of {count}, {PICTURE} with sound. The recorder writes to its journal when it takes the first frame of "
        "a run; the benchmark looks there every 0.3 ms. The frame's own time comes from the same line.",
        "The peer's figure ends when the element in front of its encoder reports its first frame; it holds the "
        "start of a process and the loading of plug-ins, which the daemon has behind it.",
        "Nothing in the daemon opens the camera ahead of START yet (no preview runs), so there is no figure for a "
        "warm camera."])
