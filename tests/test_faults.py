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
    # The latest dataset is older than the system's: one boot switches to it, the next one rejects it.
    "system 2022z, dataset 2021b.1.0, live 2021b.1.0, dataset 2022a.1.0, latest 2022a.1.0": 3,
}
FAULTS = {
    "fails once": "error=EIO:when={}",
    "fails from there on": "error=EIO:when={}+",
    "finds nothing once": "error=ENOENT:when={}",
    "finds nothing from there on": "error=ENOENT:when={}+",
    "kills": "signal=KILL:when={}",
}
ZONES = [f"> {STATE}zoneinfo/{zone}" for zone in ("Europe/Paris", "America/Los_Angeles")]
OWN = [STATE + name for name in ("zoneinfo", "icutz", "localtime", "needs_cleanup")]
OWN += [STATE + "TZVersionDiffRecord", "/var/db/icutz", "/var/db/icu"]

CANNOT_FAIL = ["brk", "exit_group", "futex"]  # with an errno value

Call = namedtuple("Call", "name text count warning")


def traced_run(*injection, command=harness.RELEASE):
    with tempfile.TemporaryFile("w+") as trace:
        traced = ["strace", "-s4096", "-o/dev/stdout", *injection, *command]
        outcome = harness.run(traced, stdout=trace)
        trace.seek(0)
        return outcome, trace.read()


def warning_of(text, after_marker):
    """Returns the warning that this call leads to when it fails, without the text of errno."""
    strings = re.findall(r'"([^"]*)"', text)
    if "needs_cleanup" in text and text.startswith("open") or after_marker:
        return f"Cannot touch file {STATE}needs_cleanup"
    if text.startswith("symlink"):
        return f"create_symlink: from {strings[1]} to {strings[0]}"
    if text.startswith("readlink"):
        return f"read_symlink: {strings[0]}"
    if text.startswith("unlink") and strings[0].endswith(("zoneinfo", "icutz")):
        return f"remove: could not remove {strings[0]}"
    return ""


def calls_of_a_run():
    """Returns the calls of the program itself, each with its count among all of its name."""
    texts = [text for text in traced_run()[1].split("\n") if re.match(r"\w+\(.* = ", text)]
    # The C library's start comes first; the first call of main makes the process ignore SIGPIPE.
    start = [text.startswith("rt_sigaction(SIGPIPE") for text in texts].index(True)
    counts, calls = Counter(), []
    for position, text in enumerate(texts):
        name = text.partition("(")[0]
        counts[name] += 1
        marker = any(
            "needs_cleanup" in t and t.startswith("open") for t in texts[position - 2 : position]
        )
        if position >= start and name not in CANNOT_FAIL:
            calls.append(Call(name, text, counts[name], warning_of(text, marker)))
    assert len(calls) > 20
    return calls


def untouchable(disk):
    """Returns what no run may change."""
    return {path: value for path, value in disk.items() if path not in OWN}


def expected_status(warnings):
    """Status 1 stands for a zoneinfo link of the fallback, or a local time link, that was not created."""
    fallback = [w.startswith("Unable to locate data") for w in warnings]
    after = warnings[fallback.index(True) :] if True in fallback else []
    zoneinfo = f"create_symlink: from {STATE}zoneinfo to {SYSTEM}: "
    localtime = f"create_symlink: from {STATE}localtime to {ZONES[1][2:]}: "
    return int(
        any(w.startswith(zoneinfo) for w in after) or any(w.startswith(localtime) for w in warnings)
    )


def check_failure(call, outcome, error):
    tolerated = error == os.strerror(2) and not call.name.startswith(("symlink", "open"))
    if call.warning and not tolerated:
        assert f"{call.warning}: {error}" in outcome.warnings
    assert outcome.status == expected_status(outcome.warnings)
    assert outcome.status == 1 or all(
        os.path.islink(STATE + name) for name in ("zoneinfo", "localtime")
    )


def check_recovery(before, boots):
    """Boots until all is settled. Returns whether the ICU link is left at what was live before."""
    for _ in range(boots):
        harness.run()
    settled = harness.read_disk()
    zoneinfo, icu = settled[STATE + "zoneinfo"], settled.get(STATE + "icutz")
    assert zoneinfo == f"> {SYSTEM}" or (
        zoneinfo.startswith(f"> {STATE}tz/") and os.path.isdir(zoneinfo[2:])
    )
    assert settled[STATE + "localtime"] in ZONES
    assert STATE + "needs_cleanup" not in settled
    assert untouchable(settled) == untouchable(before)
    harness.run()
    assert harness.read_disk() == settled, "one more boot changes something"
    left_behind = icu not in (None, zoneinfo.replace("/zoneinfo", "/icutz"))
    assert not left_behind or icu == before[STATE + "icutz"]
    return left_behind


def check_fault(situation, fault, call):
    harness.stage(situation)
    before = harness.read_disk()
    outcome, trace = traced_run("-e", f"inject={call.name}:{FAULTS[fault].format(call.count)}")
    assert untouchable(harness.read_disk()) == untouchable(before)
    if fault == "kills":
        assert outcome.status == -9
    else:
        assert "(INJECTED)" in trace
        check_failure(call, outcome, os.strerror(2 if "nothing" in fault else 5))
    # No run touches the links of a dataset that it keeps, so the next boots do not repair this.
    if check_recovery(before, SITUATIONS[situation]):
        assert call.name.startswith("unlink")
        assert fault != "kills" or f'"{STATE}icutz"' in call.text


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
