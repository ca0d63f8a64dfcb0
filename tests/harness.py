"""Stages a situation, runs the program once as a boot does, and compares what it leaves on disk.

boots.txt explains the notation.
"""

import os
import shutil
import stat
import subprocess
from collections import namedtuple

DEFAULT = "system 2021a, live system, localtime > /var/db/timezone/zoneinfo/Europe/Paris"
STATE = "/var/db/timezone/"
SYSTEM = "/usr/share/zoneinfo.default"
ICU_FORMAT = "/usr/share/icu/icutzformat.txt"
COVERED = ["/var", "/usr/share"]
RELEASE = os.environ.get("TZRECONCILE", "build/release/tzreconcile").split()
SANITIZED = ["build/dev/tzreconcile"]
IN_2041 = 2240611200  # Seconds that do not fit into 32 bits.
ERRORS = {os.strerror(number) for number in range(134)}

Outcome = namedtuple("Outcome", "status warnings")

with open("/proc/self/mounts") as file:
    mounts = file.read()
    if not all(f"tzreconcile-sandbox {path} " in mounts for path in COVERED):
        raise SystemExit("run scripts/test: outside tests/sandbox this would clear /var")
os.umask(0o022)


def in_full(statement):
    """Returns the statements on paths that a statement stands for."""
    match statement.split():
        case ["system", version, *schema]:
            words = {f"{SYSTEM}/+VERSION": version, ICU_FORMAT: (*schema, "44l")[0]}
            files = [f"- {f}" if word == "-" else f"{f} = {word}\\n" for f, word in words.items()]
            return [*zones(SYSTEM), "/usr/share/icu /", *files]
        case ["dataset", version, *schema]:
            file = "" if schema == ["-"] else f"icutz{(*schema, '44l')[0]}.dat ="
            return [
                *zones(f"tz/{version}/zoneinfo"),
                f"tz/{version}/icutz/{file}" if file else f"tz/{version}/icutz /",
            ]
        case ["live", "system"]:
            return [f"zoneinfo > {SYSTEM}", "- icutz"]
        case ["live", version]:
            return [f"zoneinfo > @{version}/zoneinfo", f"icutz > @{version}/icutz"]
        case ["latest", version]:
            return [f"tz_latest > @{version}"]
        case ["marker"]:
            return ["needs_cleanup ="]
        case ["record", *_]:
            return [f"TZVersionDiffRecord ={statement[6:]}"]
    return [statement]


def zones(directory):
    return [f"{directory}/{zone} = TZif" for zone in ("Europe/Paris", "America/Los_Angeles")]


def entries(statements):
    """Yields path, kind and text of each statement; the kind of nothing at the path is empty."""
    for statement in (full for short in statements.split(", ") for full in in_full(short) if full):
        path, _, value = statement.partition(" ")
        kind, _, text = value.partition(" ")
        if path == "-":
            path, kind, text = value, "", ""
        elif kind not in ("/", "=", ">", "fifo", "mode"):
            raise ValueError(f"no such statement: {statement}")
        text = f"{STATE}tz/{text[1:]}" if text.startswith("@") else text
        yield os.path.normpath(os.path.join(STATE, path)), kind, text


def remove(path):
    if os.path.isdir(path) and not os.path.islink(path):
        shutil.rmtree(path)
    elif os.path.lexists(path):
        os.unlink(path)


def create(path, kind, text):
    if kind == "mode":
        os.chmod(path, int(text, 8))
        return
    remove(path)
    if kind:
        os.makedirs(path if kind == "/" else os.path.dirname(path), exist_ok=True)
    if kind == ">":
        os.symlink(text, path)
    elif kind == "fifo":
        os.mkfifo(path)
    elif kind == "=":
        with open(path, "wb") as file:
            file.write(text.encode().decode("unicode_escape").encode("latin-1"))
        os.utime(path, (IN_2041, IN_2041))


def stage(situation):
    for covered in COVERED:
        for name in os.listdir(covered):
            remove(os.path.join(covered, name))
    os.makedirs(STATE + "tz")
    for entry in entries(f"{DEFAULT}, {situation}"):
        create(*entry)


def read_disk():
    """Returns all below /var and /usr/share: path to "> TARGET", "= TEXT", "/" or "fifo"."""
    disk = {}
    for covered in COVERED:
        for directory, directories, files in os.walk(covered):
            for path in (os.path.join(directory, name) for name in directories + files):
                mode = os.lstat(path).st_mode
                if stat.S_ISLNK(mode):
                    disk[path] = f"> {os.readlink(path)}"
                elif stat.S_ISREG(mode):
                    with open(path, encoding="latin-1") as file:
                        disk[path] = f"= {file.read()}"
                else:
                    disk[path] = "/" if stat.S_ISDIR(mode) else "fifo"
    return disk


def run(command=RELEASE, **options):
    """Runs the program, or a command that ends in it. The options are subprocess.run's."""
    defaults = {"stdin": subprocess.DEVNULL, "stderr": subprocess.PIPE, "timeout": 10}
    result = subprocess.run(command, **defaults | options)
    # A line that does not begin with the program's name belongs to the warning before it.
    text = "\n" + (result.stderr or b"").decode("latin-1")
    parts = [part.removesuffix("\n") for part in text.split("\ntzreconcile: ")]
    return Outcome(result.returncode, [part for part in parts if part])


def is_warning(seen, expected):
    """Returns whether this is the expected warning, which may leave out the text of errno."""
    text, _, error = seen.rpartition(": ")
    return error in ERRORS and expected in (seen, text)


def check_boot(situation, changes, warnings=None, status=0, command=RELEASE):
    """Fails with what was expected and what was seen, unless a boot does as it should.

    Nothing but the changes is to differ from the situation; without warnings, any will do.
    """
    stage(f"{situation}, {changes}")
    expected = read_disk() | {"status": status, "warnings": warnings}
    stage(situation)
    os.utime(STATE, (0, 0))
    outcome = run(command)
    quiet = not changes and not outcome.warnings
    assert not quiet or os.stat(STATE).st_mtime == 0, "a quiet boot has written"
    seen = read_disk() | outcome._asdict()
    pairs = zip(outcome.warnings, warnings or outcome.warnings, strict=False)
    if (
        warnings is None
        or len(outcome.warnings) == len(warnings)
        and all(is_warning(*p) for p in pairs)
    ):
        expected["warnings"] = outcome.warnings
    differing = sorted(key for key in expected | seen if expected.get(key) != seen.get(key))
    report = [
        f"{k}\n  expected: {expected.get(k, 'nothing')}\n  seen:     {seen.get(k, 'nothing')}"
        for k in differing
    ]
    assert not differing, "\n" + "\n".join(report)
