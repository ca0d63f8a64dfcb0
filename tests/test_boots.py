"""Runs every boot of boots.txt."""

from pathlib import Path

import pytest

import harness


def read_boots():
    """Yields the name and the situation of each boot, and the lines on its outcome."""
    text = Path(__file__).with_name("boots.txt").read_text(encoding="utf-8")
    text = "\n".join(line for line in text.split("\n") if not line.startswith("#"))
    for paragraph in filter(None, text.replace("\n      ", " ").strip().split("\n\n")):
        first, *lines = paragraph.strip().split("\n  ")
        name, _, situation = first.partition(": ")
        cases = [line[1:].strip(" ") for line in lines if line.startswith("|")]
        for case in cases or ["*"]:
            outcome = [line.replace("*", case) for line in lines if not line.startswith("|")]
            yield f"{name}: {case}" if cases else name, situation.replace("*", case), outcome


BINARIES = {"release": harness.RELEASE, "sanitized": harness.SANITIZED}
BOOTS = {name: boot for name, *boot in read_boots()}


@pytest.mark.parametrize("binary", BINARIES)
@pytest.mark.parametrize("name", BOOTS)
def test_boot(name, binary):
    situation, lines = BOOTS[name]
    rows = {"->": [], "!": [], "exit": ["0"]}
    for line in lines:
        kind, _, rest = line.partition(" ")
        rows[kind].append(rest)
    changes, status = ", ".join(rows["->"]), int(rows["exit"][-1])
    harness.check_boot(situation, changes, rows["!"], status, BINARIES[binary])
