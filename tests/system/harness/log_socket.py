"""A datagram socket for the system log that loses no message when its reader is slow."""
import ctypes
import socket
import threading
from pathlib import Path

CLONE_NEWNET = 0x40000000
LENGTH = Path("/proc/sys/net/unix/max_dgram_qlen")


def log_socket():
    """An unbound local datagram socket with room for more than a hundred messages.

    The limit of queued messages, usually ten, comes from the network namespace of the thread that creates the socket.
    A starting daemon sends ten faster than a busy machine reads them. Unprivileged users can't raise the limit.
    """
    made = []
    thread = threading.Thread(target=lambda: made.append(_in_namespace_of_its_own()))
    thread.start()
    thread.join()
    made[0].setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, 4 << 20)
    return made[0]


def _in_namespace_of_its_own():
    """Creates the socket in a new network namespace, which only the calling thread enters."""
    if ctypes.CDLL(None).unshare(CLONE_NEWNET) == 0:
        LENGTH.write_text("4096")
    return socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
