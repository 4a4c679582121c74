# box: --no-network
"""The mechanics of steps.py themselves: they find a file that is written in place, and not one that is replaced."""

import pytest
from conftest import wait_for
from steps import Watch, killed_at_each_step, steps

OLD, NEW = "old " * 1000, "new " * 2000
IN_PLACE, REPLACING = "/bin/cp", "/bin/mv"


@pytest.fixture
def target(tmp_path):
    return tmp_path / "target"


def prepared(program, target):
    """The command that gives a file its new content; it has its old one."""
    fresh = target.with_name("fresh")
    fresh.write_text(NEW)
    target.write_text(OLD)
    return program, "-f", fresh, target


def test_between_two_calls_a_file_written_in_place_is_torn(target):
    assert {target.read_text() for _ in steps(*prepared(IN_PLACE, target))} == {OLD, "", NEW}


def test_between_two_calls_a_replaced_file_is_whole(target):
    assert {target.read_text() for _ in steps(*prepared(REPLACING, target))} == {OLD, NEW}


@pytest.mark.parametrize("program,contents", [(IN_PLACE, {OLD, "", NEW}), (REPLACING, {OLD, NEW})])
def test_a_kill_leaves_what_was_there_between_two_calls(target, program, contents):
    kills = {step: target.read_text() for step in killed_at_each_step(lambda: prepared(program, target))}
    assert set(kills.values()) == contents
    assert target.read_text() == NEW, "it got through in the end"
    assert len(kills) > 10 and list(kills) == list(range(1, len(kills) + 1))


def test_exit_status_is_checked():
    with pytest.raises(AssertionError):
        list(steps("/bin/false"))
    list(steps("/bin/false", status=1))
    list(steps("/bin/sh", "-c", "kill -TERM $$", status=-15))


def test_watch_sees_every_content(tmp_path):
    path = tmp_path / "file"
    with Watch(path) as watch:
        for content in ("first", "second"):
            path.write_text(content)
            wait_for(lambda text=content: text in watch.contents)
        path.unlink()
        wait_for(lambda: None in watch.contents)
    assert {"first", "second"} <= watch.contents <= {None, "", "first", "second"}
    assert watch.reads >= 3
