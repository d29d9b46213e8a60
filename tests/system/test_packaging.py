"""The installed files: man page and completion list the program's options, the sample preferences can be loaded."""
import re
import shutil
import string
import subprocess

import pytest
from conftest import ROOT


@pytest.fixture
def options(agent):
    """The options that the program takes."""
    letters = string.ascii_letters + string.digits
    each = 'for option; do "$0" "$option" x -h; done'  # -h ends the program before it does anything
    refused = agent.run(*(f"-{letter}" for letter in letters), prefix=["sh", "-c", each]).stderr
    short = set(letters) - set(re.findall("invalid option -- '(.)'", refused))
    ambiguous = agent.run("--=").stderr  # an empty name abbreviates every long option: all are named
    return {f"-{letter}" for letter in short} | set(re.findall(r"'(--\w+)'", ambiguous))


def complete(*words):
    """What bash offers for the last of `words`."""
    script = (f'source "{ROOT}/packaging/lmxagentd.bash-completion"; COMP_WORDS=("$@"); COMP_CWORD=$(($# - 1)); '
              'COMPREPLY=(); _lmxagentd; printf "%s\\n" "${COMPREPLY[@]}"')
    result = subprocess.run(["bash", "-c", script, "bash", *words], capture_output=True, text=True, check=True)
    assert not result.stderr
    return result.stdout.split()


def test_the_man_page_lists_the_options(options):
    page = (ROOT / "packaging/lmxagentd.8").read_text().replace("\\-", "-")
    section = re.search(r"^\.SH OPTIONS$(.*?)^\.SH ", page, re.MULTILINE | re.DOTALL)[1]
    headings = " ".join(re.findall(r"^\.TP\n(.*)$", section, re.MULTILINE))
    assert set(re.findall(r"(?<![\w-])--?\w+", headings)) == options


def test_the_completion_lists_the_options(options):
    assert sorted(complete("lmxagentd", "")) == sorted(options)


def test_completion_of_words():
    assert complete("lmxagentd", "--timer") == ["--timerstart", "--timerdelay", "--timerlist", "--timerrevoke"]
    assert complete("lmxagentd", "-i", "") == ["ad-hoc-prefs", "daemon-prefs", "zq-device-list"]
    assert complete("lmxagentd", "-d", "") == []


def test_completion_of_paths(tmp_path):
    (tmp_path / "lecture.mov").touch()
    assert complete("lmxagentd", "-f", f"{tmp_path}/lec") == [f"{tmp_path}/lecture.mov"]


def test_the_sample_preferences_can_be_used(agent):
    """All but its devices: what "Automatic" stands for depends on the machine."""
    sample = (ROOT / "packaging/com.zandor.lmxagentd.sample.plist").read_bytes()
    for device in (b"test://video", b"test://audio"):
        sample = sample.replace(b"<string>Automatic<", b"<string>" + device + b"<", 1)
    agent.preferences_bytes(sample)
    result = agent.run("-i", "daemon-prefs")
    assert result.returncode == 0, result.stderr
    for line in ("'CameraName' == 'Lecture hall'", "'RecordingVideoInput' == 'test://video'",
                 "'RecordingAudioInput' == 'test://audio'"):
        assert line + "\n" in result.stdout


def test_installation(tmp_path):
    subprocess.run(["cmake", "--install", str(ROOT / "build/release"), "--prefix", str(tmp_path)], check=True,
                   stdout=subprocess.DEVNULL)
    installed = {str(path.relative_to(tmp_path)) for path in tmp_path.rglob("*") if path.is_file()}
    assert installed == {"sbin/lmxagentd", "bin/lmx-tunnel", "share/man/man8/lmxagentd.8",
                         "lib/systemd/system/lmxagentd.service", "share/bash-completion/completions/lmxagentd",
                         "share/doc/lmxagentd/com.zandor.lmxagentd.sample.plist"}
    program = shutil.which("lmxagentd", path=str(tmp_path / "sbin"))
    assert "(version 100)" in subprocess.run([program, "-v"], capture_output=True, text=True, check=True).stderr


def unit_settings():
    """Each setting of the unit with all its values."""
    settings = {}
    for line in (ROOT / "packaging/lmxagentd.service").read_text().splitlines():
        if "=" in line and not line.startswith("#"):
            key, value = line.split("=", 1)
            settings.setdefault(key, []).extend(value.split())
    return settings


def test_the_unit_lets_cameras_and_microphones_in():
    settings = unit_settings()
    assert {"char-video4linux", "char-alsa"} <= set(settings["DeviceAllow"])
    assert {"video", "audio"} <= set(settings["SupplementaryGroups"])
    assert settings.get("PrivateDevices", ["no"]) == ["no"]
    # udev's news of devices, the server, and sound servers
    assert {"AF_NETLINK", "AF_INET", "AF_INET6", "AF_UNIX"} <= set(settings["RestrictAddressFamilies"])


@pytest.mark.skipif(shutil.which("systemd-analyze") is None, reason="needs systemd")
def test_systemd_understands_the_unit():
    result = subprocess.run(["systemd-analyze", "verify", "--man=no", str(ROOT / "packaging/lmxagentd.service")],
                            capture_output=True, text=True)
    lines = [line for line in result.stderr.splitlines() if "/usr/sbin/lmxagentd is not executable" not in line]
    assert not [line for line in lines if "lmxagentd.service" in line]


def test_the_packages_that_the_daemon_names_are_installed_with_it():
    """A missing package's log line must not name one that the installation knows nothing of."""
    named = set(re.findall(r"gstreamer1\.0-[a-z-]+", (ROOT / "src/capture/gst/plugin_packages.cpp").read_text()))
    assert len(named) >= 7
    known = (ROOT / "scripts/install-dependencies").read_text() + (ROOT / "README.md").read_text()
    assert named <= set(re.findall(r"gstreamer1\.0-[a-z-]+", known))
