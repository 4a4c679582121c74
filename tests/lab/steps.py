"""A program, one system call at a time: what others see of its work between any two of them, and what it leaves behind
when it is killed there.

    for step in steps("/bin/mv", new, target):      # stopped before each of its calls
        assert target.read_text() in (before, after)
    for step in killed_at_each_step(prepare):       # prepared and run again and again, killed before each of its calls
        assert target.read_text() in (before, after)
    with Watch(target) as watch:                    # read without a pause, whoever writes meanwhile
        ...
    assert watch.contents <= {before, after}

Only the program itself is stopped or killed, what it starts is not.
"""

import ctypes
import itertools
import os
import pathlib
import signal
import threading

TRACEME, SYSCALL, SETOPTIONS = 0, 24, 0x4200
MARK_CALLS, END_WITH_TRACER = 1, 0x100000
CALL_STOP = signal.SIGTRAP | 0x80

libc = ctypes.CDLL(None, use_errno=True)
libc.ptrace.argtypes = [ctypes.c_long, ctypes.c_int, ctypes.c_void_p, ctypes.c_void_p]
libc.ptrace.restype = ctypes.c_long


def ptrace(request, pid, data=0):
    if libc.ptrace(request, pid, None, data) < 0:
        raise OSError(ctypes.get_errno(), f"ptrace request {request}")


class Stepped:
    """A program that is stopped at its start. It must be used by the thread that made it."""

    def __init__(self, command):
        words = [str(word) for word in command]
        self.status = None  # as subprocess tells it, once it has ended
        self.pid = os.fork()
        if self.pid == 0:
            self.become(words)
        os.waitpid(self.pid, 0)
        ptrace(SETOPTIONS, self.pid, MARK_CALLS | END_WITH_TRACER)

    @staticmethod
    def become(words):
        try:
            nothing = os.open("/dev/null", os.O_RDWR)
            for standard in range(3):
                os.dup2(nothing, standard)
            ptrace(TRACEME, 0)
            os.execv(words[0], words)
        finally:
            os._exit(127)

    def go_on(self):
        """Lets it run up to the beginning of its next call, or to the end of the one it is in. False when it has ended
        instead."""
        passed_on = 0
        while True:
            ptrace(SYSCALL, self.pid, passed_on)
            _, status = os.waitpid(self.pid, 0)
            if not os.WIFSTOPPED(status):
                self.status = os.waitstatus_to_exitcode(status)
                return False
            if os.WSTOPSIG(status) == CALL_STOP:
                return True
            passed_on = os.WSTOPSIG(status)

    def kill(self):
        """Ends it where it is; the call that it is about to make is not made."""
        if self.status is None:
            os.kill(self.pid, signal.SIGKILL)
            os.waitpid(self.pid, 0)


def steps(*command, status=0):
    """Stops a program before each of its system calls, yields their numbers and checks its exit status."""
    program = Stepped(command)
    try:
        for step in itertools.count(1):
            if not program.go_on():
                break
            yield step
            if not program.go_on():
                break
        assert program.status == status, f"{command}: {program.status}"
    finally:
        program.kill()


def is_killed_at(step, *command):
    """Runs a program up to its system call of that number and kills it there. False when it succeeds before."""
    for reached in steps(*command):
        if reached == step:
            return True
    return False


def killed_at_each_step(prepare):
    """Runs the command that prepare() gives, killed before its first, second ... call, until it once gets through.
    Yields the numbers after the kills."""
    for step in itertools.count(1):
        if not is_killed_at(step, *prepare()):
            return
        yield step


class Watch:
    """Reads a file again and again while a block runs: all contents it had, None when it was not there."""

    def __init__(self, path):
        self.path = pathlib.Path(path)
        self.contents = set()
        self.reads = 0
        self.ended = threading.Event()
        self.thread = threading.Thread(target=self.look)

    def look(self):
        while not self.ended.is_set():
            try:
                self.contents.add(self.path.read_text())
            except FileNotFoundError:
                self.contents.add(None)
            self.reads += 1

    def __enter__(self):
        self.thread.start()
        return self

    def __exit__(self, *_):
        self.ended.set()
        self.thread.join()
