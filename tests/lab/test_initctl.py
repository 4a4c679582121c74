# box: --no-network
"""/sbin/initctl, which has a running job read its settings again, and the job of the system logger."""

import concurrent.futures
import pathlib
import re

import pytest
from conftest import processes, run, wait_for

JOBS = pathlib.Path("/etc/kova/jobs")
STATE = pathlib.Path("/run/kova/jobs")
MESSAGES = pathlib.Path("/var/log/messages")
SOCKET = pathlib.Path("/dev/log")


def pid_of(instance):
    return int((STATE / instance).read_text().split()[0])


@pytest.fixture
def make_job():
    """make_job(name, run): a job of shell commands."""
    made = []

    def make(name, commands):
        job = JOBS / name
        job.write_text(f"#!/bin/sh\ncase $1 in run) {commands} ;; esac\n")
        job.chmod(0o755)
        made.append(job)

    yield make
    for job in made:
        run("/sbin/stop", job.name)
        job.unlink()


@pytest.fixture
def reloads(make_job, tmp_path):
    """A job "reader" that notes every reload; gives their number."""
    notes = tmp_path / "reloads"
    notes.touch()
    make_job("reader", f"trap 'echo $KEY >>{notes}' HUP; touch {notes}.$KEY; while :; do sleep 0.01; done")

    def start(key=""):
        run("/sbin/start", "reader", *([f"KEY={key}"] if key else []))
        wait_for(pathlib.Path(f"{notes}.{key}").exists, what="the job")
        return notes

    return start


# ---- initctl --------------------------------------------------------------------------------------------------------


@pytest.mark.parametrize("words", [[], ["restart", "ddns"], ["reload"], ["reload", "../jobs/ddns"], ["reload", ""],
                                   ["reload", "ddns", "key=x"], ["reload", "ddns", "KEY"]])  # fmt: skip
def test_bad_usage_is_refused(words):
    assert re.match("usage: initctl|initctl: a key", run("/sbin/initctl", *words, status=2).stderr)


def test_unknown_job_is_refused():
    assert "unknown job nosuchjob" in run("/sbin/initctl", "reload", "nosuchjob", status=1).stderr


def test_reload_reaches_the_running_job(reloads):
    notes = reloads()
    for turn in range(1, 4):
        run("/sbin/initctl", "reload", "reader")
        wait_for(lambda turn=turn: notes.read_text().count("\n") == turn, what="the reload")


def test_reload_reaches_the_instance_with_the_keys(reloads):
    notes = reloads("one")
    reloads("two")
    run("/sbin/initctl", "reload", "reader", "KEY=two")
    wait_for(lambda: notes.read_text() == "two\n", what="the reload")
    run("/sbin/initctl", "reload", "reader", "KEY=three")
    run("/sbin/initctl", "reload", "reader", "KEY=one")
    wait_for(lambda: notes.read_text() == "two\none\n", what="the other reload")


def test_a_job_that_does_not_run_is_not_started(make_job):
    make_job("idle", "exec sleep 7531")
    run("/sbin/initctl", "reload", "idle")
    assert not processes("sleep 7531")


def test_a_job_without_a_reload_lives_on(make_job):
    make_job("deaf", "exec sleep 7531")
    run("/sbin/start", "deaf")
    wait_for(lambda: processes("sleep 7531"))
    run("/sbin/initctl", "reload", "deaf")
    assert processes("sleep 7531") == [pid_of("deaf")]


# ---- the logger -----------------------------------------------------------------------------------------------------


@pytest.fixture
def logger():
    """The system logger, with a log of its own; gives its text."""
    MESSAGES.unlink(missing_ok=True)
    run("/sbin/start", "syslog-ng")
    wait_for(lambda: MESSAGES.exists() and SOCKET.is_socket(), what="the logger")
    yield lambda: MESSAGES.read_text(errors="replace")
    run("/sbin/stop", "syslog-ng")


def log(text):
    run("logger", "-t", "test", text)


def starts(text):
    return text.count("syslogd started")


def test_logger_writes_what_it_is_sent(logger):
    log("here it is")
    wait_for(lambda: "test: here it is\n" in logger())


def test_stop_leaves_no_logger_and_no_socket(logger):
    run("/sbin/stop", "syslog-ng")
    assert not processes("syslogd") and not SOCKET.exists()
    run("/sbin/start", "syslog-ng")
    wait_for(lambda: starts(logger()) == 2)
    assert len(processes("busybox syslogd")) == 1


def test_reload_is_one_other_logger(logger):
    [before] = processes("busybox syslogd")
    run("/sbin/initctl", "reload", "syslog-ng")
    wait_for(lambda: starts(logger()) == 2 and processes("busybox syslogd") not in ([], [before])
             and len(processes("busybox syslogd")) == 1, what="the other logger")  # fmt: skip
    assert before not in processes("busybox syslogd")
    log("to the other")
    wait_for(lambda: "test: to the other\n" in logger())


def test_nothing_is_lost_while_it_is_reloaded(logger):
    texts = [f"number {number}." for number in range(300)]
    with concurrent.futures.ThreadPoolExecutor(1) as pool:
        sent = pool.submit(lambda: [log(text) for text in texts])
        for _ in range(6):
            known = starts(logger())
            run("/sbin/initctl", "reload", "syslog-ng")
            wait_for(lambda known=known: starts(logger()) > known, what="the other logger")
        sent.result()
    wait_for(lambda: all(text in logger() for text in texts), what="every message")
    assert all(logger().count(text) == 1 for text in texts)


def test_reloads_that_come_together_end_with_one_logger(logger):
    with concurrent.futures.ThreadPoolExecutor(4) as pool:
        list(pool.map(lambda _: run("/sbin/initctl", "reload", "syslog-ng"), range(8)))
    wait_for(lambda: starts(logger()) > 1 and len(processes("busybox syslogd")) == 1, what="one logger")
    log("after all")
    wait_for(lambda: "test: after all\n" in logger())
