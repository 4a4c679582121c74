"""The Debian packages that ./package builds: what is in them, and that they can be installed, used, removed and purged. The
last in a box, whose own copy of this machine's package database is thrown away with it."""
import hashlib
import pathlib
import re
import shutil
import subprocess

import pytest
from conftest import BUILD, ROOT, STAGE, run

NAMES = {"libkovanetsdk6", "libkovaplatform6", "libkovanetsdk-dev", "kovanet", "kovanet-appliance"}
LIBRARIES = {"libkovanetsdk6", "libkovaplatform6"}
FIRST = "/usr/share/kovanet-appliance/first"
ONCE = ("/etc/kovainfo.conf", "/etc/sysconfig/", "/etc/kova/service/")  # brought as the first and then the machine's own
MOVED = "/usr/kova/sbin/dhclient"  # the system's own, copied where no package can move it

PROGRAM = """#include <kovanetsdk/kovanetsdk.h>
#include <stdio.h>
int main(void)
{
    int good = BlKLIBIsIpAddr("192.168.1.10"), bad = BlKLIBIsIpAddr("192.168.1.256");
    printf("%d %d 0x%X\\n", good, bad, (unsigned)KLIBCErrGet());
    return 0;
}
"""
PROJECT = """cmake_minimum_required(VERSION 3.25)
project(outside C CXX)
find_package(kovanetsdk 6 REQUIRED)
add_executable(cmake-c outside.c)
add_executable(cmake-c++ outside.cpp)
target_link_libraries(cmake-c kovanetsdk::kovanetsdk)
target_link_libraries(cmake-c++ kovanetsdk::kovanetsdk)
"""
# Each line it prints is compared; what goes wrong ends it.
IN_THE_BOX = r"""
set -eu
export DEBIAN_FRONTEND=noninteractive LC_ALL=C.UTF-8
client=$(sha256sum </sbin/dhclient)
if dpkg --install "$2"/kovanet_*.deb >refused 2>&1; then echo "installed without its libraries"; fi
grep -o 'kovanet depends on libkova[a-z0-9]*' refused | sort -u
dpkg --purge kovanet >log 2>&1

dpkg --install "$2"/*.deb >log 2>&1 || { cat log; exit 1; }
dpkg --verify $1 && echo verified
dpkg-query --show --showformat '${Package} ${db:Status-Status}\n' $1
[ "$client" = "$(sha256sum </usr/kova/sbin/dhclient)" ] && echo "client moved"
head -c 2 /usr/sbin/dhclient; echo
cat /etc/kovainfo.conf
/sbin/ldconfig --print-cache | grep -c libkova
kovanet check address 192.168.1.10 --json
MANPATH=/usr/share/man man -w kovanet kovanetsdk kovanet-files

for language in c c++; do
    compiler=gcc; suffix=c
    [ $language = c ] || { compiler=g++; suffix=cpp; }
    $compiler -Wall -Werror outside.$suffix -o pkg-config-$language $(pkg-config --cflags --libs kovanetsdk)
    ./pkg-config-$language
done
cmake -S . -B build >log 2>&1 && cmake --build build >>log 2>&1 || { cat log; exit 1; }
build/cmake-c
build/cmake-c++

sed -i 's/^dns_mode=.*/dns_mode="static"/' /etc/kovainfo.conf
dpkg --install "$2"/*.deb >log 2>&1 || { cat log; exit 1; }
grep dns_mode /etc/kovainfo.conf
/sbin/start link-watch
pgrep -f 'kovanet link watc[h]' >log && echo "job runs"
mkdir -p /etc/dhcpd /etc/sysconfig/pppoe-relay /var/lib/kova
written="/etc/dhcpd/dhcpd.info /etc/sysconfig/pppoe-relay/pppoe-relay-eth0.conf /etc/sysconfig/network-scripts/ifcfg-eth7
    /etc/sysconfig/network-scripts/DEV_abcdef /etc/gogoc/.tunnel_passwd /etc/gogoc/gogoc.conf /etc/resolv.conf.static
    /etc/dhclient/ipv4/dhcpcd-eth0.info /etc/iproute2/config/resolv4.conf /var/lib/kova/dhcp-server.leases"
touch $written
dpkg --remove $1 >log 2>&1 || { cat log; exit 1; }
[ "$client" = "$(sha256sum </sbin/dhclient)" ] && echo "client back"
grep dns_mode /etc/kovainfo.conf
/sbin/ldconfig --print-cache | grep libkova || echo "libraries gone"
pgrep -f 'kovanet link watc[h]' || echo "job ended"
ls $written >log && echo "settings kept"
dpkg --purge $1 >log 2>&1 || { cat log; exit 1; }
dpkg-query --show $1 2>/dev/null || echo "packages gone"
dpkg-divert --list 'kovanet*'
printf '%s\n' $written /etc/sysconfig /etc/kova /etc/dhcpd >>new-paths
while read -r path; do
    if [ -e "$path" ] || [ -L "$path" ]; then echo "left: $path"; fi
done <new-paths
"""


@pytest.fixture(scope="module")
def packages():
    """Name and file of each."""
    run("./package", cwd=ROOT)
    files = [path for path in (BUILD / "packages").glob("*.deb") if "-dbgsym_" not in path.name]
    return {path.name.partition("_")[0]: path for path in files}


def field(package, name):
    return run("dpkg-deb", "--field", package, name).strip()


def needed(package):
    """Names that a package depends on, and the versions asked for."""
    depends = re.findall(r"([\w.+-]+)(?: \((.*?)\))?", field(package, "Depends"))
    return dict(depends)


def contents(package):
    """Path and kind of everything in a package; the root itself left out."""
    listed = re.findall(r"^([-dl])\S+ .*? \.(/\S*)(?: -> .*)?$", run("dpkg-deb", "--contents", package), re.MULTILINE)
    return {path.rstrip("/"): kind for kind, path in listed if path != "/"}


def files_of(package):
    return {path for path, kind in contents(package).items() if kind != "d"}


def test_packages_are_of_the_library_s_version(packages):
    assert set(packages) == NAMES
    version = re.search(r"project\(kovanetsdk VERSION (\S+)", (ROOT / "CMakeLists.txt").read_text())[1]
    assert {field(path, "Version") for path in packages.values()} == {version}
    assert {field(path, "Architecture") for path in packages.values()} == {run("dpkg", "--print-architecture").strip()}


def test_no_file_is_in_two_packages(packages):
    owner = {}
    for name, path in packages.items():
        for file in files_of(path):
            assert owner.setdefault(file, name) == name, file


def packed_as(path):
    """Under which name a package has what is installed as another one."""
    path = re.sub(r"-targets-\w+\.cmake$", "-targets-none.cmake", path)  # named after the kind of build
    if path.startswith(ONCE):
        return FIRST + path
    return f"{path}.gz" if "/share/man/" in path else path.replace("/usr/sbin/dhclient", "/sbin/dhclient")


def test_everything_installed_is_in_a_package(packages):
    packed = {path for package in packages.values() for path in files_of(package)}
    staged = {f"/{path.relative_to(STAGE)}" for path in STAGE.rglob("*") if path.is_symlink() or not path.is_dir()}
    wanted = {packed_as(path) for path in staged - {MOVED}}
    assert wanted - packed == set()
    assert {path for path in packed - wanted if not path.startswith(("/usr/share/doc/", "/usr/share/lintian/"))} == set()


def test_dependencies(packages):
    version = field(packages["kovanet"], "Version")
    assert needed(packages["libkovaplatform6"]).keys() == {"libc6"}
    assert needed(packages["libkovanetsdk6"]).keys() == {"libc6", "libkovaplatform6"}
    assert needed(packages["libkovanetsdk6"])["libkovaplatform6"] == f">= {version}"
    assert needed(packages["libkovanetsdk-dev"]) == {"libkovanetsdk6": f"= {version}", "libkovaplatform6": f"= {version}"}
    assert needed(packages["kovanet"]).keys() == {"libc6", "libkovanetsdk6", "libkovaplatform6"}
    tools = {"busybox", "dnsmasq-base", "ipcalc-ng", "iproute2", "iputils-ping", "isc-dhcp-client", "kmod", "net-tools"}
    assert needed(packages["kovanet-appliance"]).keys() >= tools | {"kovanet", "libkovanetsdk6", "libkovaplatform6"}


def test_scripts_are_where_they_have_to_be(packages, tmp_path):
    for name, path in packages.items():
        run("dpkg-deb", "--control", path, tmp_path / name)
        there = {file.name for file in (tmp_path / name).iterdir()}
        if name in LIBRARIES:
            assert (tmp_path / name / "triggers").read_text().splitlines()[-1] == "activate-noawait ldconfig"
        scripts = {"preinst", "postinst", "prerm", "postrm"} if name == "kovanet-appliance" else set()
        assert there & {"preinst", "postinst", "prerm", "postrm", "config"} == scripts, name


def test_lintian_has_nothing_to_say(packages):
    done = subprocess.run(["lintian", "--allow-root", "--fail-on", "error,warning", "--display-level", ">=warning",
                           *map(str, packages.values())], stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True)
    assert done.returncode == 0 and not done.stdout, done.stdout


def test_life_of_the_packages(packages, tmp_path):
    for name, text in {"outside.c": PROGRAM, "outside.cpp": PROGRAM, "CMakeLists.txt": PROJECT}.items():
        (tmp_path / name).write_text(text)
    paths = {path.removeprefix(FIRST) for package in packages.values() for path in contents(package)} | {MOVED}
    new = sorted(path for path in paths if not pathlib.Path(path).exists() and not pathlib.Path(path).is_symlink())
    assert len(new) > 60
    (tmp_path / "new-paths").write_text("".join(f"{path}\n" for path in new))
    (tmp_path / "packages").mkdir()
    for path in packages.values():
        shutil.copy(path, tmp_path / "packages")
    host = hashlib.sha256(pathlib.Path("/var/lib/dpkg/status").read_bytes()).hexdigest()

    said = run(BUILD / "lab" / "kova-box", "--no-network", "--share", tmp_path, "--", "bash", "-c", IN_THE_BOX, "bash",
               " ".join(sorted(NAMES)), tmp_path / "packages", cwd=tmp_path)

    assert said.splitlines() == [
        "kovanet depends on libkovanetsdk6", "kovanet depends on libkovaplatform6",
        "verified",
        *(f"{name} installed" for name in sorted(NAMES)),
        "client moved", "#!", 'dns_mode="auto"', 'pppoe_enable="no"', "10",
        '{"kind":"address","value":"192.168.1.10","valid":true,"reason":null}',
        "/usr/share/man/man1/kovanet.1.gz", "/usr/share/man/man7/kovanetsdk.7.gz", "/usr/share/man/man5/kovanet-files.5.gz",
        *["1 0 0x1000"] * 4,
        'dns_mode="static"', "job runs",
        "client back", 'dns_mode="static"', "libraries gone", "job ended", "settings kept", "packages gone"]
    assert hashlib.sha256(pathlib.Path("/var/lib/dpkg/status").read_bytes()).hexdigest() == host
