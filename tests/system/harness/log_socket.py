"""A datagram socket for a system log that loses nothing when its reader is held up for a while."""
import ctypes
import socket
import threading
from pathlib import Path

CLONE_NEWNET = 0x40000000
LENGTH = Path("/proc/sys/net/unix/max_dgram_qlen")


def log_socket():
    """A local datagram socket, not bound yet, that holds as many messages as its memory has room for.

    How many may wait is decided when it is made, by the network namespace of the thread that makes it: ten, which a
    starting daemon sends faster than a busy machine reads them. An ordinary user has to live with that.
    """
    made = []
    thread = threading.Thread(target=lambda: made.append(_in_namespace_of_its_own()))
    thread.start()
    thread.join()
    made[0].setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, 4 << 20)
    return made[0]


def _in_namespace_of_its_own():
    """Leaves the process's network with the calling thread only."""
    if ctypes.CDLL(None).unshare(CLONE_NEWNET) == 0:
        LENGTH.write_text("4096")
    return socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
