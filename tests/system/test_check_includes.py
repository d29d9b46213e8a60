"""scripts/check-includes: it must complain about what it exists for, and only about that."""
import json
import subprocess
from pathlib import Path

import pytest

CHECK = Path(__file__).resolve().parents[2] / "scripts/check-includes"
FILES = {
    "src/support/text.h": "#include <string>\nstd::string text();\n",
    "src/platform/log.h": '#include "support/text.h"\n',
    "src/platform/log.cpp": '#include "platform/log.h"\nstd::string logged() { return text(); }\n',
    "src/model/codes.h": "",
    "src/model/context.h": '#include "platform/log.h"\n',
    "src/capture/api/framework.h": '#include "support/text.h"\n',
    "src/prefs/settings.h": '#include "capture/api/framework.h"\n#include "model/context.h"\n',
    "src/record/engine.h": '#include "prefs/settings.h"\n',
    "src/control/protocol/reply.h": "",
    "src/control/channel.h": '#include "control/protocol/reply.h"\n#include "record/engine.h"\n',
    "src/capture/media/cutter.h": '#include "support/text.h"\n',
    "src/capture/controller.h": '#include "capture/api/framework.h"\n#include "capture/media/cutter.h"\n',
    "src/capture/recorder.h": '#include "model/codes.h"\n',
    "src/agent/agent_main.h": '#include "control/channel.h"\n',
    "src/capture/factory.h": '#include "capture/api/framework.h"\n',
    "src/app/main.cpp": '#include <vector>\n#include "agent/agent_main.h"\n#include "capture/factory.h"\n',
    "tools/sender/sender.h": '#include "control/channel.h"\n',
    "tests/unit/support/CMakeLists.txt": "lmx_test(unit_support SOURCES a_test.cpp)\n",
    "tests/unit/support/a_test.cpp": "",
}
PASSED = "includes keep their direction, every unit test has a target"


def check(tmp_path, changes=None, *options):
    for name, text in {**FILES, **(changes or {})}.items():
        (tmp_path / name).parent.mkdir(parents=True, exist_ok=True)
        (tmp_path / name).write_text(text)
    result = subprocess.run([CHECK, tmp_path, *options], capture_output=True, text=True, timeout=60)
    assert not result.stderr
    return result.returncode, result.stdout


def compile_all(tmp_path, changes=None):
    """Checks with a build directory whose calls bring everything in by a precompiled header."""
    build = tmp_path / "build"
    build.mkdir()
    precompiled = build / "cmake_pch.hxx"
    precompiled.write_text("#include <string>\n#include <vector>\n")
    names = {**FILES, **(changes or {})}
    sources = [tmp_path / name for name in names if name.startswith("src/") and name.endswith(".cpp")]
    (build / "compile_commands.json").write_text(json.dumps([
        {"file": str(source), "directory": str(build),
         "command": f"ccache c++ -std=c++20 -I{tmp_path}/src -Winvalid-pch -include {precompiled} -o a.o -c {source}"}
        for source in sources]))
    return check(tmp_path, changes, "--compile", build)


def test_allowed_directions_pass(tmp_path):
    assert check(tmp_path) == (0, PASSED + "\n")


@pytest.mark.parametrize("name, text, complaint", [
    ("src/support/new.h", '#include "platform/log.h"', "support/new.h: support must not include platform/log.h"),
    ("src/model/new.h", '#include "prefs/other.h"', "model/new.h: model must not include prefs/other.h"),
    ("src/record/new.h", '#include "control/protocol/reply.h"',
     "record/new.h: record must not include control/protocol/reply.h"),
    ("src/control/new.h", '#  include "agent/other.h"', "control/new.h: control must not include agent/other.h"),
    ("src/agent/new.h", '#include "capture/other.h"', "agent/new.h: agent must not include capture/other.h"),
    ("src/app/new.h", '#include "capture/media/cutter.h"', "app/new.h: app must not include capture/media/cutter.h"),
    ("src/capture/media/new.h", '#include "platform/other.h"',
     "capture/media/new.h: capture/media must not include platform/other.h"),
    ("src/capture/new.h", '#include "model/other.h"', "capture/new.h: capture must not include model/other.h"),
    ("src/support/new.h", '#include "text.h"', 'support/new.h: "text.h" names no header of the tree by its folder'),
    ("src/support/new.h", '#include "support/gone.h"',
     'support/new.h: "support/gone.h" names no header of the tree by its folder'),
    ("src/elsewhere/a.h", "", "elsewhere/a.h: its folder is not in scripts/check-includes"),
    ("tests/unit/support/b_test.cpp", "", "tests/unit/support/b_test.cpp: no CMakeLists.txt names it"),
    ("tests/unit/support/aa_test.cpp", "", "tests/unit/support/aa_test.cpp: no CMakeLists.txt names it"),
])
def test_each_offence_is_named(tmp_path, name, text, complaint):
    others = {f"src/{folder}/other.h": "" for folder in ("platform", "model", "prefs", "agent", "capture")}
    assert check(tmp_path, {**others, name: text + "\n"}) == (1, complaint + "\n")


def test_a_header_that_is_reached_through_others_counts(tmp_path):
    """The complaint shows the way from the file to the header that it must not reach."""
    changes = {"src/capture/media/new.h": '#include "support/deep.h"\n',
               "src/support/deep.h": '#include "support/deeper.h"\n',
               "src/support/deeper.h": '#include "record/other.h"\n', "src/record/other.h": ""}
    assert check(tmp_path, changes) == (
        1, "capture/media/new.h: capture/media must not include record/other.h "
           "(through support/deep.h → support/deeper.h)\n"
           "support/deep.h: support must not include record/other.h (through support/deeper.h)\n"
           "support/deeper.h: support must not include record/other.h\n")


def test_headers_that_include_each_other_end_the_search(tmp_path):
    ring = {"src/support/one.h": '#include "support/two.h"\n', "src/support/two.h": '#include "support/one.h"\n'}
    assert check(tmp_path, ring) == (0, PASSED + "\n")


def test_every_file_compiles_without_the_precompiled_header(tmp_path):
    assert compile_all(tmp_path) == (0, PASSED + ", every file includes what it uses\n")


@pytest.mark.parametrize("name, text, complaint", [
    ("src/capture/recorder.h", "std::vector<int> frames();\n", "capture/recorder.h"),  # no source includes it
    ("src/agent/other.h", "std::string other();\n", "agent/other.cpp"),  # its own source includes it first
    ("src/app/main.cpp", "std::string name;\nint main() {}\n", "app/main.cpp"),
])
def test_a_file_that_needs_the_precompiled_header_is_named(tmp_path, name, text, complaint):
    others = {"src/agent/other.h": "", "src/agent/other.cpp": '#include "agent/other.h"\n'}
    status, output = compile_all(tmp_path, {**others, name: text})
    assert status == 1
    lines = output.splitlines()
    assert [line.split(":")[0] for line in lines] == [complaint]
    assert lines[0].startswith(f"{complaint}: does not include all that it uses: ")
