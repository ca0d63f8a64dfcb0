"""Stages a situation, starts the program once as a boot does, and compares what it left on disk.

A situation is a list of statements, separated by ", ". Their paths are relative to /var/db/timezone:
  system VERSION [SCHEMA]    the system partition's data; "-" leaves the version or the schema out
  dataset VERSION [SCHEMA]   an installed dataset; "-" leaves the ICU data file out
  live system                the zoneinfo link points to the system partition, no icutz link
  live VERSION               both links point to the dataset
  latest VERSION             tz_latest points to the dataset
  marker                     an empty needs_cleanup
  record TEXT                TZVersionDiffRecord holds the text
  PATH > TARGET              a link; "@" at the front of a target stands for /var/db/timezone/tz/
  PATH = TEXT                a file; a backslash escape, such as \\n, \\0 or \\xff, stands for a byte
  PATH /                     a directory
  PATH mode MODE             the permissions of what is there, in octal digits
  - PATH                     nothing at the path
A schema that is not given is 44l. Each situation begins as DEFAULT.
"""

import os
import shutil
import stat
import subprocess
from collections import namedtuple

DEFAULT = "system 2021a, live system, localtime > /var/db/timezone/zoneinfo/Europe/Paris"
STATE = "/var/db/timezone/"
SYSTEM = "/usr/share/zoneinfo.default"
COVERED = ["/var", "/usr/share"]
RELEASE = os.environ.get("TZRECONCILE", "build/release/tzreconcile").split()
SANITIZED = ["build/dev/tzreconcile"]
ERRORS = {os.strerror(number) for number in range(134)}

Outcome = namedtuple("Outcome", "status warnings")

with open("/proc/self/mounts") as file:
    mounts = file.read()
    if not all(f"tzreconcile-sandbox {path} " in mounts for path in COVERED):
        raise SystemExit("run scripts/test: outside tests/sandbox this would clear /var")
os.umask(0o022)


def zones(directory):
    return [f"{directory}/{zone} = TZif" for zone in ("Europe/Paris", "America/Los_Angeles")]


def word_file(path, word):
    return f"- {path}" if word == "-" else f"{path} = {word}\\n"


def in_full(statement):
    """Returns the statements on paths that a shorter one stands for."""
    match statement.split():
        case ["system", version, *schema]:
            icu = word_file("/usr/share/icu/icutzformat.txt", *schema or ["44l"])
            return [
                *zones(SYSTEM),
                "/usr/share/icu /",
                word_file(f"{SYSTEM}/+VERSION", version),
                icu,
            ]
        case ["dataset", version, *schema]:
            icu = [f"icutz{name}.dat =" for name in schema or ["44l"] if name != "-"]
            return [*zones(f"tz/{version}/zoneinfo"), f"tz/{version}/icutz /"] + [
                f"tz/{version}/icutz/{file}" for file in icu
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
            return [statement.replace("record", "TZVersionDiffRecord =", 1)]
    return [statement]


def entries(statements):
    """Yields the path and the value of each statement, without the value for nothing at a path."""
    for statement in (full for short in statements.split(", ") for full in in_full(short) if full):
        path, _, value = statement.partition(" ")
        if path == "-":
            path, value = value, ""
        elif value[:1] not in ("=", ">", "/") and not value.startswith("mode "):
            raise ValueError(f"no such statement: {statement}")
        value = value.replace("> @", f"> {STATE}tz/")
        yield os.path.normpath(os.path.join(STATE, path)), "= " if value == "=" else value


def is_directory(path):
    return os.path.isdir(path) and not os.path.islink(path)


def remove(path):
    if is_directory(path):
        shutil.rmtree(path)
    elif os.path.lexists(path):
        os.unlink(path)


def create(path, kind, text):
    if kind == "mode":
        os.chmod(path, int(text, 8))
        return
    if kind != "/" or not is_directory(path):
        remove(path)
    os.makedirs(path if kind == "/" else os.path.dirname(path), exist_ok=True)
    if kind == ">":
        os.symlink(text, path)
    elif kind == "=":
        with open(path, "wb") as file:
            file.write(text.encode().decode("unicode_escape").encode("latin-1"))


def stage(situation):
    for covered in COVERED:
        for name in os.listdir(covered):
            remove(os.path.join(covered, name))
    os.makedirs(STATE + "tz")
    for path, value in entries(f"{DEFAULT}, {situation}"):
        if value:
            kind, _, text = value.partition(" ")
            create(path, kind, text)
        else:
            remove(path)


def read_disk():
    """Returns all that is below /var and /usr/share: path to "> TARGET", "= TEXT" or "/"."""
    disk = {}
    for path in paths():
        mode = os.lstat(path).st_mode
        if stat.S_ISLNK(mode):
            disk[path] = f"> {os.readlink(path)}"
        elif stat.S_ISREG(mode):
            with open(path, encoding="latin-1") as file:
                disk[path] = f"= {file.read()}"
        else:
            disk[path] = "/"
    return disk


def paths():
    for covered in COVERED:
        for directory, directories, files in os.walk(covered):
            yield from (os.path.join(directory, name) for name in directories + files)


def read_stamps():
    """Returns what any write changes, even one that leaves the contents as they were."""
    stats = {path: os.lstat(path) for path in paths()}
    return {path: (s.st_ino, s.st_mtime_ns, s.st_ctime_ns) for path, s in stats.items()}


def changed(disk, statements):
    """Returns what the disk becomes when the statements are carried out."""
    return {path: value for path, value in (disk | dict(entries(statements))).items() if value}


def run(command=RELEASE, **options):
    """Runs the program, or a command that ends in it. The options are subprocess.run's."""
    defaults = {"stdin": subprocess.DEVNULL, "stderr": subprocess.PIPE, "timeout": 60}
    result = subprocess.run(command, **defaults | options)
    # A line that does not begin with the program's name belongs to the warning before it.
    text = "\n" + (result.stderr or b"").decode("latin-1")
    parts = [part.removesuffix("\n") for part in text.split("\ntzreconcile: ")]
    return Outcome(result.returncode, [part for part in parts if part])


def is_warning(seen, expected):
    """Returns whether this is the expected warning, which may leave out the text of errno."""
    text, _, error = seen.rpartition(": ")
    return error in ERRORS and expected in (seen, text)


def check(outcome, before, changes, warnings=(), status=0):
    """Fails with what was expected and what was seen, unless they are the same."""
    expected, seen = changed(before, changes), read_disk()
    problems = [
        f"{path}\n  expected: {expected.get(path, 'nothing')}\n  seen:     {seen.get(path, 'nothing')}"
        for path in sorted(expected.keys() | seen.keys())
        if expected.get(path) != seen.get(path)
    ]
    if len(outcome.warnings) != len(warnings) or not all(
        map(is_warning, outcome.warnings, warnings)
    ):
        problems += ["warnings", *(f"  expected: {w}" for w in warnings)]
        problems += [f"  seen:     {w}" for w in outcome.warnings]
    if outcome.status != status:
        problems += [f"status\n  expected: {status}\n  seen:     {outcome.status}"]
    assert not problems, "\n" + "\n".join(problems)
