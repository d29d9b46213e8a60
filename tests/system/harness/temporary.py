"""Temporary directories of the harness."""
import tempfile


def short_directory():
    """A new directory directly below /tmp, removed by cleanup() or at the end of its block.

    Sockets are made in it, and the path of a socket has at most 107 bytes: pytest's tmp_path may be too long.
    """
    return tempfile.TemporaryDirectory(prefix="lmx-", dir="/tmp")
