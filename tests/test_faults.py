"""Lets each system call of a run fail, or kills the program before it, and boots again.

Likewise the sample installer is killed before each call that changes the disk.
"""

import os
import re
from collections import Counter
from pathlib import Path

import pytest

from test_boots import BINARIES, STATE, create, read_disk, run, stage

# Together they reach every call that a run can make.
SITUATIONS = [
    "zoneinfo > @2021b.1.0/zoneinfo, /var/db/icutz > @2021b.1.0/icutz, dataset 2021b.1.0, "
    "latest 2022a.1.0, marker, /var/db/icu /, localtime > /usr/share/zoneinfo/Europe/Paris",
    # The latest is older than the system: one boot switches to it, the next rejects it.
    "system 2022z, live 2021b.1.0, latest 2022a.1.0, needs_cleanup /, localtime /",
    "zoneinfo > x, icutz > x, tz_latest > /elsewhere",
]
OWN = [STATE + name for name in ("zoneinfo", "icutz", "localtime", "needs_cleanup")]
OWN += [STATE + "TZVersionDiffRecord", "/var/db/icutz", "/var/db/icu"]
# Calls that get a fault, and the call after which they begin. Of a run: all whose failure the
# program can see. Of a command: those that change the disk.
OF_THE_RUN = r"(?!brk|exit_group)", "rt_sigaction(SIGPIPE"
CHANGES_DISK = r"mkdir|rename|symlink|link|unlink|copy_file|write|f?chmod|sync|.*O_CREAT", "execve("
TRACE = Path("build/trace").absolute()
TOOLS = TRACE.with_name("tools")


def calls(trace, wanted):
    """Returns the wanted system calls of a trace, each with the option that injects a fault."""
    counts, started, found = Counter(), False, []
    for line in re.findall(r"^\w+\(.* = .*", trace, re.MULTILINE):
        name = line.partition("(")[0]
        counts[name] += 1
        if started and re.match(wanted[0], line):
            found.append((line, f"-einject={name}:when={counts[name]}:"))
        started = started or line.startswith(wanted[1])
    assert found
    return found


def traced_run(*options):
    """Returns the exit status and the trace of a run."""
    status, _ = run(["strace", f"-o{TRACE}", *options, *BINARIES["release"]])
    return status, TRACE.read_text()


def others(disk):
    """Returns what no run may change."""
    return {path: value for path, value in disk.items() if path not in OWN}


def check_recovery(before):
    """Asserts that three more boots settle the links: one may switch, the next reject that."""
    for _ in range(3):
        run()
    after = read_disk()
    zoneinfo, localtime = (os.readlink(STATE + name) for name in ("zoneinfo", "localtime"))
    assert os.path.isfile(zoneinfo + "/Europe/Paris")
    assert localtime in [f"{STATE}zoneinfo/{z}" for z in ("Europe/Paris", "America/Los_Angeles")]
    # It may be missing, or that of what was live before: no run touches the links of what it keeps.
    icu = [None, f"> {os.path.dirname(zoneinfo)}/icutz"]
    icu += [before.get(STATE + "icutz"), before.get("/var/db/icutz")]
    assert after.get(STATE + "icutz") in icu
    assert STATE + "needs_cleanup" not in after and others(after) == others(before)
    run()
    assert read_disk() == after, "one more boot changes something"


@pytest.mark.parametrize("situation", SITUATIONS)
@pytest.mark.parametrize("fault", ["error=EIO", "signal=KILL"])
def test_fault(situation, fault):
    stage(situation)
    before = read_disk()
    for call, injection in calls(traced_run()[1], OF_THE_RUN):
        print(fault, "at", call)  # The last of these lines is the call that a failure is about.
        stage(situation)
        status, trace = traced_run(injection + fault)
        assert status == -9 if fault == "signal=KILL" else "(INJECTED)" in trace
        assert status != 0 or all(os.path.islink(path) for path in (OWN[0], OWN[2]))
        assert others(read_disk()) == others(before)
        check_recovery(before)


# The commands by which the installer changes the disk, with the end of the arguments.
COMMANDS = ["rm new", "ln new", "mkdir partial", "cp partial", "chmod partial", "sync partial"]
COMMANDS += ["mv 2022a.1.0", "mv tz_latest", "sync timezone"]
# Takes the place of such a command, which is traced, and takes the installer with it if killed.
TRACED = """#!/bin/sh
if [ "${*%$CUT}" != "$*" ] && [ ! -e "$TRACE" ]
then strace -o "$TRACE" $INJECT /bin/${0##*/} "$@" || kill -9 $PPID
else exec /bin/${0##*/} "$@"
fi"""


def install(cut="never", injection=""):
    """Installs an update with the sample program. Returns its exit status."""
    TRACE.unlink(missing_ok=True)
    variables = [f"PATH={TOOLS}:/bin", f"TRACE={TRACE}", f"INJECT={injection}", f"CUT={cut}"]
    return run(["env", *variables, "examples/install-dataset", "/var/new/2022a.1.0"])[0]


@pytest.mark.parametrize("command", COMMANDS)
def test_installation_that_is_cut_short(command):
    situation = "live 2021b.1.0, latest 2021b.1.0, tz/.partial/x =, dataset ../../../new/2022a.1.0"
    name, cut = command.split(" ")
    create(TOOLS, "/")
    create(TOOLS / name, "=", TRACED)
    create(TOOLS / name, "mode", "755")
    stage(situation)
    assert install(cut) == 0 and run() == (0, [])
    run()
    installed = read_disk()
    for call, injection in calls(TRACE.read_text(), CHANGES_DISK):
        print("killed at", call)
        stage(situation)
        assert install(cut, injection + "signal=KILL") == -9
        assert run()[0] == 0
        whole = [f"{STATE}{link}/Europe/Paris" for link in ("zoneinfo", "tz_latest/zoneinfo")]
        assert all(map(os.path.isfile, whole))
        assert install() == 0
        run()
        run()
        assert read_disk() == installed
