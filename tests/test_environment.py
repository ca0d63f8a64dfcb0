"""What a boot may do to the program apart from the links."""

import re
import subprocess

import pytest

from test_boots import BINARIES, STATE, check_boot, run, stage

RESET = "localtime > /var/db/timezone/zoneinfo/America/Los_Angeles"
SWITCH = "live 2021b.1.0, latest 2022a.1.0, localtime ="
SWITCHED = f"live 2022a.1.0, marker, record 2021b.1.0_2022a.1.0, {RESET}"
# Without the options that the mount has, since a user namespace knows its owner by another number.
REMOUNT = "mount --options-source disable -o remount"
FULL = "nr_inodes=$(($(stat -f -c %c-%d /var)))"
VERSION = "/usr/share/zoneinfo.default/+VERSION"

# Scripts that run the program, $0, with what becomes of SWITCH and the exit status.
ENVIRONMENTS = {
    "[[ $($0 2>&1 <&- | wc -l) == 2 ]]": (SWITCHED, 0),
    "exec $0 2>&-": (SWITCHED, 0),
    "exec $0 2>/dev/full": (SWITCHED, 0),
    "exec 2> >(exec true) && wait $! && exec $0": (SWITCHED, 0),
    "ulimit -f 0; exec $0": (SWITCHED.replace("2021b.1.0_2022a.1.0", ""), 0),
    f"umask 0; $0; [[ $(stat -c %a {STATE}[Tn]* | uniq) == 666 ]]": (SWITCHED, 0),
    f"r={STATE}TZVersionDiffRecord; mkfifo $r; exec 3<>$r; $0 3>&-; ! read -rt 0 -u 3": (
        SWITCHED.replace("record 2021b.1.0_2022a.1.0", "TZVersionDiffRecord fifo"),
        0,
    ),
    f"truncate -s 100G {VERSION}; $0; s=$?; echo 2021a >{VERSION}; exit $s": (SWITCHED, 0),
    f"rm {STATE}localtime; {REMOUNT},{FULL} /var || exit 9; $0; s=$?; "
    f"{REMOUNT},nr_inodes=99999 /var; exit $s": ("live 2022a.1.0, localtime -", 1),
    f"rm {STATE}localtime; {REMOUNT},ro /var || exit 9; $0; s=$?; "
    f"{REMOUNT},rw /var; exit $s": ("localtime -", 1),
    f"rm -r {STATE}; exec $0": (". -", 1),
}


@pytest.mark.parametrize("script", ENVIRONMENTS)
def test_environment(script):
    changes, status = ENVIRONMENTS[script]
    check_boot(SWITCH, changes, None, status, ["bash", "-c", script, *BINARIES["release"]])


@pytest.mark.parametrize("limit", ["unlimited", "8000"])
def test_a_version_of_megabytes_does_not_stop_the_local_time_repair(limit):
    command = ["bash", "-c", f"ulimit -v {limit}; exec $0", *BINARIES["release"]]
    check_boot(f"system {'7' * (8 << 20)}a, localtime =", RESET, None, 1, command)


def test_a_version_file_of_several_buffers():
    check_boot(f"{VERSION} = {'2021b':>8192}{'z':>4097}, live 2021b.1.0", "", [], 0)


def test_a_link_target_is_cut_to_1024_bytes():
    stage("tz_latest > /" + 1200 * "x")
    assert f"bad path /{1023 * 'x'}: " in run()[1][0]


def test_a_platform_with_protection_classes_gets_them():
    stage("system 2022a, live 2021b.1.0")
    command = ["strace", "-y", "-e", "fcntl", "build/protected/tzreconcile"]
    trace = subprocess.run(command, capture_output=True, text=True, check=True).stderr
    classes = re.findall(r"fcntl\(\d<(.*)>, 0x40 .*, (\w+)\)", trace)
    paths = ["/var/db/timezone", "/var/db/timezone/tz", "/var/db/timezone/needs_cleanup"]
    assert classes == [(path, "0x4") for path in paths], trace
