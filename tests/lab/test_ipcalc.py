# box: --no-network
"""/bin/ipcalc answers in the form that its callers read."""

import pytest
from conftest import run


@pytest.mark.parametrize(
    ("argument", "network", "broadcast"),
    [
        ("192.168.1.10/24", "192.168.1.0", "192.168.1.255"),
        ("192.168.1.10/255.255.255.0", "192.168.1.0", "192.168.1.255"),
        ("10.20.30.40/8", "10.0.0.0", "10.255.255.255"),
        ("172.16.77.5/255.255.240.0", "172.16.64.0", "172.16.79.255"),
        ("192.168.1.130/25", "192.168.1.128", "192.168.1.255"),
        ("10.0.0.5/30", "10.0.0.4", "10.0.0.7"),
        ("10.0.0.5/32", "10.0.0.5", "10.0.0.5"),
    ],
)
def test_first_line_is_the_answer(argument, network, broadcast):
    assert run("/bin/ipcalc", "-n", argument).stdout.splitlines()[0] == f"NETWORK={network}"
    assert run("/bin/ipcalc", "-b", argument).stdout.splitlines()[0] == f"BROADCAST={broadcast}"


@pytest.mark.parametrize("argument", ["192.168.1.300/24", "192.168.1.10/33", "192.168.1.10/255.0.255.0", "eth0"])
def test_bad_argument_gives_no_answer(argument):
    for option in ("-n", "-b"):
        done = run("/bin/ipcalc", option, argument, status=1)
        assert done.stdout == ""
        assert done.stderr
