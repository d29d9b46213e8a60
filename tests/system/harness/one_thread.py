"""Holds single threads of the daemon, so that its other threads run on without them."""
import contextlib
import ctypes
import os
from pathlib import Path

SEIZE, INTERRUPT, DETACH = 0x4206, 0x4207, 17
ANY_THREAD = 0x40000000  # waitpid reports threads too

_libc = ctypes.CDLL(None, use_errno=True)
_libc.ptrace.restype = ctypes.c_long
_libc.ptrace.argtypes = [ctypes.c_long, ctypes.c_long, ctypes.c_void_p, ctypes.c_void_p]


def _trace(request, thread):
    if _libc.ptrace(request, thread, None, None) != 0:
        error = ctypes.get_errno()
        raise OSError(error, f"ptrace: {os.strerror(error)}")


@contextlib.contextmanager
def held(*threads):
    """These threads stand still inside the block. To be left by the thread that has entered it."""
    seized = []
    try:
        for thread in threads:
            _trace(SEIZE, thread)
            seized.append(thread)
            _trace(INTERRUPT, thread)
            os.waitpid(thread, ANY_THREAD)
        yield
    finally:
        for thread in seized:
            _trace(DETACH, thread)


def main_thread_held(agent):
    """The main thread stands still inside the block."""
    return held(agent.sandbox.daemon_pid)


def threads_named(agent, name):
    """The threads of this name, oldest first."""
    tasks = Path(f"/proc/{agent.sandbox.daemon_pid}/task").iterdir()
    return sorted(int(task.name) for task in tasks if (task / "comm").read_text().strip() == name)
