"""What a boot may do to the program apart from the links, and what no table of links shows."""

import os
import re
import subprocess

import pytest

import harness
from harness import STATE, SYSTEM
from test_faults import traced_run

SWITCH = "dataset 2021b.1.0, live 2021b.1.0, dataset 2022a.1.0, latest 2022a.1.0, localtime ="
LOS_ANGELES = f"localtime > {STATE}zoneinfo/America/Los_Angeles"
SWITCHED = f"live 2022a.1.0, marker, record 2021b.1.0_2022a.1.0, {LOS_ANGELES}"
ENVIRONMENTS = {
    "without standard input": "exec $0 <&-",
    "without standard output": "exec $0 >&-",
    "without standard error": "exec $0 2>&-",
    "without any stream": "exec $0 <&- >&- 2>&-",
    "full log": "exec $0 2>/dev/full",
    "log without a reader": "exec 2> >(exec true) && wait $! && exec $0",
    "deleted working directory": "p=$PWD/$0; mkdir /var/gone; cd /var/gone; rmdir /var/gone; exec $p",
    "arguments": "exec $0 --help -x ''",
}


def in_shell(script):
    return ["bash", "-c", script, *harness.RELEASE]


@pytest.mark.parametrize("script", ENVIRONMENTS.values(), ids=ENVIRONMENTS)
def test_switch(script):
    harness.stage(SWITCH)
    before = harness.read_disk()
    outcome = harness.run(in_shell(script))
    harness.check(outcome._replace(warnings=[]), before, SWITCHED)


def test_marker_and_record_have_the_mode_that_the_umask_leaves():
    harness.stage(SWITCH)
    harness.run(in_shell("umask 027; exec $0"))
    for name in ("needs_cleanup", "TZVersionDiffRecord"):
        assert os.stat(STATE + name).st_mode & 0o777 == 0o640


def test_a_run_ends_at_the_descriptor_limit():
    harness.stage(SWITCH)
    # Without its files the system has no schema and no version, and no directory can be walked: all fits.
    assert harness.run(in_shell("ulimit -n 3; exec $0")).status == 0
    assert os.readlink(STATE + "zoneinfo") == f"{STATE}tz/2022a.1.0/zoneinfo"
    assert os.readlink(STATE + "localtime") == f"{STATE}zoneinfo/America/Los_Angeles"


@pytest.mark.parametrize("error", ["Read-only file system", "No space left on device"])
def test_a_state_directory_that_takes_nothing_is_reported(error):
    harness.stage("dataset 2021b.1.0, latest 2021b.1.0, - localtime")
    before, room = harness.read_disk(), os.statvfs("/var")
    option = "ro" if error.startswith("Read") else f"nr_inodes={room.f_files - room.f_ffree}"
    remount = ["mount", "/var", "-o"]
    subprocess.run([*remount, f"remount,{option}"], check=True)
    outcome = harness.run()
    subprocess.run([*remount, "remount,rw,nr_inodes=100000"], check=True)
    harness.check(outcome._replace(warnings=[]), before, "", [], 1)
    link, target = f"{STATE}localtime", f"{STATE}zoneinfo/America/Los_Angeles"
    assert outcome.warnings[-1] == f"create_symlink: from {link} to {target}: {error}"


@pytest.mark.parametrize("version, status", [("7", 0), ("a", 0), ("2021a", 0), ("7a", 1)])
def test_a_version_of_megabytes_does_not_stop_the_local_time_repair(version, status):
    harness.stage("system - -, - localtime")
    for byte in "7a":
        version = version.replace(byte, byte * (8 << 20))
    harness.create(f"{SYSTEM}/+VERSION", "=", version)
    assert harness.run(stderr=subprocess.DEVNULL).status == status
    assert os.readlink(STATE + "localtime") == f"{STATE}zoneinfo/America/Los_Angeles"


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
    for path, number in (("", 4), ("tz/", 4), ("needs_cleanup", 1004)):
        assert re.search(f'"{STATE}{path}".* = 3\\nfcntl\\(3, 0x40 .*, {number:#x}\\)', trace), path


def test_in_process():
    result = subprocess.run(["build/dev/tests/in_process_tests"], capture_output=True)
    assert result.returncode == 0, (result.stdout + result.stderr[-4000:]).decode(errors="replace")
