"""Lets each system call of a run fail, or kills the program before it, and boots again."""

import os
import re
from collections import Counter
from pathlib import Path

import pytest

from test_boots import RELEASE, STATE, create, read_disk, run, stage

# Together they reach every call that a run can make.
SITUATIONS = [
    "zoneinfo > @2021b.1.0/zoneinfo, /var/db/icutz > @2021b.1.0/icutz, dataset 2021b.1.0, "
    "latest 2022a.1.0, marker, /var/db/icu /, localtime > /usr/share/zoneinfo/Europe/Paris",
    # The latest is older than the system: one boot switches to it, the next rejects it.
    "system 2022z, live 2021b.1.0, latest 2022a.1.0, needs_cleanup /, localtime /",
    "zoneinfo > x, icutz > x, tz_latest > /elsewhere",
]
OWN = [STATE + name for name in ("zoneinfo", "icutz", "localtime", "needs_cleanup", "TZVersionDiffRecord")]
OWN += ["/var/db/icutz", "/var/db/icu"]
# All calls whose failure the program can see, and the call after which they begin.
OF_THE_RUN = r"(?!brk|exit_group)", "rt_sigaction(SIGPIPE"
TRACE = Path("build/trace").absolute()


def calls(trace, wanted):
    """Returns system calls of a trace, each with the option that injects a fault."""
    # The calls match the first of the wanted patterns, and come after the call that begins with the second.
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
    status, _ = run(["strace", f"-o{TRACE}", *options, *RELEASE])
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
    # icutz may be missing or as before: no run touches the links of a dataset that it keeps.
    kept = [None, before.get(STATE + "icutz"), before.get("/var/db/icutz")]
    assert after.get(STATE + "icutz") in [*kept, f"> {os.path.dirname(zoneinfo)}/icutz"]
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
