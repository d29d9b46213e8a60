"""Holds a single thread of the daemon, so that its other threads run on without it."""
import contextlib
import ctypes
import os

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
def main_thread_held(agent):
    """The main thread stands still inside the block. To be left by the thread that has entered it."""
    thread = agent.sandbox.daemon_pid
    _trace(SEIZE, thread)
    try:
        _trace(INTERRUPT, thread)
        os.waitpid(thread, ANY_THREAD)
        yield
    finally:
        _trace(DETACH, thread)
