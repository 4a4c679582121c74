"""The measurements: that each can be made, and what they are written down as. Times are no test's matter."""
import json
import math
import re
import subprocess

import pytest
from conftest import BUILD, ROOT, STAGE, run

PROGRAM = BUILD / "bench" / "kova-bench"
BOX = [BUILD / "lab" / "kova-box", "--tree", STAGE, "--"]


@pytest.fixture(scope="module")
def results():
    run(ROOT / "bench" / "run", "--quick")
    return json.loads((BUILD / "bench" / "quick.json").read_text())


def finished(*command):
    done = subprocess.run([str(word) for word in command], stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True,
                          check=False)
    return done.returncode, done.stdout


def test_every_row_is_measured(results):
    rows = run(*BOX, PROGRAM, "--list").split()
    assert len(rows) >= 9 and list(dict.fromkeys(contest["row"] for contest in results["contests"])) == rows
    for contest in results["contests"]:
        numbers = [contest[key] for key in ("ours_median", "theirs_median", "ratio_lowest", "ratio", "ratio_highest")]
        assert all(math.isfinite(number) and number > 0 for number in numbers), contest
        assert contest["ratio_lowest"] <= contest["ratio"] <= contest["ratio_highest"], contest
        assert contest["met"] == (None if contest["goal"] is None else contest["ratio"] <= contest["goal"]), contest


def test_size_is_within_its_goal(results):
    [size] = [contest for contest in results["contests"] if contest["row"] == "size"]
    assert size["unit"] == "bytes" and size["met"] is True, size


def test_fields_are_the_documented_ones(results):
    text = (ROOT / "docs" / "bench.md").read_text()
    rows = re.findall(r"^\| (`[^|]+`) \| (?:text|number|boolean|array)", text, re.MULTILINE)
    documented = {name for row in rows for name in re.findall(r"`(\w+)`", row)}
    assert results["version"] == 1 and results["quick"] is True
    assert set(results) | {key for contest in results["contests"] for key in contest} == documented


def test_what_cannot_be_measured_is_said():
    status, output = finished(*BOX, PROGRAM, "--quick", "--disk", "/proc", "key-get", "address")
    assert status == 1
    assert "open, read, close                          failed: cannot make a directory in /proc" in output
    assert "0 missed, 1 failed" in output or "1 missed, 1 failed" in output


def test_unknown_row_is_refused():
    status, output = finished(*BOX, PROGRAM, "nothing")
    assert status != 0 and "ROW: nothing not in {counters," in output


def test_nothing_is_measured_outside_a_box(library):
    status, output = finished("env", "--unset=KOVA_BOX", f"LD_LIBRARY_PATH={library.parent}", PROGRAM, "size")
    assert (status, output) == (1, "kova-bench: only inside a box: see bench/run\n")
