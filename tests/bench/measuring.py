"""Clocks and counters: CPU time of a process to the nanosecond, its memory, its wake-ups, the machine's other load."""
import os
import statistics
import time
from dataclasses import dataclass
from pathlib import Path

TICK = os.sysconf("SC_CLK_TCK")


def cpu_seconds(pid):
    """User and system time of a whole process, ended threads included: what utime + stime of its stat file say, without
    their rounding to 1/100 s."""
    return time.clock_gettime((~pid << 3) | 2)


def stat_cpu_seconds(pid):
    """utime + stime of /proc/PID/stat."""
    fields = Path(f"/proc/{pid}/stat").read_text().rsplit(")", 1)[1].split()
    return (int(fields[11]) + int(fields[12])) / TICK


def machine_busy_seconds():
    """Seconds that all cores together have been busy (time stolen by the host included)."""
    words = Path("/proc/stat").read_text().split("\n", 1)[0].split()[1:]
    user, nice, system, _idle, _iowait, irq, softirq, steal = (int(word) for word in words[:8])
    return (user + nice + system + irq + softirq + steal) / TICK


def other_load(seconds=0.5):
    """Busy cores while nothing of the benchmark runs: what others do on this machine."""
    busy, begin = machine_busy_seconds(), time.monotonic()
    time.sleep(seconds)
    return (machine_busy_seconds() - busy) / (time.monotonic() - begin)


def switches(pid):
    """(voluntary, involuntary) context switches of all threads that live."""
    totals = [0, 0]
    for task in Path(f"/proc/{pid}/task").iterdir():
        for line in (task / "status").read_text().splitlines():
            if line.startswith("voluntary_ctxt"):
                totals[0] += int(line.split()[1])
            elif line.startswith("nonvoluntary_ctxt"):
                totals[1] += int(line.split()[1])
    return tuple(totals)


def threads(pid):
    """{thread id: (name, CPU seconds, voluntary switches)} of all threads that live."""
    found = {}
    for task in Path(f"/proc/{pid}/task").iterdir():
        status = dict(line.split(":", 1) for line in (task / "status").read_text().splitlines() if ":" in line)
        ran = int((task / "schedstat").read_text().split()[0]) / 1e9
        found[int(task.name)] = (status["Name"].strip(), ran, int(status["voluntary_ctxt_switches"]))
    return found


def memory_megabytes(pid):
    """{"Rss", "Pss", "Private", "Dirty"} of a process: private is what nobody else maps at the moment, dirty the part
    of it that is its own, whoever else has the same libraries loaded."""
    kilobytes = {}
    for line in Path(f"/proc/{pid}/smaps_rollup").read_text().splitlines()[1:]:
        name, value = line.split(":")
        kilobytes[name] = int(value.split()[0])
    return {"Rss": kilobytes["Rss"] / 1024, "Pss": kilobytes["Pss"] / 1024,
            "Private": (kilobytes["Private_Clean"] + kilobytes["Private_Dirty"]) / 1024,
            "Dirty": kilobytes["Private_Dirty"] / 1024}


def percentile(values, share):
    """The smallest value that `share` of all are not above."""
    ordered = sorted(values)
    return ordered[min(len(ordered) - 1, max(0, -int(-share * len(ordered) // 1) - 1))]


median = statistics.median


@dataclass(frozen=True)
class CpuShare:
    """CPU seconds of one process per second of a span."""

    cpu: float
    stat_cpu: float  # the same from its stat file


def cpu_shares(pids, seconds):
    """({name: CpuShare} of the processes {name: pid} over the same span, the cores that others kept busy meanwhile)."""
    before = {name: (cpu_seconds(pid), stat_cpu_seconds(pid)) for name, pid in pids.items()}
    own, busy, begin = time.process_time(), machine_busy_seconds(), time.monotonic()
    time.sleep(seconds)
    spent = time.monotonic() - begin
    shares = {name: CpuShare((cpu_seconds(pid) - before[name][0]) / spent,
                             (stat_cpu_seconds(pid) - before[name][1]) / spent) for name, pid in pids.items()}
    known = time.process_time() - own + sum(share.cpu for share in shares.values()) * spent
    return shares, max(0.0, (machine_busy_seconds() - busy - known) / spent)
