"""Lets every system call of a run fail, or kills the process before it, and boots again.

One traced run of a situation lists its calls. Each of them is then made to fail, or to be the last.
"""

import os
import re
import tempfile
from collections import Counter, namedtuple

import pytest

import harness
from harness import STATE, SYSTEM

# Together they reach every branch of a run, with the number of boots until all is settled.
SITUATIONS = {
    "dataset 2021b.1.0, latest 2021b.1.0": 2,
    "dataset 2021b.1.0, live 2021b.1.0, dataset 2022a.1.0, latest 2022a.1.0": 2,
    "system 2022a, dataset 2021b.1.0, live 2021b.1.0": 2,
    "zoneinfo > x, icutz > x, dataset 2021b.1.0, latest 2021b.1.0, localtime =": 2,
    "dataset 2021b.1.0, zoneinfo > @2021b.1.0/zoneinfo, /var/db/icutz > @2021b.1.0/icutz, "
    "tz_latest > /elsewhere, marker, /var/db/icu =": 2,
    "localtime > /usr/share/zoneinfo/Europe/Paris": 2,
    "localtime > /usr/share/zoneinfo/No/Such": 2,
    # The latest dataset is older than the system's: one boot switches to it, the next rejects it.
    "system 2022z, dataset 2021b.1.0, live 2021b.1.0, dataset 2022a.1.0, latest 2022a.1.0": 3,
}
# A "+" is for all calls of the name from there on.
FAULTS = ["error=EIO", "error=EIO+", "error=ENOENT", "error=ENOENT+", "signal=KILL"]
OWN = [STATE + name for name in ("zoneinfo", "icutz", "localtime", "needs_cleanup")]
OWN += [STATE + "TZVersionDiffRecord", "/var/db/icutz", "/var/db/icu"]
ZONES = [f"{STATE}zoneinfo/{zone}" for zone in ("Europe/Paris", "America/Los_Angeles")]
NEVER_FAIL = ["brk", "exit_group", "futex"]  # None of them fails by an errno value.
WARNINGS = {
    "symlink": "create_symlink: from {1} to {0}",
    "readlink": "read_symlink: {0}",
    "unlink": "remove: could not remove {0}",
}

Call = namedtuple("Call", "name text count warning")


def traced_run(*injection, command=harness.RELEASE):
    with tempfile.TemporaryFile("w+") as trace:
        traced = ["strace", "-s4096", "-o/dev/stdout", *injection, *command]
        outcome = harness.run(traced, stdout=trace)
        trace.seek(0)
        return outcome, trace.read()


def warning_of(name, lines):
    """Returns the warning of the last of these calls if it fails, without the text of errno."""
    # The open of the marker is followed by two calls on it.
    if any('needs_cleanup", O_RDWR' in line for line in lines[-3:]):
        return f"Cannot touch file {STATE}needs_cleanup"
    strings = re.findall('"([^"]*)"', lines[-1])
    if name == "unlink" and not strings[0].endswith(("/zoneinfo", "/icutz")):
        return ""  # Removed without a word.
    return WARNINGS.get(name, "").format(*strings)


def calls_of_a_run():
    """Returns the calls of the program itself, each with its count among all of its name."""
    lines = [line for line in traced_run()[1].split("\n") if re.match(r"\w+\(.* = ", line)]
    # The C library's start comes first; the first call of main makes the process ignore SIGPIPE.
    start = [line.startswith("rt_sigaction(SIGPIPE") for line in lines].index(True)
    counts, calls = Counter(), []
    for end, line in enumerate(lines, 1):
        name = line.partition("(")[0]
        counts[name] += 1
        if end > start and name not in NEVER_FAIL:
            calls.append(Call(name, line, counts[name], warning_of(name, lines[:end])))
    return calls


def untouchable(disk):
    """Returns what no run may change."""
    return {path: value for path, value in disk.items() if path not in OWN}


def check_failure(call, outcome, error):
    tolerated = error == os.strerror(2) and call.name in ("unlink", "readlink")
    if call.warning and not tolerated:
        assert f"{call.warning}: {error}" in outcome.warnings
    # Status 1: the zoneinfo link of the fallback or the local time link could not be created.
    text = "\n".join(outcome.warnings)
    no_zoneinfo = f"create_symlink: from {STATE}zoneinfo to {SYSTEM}: "
    no_localtime = f"create_symlink: from {STATE}localtime to {ZONES[1]}: "
    failed = no_zoneinfo in text.partition("Unable to locate data")[2] or no_localtime in text
    assert outcome.status == int(failed)
    assert failed or all(os.path.islink(STATE + name) for name in ("zoneinfo", "localtime"))


def check_recovery(before, boots):
    """Boots until all is settled. Returns whether the ICU link still points to what was live."""
    for _ in range(boots):
        harness.run()
    settled = harness.read_disk()
    zoneinfo, localtime = (os.readlink(STATE + name) for name in ("zoneinfo", "localtime"))
    assert zoneinfo == SYSTEM or zoneinfo.startswith(f"{STATE}tz/") and os.path.isdir(zoneinfo)
    assert localtime in ZONES
    assert STATE + "needs_cleanup" not in settled
    assert untouchable(settled) == untouchable(before)
    harness.run()
    assert harness.read_disk() == settled, "one more boot changes something"
    icu = settled.get(STATE + "icutz")
    left_behind = icu not in (None, "> " + zoneinfo.replace("/zoneinfo", "/icutz"))
    assert not left_behind or icu == before[STATE + "icutz"]
    return left_behind


def check_fault(situation, fault, call):
    harness.stage(situation)
    before = harness.read_disk()
    action, from_there_on = fault.removesuffix("+"), "+" if fault.endswith("+") else ""
    outcome, trace = traced_run(f"-einject={call.name}:{action}:when={call.count}{from_there_on}")
    assert untouchable(harness.read_disk()) == untouchable(before)
    if action == "signal=KILL":
        assert outcome.status == -9
    else:
        assert "(INJECTED)" in trace
        check_failure(call, outcome, os.strerror(5 if action == "error=EIO" else 2))
    # No run touches the links of a dataset that it keeps, so the next boots do not repair this.
    if check_recovery(before, SITUATIONS[situation]):
        assert call.name == "unlink"
        assert action != "signal=KILL" or f'"{STATE}icutz"' in call.text


@pytest.mark.parametrize("fault", FAULTS)
@pytest.mark.parametrize("situation", SITUATIONS)
def test_fault(situation, fault):
    harness.stage(situation)
    problems = []
    for call in calls_of_a_run():
        try:
            check_fault(situation, fault, call)
        except AssertionError as failure:
            problems.append(f"{fault}: {call.text}\n{failure}")
    assert not problems, "\n" + "\n\n".join(problems)
