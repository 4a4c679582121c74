"""What kovanet verify finds, for the tests of it."""

from conftest import DONE, NO, data, kovanet

SCRIPTS = "/etc/sysconfig/network-scripts/"


def differences():
    """File, key, wanted and actual value of every difference; that of an interface without the folder."""
    return [(row["file"].removeprefix(SCRIPTS), row["key"], row["wanted"], row["actual"])
            for row in data("verify", status=NO)["differences"]]


def expect_agreement():
    """Fails with the table of the differences."""
    kovanet("verify", status=DONE)
