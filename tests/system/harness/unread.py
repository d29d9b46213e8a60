"""What was sent to the daemon but not read yet. A piece sent after the previous one was read is a chunk of its own."""
import fcntl
import socket
import struct
import termios
from pathlib import Path

from .waiting import wait_until


def small_buffers(agent):
    """Lets a few replies fill what the system buffers of a TCP connection in the agent's network."""
    agent.in_network("sh", "-c", "echo 4096 4096 16384 > /proc/sys/net/ipv4/tcp_wmem; "
                                 "echo 4096 4096 16384 > /proc/sys/net/ipv4/tcp_rmem")


def all_read(agent, peer):
    """Whether the daemon has read all that was sent on this local socket or IPv4 connection."""
    unsent = struct.unpack("i", fcntl.ioctl(peer, termios.TIOCOUTQ, bytes(4)))[0]  # for a local socket: and unread
    return unsent == 0 and (peer.family == socket.AF_UNIX or _received(agent, peer) == 0)


def wait_read(agent, peer, timeout=10.0):
    """Waits until the daemon has read all that was sent."""
    wait_until(lambda: all_read(agent, peer), timeout, "the daemon reading what was sent", interval=0.001)


def _received(agent, peer):
    """How many bytes wait at the daemon's end of the connection; 0 once it has closed it."""
    ends = [_as_proc_shows(peer.getpeername()), _as_proc_shows(peer.getsockname())]
    for line in Path(f"/proc/{agent.sandbox.daemon_pid}/net/tcp").read_text().splitlines()[1:]:
        words = line.split()
        if words[1:3] == ends:
            return int(words[4].split(":")[1], 16)
    return 0


def _as_proc_shows(address):
    host, port = address
    return f"{struct.unpack('=I', socket.inet_aton(host))[0]:08X}:{port:04X}"
