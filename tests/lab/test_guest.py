"""The guest itself, from outside: what kova-box --guest gives beyond the box, and that a guest ends, whatever happens."""

import contextlib
import os
import pathlib
import shutil
import signal
import subprocess
import time

import pytest

ROOT = pathlib.Path(__file__).resolve().parent.parent.parent
BUILD = pathlib.Path(os.environ.get("KOVA_BUILD", ROOT / "build"))
BOX = os.environ.get("KOVA_BOX_PROGRAM", str(BUILD / "lab" / "kova-box"))
AS_USER = ["setpriv", "--reuid", "1000", "--regid", "1000", "--clear-groups"] if os.geteuid() == 0 else []
PATIENCE = 600  # seconds that nothing here needs
MODULES = ["8021q", "bonding", "bridge", "dummy", "ifb", "macvlan", "openvswitch", "ppp_async", "ppp_generic",
           "ppp_synctty", "pppoe", "sit", "tun", "veth", "vxlan"]  # fmt: skip

pytestmark = pytest.mark.skipif(shutil.which("linux.uml") is None, reason="no user-mode-linux on this machine")


def guest(*words, options=(), prefix=(), **keywords):
    return subprocess.run([*prefix, BOX, "--guest", *map(str, options), "--", *map(str, words)], text=True,
                          capture_output=True, timeout=PATIENCE, **keywords)  # fmt: skip


def shell(script, **keywords):
    """The output of a shell script in a guest, which has to succeed."""
    done = guest("bash", "-euc", script, **keywords)
    assert (done.returncode, done.stderr) == (0, "")
    return done.stdout


def wait_until(condition):
    end = time.monotonic() + PATIENCE
    while not condition():
        assert time.monotonic() < end
        time.sleep(0.02)


def processes_of(mark):
    """Pids of the living processes that have a text in their environment: a guest's, and what else it is made of."""
    found = set()
    for folder in pathlib.Path("/proc").glob("[0-9]*"):
        with contextlib.suppress(OSError):
            if mark.encode() in (folder / "environ").read_bytes():
                found.add(int(folder.name))
    return found


@pytest.fixture
def marked():
    """A word for the environment of everything that a test starts; none of that may be left at its end."""
    mark = f"KOVA_GUEST_TEST={os.getpid()}.{time.monotonic_ns()}"
    yield mark
    wait_until(lambda: not processes_of(mark))


def environment(mark):
    name, _, value = mark.partition("=")
    return {**os.environ, name: value}


@pytest.fixture
def program(tmp_path):
    """Writes a program that stands in for the kernel."""

    def write(script):
        path = tmp_path / "kernel"
        path.write_text(f"#!/bin/sh\n{script}\n")
        path.chmod(0o755)
        return path

    return write


# ---- status, streams, root


@pytest.mark.parametrize("script, status", [("exit 0", 0), ("exit 1", 1), ("exit 255", 255), ("kill -SEGV $$", 139)])
def test_status_is_the_command_s(script, status):
    assert guest("sh", "-c", script).returncode == status


def test_status_of_a_missing_command():
    done = guest("no-such-command")
    assert (done.returncode, done.stderr) == (127, "kova-box: cannot run no-such-command: No such file or directory\n")


def test_streams_pass_through_whole():
    text = "".join(f"line {number}\n" for number in range(200000))
    done = guest("sh", "-c", "cat; echo to stderr >&2", input=text)
    assert done.stdout == text
    assert done.stderr == "to stderr\n"


def test_output_comes_while_the_command_runs(marked):
    command = [BOX, "--guest", "--", "sh", "-c", "echo first; read -r word; echo got $word"]
    with subprocess.Popen(command, stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True,
                          env=environment(marked)) as running:  # fmt: skip
        assert running.stdout.readline() == "first\n"
        assert running.communicate("answer\n", timeout=PATIENCE)[0] == "got answer\n"
    assert running.returncode == 0


def test_arguments_directory_and_environment_are_the_caller_s(tmp_path):
    (tmp_path / "here").touch()
    done = guest("bash", "-c", 'printf "%s|" "$@"; pwd; ls; echo $WORD', "-", "--guest", "", "--", "a b", cwd=tmp_path,
                 env={**os.environ, "WORD": "two words"})  # fmt: skip
    assert done.stdout == f"--guest||--|a b|{tmp_path}\nhere\ntwo words\n"


def test_root_is_private_and_shares_are_the_host_s(tmp_path):
    tree, share = tmp_path / "tree", tmp_path / "share"
    (tree / "etc").mkdir(parents=True)
    (tree / "etc/of-the-tree").write_text("laid over\n")
    share.mkdir()
    (share / "in").write_text("from the host\n")
    script = f"""cat /etc/of-the-tree {share}/in; echo inside >/etc/hosts; echo inside >/usr/sbin/of-the-guest
                 echo from the guest >{share}/out; hostname"""
    assert shell(script, options=["--tree", tree, "--share", share, "--name", "other"]) == \
        "laid over\nfrom the host\nother\n"
    assert (share / "out").read_text() == "from the guest\n"
    assert "inside" not in pathlib.Path("/etc/hosts").read_text() and not os.path.exists("/usr/sbin/of-the-guest")


def test_an_ordinary_user_has_a_guest_too():
    done = guest("sh", "-c", "ip link add dummy0 type dummy && id -u && uname -r", prefix=AS_USER)
    assert (done.returncode, done.stderr) == (0, "")
    assert done.stdout.splitlines()[0] == "0" and done.stdout.splitlines()[1] != os.uname().release


def test_the_appliance_and_its_neighbour_run_in_it():
    done = guest("lab/appliance-up", "lab/demo", options=["--tree", BUILD / "stage"], cwd=ROOT)
    assert done.returncode == 0, done.stdout + done.stderr
    assert "eth0 is static and everything above is there." in done.stdout


# ---- kernel


@pytest.mark.parametrize("module", MODULES)
def test_module_can_be_loaded(module, loaded):
    assert module in loaded


@pytest.fixture(scope="module")
def loaded():
    return shell(f"for m in {' '.join(MODULES)}; do modprobe $m; test -d /sys/module/$m && echo $m; done").split()


def test_nothing_is_there_that_nobody_asked_for():
    options = ["--link", "eth0", "--link", "lan0"]
    script = "modprobe -a bonding dummy ifb; ls /sys/class/net; ip netns exec net ls /sys/class/net"
    assert shell(script, options=options).split() == ["bonding_masters", "eth0", "lan0", "lo"] * 2


def test_vlan_on_a_bond_carries_traffic():
    """Every interface is made without a module having been loaded by hand."""
    script = """
        for side in "ip" "ip -n net"; do
            $side link set lan0 down; $side link set lan1 down
            $side link add bond0 type bond mode 802.3ad miimon 50 lacp_rate fast
            $side link set lan0 master bond0; $side link set lan1 master bond0; $side link set bond0 up
            $side link add link bond0 name bond0.20 type vlan id 20; $side link set bond0.20 up
        done
        ip addr add 192.0.2.1/24 dev bond0.20; ip -n net addr add 192.0.2.2/24 dev bond0.20
        for i in $(seq 60); do ping -q -c 1 -W 1 192.0.2.2 >/dev/null && break; done
        ping -q -c 1 -W 5 192.0.2.2; cat /proc/net/vlan/config; cat /proc/net/bonding/bond0"""
    output = shell(script, options=["--link", "lan0", "--link", "lan1"])
    assert "1 packets transmitted, 1 received" in output
    assert "bond0.20       | 20  | bond0" in output
    assert "IEEE 802.3ad Dynamic link aggregation" in output and output.count("Slave Interface: lan") == 2


def test_packets_from_and_to_a_program():
    assert shell("ip tuntap add tun0 mode tun; ip -br link show tun0; test -c /dev/ppp").startswith("tun0 ")


def test_several_run_at_once(marked):
    running = [subprocess.Popen([BOX, "--guest", "--", "sh", "-c", f"ip link add d{number} type dummy; ls /sys/class/net"],
                                stdout=subprocess.PIPE, text=True, env=environment(marked)) for number in range(3)]
    for number, one in enumerate(running):
        assert one.communicate(timeout=PATIENCE)[0].split() == [f"d{number}", "eth0", "lo"]
        assert one.returncode == 0


# ---- a guest ends


def test_a_guest_that_does_not_start_is_ended_and_shows_its_console(program):
    kernel = program("echo Kernel panic - no root; exec sleep 1000")
    done = guest("echo", "ran", options=["--kernel", kernel, "--boot-limit", 5])
    assert (done.returncode, done.stdout) == (125, "")
    assert done.stderr == f"kova-box: the guest's kernel {kernel} was not ready after 5 s\nKernel panic - no root\n"


def test_a_guest_that_dies_shows_its_console(program):
    kernel = program("echo Kernel panic - no memory; exit 1")
    done = guest("echo", "ran", options=["--kernel", kernel])
    assert (done.returncode, done.stdout) == (125, "")
    assert done.stderr == f"kova-box: the guest's kernel {kernel} ended before the command did\nKernel panic - no memory\n"


def test_a_missing_kernel_is_said():
    done = guest("true", options=["--kernel", "/no/such/kernel"])
    assert done.returncode == 125
    assert done.stderr.startswith("kova-box: the guest's kernel /no/such/kernel cannot be started: "
                                  "it is in Debian's package user-mode-linux\n")  # fmt: skip


def test_a_kernel_that_dies_under_the_command_is_said(marked):
    with subprocess.Popen([BOX, "--guest", "--", "sh", "-c", "echo ready; sleep 1000"], text=True, env=environment(marked),
                          stdout=subprocess.PIPE, stderr=subprocess.PIPE) as running:  # fmt: skip
        assert running.stdout.readline() == "ready\n"
        os.kill(kernel_of(running.pid), signal.SIGKILL)
        assert "ended before the command did" in running.communicate(timeout=PATIENCE)[1]
    assert running.returncode == 125


def test_a_guest_that_hangs_is_ended_by_its_limit(marked):
    with subprocess.Popen([BOX, "--guest", "--limit", "30", "--", "sh", "-c", "echo ready; sleep 1000"], text=True,
                          env=environment(marked), stdout=subprocess.PIPE, stderr=subprocess.PIPE) as running:  # fmt: skip
        assert running.stdout.readline() == "ready\n"
        os.kill(kernel_of(running.pid), signal.SIGSTOP)
        assert "the command was still running after 30 s" in running.communicate(timeout=PATIENCE)[1]
    assert running.returncode == 124


def test_a_box_has_the_same_limit():
    done = subprocess.run([BOX, "--limit", "1", "--", "sleep", "1000"], text=True, capture_output=True, timeout=PATIENCE)
    assert (done.returncode, done.stderr) == (124, "kova-box: the command took too long\n")


def children_of(pid):
    return [int(child) for child in pathlib.Path(f"/proc/{pid}/task/{pid}/children").read_text().split()]


def kernel_of(pid):
    """Pid of the kernel that a kova-box started."""
    [keeper] = children_of(pid)
    return next(child for child in children_of(keeper) if pathlib.Path(f"/proc/{child}/comm").read_text() == "linux.uml\n")


@pytest.mark.parametrize("ending", [signal.SIGKILL, signal.SIGTERM, signal.SIGINT, signal.SIGHUP])
@pytest.mark.parametrize("whom", ["kova-box", "its group"])
def test_nothing_stays_after_a_kill(marked, ending, whom):
    running = subprocess.Popen([BOX, "--guest", "--", "sh", "-c", "setsid sleep 1000 & echo ready; sleep 1000"],
                               stdout=subprocess.PIPE, text=True, env=environment(marked), start_new_session=True)
    assert running.stdout.readline() == "ready\n"
    kernel = kernel_of(running.pid)
    assert len(processes_of(marked)) > 3 and kernel in processes_of(marked)

    (os.kill if whom == "kova-box" else os.killpg)(running.pid, ending)
    assert running.wait(PATIENCE) == -ending
    wait_until(lambda: not processes_of(marked))
    running.stdout.close()


def test_nothing_stays_after_the_end(marked):
    before = pathlib.Path("/proc/self/mountinfo").read_text(), sorted(os.listdir("/sys/class/net"))
    assert guest("sh", "-c", "setsid sleep 1000 & ip link add d0 type dummy", env=environment(marked)).returncode == 0
    assert not processes_of(marked)
    assert (pathlib.Path("/proc/self/mountinfo").read_text(), sorted(os.listdir("/sys/class/net"))) == before


def test_a_guest_leaves_no_file():
    folders = [pathlib.Path(name) for name in ("/dev/shm", "/tmp", os.path.expanduser("~"))]

    def found():
        return {path for folder in folders for pattern in ("*vm_file*", ".uml*") for path in folder.glob(pattern)}

    before = found()
    assert guest("true").returncode == 0
    wait_until(lambda: found() <= before)  # other guests that start now have one for a moment


# ---- the runner


def run_tests(*words, prefix=()):
    done = subprocess.run([*prefix, "/usr/bin/python3", "-B", "tests/run.py", *words], cwd=ROOT, text=True,
                          stdout=subprocess.PIPE, stderr=subprocess.STDOUT, timeout=PATIENCE)  # fmt: skip
    return done.returncode, done.stdout.splitlines()


def test_named_test_runs_in_the_guest():
    status, lines = run_tests("--backend", "guest", "cal_mask")
    assert status == 0 and lines[0].startswith("ok     unit/unit/cal_mask: ") and lines[0].endswith(" s, in the guest)")
    assert lines[-1].endswith(" passed, 0 failed, 0 skipped")


def test_what_a_backend_cannot_give_is_skipped_with_the_reason():
    assert run_tests("--backend", "guest", "sanitize") == (0, [
        "-      sanitize/unit: 0 passed, 1 skipped (0.0 s)",
        "       skipped unit: guest: sanitizers do not run on its kernel",
        "-      sanitize/platform: 0 passed, 1 skipped (0.0 s)",
        "       skipped platform: guest: sanitizers do not run on its kernel",
        "0 passed, 0 failed, 2 skipped"])  # fmt: skip


def test_where_boxes_are_refused_the_guest_is_taken():
    """A box of an ordinary user is a machine on which that can be arranged."""
    script = "echo 0 >/proc/sys/user/max_pid_namespaces; exec /usr/bin/python3 -B tests/run.py test_box cal_mask"
    done = subprocess.run([*AS_USER, BOX, "--", "sh", "-c", script], cwd=ROOT, text=True, stdout=subprocess.PIPE,
                          stderr=subprocess.STDOUT, timeout=PATIENCE, env={**os.environ, "CI": ""})  # fmt: skip
    if "cannot make a PID namespace" in done.stdout and not done.stdout.startswith("no boxes here"):
        pytest.skip(f"user namespaces are refused here: {done.stdout}")
    refused = "kova-box: cannot make a PID namespace, nor one in a user namespace: No space left on device"
    lines = done.stdout.splitlines()
    assert lines[0] == f"no boxes here ({refused}): the guest is taken for everything"
    assert lines[-1].endswith(" passed, 0 failed, 1 skipped") and done.returncode == 0
    assert f"       skipped test_box: box: {refused}" in lines
    assert [line for line in lines if line.startswith("ok     unit/unit/cal_mask: ") and "in the guest" in line]
