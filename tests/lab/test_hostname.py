# box: --no-network
"""The host name: kernel, files, log and plug-ins, in the box's own UTS namespace, and what a reader sees of the files,
or a kill leaves of them, while they are replaced."""

import concurrent.futures
import contextlib
import ctypes
import itertools
import os
import pathlib
import random
import shutil
import socket
import string
import subprocess

import pytest
from conftest import run, wait_for
from sdk import library, register
from steps import Watch, killed_at_each_step, steps

KOVANET = "/usr/bin/kovanet"
HOSTNAME, HOSTS = pathlib.Path("/etc/hostname"), pathlib.Path("/etc/hosts")
PLUGINS = pathlib.Path("/usr/kova/plugins/net/hostname_change")
MESSAGES = pathlib.Path("/var/log/messages")
DONE, NO, USAGE, _, CALL_FAILED, NO_PERMISSION = range(6)
OLD, NEW = "old-name", "new-name"
SYSCALL, RENAME, FILE_OPEN, FILE_WRITE, BAD_PARAMETER, OUT_OF_RANGE = 0x8100, 0x2800, 0x900, 0xB00, 0xD00, 0xE00


def hosts_of(name):
    return (
        "# Any manual change will be lost if the host name is changed or system upgrades.\n"
        "127.0.0.1\tlocalhost\n"
        "::1\t\tlocalhost\n"
        f"127.0.0.1\t{name}\n"
        f"::1\t\t{name}\n"
    )


def use(name):
    """Puts the system where it is after the host name has been set."""
    socket.sethostname(name)
    HOSTNAME.write_text(f"{name}\n")
    HOSTS.write_text(hosts_of(name))


def names():
    """The host name, in the kernel and in the files that are made of it."""
    return os.uname().nodename, HOSTNAME.read_text().rstrip("\n"), HOSTS.read_text()


def leftovers():
    """Temporary files of the two."""
    return [path for path in HOSTS.parent.iterdir() if path.name.startswith((".hosts.", ".hostname."))]


def set_name(name):
    return library.KOVALnxSetHostname(name.encode())


def get_name():
    buffer = ctypes.create_string_buffer(64)
    return library.KOVALnxGetHostname(buffer), buffer.value.decode()


def kovanet(*words, status=DONE):
    done = run(KOVANET, *words, status=status)
    assert (done.stderr == "") == (status == DONE)
    return done


def complaint(*words, status):
    done = kovanet(*words, status=status)
    assert done.stdout == "" and done.stderr.startswith("kovanet: ") and done.stderr.count("\n") == 1
    return done.stderr


@pytest.fixture(autouse=True)
def named(keep):
    """The host is called old-name, and keeps what it had before the test."""
    before = os.uname().nodename
    keep(HOSTNAME)
    keep(HOSTS)
    use(OLD)
    yield
    socket.sethostname(before)
    for path in leftovers():
        path.unlink()


@pytest.fixture
def plugin(tmp_path):
    """A plug-in of the event that notes all it is told and all it sees; gives the file of its notes."""
    notes = tmp_path / "notes"
    script = PLUGINS / "50-test"
    script.parent.mkdir(parents=True, exist_ok=True)
    script.write_text(
        f"#!/bin/sh\nexec >>{notes}\necho $PLUGIN_EVENT $PLUGIN_PHASE $HOSTNAME $(uname -n) $(cat {HOSTNAME})\n"
        f"cat {HOSTS} -\n"
    )
    script.chmod(0o755)
    yield notes
    script.unlink()


@pytest.fixture
def logger():
    """The system logger, with a log of its own."""
    MESSAGES.unlink(missing_ok=True)
    run("/sbin/start", "syslog-ng")
    wait_for(lambda: MESSAGES.exists() and pathlib.Path("/dev/log").is_socket(), what="the logger")
    yield MESSAGES
    run("/sbin/stop", "syslog-ng")


# ---- set ------------------------------------------------------------------------------------------------------------


def test_kernel_files_and_plugin_get_the_name(plugin):
    assert set_name(NEW) == 0
    assert names() == (NEW, NEW, hosts_of(NEW))
    assert plugin.read_text() == (
        f"net/hostname_change POST {NEW} {NEW} {NEW}\n{hosts_of(NEW)}"
        f"PLUGIN_EVENT=net/hostname_change\nPLUGIN_PHASE=POST\nHOSTNAME={NEW}\n"
    )
    assert get_name() == (1, NEW)
    assert leftovers() == []


def test_everybody_may_read_the_files_and_finds_the_host():
    mask = os.umask(0o077)
    assert set_name(NEW) == 0
    os.umask(mask)
    assert [path.stat().st_mode & 0o777 for path in (HOSTNAME, HOSTS)] == [0o644, 0o644]
    assert run("unshare", "--user", "cat", HOSTS).stdout == hosts_of(NEW)
    assert {line.split()[0] for line in run("getent", "ahosts", NEW).stdout.splitlines()} <= {"127.0.0.1", "::1"}


def test_the_name_is_that_of_this_uts_namespace_only():
    with subprocess.Popen(["unshare", "--uts", "sh", "-c", "echo; read -r _; uname -n"], stdin=subprocess.PIPE,
                          stdout=subprocess.PIPE, text=True) as other:  # fmt: skip
        other.stdout.readline()  # it has its namespace
        kovanet("hostname", "set", NEW)
        assert os.uname().nodename == NEW
        assert other.communicate("\n", timeout=60)[0] == f"{OLD}\n"


def test_the_configuration_is_locked_while_the_plugins_run(plugin, tmp_path):
    held = tmp_path / "held"
    script = PLUGINS / "60-asks"
    script.write_text(
        "#!/usr/bin/python3\nimport ctypes\ncore = ctypes.CDLL('libkovacore.so.6')\n"
        f"open('{held}', 'w').write(str(core.KLIBCFileLock(0x105, 0)))\n"
    )
    script.chmod(0o755)
    try:
        assert set_name(NEW) == 0
    finally:
        script.unlink()
    assert held.read_text() == "-1"
    assert get_name() == (1, NEW), "and free again"


def test_a_failing_plugin_fails_the_call_and_keeps_the_name(plugin):
    script = PLUGINS / "10-fails"
    script.write_text("#!/bin/sh\nexit 3\n")
    script.chmod(0o755)
    try:
        assert set_name(NEW) == -1
    finally:
        script.unlink()
    assert names() == (NEW, NEW, hosts_of(NEW))
    assert plugin.exists(), "the others run all the same"


def test_parallel_settings_end_with_one_of_the_names():
    chosen = [f"host{number}" for number in range(6)]
    with concurrent.futures.ThreadPoolExecutor(3) as pool:
        list(pool.map(lambda name: kovanet("hostname", "set", name), chosen))
    kernel, hostname, hosts = names()
    assert kernel in chosen and (hostname, hosts) == (kernel, hosts_of(kernel))
    assert leftovers() == []


# ---- the system logger ----------------------------------------------------------------------------------------------


def test_log_carries_the_new_name(logger):
    run("logger", "-t", "test", "before")
    wait_for(lambda: f"{OLD} user.notice test: before" in logger.read_text())
    assert set_name(NEW) == 0
    wait_for(lambda: f"{NEW} syslog.info syslogd started" in logger.read_text(), what="the reload")
    run("logger", "-t", "test", "after")
    wait_for(lambda: f"{NEW} user.notice test: after" in logger.read_text())


def test_a_logger_that_does_not_run_is_no_failure():
    assert not pathlib.Path("/dev/log").exists()
    assert set_name(NEW) == 0


@pytest.mark.parametrize("status", [1, 127])
def test_a_failing_reload_fails_after_the_files_are_written(keep, plugin, status):
    initctl = keep("/sbin/initctl")
    seen = plugin.with_name("seen")
    initctl.write_text(f'#!/bin/sh\necho "$*" >{seen}\nexit {status}\n')
    assert set_name(NEW) == -1
    assert seen.read_text() == "reload syslog-ng\n"
    assert names() == (NEW, NEW, hosts_of(NEW))
    assert not plugin.exists(), "nobody is told"
    assert "the system logger could not be reloaded" in complaint("hostname", "set", "third", status=CALL_FAILED)


def test_a_missing_initctl_is_told(keep):
    initctl = keep("/sbin/initctl")
    initctl.unlink()
    assert "NET_ERR_EXEC (0x2A00)" in complaint("hostname", "set", NEW, status=CALL_FAILED)
    assert names() == (NEW, NEW, hosts_of(NEW))


# ---- whole files ----------------------------------------------------------------------------------------------------


def test_a_reader_never_finds_a_torn_or_missing_file():
    short, long = "a", "b" * 63
    use(short)
    with Watch(HOSTS) as hosts, Watch(HOSTNAME) as hostname:
        for turn in itertools.count():
            assert set_name(long if turn % 2 == 0 else short) == 0
            if turn >= 60 and min(hosts.reads, hostname.reads) >= 500:
                break
    assert hosts.contents == {hosts_of(short), hosts_of(long)}
    assert hostname.contents == {f"{short}\n", f"{long}\n"}


def test_between_any_two_calls_of_the_writer_the_files_are_whole():
    with contextlib.closing(steps(KOVANET, "hostname", "set", NEW)) as writer:
        seen = [names() for _ in writer]
    assert set(seen) == {
        (OLD, OLD, hosts_of(OLD)), (NEW, OLD, hosts_of(OLD)), (NEW, NEW, hosts_of(OLD)), (NEW, NEW, hosts_of(NEW))
    }  # fmt: skip
    assert seen == sorted(seen, key=seen.index), "kernel, host name file, hosts file, one after the other"


def test_a_writer_killed_at_any_step_leaves_whole_files():
    def prepare():
        use(OLD)
        return KOVANET, "hostname", "set", NEW

    left, behind = {}, 0
    for step in killed_at_each_step(prepare):
        left[step] = names()
        behind = max(behind, len(leftovers()))
        for path in leftovers():
            path.unlink()
        assert get_name() == (1, left[step][0]), "the lock of a dead writer is free"
    assert set(left.values()) == {
        (OLD, OLD, hosts_of(OLD)), (NEW, OLD, hosts_of(OLD)), (NEW, NEW, hosts_of(OLD)), (NEW, NEW, hosts_of(NEW))
    }  # fmt: skip
    assert names() == (NEW, NEW, hosts_of(NEW)), "it got through in the end"
    assert behind == 1, "some kills came while a new file was being written"
    assert len(left) > 30 and list(left) == list(range(1, len(left) + 1))


def test_what_a_killed_writer_left_does_not_disturb_the_next():
    with contextlib.closing(steps(KOVANET, "hostname", "set", NEW)) as writer:  # killed at the end
        next(step for step in writer if any(path.name.startswith(".hosts.") for path in leftovers()))
    [torn] = leftovers()
    kovanet("hostname", "set", "third")
    assert names() == ("third", "third", hosts_of("third"))
    assert leftovers() == [torn]


# ---- bad input ------------------------------------------------------------------------------------------------------


def random_name(length):
    return "".join(random.choices(string.ascii_letters + string.digits, k=length))


def test_sixty_three_characters_are_a_name():
    name = random_name(63)
    assert set_name(name) == 0
    assert names() == (name, name, hosts_of(name))
    assert get_name() == (1, name)


@pytest.mark.parametrize("length", [64, 65, 4096, 100000])
def test_longer_names_are_refused_and_change_nothing(length):
    assert set_name("x" * length) == -1
    assert register() == (OUT_OF_RANGE, "lnx_set_hostname")
    assert "1 to 63 characters" in complaint("hostname", "set", "x" * length, status=NO)
    assert names() == (OLD, OLD, hosts_of(OLD))


def test_no_name_is_refused():
    assert set_name("") == -1
    assert register() == (BAD_PARAMETER, "lnx_set_hostname")
    assert library.KOVALnxSetHostname(None) == library.KOVALnxGetHostname(None) == -1
    assert names() == (OLD, OLD, hosts_of(OLD))


def test_a_domain_is_set_and_not_told():
    assert set_name("nas.example.com") == 0
    assert names() == ("nas.example.com", "nas.example.com", hosts_of("nas.example.com"))
    assert get_name() == (1, "nas")


def test_a_kernel_without_a_name():
    socket.sethostname("")
    assert get_name() == (0, "")
    assert kovanet("hostname", "show").stdout == "name: -\n"
    assert kovanet("hostname", "show", "--json").stdout == '{"name":null}\n'


def test_a_kernel_name_that_is_too_long_is_not_cut():
    socket.sethostname("x" * 64)
    assert get_name() == (-1, "")
    assert register() == (SYSCALL, "lnx_get_hostname")


FOREIGN = {"missing": None, "empty": b"", "lines": b"192.168.1.2 other\n# mine\nno newline", "binary": b"\0\xff\n",
           "long": b"x" * 1000000}  # fmt: skip


@pytest.mark.parametrize("content", FOREIGN.values(), ids=FOREIGN)
def test_hosts_file_of_any_content_is_replaced(content):
    HOSTS.unlink()
    if content is not None:
        HOSTS.write_bytes(content)
    assert set_name(NEW) == 0
    assert names() == (NEW, NEW, hosts_of(NEW))


def test_hosts_file_that_is_a_directory_is_kept():
    HOSTS.unlink()
    (HOSTS / "inner").mkdir(parents=True)
    try:
        assert set_name(NEW) == -1
        assert register() == (RENAME, "lnx_set_hostname")
        assert (HOSTS / "inner").is_dir() and leftovers() == []
        assert "NET_ERR_RENAME (0x2800)" in complaint("hostname", "set", NEW, status=CALL_FAILED)
    finally:
        shutil.rmtree(HOSTS)


def test_hosts_file_that_is_a_link_is_replaced_and_its_target_kept(tmp_path):
    elsewhere = tmp_path / "elsewhere"
    elsewhere.write_text("mine\n")
    HOSTS.unlink()
    HOSTS.symlink_to(elsewhere)
    assert set_name(NEW) == 0
    assert not HOSTS.is_symlink() and elsewhere.read_text() == "mine\n"


@contextlib.contextmanager
def etc_on_a_file_system_of_its_own(folder):
    """/etc is a copy of itself on a small file system."""
    shutil.copytree("/etc", folder / "etc", symlinks=True)
    run("mount", "-t", "tmpfs", "-o", "size=64m", "tmpfs", "/etc")
    try:
        run("cp", "-a", f"{folder}/etc/.", "/etc")
        yield
    finally:
        run("umount", "--lazy", "/etc")


def test_a_full_file_system_keeps_the_old_files(tmp_path):
    with etc_on_a_file_system_of_its_own(tmp_path):
        run("dd", "if=/dev/zero", "of=/etc/filler", "bs=4096", status=1)
        assert set_name(NEW) == -1
        assert register() == (FILE_WRITE, "lnx_set_hostname")
        assert names() == (NEW, OLD, hosts_of(OLD)) and leftovers() == []
        assert "NET_ERR_FILE_WRITE (0xB00)" in complaint("hostname", "set", NEW, status=CALL_FAILED)
        pathlib.Path("/etc/filler").unlink()
        assert set_name(NEW) == 0
        assert names() == (NEW, NEW, hosts_of(NEW))


def test_a_read_only_file_system_keeps_the_old_files(tmp_path):
    with etc_on_a_file_system_of_its_own(tmp_path):
        run("mount", "-o", "remount,ro", "/etc")
        assert set_name(NEW) == -1
        assert register() == (FILE_OPEN, "lnx_set_hostname")
        assert names() == (NEW, OLD, hosts_of(OLD))
        done = run(KOVANET, "hostname", "set", NEW, "--verbose", status=CALL_FAILED)
        assert "fopen failed: Read-only file system\n" in done.stderr and "NET_ERR_FILE_OPEN (0x900)" in done.stderr


def test_inside_a_container_nothing_is_changed(keep, plugin):
    keep("/etc/kova/platform.conf").write_text('docker_hmx="yes"\n')
    assert set_name(NEW) == 0
    assert names() == (OLD, OLD, hosts_of(OLD)) and not plugin.exists()
    assert "it is given from outside" in complaint("hostname", "set", NEW, status=NO)


# ---- kovanet --------------------------------------------------------------------------------------------------------


def test_kovanet_sets_and_shows():
    assert kovanet("hostname", "set", NEW).stdout == ""
    assert names() == (NEW, NEW, hosts_of(NEW))
    assert kovanet("hostname", "show").stdout == f"name: {NEW}\n"
    assert kovanet("hostname", "show", "--json").stdout == f'{{"name":"{NEW}"}}\n'
    assert kovanet("hostname", "set", "nas.example.com", "--json").stdout == ""
    assert kovanet("hostname", "show").stdout == "name: nas\n"


@pytest.mark.parametrize("name", ["", "a b", "a\nb", "a/b", "ä", "a;b", ".a", "%s", "a\x1b[31m"])
def test_kovanet_refuses_what_is_no_name(name):
    assert "a host name" in complaint("hostname", "set", name, status=NO)
    assert names() == (OLD, OLD, hosts_of(OLD))
    assert "\x1b" not in complaint("hostname", "set", name, status=NO)


def test_kovanet_refuses_a_name_that_looks_like_an_option():
    complaint("hostname", "set", "-x", status=USAGE)
    assert "begins with a letter" in complaint("hostname", "set", "--", "-x", status=NO)
    assert names() == (OLD, OLD, hosts_of(OLD))
