"""Stages each situation of boots.txt, boots, and compares all that the boot leaves behind."""

import difflib
import os
import re
import shutil
import subprocess
from pathlib import Path

import pytest

STATE = "/var/db/timezone/"
TZ = f"{STATE}tz/"
RELEASE = os.environ.get("TZRECONCILE", "build/release/tzreconcile").split()
BINARIES = {"release": RELEASE, "sanitized": ["build/dev/tzreconcile"]}
IN_2041 = 2240611200  # Seconds that do not fit into 32 bits.
ZONES = "{0}/Europe/Paris = TZif, {0}/America/Los_Angeles = TZif, "
SYSTEM = ZONES.format("/usr/share/zoneinfo.default") + "/usr/share/zoneinfo.default/+VERSION"
DATASET = ZONES.format("tz/{0}/zoneinfo") + "tz/{0}/icutz/icutz{1}.dat ="
SHORT = {
    "system": f"{SYSTEM} = {{0}}\\n, /usr/share/icu/icutzformat.txt = {{1}}\\n",
    "dataset": DATASET,
    "live": f"{DATASET}, zoneinfo > @{{0}}/zoneinfo, icutz > @{{0}}/icutz",
    "live system": "zoneinfo > /usr/share/zoneinfo.default, icutz -",
    "latest": f"{DATASET}, tz_latest > @{{0}}",
    "new": DATASET.replace("tz/{0}", "new/{0}"),
    "classic": "/usr/share/zoneinfo > /var/db/timezone/zoneinfo, /etc/localtime > /usr/share/zoneinfo/Europe/Paris",
    "marker": "needs_cleanup =",
    "record": "TZVersionDiffRecord = {0}",
    "localtime reset": "localtime > /var/db/timezone/zoneinfo/America/Los_Angeles",
}
DEFAULT = "system 2021a, live system, localtime > /var/db/timezone/zoneinfo/Europe/Paris"

if "tzreconcile-sandbox /usr/share " not in Path("/proc/self/mounts").read_text():
    raise SystemExit("run scripts/test: outside its sandbox this would clear /var")
os.umask(0o022)


def in_full(statement):
    """Returns the statements on paths that a statement stands for."""
    name, *words = statement.split(" ")
    full = SHORT.get(statement) or SHORT.get(name)
    return full.format(*words, "44l").split(", ") if full else [statement]


def create(path, kind="", text=""):
    """Replaces what is at the path with what the statement says."""
    if kind == "mode":
        path.chmod(int(text, 8))
        return
    if path.is_dir() and not path.is_symlink():
        shutil.rmtree(path)
    path.unlink(missing_ok=True)
    path.parent.mkdir(parents=True, exist_ok=True)
    match kind:
        case ">":
            path.symlink_to(text.replace("@", TZ))
        case "=":
            path.write_bytes(text.encode().decode("unicode_escape").encode("latin-1"))
            os.utime(path, (IN_2041, IN_2041))
        case "/":
            path.mkdir()
        case "fifo":
            os.mkfifo(path)
        case _:
            assert kind == "-", f"no such statement: {path} {kind} {text}"


def stage(situation):
    for path in [*Path("/var").iterdir(), *Path("/usr/share").iterdir(), *Path("/etc").glob("localtime*")]:
        create(path, "-")
    for statement in f"tz /, {DEFAULT}, {situation}".split(", "):
        for full in filter(None, in_full(statement)):
            path, *rest = full.split(" ", 2)
            create(Path(STATE, path.encode().decode("unicode_escape")), *rest)


def read_disk():
    """Returns what is below /var and /usr/share, and the local time, by path, in the notation of boots.txt."""
    disk = {}
    for path in [*Path("/var").rglob("*"), *Path("/usr/share").rglob("*"), *Path("/etc").glob("localtime*")]:
        if path.is_symlink():
            disk[str(path)] = f"> {os.readlink(path)}"
        elif path.is_file():
            disk[str(path)] = f"= {path.read_text('latin-1')}"
        else:
            disk[str(path)] = "/" if path.is_dir() else "fifo"
        if (mode := path.lstat().st_mode & 0o7777) not in (0o644, 0o755, 0o777):
            disk[str(path)] += f" mode {mode:o}"
        disk[str(path)] += " of another user" * (path.lstat().st_uid != 0)
    return disk


def compare(expected, seen):
    """Fails with the lines that differ. What is compared has names with values, which may be several lines."""

    def lines(values):
        return "\n".join(f"{name} {value}" for name, value in sorted(values.items())).split("\n")

    differs = [ascii(line)[1:-1] for line in difflib.ndiff(lines(expected), lines(seen)) if line[0] in "-+"]
    if differs:
        pytest.fail("\n".join(differs), pytrace=False)


def run(command=RELEASE):
    """Runs the program, or a command that ends in it. Returns exit status and lines of output."""
    result = subprocess.run(command, capture_output=True, encoding="latin-1", timeout=10)
    return result.returncode, (result.stdout + result.stderr).splitlines()


def read_paragraphs(path):
    """Yields name, situation, changes, texts, exit status and script of each case in a file."""
    text = re.sub(r"^#.*\n", "", Path(path).read_text(), flags=re.MULTILINE)
    for paragraph in re.split(r"\n+(?! )", re.sub(r"\n {3,}", " ", text).strip()):
        first, *lines = paragraph.split("\n  ")
        first, *texts = first.split(" ! ")
        rows = {"!": texts, "run": [], "|": []}
        for line in lines:
            kind, _, rest = line.partition(" ")
            rows[kind] += rest.split(f" {kind} ")
        for case in rows["|"] or ["*"]:
            name, colon, situation = first.partition(":")
            assert colon, f"no colon after the name: {first}"
            situation, _, changes = situation.replace("*", case).partition("-> ")
            texts = [text.replace("*", case).replace("@", TZ) for text in rows["!"] if text != "exit 1"]
            name += f": {case}" if rows["|"] else ""
            script = "".join(rows["run"]).replace("*", case)
            yield name, situation.strip(), changes, texts, int("exit 1" in rows["!"]), script


def read_boots():
    """Yields situation, changes, warnings, exit status and command of each boot."""
    for name, *boot, texts, status, script in read_paragraphs("tests/boots.txt"):
        warnings = [f"tzreconcile: {text}" for text in texts]
        for label, command in ({"script": ["bash", "-c", script, *RELEASE]} if script else BINARIES).items():
            yield pytest.param(*boot, warnings, status, command, id=f"{name}-{label}")


@pytest.mark.parametrize("situation, changes, warnings, status, command", read_boots())
def test_boot(situation, changes, warnings, status, command):
    stage(f"{situation}, {changes}")
    expected = {"exit": status, "!": "\n! ".join(warnings)} | read_disk()
    stage(situation)
    os.utime(STATE, (0, 0))
    status, texts = run(command)
    texts = warnings if texts and warnings == ["tzreconcile: any"] else texts
    seen = [begin if text.startswith(begin) else text for text, begin in zip(texts, warnings + texts)]
    compare(expected, {"exit": status, "!": "\n! ".join(seen)} | read_disk())
    if not changes and not texts:
        assert os.stat(STATE).st_mtime == 0, "a quiet boot has written to the state directory"
