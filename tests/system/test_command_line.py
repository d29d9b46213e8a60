"""The program at a shell: help, version, dumps, device list, preview path, camera-bind test."""
import os
import plistlib
import re
import stat

import pytest
from harness.agent import PREFERENCES
from harness.log_reader import Level

USAGE = """
lmxagentd (version 100)

usage: lmxagentd [-dhsv] [-i [ad-hoc-prefs | daemon-prefs | zq-device-list]] [-f file_output_path]

\t    -h (help usage)
\t    -v (print version and application validity)
\t    -d (duration in seconds of an ad-hoc recording)
\t    -i (print the requested type of information)
\t    -s (disables submission post-process step, enabled by default)
\t    -f file_output_path (runs an ad-hoc capture on this machine)

example: lmxagentd -s

"""
BIND_USAGE = "Usage: lmxagentd -t <file-path> -u <username> -c <server>\n"
CAMERA = "11111111-1111-4111-8111-111111111111"
SERVER = "22222222-2222-4222-8222-222222222222"
BOUND = f"Successfully bound {CAMERA} to server {SERVER}.\n"
BIND = ("-t", "/var/lmx/input.mov", "-u", "jane", "-c", "lumex.example.test")


def stored(agent):
    return plistlib.loads(agent.path(PREFERENCES).read_bytes())


def bind_calls(agent):
    return [call["arguments"] for call in agent.tool_calls(having="--bind")]


@pytest.mark.parametrize("option", ["-h", "-H"])
def test_help(agent, option):
    result = agent.run(option)
    assert (result.returncode, result.stdout, result.stderr) == (0, "", USAGE)


def test_version(agent):
    result = agent.run("-v")
    assert (result.returncode, result.stdout, result.stderr) == (0, "", "\nLumex lmxagentd (version 100)\n\n")


@pytest.mark.parametrize("arguments", [("-x",), ("-p",), ("--timerrevoke",), ("--nothing",)],
                         ids=["unknown", "-p last", "--timerrevoke last", "unknown long"])
def test_usage_errors(agent, arguments):
    result = agent.run(*arguments)
    assert (result.returncode, result.stdout) == (64, "")
    assert result.stderr.endswith(USAGE)


@pytest.mark.parametrize("arguments, status, errors", [
    (("-d", "60"), 64, "The -d option only applies to ad-hoc mode (requires a file path)\n"),
    (("-f", "/tmp/out.mov"), 64, "A user name is required for ad-hoc file submission.\n"),
    (("-f", os.fsdecode(b"/tmp/H\xf6rsaal.mov"), "-s"), 71, "The -f option requires a path in UTF-8\n"),
], ids=["-d alone", "-f without a user", "-f not UTF-8"])
def test_wrong_combinations(agent, arguments, status, errors):
    result = agent.run(*arguments)
    assert (result.returncode, result.stdout, result.stderr) == (status, "", errors)


@pytest.mark.parametrize("arguments", [("-h",), ("-v",), ("-x",), ("-i", "nonsense"), ("--status",)])
def test_every_run_logs_its_end(agent, arguments):
    agent.run(*arguments)
    agent.log.wait("^lmxagentd stopped$", level=Level.INFO)


def test_unknown_information_prints_nothing(agent):
    result = agent.run("-i", "nonsense")
    assert (result.returncode, result.stdout, result.stderr) == (0, "", "")


def test_daemon_preferences(agent):
    result = agent.run("-i", "daemon-prefs")
    assert result.returncode == 0
    assert result.stderr.startswith("Got recording context (with daemon-prefs): ")
    assert agent.log.lines(r"^Got recording context \(with daemon-prefs\): ")
    assert result.stdout.startswith("\n\n'RecordingType' == 'Audio+Video'\n'RecordingVideoInput' == 'test://video")
    keys = re.findall("^'(.*?)' ==", result.stdout, re.MULTILINE)
    assert keys == ["RecordingType", "RecordingVideoInput", "RecordingVideoMaximumFrameRate", "RecordingAudioInput",
                    "CameraName", "CameraUUID", "RecordingRepositoryPath", "RecordingDiskSpaceCutoffInMB",
                    "PreviewIntervalInMilliseconds", "ServerUUID", "TunnelHost", "TunnelPort", "LumexURL"]


def test_ad_hoc_preferences_come_in_layers(agent):
    home = agent.path("/root" + PREFERENCES)
    home.parent.mkdir(parents=True)
    home.write_bytes(plistlib.dumps({"CameraName": "My own"}))
    agent.preferences(RecordingAudioChannel=None)
    result = agent.run("-i", "ad-hoc-prefs")
    assert result.returncode == 0, result.stderr
    assert "'CameraName' == 'My own'\n" in result.stdout
    assert "'TunnelPort' == '8175'\n" in result.stdout
    assert "'RecordingAudioChannel' == 'Stereo'\n" in result.stdout, "a default"


def test_preferences_that_cannot_be_used(agent):
    agent.preferences(RecordingType="audio")
    result = agent.run("-i", "daemon-prefs")
    text = "Exception caught: Invalid value: audio for preference: RecordingType"
    assert (result.returncode, result.stdout, result.stderr) == (70, "", text + "\n")
    assert agent.log.lines(f"^{text}$")


def test_device_list(agent):
    result = agent.run("-i", "zq-device-list")
    assert (result.returncode, result.stderr) == (0, "")
    cameras, microphones = result.stdout.split("\n\n")
    assert "RecordingVideoInput" in cameras and "\n  test://video " in cameras
    assert "RecordingAudioInput" in microphones and "\n  test://audio " in microphones


def test_preview_path(agent):
    before = stored(agent)
    agent.path(PREFERENCES).chmod(0o640)
    result = agent.run("-p", "/var/lmx/p.jpg")
    assert (result.returncode, result.stdout, result.stderr) == (0, "", "")
    assert stored(agent) == {**before, "PreviewPath": "/var/lmx/p.jpg"}
    assert stat.S_IMODE(agent.path(PREFERENCES).stat().st_mode) == 0o640
    assert agent.path(PREFERENCES).read_bytes().startswith(b"<?xml")


def test_preview_path_of_a_machine_without_preferences(agent):
    agent.path(PREFERENCES).unlink()
    assert agent.run("-p", "/var/lmx/p.jpg").returncode == 0
    assert stored(agent)["RecordingCapturePreset"] == "Video:Better"
    assert len(stored(agent)) == 12


def test_preview_path_keeps_a_broken_file(agent):
    agent.preferences_bytes(b"half a file")
    result = agent.run("-p", "/var/lmx/p.jpg")
    assert result.returncode == 0
    assert PREFERENCES + ".unreadable-1" in result.stderr
    assert agent.path(PREFERENCES + ".unreadable-1").read_bytes() == b"half a file"
    assert stored(agent)["PreviewPath"] == "/var/lmx/p.jpg"


def test_preview_path_on_a_read_only_system(agent):
    result = agent.run("-p", "/var/lmx/p.jpg", mounts=["ro /Library/Preferences"])
    assert result.returncode == 73
    assert "could not be written: Read-only file system" in result.stderr


def test_bind_needs_its_arguments(agent):
    result = agent.run("-t", "")
    assert (result.returncode, result.stdout) == (64, "")
    assert result.stderr == ("The -t option requires a file path\n"
                             "The -t option requires a username to be specified with the -u option\n"
                             "The -t option requires a server to be specified with the -c option\n" + BIND_USAGE)
    result = agent.run("-t", "/a.mov", "-u", "jane")
    assert result.stderr == "The -t option requires a server to be specified with the -c option\n" + BIND_USAGE
    assert not bind_calls(agent)


def test_bind(agent):
    agent.path(PREFERENCES).unlink()
    agent.set_tool({"when": "--bind", "print": "Welcome.\n" + BOUND})
    result = agent.run(*BIND)
    assert (result.returncode, result.stderr) == (0, "")
    assert result.stdout == f"camera UUID: {CAMERA}\nserver UUID: {SERVER}\n"
    assert bind_calls(agent) == [["--bind", "Fake-Camera", "-u", "jane", "-s", "lumex.example.test"]]
    new = stored(agent)
    assert {key: new[key] for key in ("RecordingType", "RecordingPath", "CameraName", "CameraUUID", "ServerUUID",
                                      "RecordingRepositoryPath", "TunnelPort")} == {
        "RecordingType": "File", "RecordingPath": "/var/lmx/input.mov", "CameraName": "Fake-Camera",
        "CameraUUID": CAMERA, "ServerUUID": SERVER, "RecordingRepositoryPath": "/var/lmx/agent/recordings",
        "TunnelPort": "8175"}


def test_bind_keeps_an_earlier_binding(agent):
    before = stored(agent)
    agent.set_tool({"when": "--bind", "print": BOUND})
    assert agent.run(*BIND).returncode == 0
    assert stored(agent) == {**before, "RecordingType": "File", "RecordingPath": "/var/lmx/input.mov"}


def test_bind_names_are_never_shell_syntax(agent):
    agent.set_tool({"when": "--bind", "print": BOUND})
    user, server = "jane doe; touch /tmp/oops", "$(touch /var/oops)`touch /var/oops`'\""
    assert agent.run("-t", "/a.mov", "-u", user, "-c", server).returncode == 0
    assert bind_calls(agent) == [["--bind", "Fake-Camera", "-u", user, "-s", server]]
    assert not agent.path("/var/oops").exists()


def test_bind_command_is_cut(agent):
    agent.set_tool({"when": "--bind", "print": BOUND})
    assert agent.run("-t", "/a.mov", "-u", "jane", "-c", "s" * 400).returncode == 0
    assert len(" ".join(["/usr/bin/lumex", *bind_calls(agent)[0]])) == 255


def test_bind_looks_at_264_bytes(agent):
    before = stored(agent)
    agent.set_tool({"when": "--bind", "print": "." * 264 + BOUND})
    result = agent.run(*BIND)
    assert result.returncode == 76
    assert result.stderr == "Error: unexpected result from `lmx --bind`: " + "." * 264 + "\n"
    assert stored(agent) == before
    agent.set_tool({"when": "--bind", "print": BOUND + "." * 300_000})
    assert agent.run(*BIND).returncode == 0, "a talkative tool is read to its end"


def test_bind_failures(agent):
    before = stored(agent)
    agent.set_tool({"when": "--bind", "print": BOUND, "exit": 9})
    result = agent.run(*BIND, "-p", "/var/lmx/p.jpg")
    assert (result.returncode, result.stdout) == (9, "")
    assert result.stderr == "Error: camera binding failed with exit status 9\n"
    agent.set_tool(present=False)
    result = agent.run(*BIND)
    assert result.returncode == 127
    assert result.stderr.endswith("Error: camera binding failed with exit status 127\n")
    assert stored(agent) == before


def test_bind_and_preview_path(agent):
    agent.set_tool({"when": "--bind", "print": BOUND})
    assert agent.run("-p", "/var/lmx/p.jpg", *BIND).returncode == 0
    assert stored(agent)["PreviewPath"] == "/var/lmx/p.jpg"
    assert stored(agent)["RecordingPath"] == "/var/lmx/input.mov"
