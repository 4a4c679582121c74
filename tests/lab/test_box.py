"""The box itself, from outside: what a command sees in it, what it returns, and that nothing of it stays."""
import contextlib
import os
import pathlib
import pty
import signal
import subprocess
import sys
import time

import pytest

ROOT = pathlib.Path(__file__).resolve().parent.parent.parent
BOX = os.environ.get("KOVA_BOX_PROGRAM", str(ROOT / "build" / "lab" / "kova-box"))
AS_USER = ["setpriv", "--reuid", "1000", "--regid", "1000", "--clear-groups"] if os.geteuid() == 0 else []
PATIENCE = 120  # seconds that nothing here needs


def why_no_user_namespaces():
    """What an ordinary user is told who makes a user namespace; empty where that is allowed."""
    tried = subprocess.run([*AS_USER, "unshare", "--user", "--map-root-user", "--mount", "true"], text=True,
                           stdout=subprocess.PIPE, stderr=subprocess.STDOUT)
    return tried.stdout.strip() if tried.returncode else ""


def run(prefix, *words, options=(), **keywords):
    return subprocess.run([*prefix, BOX, *map(str, options), "--", *map(str, words)], text=True, capture_output=True,
                          timeout=PATIENCE, **keywords)


@pytest.fixture(params=["root", "user"])
def prefix(request):
    """How to become who makes the box."""
    if request.param == "root":
        if os.geteuid() != 0:
            pytest.skip("not run as root")
        return []
    if reason := why_no_user_namespaces():
        pytest.skip(f"user namespaces are refused here: {reason}")
    return AS_USER


@pytest.fixture
def box(prefix):
    """Runs a command in a box."""
    return lambda *words, **keywords: run(prefix, *words, **keywords)


@pytest.fixture
def shell(box):
    """Runs a shell script in a box, which has to succeed, and gives its output."""
    def run_script(script, **keywords):
        done = box("bash", "-euc", script, **keywords)
        assert (done.returncode, done.stderr) == (0, "")
        return done.stdout
    return run_script


@pytest.fixture
def folder(tmp_path_factory):
    """A directory below the host's /tmp that an ordinary user can reach and write to."""
    path = tmp_path_factory.mktemp("box")
    for directory in [path, *path.parents]:
        if directory == pathlib.Path("/tmp"):
            break
        directory.chmod(0o777)
    return path


def wait_until(condition):
    end = time.monotonic() + PATIENCE
    while not condition():
        assert time.monotonic() < end
        time.sleep(0.01)


# ---- exit status and streams

@pytest.mark.parametrize("status", [0, 1, 42, 255])
def test_status_is_the_command_s(box, status):
    assert box("sh", "-c", f"exit {status}").returncode == status


def test_status_of_a_killed_command(box):
    assert box("sh", "-c", "kill -KILL $$").returncode == 128 + signal.SIGKILL


def test_status_of_a_missing_command(box):
    done = box("no-such-command")
    assert (done.returncode, done.stderr) == (127, "kova-box: cannot run no-such-command: No such file or directory\n")


def test_status_of_what_is_no_program(box):
    done = box("/etc/passwd")
    assert (done.returncode, done.stderr) == (126, "kova-box: cannot run /etc/passwd: Permission denied\n")


@pytest.mark.parametrize("options, text", [
    (["--link", "a/b"], "not an interface name: a/b"),
    (["--link", "sixteen-letters-"], "not an interface name: sixteen-letters-"),
    (["--size", "much"], "not a size such as 512m, 1g or 20%: much"),
    (["--tree", "/no/such/tree"], "Directory does not exist: /no/such/tree"),
    (["--share", "/etc/passwd"], "Directory is actually a file: /etc/passwd"),
    (["--internal-lan-ports", "-1"], "--internal-lan-ports"),
    (["--bogus"], "--bogus"),
])
def test_bad_options_make_no_box(box, options, text):
    done = box("echo", "ran", options=options)
    assert (done.returncode, done.stdout) == (125, "")
    assert done.stderr.startswith("kova-box: ") and text in done.stderr and done.stderr.count("\n") == 1


def test_no_command_makes_no_box():
    done = subprocess.run([BOX, "true"], text=True, capture_output=True, timeout=PATIENCE)
    assert done.returncode == 125


def test_refused_namespaces_are_said():
    if reason := why_no_user_namespaces():
        pytest.skip(f"user namespaces are refused here: {reason}")
    # in a box of an ordinary user the limit is the box's own
    done = run(AS_USER, "sh", "-c", f"echo 0 >/proc/sys/user/max_pid_namespaces; exec {BOX} -- true")
    assert done.returncode == 125
    assert done.stderr == ("kova-box: cannot make a PID namespace, nor one in a user namespace: "
                           "No space left on device\n")


def test_streams_pass_through(box):
    done = box("sh", "-c", "cat; echo to stderr >&2", input="through the box\n")
    assert (done.stdout, done.stderr) == ("through the box\n", "to stderr\n")


def test_arguments_stay_as_they_are(box):
    assert box("printf", "%s|", "--tree", "", "--", "a b", "[x]").stdout == "--tree||--|a b|[x]|"


# ---- what is inside

def test_changes_stay_inside(shell, folder):
    kept = folder / "kept"
    kept.write_text("host\n")
    script = f"""
        echo inside >/etc/kova-box-test; echo inside >/usr/sbin/kova-box-test; rm /etc/hosts; echo x >/etc/passwd
        cat /etc/kova-box-test; test ! -e {kept}; mkdir -p {folder}; echo inside >{kept}; cat {kept}"""
    passwd = pathlib.Path("/etc/passwd").read_text()
    assert shell(script) == "inside\ninside\n"
    assert not pathlib.Path("/etc/kova-box-test").exists() and not pathlib.Path("/usr/sbin/kova-box-test").exists()
    assert pathlib.Path("/etc/hosts").exists() and pathlib.Path("/etc/passwd").read_text() == passwd
    assert kept.read_text() == "host\n"


def test_temporary_directories_are_fresh(shell):
    assert shell("ls -A /tmp; touch /tmp/a /run/b; stat -c %a /tmp; test ! -e /dev/log", cwd="/") == "1777\n"


def test_share_is_the_host_s(shell, folder):
    (folder / "in").write_text("from the host\n")
    assert shell(f"cat {folder}/in; echo from the box >{folder}/out", options=["--share", folder]) == "from the host\n"
    assert (folder / "out").read_text() == "from the box\n"


def test_trees_are_laid_over_the_root(shell, folder):
    lower, upper = folder / "lower", folder / "upper"
    for tree, text in ((lower, "lower"), (upper, "upper")):
        for name, mode in (("sbin/kova-tool", 0o755), ("etc/kova/settings", 0o640), ("srv/new/file", 0o644)):
            path = tree / name
            path.parent.mkdir(parents=True, exist_ok=True)
            path.write_text(f"#!/bin/sh\necho {text}\n")
            path.chmod(mode)
            if os.geteuid() == 0:
                os.chown(path, 1000, 1000)
    (upper / "etc/kova/settings").unlink()
    (upper / "etc/kova/link").symlink_to("settings")
    output = shell("""kova-tool; /usr/sbin/kova-tool; sh /etc/kova/link; cat /srv/new/file
                      stat -c '%a %U %n' /sbin/kova-tool /etc/kova/settings; test -L /sbin; test -x /usr/bin/env""",
                   options=["--tree", lower, "--tree", upper])
    assert output == ("upper\nupper\nlower\n#!/bin/sh\necho upper\n"
                      "755 root /sbin/kova-tool\n640 root /etc/kova/settings\n")


def test_environment(shell):
    inherited = {**os.environ, "HOME": "/somewhere", "PATH": "/usr/bin:/bin", "TMPDIR": "/tmp/not/inside", "KEPT": "yes"}
    assert shell('echo $KOVA_BOX $HOME $KEPT ${TMPDIR-unset} $PATH', env=inherited) == \
        "1 /somewhere yes unset /usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin\n"


def test_working_directory_is_kept_and_protected(shell, folder):
    (folder / "file").write_text("host\n")
    assert shell("pwd; cat file; rm file; echo inside >other", cwd=folder) == f"{folder}\nhost\n"
    assert [path.name for path in folder.iterdir()] == ["file"]
    assert shell("pwd", cwd="/usr/share") == "/usr/share\n"
    assert shell("pwd", cwd="/proc/self") == "/\n"


def test_directories_are_for_everybody_and_the_umask_is_the_callers(shell, folder):
    (folder / "usr/bin").mkdir(parents=True)
    (folder / "usr/bin/kova-tool").touch()
    script = "umask; stat -c %a / /usr /usr/bin /usr/bin/env"
    assert shell(script, options=["--tree", folder], umask=0o077) == "0077\n755\n755\n755\n755\n"


def test_processes_and_names_are_its_own(shell):
    name, pid, parent = shell("hostname; echo $$ $PPID", options=["--name", "other"]).split()
    assert name == "other" and int(pid) < 20 and parent == "1"
    assert shell("hostname; hostname changed; hostname") == "appliance\nchanged\n"


def test_host_kernel_settings_are_protected():
    if os.geteuid() != 0:
        pytest.skip("not run as root")
    setting = pathlib.Path("/proc/sys/vm/swappiness")
    before = setting.read_text()
    done = run([], "sh", "-c", f"echo 61 >{setting}; echo 1 >/proc/sys/net/ipv4/ip_forward && echo forwards")
    assert "Read-only file system" in done.stderr and done.stdout == "forwards\n"
    assert setting.read_text() == before


def test_size_is_a_limit(box):
    done = box("sh", "-c", "head -c 41m /dev/zero >/usr/bin/big", options=["--size", "40m"])
    assert done.returncode == 1 and "No space left" in done.stderr


# ---- network

def test_links_are_up_on_both_sides(shell):
    options = ["--link", "eth0", "--link", "lan0"]
    # the kernel notes the state of a link a moment after it changed
    settled = "for i in $(seq 200); do {0} -br link | grep -q DOWN || break; sleep 0.05; done; {0} -br link"
    for side in ("ip", "ip -n net"):
        rows = [line.replace("@", " ").split() for line in shell(settled.format(side), options=options).splitlines()]
        assert [row[0] for row in rows] == ["lo", "eth0", "lan0"]
        assert [row[2] for row in rows[1:]] == ["UP", "UP"] and "UP" in rows[0][3]
    assert shell("ip netns exec net ls /sys/class/net", options=options).split() == ["eth0", "lan0", "lo"]


def test_ping_across(shell):
    script = """ip addr add 192.0.2.1/24 dev eth0; ip -n net addr add 192.0.2.2/24 dev eth0
                ip addr add 2001:db8::1/64 dev eth0; ip -n net addr add 2001:db8::2/64 dev eth0
                ping -q -c 1 -W 5 192.0.2.2; ip netns exec net ping -q -c 1 -W 5 2001:db8::1; ping -q -c 1 127.0.0.1"""
    assert shell(script).count("1 packets transmitted, 1 received") == 3


def test_ipv6_addresses_are_usable_at_once(shell):
    assert "tentative" not in shell("ip -6 addr; ip -n net -6 addr; ip addr add 2001:db8::1/64 dev eth0; ip -6 addr")


def test_no_network(shell):
    assert shell("ls /sys/class/net; ip netns list; ping -q -c 1 127.0.0.1 >/dev/null", options=["--no-network"]) == "lo\n"


def test_kernel_files(shell, folder):
    bonds = folder / "bonds"
    bonds.write_text("ovs_bond0 eth0 eth1\n")
    script = """cat /sys/class/net/kova_ovs_bonds /proc/sys/kernel/kova_internal_netif_num /proc/sys/kernel/ostype
                ip link add added type bridge; ls /sys/class/net; ip link del added; ls /sys/class/net"""
    assert shell(script, options=["--ovs-bonds", bonds, "--internal-lan-ports", 4]).split() == \
        ["ovs_bond0", "eth0", "eth1", "4", "Linux", "added", "eth0", "kova_ovs_bonds", "lo", "eth0", "kova_ovs_bonds", "lo"]


# ---- nothing stays

def command_lines():
    for path in pathlib.Path("/proc").glob("[0-9]*/cmdline"):
        with contextlib.suppress(OSError):
            yield path.read_bytes()


def network_namespaces():
    found = set()
    for path in pathlib.Path("/proc").glob("[0-9]*/ns/net"):
        with contextlib.suppress(OSError):
            found.add(os.readlink(path))
    return found


def host_state():
    mounts = pathlib.Path("/proc/self/mountinfo").read_text()
    return mounts, sorted(os.listdir("/sys/class/net")), os.path.exists("/run/netns/net")


@pytest.mark.parametrize("ending", [signal.SIGKILL, signal.SIGTERM, signal.SIGINT, signal.SIGHUP])
def test_nothing_stays_after_a_kill(prefix, folder, ending):
    mark = f"86{os.getpid():07}"  # seconds to sleep: names the processes of this box alone
    before = host_state()
    script = f"(setsid sleep {mark} &) ; mount -t tmpfs none /mnt; readlink /proc/self/ns/net >{folder}/ready; sleep {mark}"
    running = subprocess.Popen([*prefix, BOX, "--share", str(folder), "--", "bash", "-c", script])
    ready = folder / "ready"
    wait_until(lambda: ready.exists() and ready.read_text() and sum(mark.encode() in line for line in command_lines()) >= 3)
    namespace = ready.read_text().strip()
    assert namespace in network_namespaces()

    running.send_signal(ending)
    assert running.wait(PATIENCE) == -ending
    wait_until(lambda: not any(mark.encode() in line for line in command_lines()))
    wait_until(lambda: namespace not in network_namespaces())  # a process gives it up after its command line
    assert host_state() == before


def test_nothing_stays_after_the_end(shell):
    mark = f"87{os.getpid():07}"
    before = host_state()
    shell(f"setsid sleep {mark} >/dev/null 2>&1 & mount -t tmpfs none /mnt")
    assert not any(mark.encode() in line for line in command_lines())
    assert host_state() == before


# ---- terminal

class Terminal:
    """A session of its own on a new terminal, in which one program runs."""

    def __init__(self, *words):
        self.pid, self.fd = pty.fork()
        if self.pid == 0:
            os.execvp(words[0], words)
        self.output = ""

    def type(self, text):
        os.write(self.fd, text.encode())

    def wait_for(self, text):
        """Reads until the text came, and forgets all up to it."""
        while text not in self.output:
            self.output += os.read(self.fd, 4096).decode()
        self.output = self.output.partition(text)[2]

    def status(self):
        with contextlib.suppress(OSError):
            while os.read(self.fd, 4096):
                pass
        _, status = os.waitpid(self.pid, 0)
        os.close(self.fd)
        return os.waitstatus_to_exitcode(status)


@pytest.fixture
def alarm():
    """A terminal that does not say what is waited for ends the test, not the run."""
    def too_late(*_):
        pytest.fail("the terminal does not show what it should")
    signal.signal(signal.SIGALRM, too_late)
    signal.alarm(PATIENCE)
    yield
    signal.alarm(0)


def test_command_owns_the_terminal(alarm, prefix):
    terminal = Terminal(*prefix, BOX, "--", "bash", "-c",
                        'trap "echo interrupted; exit 7" INT; read -r _ _ _ _ group _ _ front _ </proc/$$/stat; '
                        'echo group $((group == front && front == $$)); while :; do read -r -t 0.1; done')
    terminal.wait_for("group 1")
    terminal.type("\x03")
    terminal.wait_for("interrupted")
    assert terminal.status() == 7


def test_shell_has_job_control(alarm, prefix):
    terminal = Terminal("env", "PS1=> ", *prefix, BOX, "--", "bash", "--norc", "--noprofile", "-i")
    terminal.wait_for("> ")
    terminal.type("sh -c 'echo run\"\"ning; exec sleep 1000'\n")
    terminal.wait_for("running")
    terminal.type("\x1a")
    terminal.wait_for("Stopped")
    terminal.type("bg; kill %1; wait; exit 3\n")
    assert terminal.status() == 3


def test_stopped_command_stops_the_box_and_goes_on(alarm, prefix):
    terminal = Terminal("bash", "--norc", "--noprofile", "-i")
    box = " ".join([*prefix, BOX])
    terminal.type(f"PS1='host> '\n{box} -- bash -c 'echo sta\"\"rted; cat; echo en\"\"ded'\n")
    terminal.wait_for("started")
    terminal.type("\x1a")
    terminal.wait_for("Stopped")
    terminal.type("echo shell \"\"again\n")
    terminal.wait_for("shell again")
    terminal.type("fg\n")
    terminal.wait_for(f"{BOX} --")  # the shell names what it goes on with
    terminal.type("through\n")
    terminal.wait_for("through")  # the terminal's echo
    terminal.wait_for("through")  # the command's answer: it reads, and will read the end, too
    terminal.type("\x04")
    terminal.wait_for("ended")
    terminal.type("echo status $?; exit 4\n")
    terminal.wait_for("status 0")
    assert terminal.status() == 4


if __name__ == "__main__":
    sys.exit(pytest.main([__file__]))
