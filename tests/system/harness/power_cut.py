"""A power cut: the daemon ends, and of its recordings only what it has synced is left. See power_cut.c."""
import shutil
import subprocess

from .agent import REPOSITORY
from .sandbox import HARNESS

PLACE = "/var/power"


class PowerCut:
    """For one start of the daemon, with an empty repository. At most one cut.

    names: "together" when each sync makes all names durable, "apart" when a directory's own sync is needed for its
    """

    def __init__(self, agent, names="together"):
        self._agent = agent
        self.prefix = ("env", f"LD_PRELOAD={PLACE}/power_cut.so", f"POWER_CUT={PLACE}", f"POWER_CUT_TOP={REPOSITORY}",
                       f"POWER_CUT_NAMES={names}")
        place = agent.path(PLACE)
        shutil.rmtree(place, ignore_errors=True)
        for name in ("files", "dirs"):
            (place / name).mkdir(parents=True)
        subprocess.run(["cc", "-shared", "-fPIC", "-O1", "-Wall", "-Werror", "-o", place / "power_cut.so",
                        HARNESS / "power_cut.c"], check=True, timeout=60)

    def start(self):
        self._agent.start(prefix=self.prefix)

    def arm(self, syncs):
        """The power fails behind the next command's answer: at once for 0, else right after so many more syncs."""
        path = self._agent.path(f"{PLACE}/armed")
        path.with_suffix(".new").write_text(str(syncs))
        path.with_suffix(".new").rename(path)

    def restore(self):
        """Leaves in the repository what is durable. The daemon has ended."""
        top = self._agent.path(REPOSITORY)
        for entry in top.iterdir():
            shutil.rmtree(entry) if entry.is_dir() and not entry.is_symlink() else entry.unlink()
        self._fill(top, self._text("top"), self._newest_names())

    def _text(self, name):
        return self._agent.path(f"{PLACE}/{name}").read_text()

    def _names(self, key):
        """When a directory was last synced, and what it held then: {name: (key, kind)}."""
        if not self._agent.path(f"{PLACE}/dirs/{key}").exists():
            return 0, {}
        number, *lines = self._text(f"dirs/{key}").splitlines()
        return int(number), {name: (key, kind) for name, key, kind in (line.rsplit(" ", 2) for line in lines)}

    def _newest_names(self):
        """For each key the directory that holds it: after a rename the one that was synced last."""
        newest = {}
        directories = [path.name for path in self._agent.path(f"{PLACE}/dirs").iterdir()]
        for directory in sorted(directories, key=lambda key: self._names(key)[0]):
            for key, _ in self._names(directory)[1].values():
                newest[key] = directory
        return newest

    def _fill(self, place, directory, newest):
        for name, (key, kind) in self._names(directory)[1].items():
            if newest[key] != directory:
                continue
            if kind == "d":
                (place / name).mkdir(mode=0o700)
                self._fill(place / name, key, newest)
                continue
            content = self._agent.path(f"{PLACE}/files/{key}")
            (place / name).write_bytes(content.read_bytes() if content.exists() else b"")
            (place / name).chmod(0o600)
