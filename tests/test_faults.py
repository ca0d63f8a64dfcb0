"""Lets each system call of a run fail, or kills the program before it, and boots again."""

import os
import re
from collections import Counter
from pathlib import Path

import pytest

from test_boots import BINARIES, STATE, read_disk, run, stage

# Together they reach every call that a run can make.
SITUATIONS = [
    "zoneinfo > @2021b.1.0/zoneinfo, /var/db/icutz > @2021b.1.0/icutz, dataset 2021b.1.0, "
    "latest 2022a.1.0, marker, /var/db/icu =, localtime > /usr/share/zoneinfo/Europe/Paris",
    "system 2022a, live 2021b.1.0, tz_latest > /elsewhere, localtime =",
    "zoneinfo > x, icutz > x, latest 2021b.1.0",
]
OWN = [STATE + name for name in ("zoneinfo", "icutz", "localtime", "needs_cleanup")]
OWN += [STATE + "TZVersionDiffRecord", "/var/db/icutz", "/var/db/icu"]
NEVER_FAIL = ["brk", "exit_group", "futex"]  # None of them fails by an errno value.


def traced_run(*options):
    """Returns the exit status and the trace of a run."""
    status, _ = run(["strace", "-o", "build/trace", *options, *BINARIES["release"]])
    return status, Path("build/trace").read_text()


def calls_of_a_run():
    """Yields each system call of the program itself, and how to let strace inject a fault into it."""
    counts, started = Counter(), False
    for line in re.findall(r"^\w+\(.* = .*", traced_run()[1], re.MULTILINE):
        name = line.partition("(")[0]
        counts[name] += 1
        if started and name not in NEVER_FAIL:
            yield line, f"-einject={name}:when={counts[name]}:"
        # The C library's start comes first; the first call of main makes the process ignore SIGPIPE.
        started = started or line.startswith("rt_sigaction(SIGPIPE")


def others(disk):
    """Returns what no run may change."""
    return {path: value for path, value in disk.items() if path not in OWN}


def check_recovery(before):
    """Asserts that two more boots settle the links."""
    run()
    run()
    after = read_disk()
    zoneinfo, localtime = (os.readlink(STATE + name) for name in ("zoneinfo", "localtime"))
    assert os.path.isfile(zoneinfo + "/Europe/Paris")
    assert localtime in [f"{STATE}zoneinfo/{z}" for z in ("Europe/Paris", "America/Los_Angeles")]
    # The ICU link of what was live before may stay: no run touches the links of what it keeps.
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
    problems = []
    for call, injection in list(calls_of_a_run()):
        stage(situation)
        status, trace = traced_run(injection + fault)
        try:
            assert status == -9 if fault == "signal=KILL" else "(INJECTED)" in trace
            assert status != 0 or all(os.path.islink(path) for path in (OWN[0], OWN[2]))
            assert others(read_disk()) == others(before)
            check_recovery(before)
        except (AssertionError, OSError) as problem:
            problems.append(f"{fault} at {call}\n{problem}")
    assert not problems, "\n" + "\n\n".join(problems)
