"""idle: what the waiting daemon costs, and how soon it answers after its start."""
import threading
import time

from ground import recording
from measuring import cpu_seconds, median, memory_megabytes, switches, threads
from report import Result, Row

# Writes down the moment of the exec on the clock that host and sandbox share.
STAMPED_EXEC = ("/usr/bin/python3", "-c",
                "import os,sys,time; open('/var/tool/exec_time','w').write(repr(time.monotonic())); "
                "os.execv(sys.argv[1], sys.argv[1:])")


def first_status(agent, answered):
    """Tries every 0.3 ms until STATUS is answered."""
    while not answered:
        try:
            if agent.command("STATUS").text:
                answered.append(time.monotonic())
        except (FileNotFoundError, ConnectionRefusedError):
            time.sleep(0.0003)


def seconds_to_first_status(ground):
    with ground.agent(start=False) as agent:
        # The daemon asks the tool for its cluster first; the harness's stand-in would spend its time starting Python.
        agent.path("/usr/bin/lumex").write_text("#!/bin/sh\nexit 1\n")
        answered = []
        asker = threading.Thread(target=first_status, args=(agent, answered), daemon=True)
        asker.start()
        agent.start(wait=False, prefix=STAMPED_EXEC)
        asker.join(20)
        assert answered, "no answer within 20 s"
        return answered[0] - float(agent.path("/var/tool/exec_time").read_text())


def waiting(agent, seconds):
    """(CPU seconds, voluntary, involuntary switches) a minute, and the threads that woke up"""
    pid = agent.sandbox.daemon_pid
    cpu, before, by_thread, begin = cpu_seconds(pid), switches(pid), threads(pid), time.monotonic()
    time.sleep(seconds)
    minutes = (time.monotonic() - begin) / 60
    after, now = switches(pid), threads(pid)
    woken = {}
    for thread, (name, _ran, voluntary) in now.items():
        count = voluntary - by_thread.get(thread, (name, 0.0, 0))[2]
        if count > 0:
            woken[f"{name}-{thread}" if name in woken else name] = count / minutes
    voluntary, involuntary = ((b - a) / minutes for a, b in zip(before, after))
    return (cpu_seconds(pid) - cpu) / minutes, voluntary, involuntary, woken


def idle(ground):
    """CPU, wake-ups and memory of the waiting daemon, and exec → first STATUS answered."""
    seconds = ground.pick(60, 10, 1)
    settled = ground.pick(5, 5, 1)  # plug-ins are warmed up behind the start
    starts = [1000 * seconds_to_first_status(ground) for _ in range(ground.pick(10, 3, 1))]
    with ground.agent(RecordingVideoInput="test://video?size=1280x720") as agent:
        time.sleep(settled)
        cpu, voluntary, involuntary, woken = waiting(agent, seconds)
        memory = memory_megabytes(agent.sandbox.daemon_pid)
        with recording(agent, "MEMORY"):
            time.sleep(ground.pick(3, 3, 1))
            while_recording = memory_megabytes(agent.sandbox.daemon_pid)
        time.sleep(ground.pick(2, 2, 1))
        afterwards = memory_megabytes(agent.sandbox.daemon_pid)
    rows = [Row("idle: CPU a minute", cpu, "s", limit=0.06),
            Row("idle: wake-ups a minute", voluntary, "", limit=300),
            Row("idle: private memory (dirty)", memory["Dirty"], "MB", limit=15),
            Row("idle: Private, clean pages too", memory["Private"], "MB"),
            Row("idle: Pss", memory["Pss"], "MB"),
            Row("private (dirty), recording 720p", while_recording["Dirty"], "MB"),
            Row("private (dirty), idle after it", afterwards["Dirty"], "MB"),
            Row("exec → first STATUS answered", median(starts), "ms", limit=100, samples={"ours": starts})]
    wakers = ", ".join(f"{name} {count:.0f}" for name, count in sorted(woken.items(), key=lambda item: -item[1]))
    return Result(rows, [
        f"over {seconds} s, no peer: the limits are absolute (0.1 % of a core, 5 wake-ups a second). Wake-ups are "
        f"voluntary context switches of all threads; {involuntary:.0f} involuntary ones a minute. By thread: {wakers}",
        f"private (dirty): Private_Dirty of smaps_rollup, {settled} s after the start, plug-ins loaded. Clean pages are "
        "those of libraries, private only while nobody else has them mapped and dropped when memory is short: they and Pss "
        "depend on what else runs.",
        "No server answers: the tunnel, where it is built in, tries again with growing pauses.",
        f"exec → STATUS: median of {len(starts)}, GStreamer's catalogue of plug-ins warm, asked every 0.3 ms; the "
        "moment of the exec is written down by the process itself."])
