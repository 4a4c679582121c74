"""What the gates share: where the sources, the build and the installed tree are."""
import os
import pathlib
import subprocess

import pytest

ROOT = pathlib.Path(__file__).resolve().parent.parent.parent
BUILD = pathlib.Path(os.environ.get("KOVA_BUILD", ROOT / "build"))
STAGE = BUILD / "stage"
COMPILE_FLAGS = ["-I", str(ROOT / "include"), "-I", str(ROOT / "platform" / "include")]


def run(*command, **options):
    """Runs a command; a failure shows what it printed."""
    done = subprocess.run([str(word) for word in command], stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True,
                          **options)
    assert done.returncode == 0, f"{' '.join(map(str, command))}\n{done.stdout}"
    return done.stdout


def tracked(*patterns):
    """Files of the repository, those not committed yet included."""
    listed = run("git", "-C", ROOT, "ls-files", "--cached", "--others", "--exclude-standard", *patterns).split("\n")
    return sorted(ROOT / name for name in set(listed) if name and (ROOT / name).exists())


@pytest.fixture(scope="session")
def library():
    [found] = STAGE.glob("usr/lib/*/libkovanetsdk.so.6.*")
    return found
