"""Runs every boot of boots.txt."""

import re
from pathlib import Path

import pytest

import harness


def read_boots():
    """Returns the situation of each boot and the lines on its outcome, by name."""
    boots = {}
    text = Path(__file__).with_name("boots.txt").read_text(encoding="utf-8")
    text = re.sub(r"^#.*\n", "", text, flags=re.MULTILINE)
    for paragraph in re.split(r"\n\s*\n", re.sub(r"\n {3,}", " ", text).strip()):
        first, *lines = paragraph.split("\n  ")
        name, _, situation = first.partition(": ")
        cases = [line[1:].strip(" ") for line in lines if line.startswith("|")]
        for case in cases or ["*"]:
            full_name = f"{name}: {case}" if cases else name
            assert full_name not in boots, f"two boots in boots.txt have the name {full_name}"
            outcome = [line.replace("*", case) for line in lines if not line.startswith("|")]
            boots[full_name] = situation.replace("*", case), outcome
    return boots


BINARIES = {"release": harness.RELEASE, "sanitized": harness.SANITIZED}
BOOTS = read_boots()


@pytest.mark.parametrize("binary", BINARIES)
@pytest.mark.parametrize("name", BOOTS)
def test_boot(name, binary):
    situation, lines = BOOTS[name]
    rows = {"->": [], "!": [], "exit": ["0"]}
    for line in lines:
        kind, _, rest = line.partition(" ")
        assert kind in rows, f"no such line: {line}"
        rows[kind].append(rest)
    changes, status = ", ".join(rows["->"]), int(rows["exit"][-1])
    harness.check_boot(situation, changes, rows["!"], status, BINARIES[binary])
