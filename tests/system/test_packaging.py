"""What is installed beside the program: each option has its place in the man page and in the completion."""
import plistlib
import re
import shutil
import subprocess

import pytest
from conftest import ROOT

SHORT = [f"-{letter}" for letter in "cdfhHipstuvZ"]
LONG = [f"--{name}" for name in ("unattended_minutes", "max_duration", "file", "password", "status", "timerstart",
                                 "timerdelay", "timerlist", "timerrevoke")]


def complete(*words):
    """What bash offers for the last of `words`."""
    script = (f'source "{ROOT}/packaging/lmxagentd.bash-completion"; COMP_WORDS=("$@"); COMP_CWORD=$(($# - 1)); '
              'COMPREPLY=(); _lmxagentd; printf "%s\\n" "${COMPREPLY[@]}"')
    result = subprocess.run(["bash", "-c", script, "bash", *words], capture_output=True, text=True, check=True)
    assert not result.stderr
    return result.stdout.split()


def test_these_are_all_options():
    source = (ROOT / "src/cli/command_line.cpp").read_text()
    assert sorted(re.findall(r'\{"(\w+)", (?:required|no)_argument', source)) == sorted(name[2:] for name in LONG)
    letters = re.search(r'kShortOptions = "([^"]+)"', source)[1].replace(":", "")
    assert sorted(f"-{letter}" for letter in letters) == sorted(SHORT)


@pytest.mark.parametrize("option", SHORT + LONG)
def test_the_man_page_tells_of_the_option(option):
    page = (ROOT / "packaging/lmxagentd.8").read_text()
    assert re.search(re.escape(option.replace("-", "\\-")) + r"\b", page)


def test_completion():
    assert sorted(complete("lmxagentd", "")) == sorted(SHORT + LONG)
    assert complete("lmxagentd", "--timer") == ["--timerstart", "--timerdelay", "--timerlist", "--timerrevoke"]
    assert complete("lmxagentd", "-i", "") == ["ad-hoc-prefs", "daemon-prefs", "zq-device-list"]
    assert complete("lmxagentd", "-d", "") == []


def test_completion_of_paths(tmp_path):
    (tmp_path / "lecture.mov").touch()
    assert complete("lmxagentd", "-f", f"{tmp_path}/lec") == [f"{tmp_path}/lecture.mov"]


def test_the_sample_preferences_are_whole():
    """A sample that is not read would be a bad example; its commented parts stay out."""
    sample = plistlib.loads((ROOT / "packaging/com.zandor.lmxagentd.sample.plist").read_bytes())
    assert {"CameraName", "CameraUUID", "ServerUUID", "LumexURL", "TunnelHost", "TunnelPort", "RecordingType",
            "RecordingRepositoryPath", "RecordingDiskSpaceCutoffInMB"} <= set(sample)
    assert all(isinstance(value, str) for value in sample.values())


def test_installation(tmp_path):
    subprocess.run(["cmake", "--install", str(ROOT / "build/release"), "--prefix", str(tmp_path)], check=True,
                   stdout=subprocess.DEVNULL)
    installed = {str(path.relative_to(tmp_path)) for path in tmp_path.rglob("*") if path.is_file()}
    assert installed == {"sbin/lmxagentd", "bin/lmx-tunnel", "share/man/man8/lmxagentd.8", "lib/systemd/system/lmxagentd.service",
                         "share/bash-completion/completions/lmxagentd",
                         "share/doc/lmxagentd/com.zandor.lmxagentd.sample.plist"}
    program = shutil.which("lmxagentd", path=str(tmp_path / "sbin"))
    assert "(version 100)" in subprocess.run([program, "-v"], capture_output=True, text=True, check=True).stderr
