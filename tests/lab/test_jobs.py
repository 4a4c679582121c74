# box: --no-network
"""/sbin/start and /sbin/stop, on jobs made for the test."""

import concurrent.futures
import os
import pathlib
import re
import signal
import subprocess
import time

import pytest
from conftest import SLOWNESS, processes, run, wait_for

JOBS = pathlib.Path("/etc/kova/jobs")
STATE = pathlib.Path("/run/kova/jobs")


@pytest.fixture
def make_job(tmp_path):
    """make_job(name, run=..., check=..., clean=..., ready=...): a job of shell commands that notes the verbs it was run with."""
    made = []

    def make(name, run_as="exec sleep 1000", check=":", clean=":", ready=":"):
        notes = tmp_path / f"{name}.notes"
        job = JOBS / name
        job.write_text(
            f"#!/bin/sh\necho $1 >> {notes}\n"
            f'case $1 in\nrun) {run_as} ;;\ncheck) {check} ;;\nclean) {clean} ;;\n'
            f"ready) {ready} ;;\nesac\n"
        )
        job.chmod(0o755)
        made.append(job)
        return notes

    yield make
    for job in made:
        run("/sbin/stop", job.name)
        job.unlink()


def record_of(instance):
    return STATE / instance


def pid_of(instance):
    return int(record_of(instance).read_text().split()[0])


def session_of(pid):
    fields = pathlib.Path(f"/proc/{pid}/stat").read_text().rpartition(")")[2].split()
    return int(fields[3])


def is_alive(pid):
    try:
        return pathlib.Path(f"/proc/{pid}/stat").read_text().rpartition(")")[2].split()[0] not in "ZX"
    except (FileNotFoundError, ProcessLookupError):
        return False


def wait_running(pid, program):
    wait_for(lambda: program in pathlib.Path(f"/proc/{pid}/cmdline").read_text(), what=f"{program} of {pid}")


@pytest.mark.parametrize("tool", ["/sbin/start", "/sbin/stop"])
def test_unknown_job_is_refused(tool):
    assert "unknown job nosuchjob" in run(tool, "nosuchjob", status=1).stderr


@pytest.mark.parametrize("tool", ["/sbin/start", "/sbin/stop"])
@pytest.mark.parametrize(
    "arguments",
    [[], [""], ["../jobs/dhcp-client"], [".hidden"], ["-x"], ["two words"]]
    + [["dhcp-client", key] for key in ("IFACE", "=eth0", "iface=eth0", "IFACE=../x", "IFACE=a,b", "IFACE=a b")]
    + [["dhcp-client", "PATH=x"]],
)
def test_bad_usage_is_refused(tool, arguments):
    before = set(STATE.glob("*"))
    done = run(tool, *arguments, status=2)
    assert done.stderr.startswith(("usage: ", "start: a key", "stop: a key"))
    assert set(STATE.glob("*")) == before


def test_job_is_detached_from_its_starter(make_job):
    make_job("lonely")
    low, high = os.open("/etc/passwd", os.O_RDONLY), os.open("/etc/passwd", os.O_RDONLY)
    os.dup2(high, 57)
    environment = {**os.environ, "STRAY": "1"}
    command = ("sh", "-c", "trap '' HUP INT TERM; exec /sbin/start lonely IFACE=lan0")
    run(*command, pass_fds=(low, high, 57), cwd="/tmp", env=environment)
    for descriptor in (low, high, 57):
        os.close(descriptor)

    pid = pid_of("lonely,IFACE=lan0")
    wait_running(pid, "sleep")
    assert session_of(pid) == pid
    assert os.readlink(f"/proc/{pid}/cwd") == "/"
    files = {entry.name: os.readlink(entry) for entry in pathlib.Path(f"/proc/{pid}/fd").iterdir()}
    assert files == {"0": "/dev/null", "1": "/dev/null", "2": "/dev/null"}
    environment = pathlib.Path(f"/proc/{pid}/environ").read_bytes().decode().strip("\0").split("\0")
    names = {entry.partition("=")[0] for entry in environment}
    assert names - {"PWD", "SHLVL"} == {"IFACE", "PATH"}  # two may be the shell's own
    assert "IFACE=lan0" in environment
    assert re.search(r"^SigIgn:\t0+$", pathlib.Path(f"/proc/{pid}/status").read_text(), re.MULTILINE)


def test_start_returns_at_once_and_holds_no_pipe(make_job):
    make_job("endless")
    began = time.monotonic()
    run("/sbin/start", "endless")  # reads both pipes to their end
    assert time.monotonic() - began < 60 * SLOWNESS  # next to nothing on an idle machine, and the job takes 1000


def test_second_start_is_the_same_job(make_job):
    notes = make_job("single")
    run("/sbin/start", "single", "B=2", "A=1")
    pid = pid_of("single,A=1,B=2")
    run("/sbin/start", "single", "A=1", "B=2")
    assert pid_of("single,A=1,B=2") == pid
    wait_for(lambda: "run" in notes.read_text())
    assert notes.read_text().split().count("run") == 1


def test_start_returns_when_the_job_is_ready(make_job, tmp_path):
    sign = tmp_path / "sign"
    make_job("slow", run_as=f"sleep 0.5; touch {sign}; exec sleep 1000", ready=f"until [ -e {sign} ]; do sleep 0.02; done")
    run("/sbin/start", "slow")
    assert sign.exists() and is_alive(pid_of("slow"))


def test_job_that_does_not_become_ready_is_ended(make_job):
    notes = make_job("never", ready="echo no sign >&2; exit 1")
    assert "no sign" in run("/sbin/start", "never", status=1).stderr
    assert not record_of("never").exists() and not processes("jobs/never")
    assert notes.read_text().split()[-1] == "clean"


def test_other_keys_are_another_instance(make_job):
    make_job("several")
    for name in ("eth0", "eth1"):
        run("/sbin/start", "several", f"IFACE={name}")
    first, second = pid_of("several,IFACE=eth0"), pid_of("several,IFACE=eth1")
    assert first != second
    run("/sbin/stop", "several", "IFACE=eth0")
    assert not is_alive(first)
    assert is_alive(second)


def test_stop_without_keys_ends_every_instance(make_job):
    make_job("several")
    make_job("several-others")
    run("/sbin/start", "several-others")
    for name in ("eth0", "eth1"):
        run("/sbin/start", "several", f"IFACE={name}")
    pids = [pid_of("several,IFACE=eth0"), pid_of("several,IFACE=eth1")]
    run("/sbin/stop", "several")
    assert not any(is_alive(pid) for pid in pids)
    assert is_alive(pid_of("several-others"))


def test_stop_cleans_up_also_when_the_job_does_not_run(make_job):
    notes = make_job("absent")
    run("/sbin/stop", "absent", "IFACE=lan0")
    assert notes.read_text().split() == ["clean"]


def test_failing_clean_is_a_failing_stop(make_job):
    make_job("unclean", clean='[ "$IFACE" != lan0 ]')
    run("/sbin/stop", "unclean", "IFACE=lan0", status=1)
    run("/sbin/stop", "unclean", "IFACE=eth0")


def test_check_that_fails_keeps_the_job_from_starting(make_job):
    notes = make_job("unfit", check="echo unfit: no such card >&2; exit 1")
    assert "no such card" in run("/sbin/start", "unfit", status=1).stderr
    assert notes.read_text().split() == ["check"]
    assert not record_of("unfit").exists()


def test_stop_ends_helpers_that_ignore_the_request(make_job, tmp_path):
    pids = tmp_path / "pids"
    helper = f"(trap '' TERM; echo $(exec sh -c 'echo $PPID') >> {pids}; while :; do sleep 0.05; done)"
    make_job("stubborn", run_as=f"trap '' TERM; {helper} & {helper}")
    run("/sbin/start", "stubborn")
    leader = pid_of("stubborn")
    helpers = wait_for(lambda: pids.exists() and len(text := pids.read_text().split()) == 2 and text, what="helpers")

    began = time.monotonic()
    run("/sbin/stop", "stubborn")
    assert time.monotonic() - began < 60 * SLOWNESS  # 1.2 on an idle machine
    assert not any(is_alive(pid) for pid in [leader, *helpers])


def test_stop_lets_the_job_tidy_up(make_job, tmp_path):
    mark = tmp_path / "tidied"
    make_job("tidy", run_as=f"trap 'touch {mark}; exit' TERM; touch {mark}.ready; while :; do sleep 0.01; done")
    run("/sbin/start", "tidy")
    wait_for(pathlib.Path(f"{mark}.ready").exists)
    run("/sbin/stop", "tidy")
    assert mark.exists()


def test_stop_right_after_start_leaves_nothing(make_job, tmp_path):
    marks = tmp_path / "marks"
    make_job("brief", run_as=f"echo x >> {marks}; exec sleep 1234")
    for _ in range(40):
        run("/sbin/start", "brief")
        pid = pid_of("brief")
        run("/sbin/stop", "brief")
        assert not is_alive(pid)
    assert not processes("sleep 1234")


def test_stop_of_a_job_that_has_no_session_yet(make_job, hold):
    notes = make_job("early")
    step = hold("/usr/bin/setsid", "early")
    run("/sbin/start", "early")
    wait_for(step.is_waiting, what="the job's process")
    run("/sbin/stop", "early")
    assert not processes("early run")
    step.release()
    assert "run" not in notes.read_text().split()


def test_parallel_starts_are_one_job(make_job):
    notes = make_job("crowded", run_as="exec sleep 4321")
    with concurrent.futures.ThreadPoolExecutor(10) as pool:
        list(pool.map(lambda _: run("/sbin/start", "crowded"), range(20)))
    wait_running(pid_of("crowded"), "sleep")
    assert processes("sleep 4321") == [pid_of("crowded")]
    assert notes.read_text().split().count("check") == 1


def test_parallel_starts_and_stops_end_stopped(make_job):
    make_job("restless", run_as="exec sleep 2345")
    with concurrent.futures.ThreadPoolExecutor(6) as pool:
        list(pool.map(lambda turn: run("/sbin/start" if turn % 2 else "/sbin/stop", "restless"), range(40)))
    run("/sbin/stop", "restless", "IFACE=lan0")  # another instance: ends nothing of this one
    run("/sbin/stop", "restless")
    assert not processes("sleep 2345")


def test_job_that_died_can_be_started_again(make_job):
    make_job("mortal")
    run("/sbin/start", "mortal")
    first = pid_of("mortal")
    os.kill(first, signal.SIGKILL)
    wait_for(lambda: not is_alive(first))
    run("/sbin/start", "mortal")
    assert pid_of("mortal") != first
    assert is_alive(pid_of("mortal"))


def test_helpers_of_a_job_that_died_end_before_the_next_start(make_job):
    make_job("orphaned", run_as="sleep 3456 & exec sleep 6543")
    run("/sbin/start", "orphaned")
    wait_for(lambda: processes("sleep 3456") and processes("sleep 6543"))
    [helper] = processes("sleep 3456")
    first = pid_of("orphaned")
    os.kill(first, signal.SIGKILL)
    wait_for(lambda: not is_alive(first))
    run("/sbin/start", "orphaned")
    assert not is_alive(helper)
    wait_for(lambda: processes("sleep 6543") == [pid_of("orphaned")])


def test_stop_leaves_a_stranger_with_the_same_number_alone(make_job):
    make_job("past")
    stranger = subprocess.Popen(["sleep", "1000"], start_new_session=True)
    STATE.mkdir(parents=True, exist_ok=True)
    record_of("past").write_text(f"{stranger.pid} 1\n")  # what started then cannot be this process
    run("/sbin/stop", "past")
    assert stranger.poll() is None
    assert not record_of("past").exists()
    stranger.kill()
    stranger.wait()
