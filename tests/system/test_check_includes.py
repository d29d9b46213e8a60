"""scripts/check-includes: it must complain about what it exists for, and only about that."""
import subprocess
from pathlib import Path

import pytest

CHECK = Path(__file__).resolve().parents[2] / "scripts/check-includes"
FILES = {
    "support/a.h": "",
    "platform/b.h": '#include "support/a.h"\n',
    "agent/context/c.h": '#include "platform/b.h"\n',
    "prefs/capture_settings.h": '#include "agent/context/c.h"\n',
    "record/capture_framework.h": '#include "prefs/capture_settings.h"\n',
    "record/engine.h": "",
    "control/d.h": '#include "record/engine.h"\n',
    "capture/e.cpp": '#include <vector>\n#include "record/capture_framework.h"\n',
    "capture/e.h": "",
    "agent/f.h": '#include "control/d.h"\n',
    "app/main.cpp": '#include "agent/f.h"\n#include "capture/e.h"\n',
    "tests/unit/support/CMakeLists.txt": "lmx_test(unit_support SOURCES a_test.cpp)\n",
    "tests/unit/support/a_test.cpp": "",
}


def check(tmp_path, changes=None):
    for name, text in {**FILES, **(changes or {})}.items():
        (tmp_path / name).parent.mkdir(parents=True, exist_ok=True)
        (tmp_path / name).write_text(text)
    result = subprocess.run([CHECK, tmp_path], capture_output=True, text=True, timeout=60)
    return result.returncode, result.stdout


def test_allowed_directions_pass(tmp_path):
    assert check(tmp_path) == (0, "includes keep their direction, every unit test has a target\n")


@pytest.mark.parametrize("name, text, complaint", [
    ("support/a.h", '#include "platform/b.h"', "support/a.h: support must not include platform/b.h"),
    ("agent/context/c.h", '#include "prefs/capture_settings.h"',
     "agent/context/c.h: agent/context must not include prefs/capture_settings.h"),
    ("record/engine.h", '#include "control/d.h"', "record/engine.h: record must not include control/d.h"),
    ("control/d.h", '#include "agent/f.h"', "control/d.h: control must not include agent/f.h"),
    ("agent/f.h", '#  include "capture/e.h"', "agent/f.h: agent must not include capture/e.h"),
    ("capture/e.cpp", '#include "record/engine.h"', "capture/e.cpp: capture must not include record/engine.h"),
    ("support/a.h", '#include "b.h"', 'support/a.h: "b.h" names no header of the tree by its folder'),
    ("support/a.h", '#include "support/gone.h"',
     'support/a.h: "support/gone.h" names no header of the tree by its folder'),
    ("tests/unit/support/b_test.cpp", "", "tests/unit/support/b_test.cpp: no CMakeLists.txt names it"),
    ("tests/unit/support/aa_test.cpp", "", "tests/unit/support/aa_test.cpp: no CMakeLists.txt names it"),
])
def test_each_offence_is_named(tmp_path, name, text, complaint):
    assert check(tmp_path, {name: text + "\n"}) == (1, complaint + "\n")
