"""Runs every boot of boots.txt."""

from pathlib import Path

import pytest

import harness


def read_boots():
    """Yields the name of each boot and its lines, without their indentation."""
    text = Path(__file__).with_name("boots.txt").read_text(encoding="utf-8")
    text = "\n".join(line for line in text.split("\n") if not line.startswith("#"))
    for paragraph in text.replace("\n      ", " ").split("\n\n"):
        name, *lines = paragraph.strip().split("\n  ")
        cases = [line[1:].removeprefix(" ") for line in lines if line.startswith("|")]
        lines = [line for line in lines if not line.startswith("|")]
        for case in cases or ["*"]:
            yield f"{name}: {case}" if cases else name, [line.replace("*", case) for line in lines]


BINARIES = {"release": harness.RELEASE, "sanitized": harness.SANITIZED}
BOOTS = {name: lines for name, lines in read_boots() if name}


@pytest.mark.parametrize("binary", BINARIES)
@pytest.mark.parametrize("name", BOOTS)
def test_boot(name, binary):
    rows = {"": [], "->": [], "!": [], "exit": ["0"]}
    for line in BOOTS[name]:
        kind, _, rest = line.partition(" ")
        kind, rest = (kind, rest) if kind in rows else ("", line)
        rows[kind].append(rest)
    changes = ", ".join(rows["->"])

    harness.stage(", ".join(rows[""]))
    before, stamps = harness.read_disk(), harness.read_stamps()
    outcome = harness.run(BINARIES[binary])
    harness.check(outcome, before, changes, rows["!"], int(rows["exit"][-1]))
    assert changes or rows["!"] or harness.read_stamps() == stamps, "the boot has written"
