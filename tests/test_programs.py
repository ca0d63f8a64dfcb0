"""Runs the programs in libexec in situations as in boots.txt, with the tools of GNU and of busybox."""

import os
import re
from pathlib import Path

import pytest

from test_boots import BINARIES, STATE, as_lines, compare, create, read_disk, run, stage
from test_faults import TRACE, calls

TOOLS = {"gnu": "/usr/bin:/bin:/usr/sbin", "busybox": str(Path("build/busybox").absolute())}
STUBS = Path("build/stubs").absolute()
TZ = f"{STATE}tz/"
NEW = "/var/new/2022a.1.0"
UPDATED = "live 2021b.1.0, latest 2021b.1.0, dataset ../../../new/2022a.1.0"


@pytest.fixture(params=TOOLS)
def start(request):
    """A function that runs a program. Stubs, if there are any, take the place of its tools."""
    create(STUBS, "/")

    def start(program, *arguments, **variables):
        path = TOOLS[request.param]
        settings = [f"PATH={STUBS}:{path}", f"TOOLS={path.partition(':')[0]}"]
        settings += [f"{name}={value}" for name, value in variables.items()]
        return run(["setsid", "env", *settings, "sh", f"libexec/{program}", *arguments])

    return start


def stub(name, text):
    create(STUBS / name, "=", text)
    create(STUBS / name, "mode", "755")


def rows(table):
    """Returns the columns of each line."""
    return [[column.strip() for column in line.split("=>")] for line in table.strip().splitlines()]


# What else there is beside UPDATED, and what the installation of NEW changes, or the message with
# which it is refused.
INSTALLATIONS = f"""
 => latest 2022a.1.0
{NEW}/zoneinfo/x > Europe, tz/.new.x/y = => latest 2022a.1.0, tz/.new.x -, tz/2022a.1.0/zoneinfo/x > Europe
{NEW} mode 700, {NEW}/zoneinfo/Europe/Paris mode 4600 => latest 2022a.1.0
dataset 2022a.1.0, tz/2022a.1.0/x = => tz_latest > @2022a.1.0
dataset 2022a.1.0, tz/2022a.1.0/zoneinfo/Europe mode 700 => tz_latest > @2022a.1.0
dataset 2022a.1.0, tz/2022a.1.0/zoneinfo/America - => latest 2022a.1.0
tz/2022a.1.0 > . => tz/2022a.1.0 -, latest 2022a.1.0
tz/2022a.1.0 = => tz/2022a.1.0 -, latest 2022a.1.0
tz - => ! no directory
tz_latest / => dataset 2022a.1.0 !
{NEW} - => !
{NEW}/zoneinfo/America/Los_Angeles - => ! no zone file
{NEW}/zoneinfo/America/Los_Angeles = x => ! no zone file
{NEW}/zoneinfo > zi, {NEW}/zi/America/Los_Angeles = TZif => ! no zone file
{NEW}/zoneinfo/America > ../p, {NEW}/p/Los_Angeles = TZif => ! America -> ../p
{NEW}/zoneinfo/localtime > /etc/localtime => ! ./zoneinfo/localtime -> /etc/localtime
{NEW}/zoneinfo/x > y => ! ./zoneinfo/x -> y
{NEW}/zoneinfo/x > ../.. => ! ./zoneinfo/x -> ../..
{NEW}/zoneinfo/x fifo => ! special file: ./zoneinfo/x
{NEW}/icutz/icutz44l.dat - => ! exactly one
{NEW}/icutz/icutz4b.dat = => ! exactly one
{NEW}/icutz/icutz44l.dat > ../zoneinfo/Europe/Paris => ! exactly one
"""


@pytest.mark.parametrize("situation, outcome", rows(INSTALLATIONS))
def test_installation(situation, outcome, start):
    changes, refused, message = outcome.partition("!")
    stage(f"{UPDATED}, {situation}, {changes.strip()}")
    expected = as_lines(bool(refused), [])
    stage(f"{UPDATED}, {situation}")
    status, texts = start("install-dataset", NEW)
    assert message.strip() in "\n".join(texts) and bool(texts) == bool(refused)
    compare(expected, as_lines(bool(status), []))
    dataset = Path(TZ, "2022a.1.0")
    for path in [dataset, *dataset.rglob("*")] if not refused else []:
        assert path.stat().st_mode & 0o7444 == 0o444, path


@pytest.mark.parametrize("name", ["2022a", "2022ab.1", "999999999z.999999999.999999999"])
def test_version_that_is_installed(name, start):
    stage(UPDATED)
    os.rename(NEW, f"/var/new/{name}")
    assert start("install-dataset", f"/var/new/{name}/")[0] == 0
    assert os.path.isfile(f"{STATE}tz_latest/zoneinfo/Europe/Paris")
    assert os.readlink(f"{STATE}tz_latest") == TZ + name


@pytest.mark.parametrize(
    "name",
    "2022 a 2022aB 2022a. 2022a.1.0.3 2022a\n x\n2022a 2147483648a 2022a.2147483648".split(" "),
)
def test_version_that_is_refused(name, start):
    stage(UPDATED)
    os.rename(NEW, f"/var/new/{name}")
    before = read_disk()
    status, texts = start("install-dataset", f"/var/new/{name}")
    assert status != 0 and f"no version: {name}" in "\n".join(texts)
    assert read_disk() == before


# The situation of a clean-up, and what stays in tz.
ALL = "2020a.1.0 2021b.1.0"
CLEAN_UPS = f"""
live 2021b.1.0, latest 2022a.1.0, dataset 2020a.1.0, dataset 2021b.1.01, marker => 2021b.1.0 2022a.1.0
zoneinfo > tz/2021b.1.0/zoneinfo, dataset 2021b.1.0, dataset 1.0, needs_cleanup.begun = => 2021b.1.0
icutz > @2021b.1.0/icutz, dataset 2021b.1.0, tz_latest > @x, tz/x > 2022a.1.0, dataset 2022a.1.0, marker
      => 2021b.1.0 2022a.1.0 x
zoneinfo > @2021b.1.0/x/zoneinfo, dataset 2021b.1.0, marker => 2021b.1.0
live 2021b.1.0, tz/l > 2021b.1.0, tz/.new.x/y =, tz/fifo fifo, marker => 2021b.1.0
tz_latest =, dataset 2021b.1.0, marker =>
live 2021b.1.0, dataset 2020a.1.0 => {ALL}
"""


@pytest.mark.parametrize("situation, kept", rows(CLEAN_UPS.replace("\n ", "")))
def test_clean_up(situation, kept, start):
    stage(situation)
    for name in ("a b", "-f", "*", ".x", "..y", "x\ny") if kept != ALL else []:
        create(Path(TZ, name, name), "=")
    before = read_disk()
    assert start("clean-up") == (0, [])
    assert sorted(os.listdir(TZ)) == kept.split()
    gone = [f"{STATE}needs_cleanup", f"{STATE}needs_cleanup.begun"]
    gone += [
        path
        for path in before
        if path.startswith(TZ) and path[len(TZ) :].split("/")[0] not in kept.split()
    ]
    assert read_disk() == {path: value for path, value in before.items() if path not in gone}
    assert all(os.stat(TZ + name).st_mode & 0o777 == 0o755 for name in kept.split())


def test_clean_up_of_what_cannot_be_deleted(start):
    stage(f"{UPDATED}, dataset 2020a.1.0, dataset 2020b.1.0, marker")
    mount = ["mount", "-t", "tmpfs", "in-the-way", f"{TZ}2020a.1.0/zoneinfo"]
    assert run(mount)[0] == 0
    try:
        for marker in ("needs_cleanup", "needs_cleanup.begun"):
            assert os.path.exists(STATE + marker)
            status, texts = start("clean-up")
            assert status != 0 and "zoneinfo" in "\n".join(texts)
            assert sorted(os.listdir(TZ)) == [".unused", "2021b.1.0"]
            assert start("install-dataset", NEW)[0] == 0
            create(Path(TZ, "2022a.1.0"), "-")
            create(Path(STATE, "tz_latest"), "-")
            run()
    finally:
        run(["umount", "in-the-way"])
    assert start("clean-up") == (0, []) and os.listdir(TZ) == ["2021b.1.0"]


@pytest.mark.parametrize("program", [["install-dataset", NEW], ["clean-up"]])
def test_nothing_is_done_without_the_lock(program, start):
    stage(f"{UPDATED}, dataset 2020a.1.0, marker")
    before = read_disk()
    stub("flock", '#!/bin/sh\n[ "$*" != "-w 300 9" ] || readlink /proc/self/fd/9 && exit 1')
    status, texts = start(*program)
    assert status != 0 and texts[0] == "/run/tzreconcile.lock" and "for five minutes" in texts[1]
    assert read_disk() == before
    assert os.stat("/run/tzreconcile.lock").st_mode & 0o777 == 0o600


# Takes the place of a tool. The one with the number CUT is traced, and takes the whole program with
# it if it is killed.
TRACED = """#!/bin/sh
read -r number <$COUNT; echo $((number + 1)) >$COUNT
[ "$number" = "$CUT" ] || exec "$TOOLS/${0##*/}" "$@"
strace -o "$TRACE" $INJECT "$TOOLS/${0##*/}" "$@"; status=$?
[ "$status" -lt 128 ] || kill -9 0; exit "$status"
"""
CHANGE = r"mkdir|rename|symlink|link|unlink|rmdir|copy_|sendfile|write|f?chmod|f?sync|.*O_CREAT"
COUNT = TRACE.with_name("count")


SETTLED = ["TZVersionDiffRecord", "icutz", "localtime", "tz", "tz_latest", "zoneinfo"]


# The shell of busybox has its tools built in.
@pytest.mark.parametrize("start", ["gnu"], indirect=True)
@pytest.mark.parametrize("program", [["install-dataset", NEW], ["clean-up"]])
def test_kill(program, start):
    situation = f"{UPDATED}, tz/.new.x/y =, marker"
    situation += (
        ", dataset 2022a.1.0, tz/2022a.1.0/icutz -" if len(program) == 2 else ", dataset 2022a.1.0"
    )
    number = 0

    def cut(injection):
        stage(situation)
        for tool in "rm mktemp ln mkdir cp chmod sync mv".split():
            stub(tool, TRACED)
        create(COUNT, "=", "0\\n")
        TRACE.unlink(missing_ok=True)
        status, _ = start(*program, TRACE=TRACE, COUNT=COUNT, CUT=number, INJECT=injection)
        create(STUBS, "/")
        return status

    while cut("") == 0 and TRACE.exists():
        for call, injection in calls(TRACE.read_text(), (CHANGE, "execve(")):
            print("killed at", call)
            stage(situation)
            before = read_disk()
            assert cut(injection + "signal=KILL") == -9
            killed = read_disk()
            lost = [path for path in before if path not in killed]
            run()
            assert os.path.isfile(f"{STATE}zoneinfo/Europe/Paris")
            assert (
                not lost
                or program[0] != "clean-up"
                or os.path.exists(f"{STATE}needs_cleanup.begun")
            )
            assert start("install-dataset", NEW)[0] == 0
            assert os.path.isfile(f"{STATE}tz_latest/zoneinfo/Europe/Paris")
            run()
            create(Path(STATE, "needs_cleanup"), "=")
            assert start("clean-up") == (0, [])
            assert os.readlink(f"{STATE}zoneinfo") == f"{TZ}2022a.1.0/zoneinfo"
            assert os.listdir(TZ) == ["2022a.1.0"]
            assert sorted(os.listdir(STATE)) == SETTLED
        number += 1
    assert number > 5


# What check finds beside UPDATED; the command that it prints repairs what is wrong.
VERDICTS = """
 =>
live system, tz_latest - =>
/usr/share/icu/icutzformat.txt -, tz/2021b.1.0/icutz - =>
icutz > tz/2021b.1.0/icutz =>
localtime > /usr/share/zoneinfo/Europe/Paris =>
/etc/localtime > ../var/db/timezone/localtime =>
zoneinfo - => wrong: zoneinfo does not point to a dataset
zoneinfo / => wrong: zoneinfo does not point to a dataset
zoneinfo > tz/2021b.1.0/zoneinfo => wrong: zoneinfo does not point to a dataset
zoneinfo > /usr/share/zoneinfo.default/ => wrong: zoneinfo does not point to a dataset
zoneinfo > @2021b.1.0/ => wrong: zoneinfo does not point to a dataset
zoneinfo > @2021b.1.0/icutz => wrong: zoneinfo does not point to a dataset
tz/2021b.1.0/zoneinfo - => wrong: no zone files in /var/db/timezone/tz/2021b.1.0/zoneinfo
tz/2021b.1.0/zoneinfo/Europe mode 750 => wrong: not world-readable: /var/db/timezone/tz/2021b.1.0/zoneinfo/Europe
tz/2021b.1.0/icutz/x =, tz/2021b.1.0/icutz/x mode 640 => wrong: not world-readable: /var/db/timezone/tz/2021b.1.0/icutz/x
/var/db mode 750 => wrong: not every user can enter /var/db
/usr/share/zoneinfo.default/Europe mode 750 => wrong: not world-readable: /usr/share/zoneinfo.default/Europe
/usr/share/zoneinfo.default/Europe -, /usr/share/zoneinfo.default/America - => wrong: no zone files in /usr/share/zoneinfo.default
/usr/share/zoneinfo.default/+VERSION - => wrong: no version in /usr/share/zoneinfo.default/+VERSION
live system, icutz > @2021b.1.0/icutz => wrong: icutz exists
live system, icutz > x => wrong: icutz exists
live system, icutz / => wrong: icutz exists
icutz - => wrong: icutz does not point to the live dataset
icutz > @2021b.1.0/zoneinfo => wrong: icutz does not point to the live dataset
icutz / => wrong: icutz does not point to the live dataset
/usr/share/icu/icutzformat.txt = 46l => wrong: the live dataset has schema 44l
live system, tz_latest -, tz - => wrong: no directory
localtime - => wrong: localtime
localtime > zoneinfo/Europe/Paris => wrong: localtime
localtime > @2021b.1.0/zoneinfo/Europe/Paris => wrong: localtime
localtime > /var/db/timezone/zoneinfo/Mars => wrong: localtime
localtime = TZif => wrong: localtime
/etc/localtime > /usr/share/zoneinfo/Europe/Paris => wrong: /etc/localtime
tz_latest > /elsewhere => wrong: tz_latest
tz_latest > @ => wrong: tz_latest
tz_latest = => wrong: tz_latest
latest 2147483648a => wrong: tz_latest
latest 2022a.1.0, tz/2022a.1.0/zoneinfo - => wrong: no zone files in the latest dataset
latest 2022a.1.0 46l => note: the latest dataset
tz_latest > @2022a => note: the latest dataset
/usr/share/zoneinfo - => note: /usr/share/zoneinfo
marker => note: there are unused datasets
needs_cleanup.begun = => note: there are unused datasets
"""


@pytest.mark.parametrize("situation, verdict", rows(VERDICTS))
def test_check(situation, verdict, start):
    links = "/usr/share/zoneinfo > /var/db/timezone/zoneinfo, /etc/localtime > /var/db/timezone/localtime"
    stage(f"{links}, live 2021b.1.0, latest 2021b.1.0, {situation}")
    status, texts = start("check")
    assert [text[: len(verdict)] for text in texts[4:5]] == ([verdict] if verdict else [])
    assert status == verdict.startswith("wrong") and len(texts) <= 6
    if status and "reinstall" not in texts[5]:
        command = texts[5].replace("/usr/sbin/tzreconcile", *BINARIES["release"])
        assert run(["bash", "-c", command])[0] == 0
        assert start("check")[0] == 0


def test_check_names_what_is_live(start):
    stage("live system, latest 2022a.1.0 46l")
    assert start("check")[1][:4] == [
        "zoneinfo: system 2021a, schema 44l",
        "icutz: none",
        "localtime: Europe/Paris",
        "latest: 2022a.1.0, schema 46l",
    ]
    stage(UPDATED)
    assert start("check")[1][:2] == ["zoneinfo: 2021b.1.0, schema 44l", "icutz: 2021b.1.0"]
