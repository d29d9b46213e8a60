"""A slow disk under the daemon: see slow_calls.c."""
import subprocess

from .sandbox import HARNESS

PLACE = "/var/slow"


def slow_directories(agent, milliseconds):
    """@return the `prefix` for start() with which the daemon takes so long for each directory that it makes"""
    place = agent.path(PLACE)
    place.mkdir(parents=True, exist_ok=True)
    subprocess.run(["cc", "-shared", "-fPIC", "-O1", "-Wall", "-Werror", "-o", place / "slow_calls.so",
                    HARNESS / "slow_calls.c"], check=True, timeout=60)
    return ("env", f"LD_PRELOAD={PLACE}/slow_calls.so", f"SLOW_MKDIR_MS={milliseconds}")
