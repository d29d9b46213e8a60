"""Rows, the table of them, and the notes on the machine."""
import os
import platform
import sys
import textwrap
import time
from dataclasses import dataclass, field
from pathlib import Path


@dataclass
class Row:
    """One figure. `peer` None: there is nothing to compare with, only a limit."""

    name: str
    ours: float
    unit: str
    peer: float | None = None
    peer_name: str = ""
    ratio: float | None = None  # the median of paired ratios where there are pairs
    ratio_goal: float | None = None
    limit: float | None = None  # of ours, in its unit
    samples: dict = field(default_factory=dict)

    def __post_init__(self):
        if self.ratio is None and self.peer:
            self.ratio = self.ours / self.peer

    def goal(self):
        parts = []
        if self.ratio_goal is not None:
            parts.append(f"≤ {self.ratio_goal:g} x")
        if self.limit is not None:
            parts.append(f"≤ {self.limit:g} {self.unit}")
        return ", ".join(parts)

    def verdict(self):
        if self.ratio_goal is None and self.limit is None:
            return ""
        good = (self.ratio_goal is None or self.ratio <= self.ratio_goal) and (
            self.limit is None or self.ours <= self.limit)
        return "met" if good else "MISSED"


@dataclass
class Result:
    """What one benchmark gives: rows, and notes that belong to them."""

    rows: list = field(default_factory=list)
    notes: list = field(default_factory=list)


def number(value, unit):
    if value is None:
        return "-"
    digits = 4 if abs(value) < 1 else 3 if abs(value) < 10 else 2 if abs(value) < 100 else 1
    return f"{value:.{digits}f} {unit}"


def print_table(rows, show_samples):
    head = ("figure", "ours", "peer", "ratio", "goal", "", "peer is")
    lines = [(row.name, number(row.ours, row.unit), number(row.peer, row.unit),
              "-" if row.ratio is None else f"{row.ratio:.3f}", row.goal(), row.verdict(), row.peer_name)
             for row in rows]
    widths = [max(len(line[i]) for line in [head, *lines]) for i in range(len(head))]
    left = (0, 4, 5, 6)
    for line, row in zip([head, *lines], [None, *rows]):
        cells = [cell.ljust(width) if i in left else cell.rjust(width)
                 for i, (cell, width) in enumerate(zip(line, widths))]
        print("  ".join(cells).rstrip())
        if row is None:
            print("  ".join("-" * width for width in widths))
        elif show_samples:
            for name, values in row.samples.items():
                print(f"    {name}: " + " ".join(f"{value:.4g}" for value in values))
    sys.stdout.flush()


def print_notes(notes):
    for note in notes:
        print(textwrap.fill(note, 118, initial_indent="  * ", subsequent_indent="    ", break_on_hyphens=False))
    sys.stdout.flush()


def machine_notes(binary):
    cpu = next((line.split(":", 1)[1].strip() for line in Path("/proc/cpuinfo").read_text().splitlines()
                if line.startswith("model name")), platform.machine())
    load = " ".join(f"{value:.2f}" for value in os.getloadavg())
    governor = Path("/sys/devices/system/cpu/cpu0/cpufreq/scaling_governor")
    return [f"{cpu}, {os.cpu_count()} cores"
            + (f", governor {governor.read_text().strip()}" if governor.exists() else ", no frequency governor seen"),
            f"Linux {platform.release()}; load average {load}",
            f"daemon: {Path(binary).stat().st_size >> 20} MiB build of "
            + time.strftime("%F %T", time.localtime(Path(binary).stat().st_mtime))]
