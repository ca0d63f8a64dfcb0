"""What a boot may do to the program apart from the links, and what no table of links shows."""

import os
import re
import subprocess

import pytest

import harness
from harness import ICU_FORMAT, STATE, SYSTEM
from test_faults import traced_run

RESET = f"localtime > {STATE}zoneinfo/America/Los_Angeles"
SWITCH = "dataset 2021b.1.0, live 2021b.1.0, dataset 2022a.1.0, latest 2022a.1.0, localtime ="
SWITCHED = f"live 2022a.1.0, marker, record 2021b.1.0_2022a.1.0, {RESET}"
FIFO = SWITCHED.replace("record 2021b.1.0_2022a.1.0", "TZVersionDiffRecord fifo")
# Without the options that the mount has, since a user namespace knows its owner by another number.
REMOUNT = "mount --options-source disable -o remount"
SPARSE = "sparse() { : >$1; truncate -s 100G $1; }; sparse"
FULL = "nr_inodes=$(($(stat -f -c %c-%d /var)))"

# Scripts that run the program, with what becomes of SWITCH and the exit status.
ENVIRONMENTS = {
    "[[ $($0 2>&1 <&- | wc -l) == 2 ]]": (SWITCHED, 0),
    "exec $0 2>&-": (SWITCHED, 0),
    "exec $0 2>/dev/full": (SWITCHED, 0),
    "exec 2> >(exec true) && wait $! && exec $0": (SWITCHED, 0),
    "ulimit -f 0; exec $0": (SWITCHED.replace(" 2021b.1.0_2022a.1.0", ""), 0),
    "p=$(realpath $0); mkdir /var/gone; cd /var/gone; rmdir /var/gone; exec $p": (SWITCHED, 0),
    f"umask 0; $0; [[ $(stat -c %a {STATE}[Tn]* | uniq) == 666 ]]": (SWITCHED, 0),
    # Without its files the system has no schema and no version; no directory is walked: all fits.
    "ulimit -n 3; exec $0": (f"live 2022a.1.0, {RESET}", 0),
    "ulimit -n 4; exec $0 <&-": (SWITCHED, 0),
    f"r={STATE}TZVersionDiffRecord; mkfifo $r; exec 3<>$r; $0 3>&-; ! read -rt 0 -u 3": (FIFO, 0),
    f"{REMOUNT},ro /usr/share || exit; $0; s=$?; {REMOUNT},rw /usr/share; exit $s": (SWITCHED, 0),
    f"{SPARSE} {SYSTEM}/+VERSION; $0; s=$?; echo 2021a >{SYSTEM}/+VERSION; exit $s": (SWITCHED, 0),
    f"{SPARSE} {ICU_FORMAT}; $0; s=$?; echo 44l >{ICU_FORMAT}; exit $s": (
        f"live system, marker, {RESET}",
        0,
    ),
    f"rm -r {STATE}; exec $0": ("- .", 1),
    f"rm {STATE}tz_latest {STATE}localtime; {REMOUNT},ro /var || exit 9; $0; s=$?; "
    f"{REMOUNT},rw /var; exit $s": ("- tz_latest, - localtime", 1),
    f"rm {STATE}localtime; {REMOUNT},{FULL} /var || exit 9; $0; s=$?; "
    f"{REMOUNT},nr_inodes=99999 /var; exit $s": ("- localtime, live 2022a.1.0", 1),
}


@pytest.mark.parametrize("script", ENVIRONMENTS)
def test_environment(script):
    changes, status = ENVIRONMENTS[script]
    harness.check_boot(SWITCH, changes, None, status, ["bash", "-c", script, *harness.RELEASE])


@pytest.mark.parametrize(
    "version, status", [("7", 0), ("a", 0), ("2021a", 0), ("7a", 1), ("77a", 0)]
)
def test_a_version_of_megabytes_does_not_stop_the_local_time_repair(version, status):
    for byte in "7a":
        version = version.replace(byte, byte * (8 << 20))
    harness.check_boot(f"system {version}, - localtime", RESET, None, status)


@pytest.mark.parametrize("version", [f"{'2021a':>8192}{'z':>4097}", f"{'2021a':>4097}"])
def test_a_version_file_of_several_buffers(version):
    harness.check_boot(f"{SYSTEM}/+VERSION = {version}, dataset 2021a.1.0, live 2021a.1.0", "", [])


def test_without_memory_the_local_time_is_repaired():
    version = "7" * (8 << 20)
    command = ["bash", "-c", "ulimit -v 8000; exec $0", *harness.RELEASE]
    harness.check_boot(f"system {version}, - localtime", RESET, None, 1, command)


def test_a_link_target_is_cut_to_1024_bytes():
    harness.stage("tz_latest > /" + 1200 * "x")
    bad_path = f"vrel_dataset::create_components: bad path /{1023 * 'x'}"
    assert harness.is_warning(harness.run().warnings[0], bad_path)


def test_the_first_directory_entry_wins():
    icu = "tz/2021b.1.0/icutz/icutz"
    harness.stage(f"dataset 2021b.1.0 45l, {icu}46l.dat =, {icu}47l.dat =, latest 2021b.1.0")
    first = os.listdir(f"{STATE}tz/2021b.1.0/icutz")[0]
    harness.create("/usr/share/icu/icutzformat.txt", "=", first[5:8])
    assert harness.run() == (0, [])


def test_a_tree_below_the_icu_directory_is_not_walked():
    harness.stage("dataset 2021b.1.0, tz/2021b.1.0/icutz/tree/x =, live 2021b.1.0")
    trace = traced_run()[1]
    assert '"tree"' in trace and 'openat(AT_FDCWD, "tree"' not in trace


def test_a_platform_with_protection_classes_gets_them():
    harness.stage("system 2022a, dataset 2021b.1.0, live 2021b.1.0")
    trace = traced_run(command=["build/dev/tests/tzreconcile"])[1]
    calls = [('"', 4), ('tz/"', 4), ('needs_cleanup", O_RDWR.O_CREAT, 0666', 1004)]
    opens = (f'"{STATE}{p}[^\n]* = 3\nfcntl\\(3, 0x40 [^\n]*, {n:#x}\\)' for p, n in calls)
    assert re.search(".*".join(opens), trace, re.DOTALL), trace


def test_in_process():
    result = subprocess.run(["build/dev/tests/in_process_tests"], capture_output=True)
    assert result.returncode == 0, (result.stdout + result.stderr[-4000:]).decode(errors="replace")
