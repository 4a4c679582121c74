"""
How many lines of the libraries the tests run. The runner starts this when the tests have run on libraries that count.
"""
import json
import os
import pathlib
import shutil
import subprocess

import pytest

ROOT = pathlib.Path(__file__).resolve().parent.parent.parent
BUILD = pathlib.Path(os.environ["KOVA_BUILD"]) / "coverage"
COUNTS = pathlib.Path(os.environ["GCOV_PREFIX"] + str(BUILD))
FLOOR = {"src": 99.0, "platform/src": 95.0}  # percent of a tree's lines; the only place that says so


def source_of(note):
    """src/CMakeFiles/kovanetsdk.dir/addr/cal_mask.cpp.gcno describes src/addr/cal_mask.cpp"""
    tree, _, _, *path = note.relative_to(BUILD).with_suffix("").parts
    return ROOT.joinpath(tree, *path)


@pytest.fixture(scope="module")
def files(tmp_path_factory):
    """Path, lines and lines that ran of every source and header, also of those that no test touches."""
    for note in BUILD.glob("*/CMakeFiles/*.dir/**/*.gcno"):
        if source_of(note).exists():  # else what is left of a source that was renamed
            copy = COUNTS / note.relative_to(BUILD)
            copy.parent.mkdir(parents=True, exist_ok=True)
            shutil.copy(note, copy)
    summary = tmp_path_factory.mktemp("coverage") / "summary.json"
    trees = [word for tree in FLOOR for word in ("--filter", f"{tree}/")]
    subprocess.run(["gcovr", "--root", ROOT, *trees, "--json-summary", summary, COUNTS], cwd=ROOT, check=True)
    found = json.loads(summary.read_text())["files"]
    return [(pathlib.PurePath(file["filename"]), file["line_total"], file["line_covered"]) for file in found]


def percent_of(files):
    return 100 * sum(ran for _, _, ran in files) / sum(lines for _, lines, _ in files)


def row(title, files):
    return f"coverage of {title:26} {percent_of(files):5.1f} % of {sum(lines for _, lines, _ in files)} lines"


def test_counts_every_source(files):
    counted = {path.as_posix() for path, _, _ in files if path.suffix == ".cpp"}
    assert counted == {path.relative_to(ROOT).as_posix() for tree in FLOOR for path in (ROOT / tree).glob("**/*.cpp")}


def test_every_directory_is_tested(files):
    by_directory = {directory: [file for file in files if file[0].parent == directory]
                    for directory in sorted({path.parent for path, _, _ in files})}
    rows = [row(str(directory), there) for directory, there in by_directory.items()]
    print("", *rows, row("everything", files), sep="\n")
    assert all(percent_of(there) > 0 for there in by_directory.values())


@pytest.mark.parametrize("tree", FLOOR)
def test_keeps_above_the_floor(files, tree):
    within = [file for file in files if file[0].is_relative_to(tree)]
    worst = sorted(within, key=lambda file: file[2] - file[1])[:5]
    assert percent_of(within) >= FLOOR[tree], "most left out in " + ", ".join(str(path) for path, _, _ in worst)
