"""Runs the programs in libexec in situations as in boots.txt, with the tools of GNU and of busybox."""

# A line of a table is an outcome, and after "<=" the situations that have it, with "|" between them.

import os
from pathlib import Path

import pytest

from test_boots import RELEASE, STATE, compare, create, read_disk, run, stage
from test_faults import TRACE, calls

TOOLS = {"gnu": "/usr/bin:/bin", "busybox": Path("build/busybox").absolute()}
STUBS = Path("build/stubs").absolute()
TZ = f"{STATE}tz/"
NEW = "/var/new/2022a.1.0"
INSTALL, CLEAN_UP, CHECK = ["sh", "libexec/install-dataset", NEW], ["sh", "libexec/clean-up"], ["sh", "libexec/check"]
LIVE, SYSTEM = "tz/2021b.1.0", "/usr/share/zoneinfo.default"
UPDATED = "live 2021b.1.0, latest 2021b.1.0, dataset ../../../new/2022a.1.0, "
NAME = f"{NEW} -, dataset ../../../new/"


@pytest.fixture(params=TOOLS)
def start(request):
    """A function that runs a command. Stubs, if there are any, take the place of its tools."""
    create(STUBS, "/")
    path = f"PATH={STUBS}:{TOOLS[request.param]}"
    return lambda *command: run(["setsid", "env", path, *command])


def stub(name, text):
    create(STUBS / name, "=", text)
    create(STUBS / name, "mode", "755")


def rows(table):
    """Yields situation and outcome of each row."""
    for line in table.strip().splitlines():
        outcome, situations = line.split("<=")
        yield from ((situation.strip(), outcome.strip()) for situation in situations.split(" | "))


# What the installation of NEW changes, and after "!" the message with which it is refused.
INSTALLATIONS = f"""
latest 2022a.1.0 <= | {NEW} mode 700, {NEW}/zoneinfo/Europe/Paris mode 4600 | dataset 2022a.1.0, tz/2022a.1.0/zoneinfo -
latest 2022a.1.0, tz/.new.x - <= tz/.new.x/y =
latest 2022a.1.0, tz/2022a.1.0 mode 755 <= dataset 2022a.1.0, tz/2022a.1.0 mode 700
latest 2022a.1.0, tz/2022a.1.0/zoneinfo mode 755 <= dataset 2022a.1.0, tz/2022a.1.0/zoneinfo mode 744
tz/2022a.1.0 -, latest 2022a.1.0 <= tz/2022a.1.0 > 2021b.1.0 | tz/2022a.1.0 =
tz_latest > @2022a.1.0 <= dataset 2022a.1.0, tz/2022a.1.0/x =
latest 2022a.1.0, tz/2022a.1.0/zoneinfo/x > Europe <= ../data /, tz > ../data, live 2021b.1.0, {NEW}/zoneinfo/x > Europe
latest 2022a <= {NAME}2022a
latest 999999999z.0.999999999 <= {NAME}999999999z.0.999999999
! no version <= {NAME}2022 | {NAME}a | {NAME}2022aB | {NAME}2022a. | {NAME}2022a.1.0.3 | {NAME}2147483648a
! no version <= {NAME}2022a\\n | {NAME}x\\n2022a
dataset 2022a.1.0 ! directory <= tz_latest /
! no directory <= tz -
! no zone file zoneinfo/America/Los_Angeles <= {NEW}/zoneinfo/America - | {NEW}/zoneinfo/America/Los_Angeles = x
! ./zoneinfo -> z <= {NEW}/zoneinfo > z, {NEW}/z/America/Los_Angeles = TZif
! ./zoneinfo/x -> /etc/localtime <= {NEW}/zoneinfo/x > /etc/localtime
! ./zoneinfo/x -> <= {NEW}/zoneinfo/x > y | {NEW}/zoneinfo/x > .. | {NEW}/zoneinfo/x > x
! special file: ./zoneinfo/x <= {NEW}/zoneinfo/x fifo | {NEW}/zoneinfo/x fifo, {NEW}/zoneinfo/America/Los_Angeles fifo
! not exactly one <= dataset 2022a.1.0, tz/2022a.1.0/x > y, {NEW}/icutz/icutz44l.dat -
! not exactly one <= {NEW}/icutz/icutz4b.dat = | {NEW}/icutz/icutz44l.dat > /bin
"""


@pytest.mark.parametrize("situation, outcome", rows(INSTALLATIONS))
def test_installation(situation, outcome, start):
    changes, refused, message = outcome.partition("!")
    stage(f"{UPDATED}{situation}, {changes.strip()}")
    expected = {"refused": bool(refused)} | read_disk()
    stage(UPDATED + situation)
    status, texts = start(*INSTALL[:2], *Path("/var/new").iterdir())
    compare(expected, {"refused": status != 0} | read_disk())
    assert message.strip() in "\n".join(texts) and bool(texts) == bool(refused)


# What stays in tz.
CLEAN_UPS = """
2021b.1.0 2022a.1.0 <= latest 2022a.1.0, live 2021b.1.0, dataset 2020a.1.0, dataset 2021b.1.01, marker
2021b.1.0 <= live 2021b.1.0, tz/l > 2021b.1.0, tz/f fifo, marker
2021b.1.0 <= icutz > @2021b.1.0/icutz, dataset 2021b.1.0, marker | live 2021b.1.0, dataset 1.0, needs_cleanup /
2021b.1.0 <= ../data /, tz > ../data, zoneinfo > tz/2021b.1.0/zoneinfo, dataset 2021b.1.0, needs_cleanup.begun =
2021b.1.0 <= zoneinfo > @2021b.1.0/x/zoneinfo, dataset 2021b.1.0, tz_latest > @x, dataset 2020a.1.0, marker
2021b.1.0 x <= live system, tz_latest > @x, tz/x > 2021b.1.0, dataset 2021b.1.0, dataset 2020a.1.0, marker
2020a.1.0 2021b.1.0 <= live 2021b.1.0, dataset 2020a.1.0
"""


@pytest.mark.parametrize("situation, kept", rows(CLEAN_UPS))
def test_clean_up(situation, kept, start):
    stage(situation)
    stays = {path: value for path, value in read_disk().items() if "needs_cleanup" not in path}
    for name in ("a b", "-f", "*", ".x", "..y", "x\ny") if "needs" in situation or "marker" in situation else []:
        create(Path(TZ, name, name), "=")
    assert start(*CLEAN_UP) == (0, [])
    compare({p: v for p, v in stays.items() if p.removeprefix(TZ).split("/")[0] in ["", *kept.split()]}, read_disk())


def test_clean_up_of_what_cannot_be_deleted(start):
    stage(f"{UPDATED}dataset 2022a.1.0, dataset 2022b.1.0, dataset 2023a.1.0, marker")
    script = f"mount -t tmpfs x {TZ}2022a.1.0/icutz; sh libexec/clean-up || sh libexec/install-dataset {NEW} && exit 9"
    status, texts = start("unshare", "--mount", "sh", "-c", script)
    assert status == 9 and "icutz" in texts[0] and sorted(os.listdir(TZ))[1:] == ["2021b.1.0", "2022a.1.0"]
    run()
    assert start(*CLEAN_UP) == (0, []) and os.listdir(TZ) == ["2022a.1.0"]


@pytest.mark.parametrize("program", [INSTALL, CLEAN_UP])
def test_nothing_is_done_without_the_lock(program, start):
    stage(f"{UPDATED}dataset 2020a.1.0, marker")
    before = read_disk()
    stub("flock", '#!/bin/sh\n[ "$*" != "-w 300 9" ] || stat -Lc "%a %n" $(readlink /proc/self/fd/9) && exit 1')
    status, texts = start(*program)
    assert status != 0 and texts[0] == "600 /run/tzreconcile.lock" and "for five minutes" in texts[1]
    compare(before, read_disk())


# Stands in for a tool, and fails if it has a certain argument. One call of a tool is traced; if the tool is killed, the
# stub kills the program's process group, as it does where the program has not got the lock.
TRACED = """#!/bin/sh
! flock -n /run/tzreconcile.lock true && [ "$1" != "{3}" ] || exit 1
echo "${{0##*/}}" >>{0}.tools
[ $(wc -l <{0}.tools) = {1} ] || exec /bin/${{0##*/}} "$@"
strace -o{0} {2} /bin/${{0##*/}} "$@"; status=$?
[ $status -lt 128 ] || kill -9 0; exit $status
"""
# The system calls that change the disk.
CHANGE = r"mkdir|rename|symlink|link|unlink|rmdir|copy_|sendfile|write|f?chmod|f?sync|.*O_CREAT"
# In tmpfs the newest files are deleted first: what is left looks whole to the end, and FAULTY is healed first.
OLD = "tz/2022a.1.0"
UNUSED = f"{OLD}/icutz/x =, {OLD}/zoneinfo/America/x =, dataset 2022a.1.0, {OLD}/icutz/x -, {OLD}/zoneinfo/America/x -"
FAULTY = f"{UNUSED}, {OLD}/zoneinfo/x > y"
KILLS = [(INSTALL, FAULTY, 0), (CLEAN_UP, UNUSED, 0), (CLEAN_UP, UNUSED, "-T")]


# The shell of busybox has its tools built in.
@pytest.mark.parametrize("start", ["gnu"], indirect=True)
@pytest.mark.parametrize("program, unused, fails", KILLS)
def test_kill(program, unused, fails, start):
    def cut(number, injection=""):
        stage(f"{UPDATED}{unused}, tz/.new.x/y =, marker")
        for tool in "rm mktemp ln mkdir cp chmod sync mv".split():
            stub(tool, TRACED.format(TRACE, number, injection, fails).replace("\\", r"\\"))
        run(["rm", "-f", TRACE, f"{TRACE}.tools"])
        status, _ = start(*program)
        create(STUBS, "/")
        return status

    def settle():
        begun = os.path.exists(f"{STATE}needs_cleanup.begun")
        assert program is INSTALL or begun or len(list(Path(TZ).rglob("*"))) in (18, 8), "deleted without a trace"
        assert run()[0] == 0 and os.path.isfile(f"{STATE}zoneinfo/Europe/Paris")
        assert start(*INSTALL) == (0, []) and run()[0] == 0
        create(Path(STATE, "needs_cleanup"), "=")
        assert start(*CLEAN_UP) == (0, []) and os.listdir(TZ) == ["2022a.1.0"]
        return read_disk()

    number = 1
    while cut(number) == 0 and TRACE.exists():
        trace, settled = TRACE.read_text(), settle()
        for call, injection in calls(trace, (CHANGE, "execve(")):
            print("killed at", call)
            assert cut(number, injection + "signal=KILL") == -9
            compare(settled, settle())
        number += 1
    tools = Path(f"{TRACE}.tools").read_text().split()
    assert len(tools) == number - 1 and (program is CLEAN_UP or tools[-7:] == "sync chmod mv mv mv sync rm".split())


# What check finds; the command that it prints repairs what is wrong.
VERDICTS = f"""
<= | live system, tz_latest - | /usr/share/icu/icutzformat.txt -, {LIVE}/icutz - | icutz > {LIVE}/icutz
<= localtime > /usr/share/zoneinfo/Europe/Paris | /etc/localtime > ../var/db/timezone/localtime | latest 2022a.1.0
<= {SYSTEM}/+VERSION = \\n 2021a x | {SYSTEM}/Europe/Paris -
wrong: no directory <= live system, tz_latest -, tz -
wrong: zoneinfo <= zoneinfo - | zoneinfo / | zoneinfo > {LIVE}/zoneinfo | zoneinfo > @2021b.1.0/icutz
wrong: zoneinfo <= zoneinfo > @2021b.1.0 | zoneinfo > @2021b.1.0/ | zoneinfo > {SYSTEM}/
wrong: the live dataset is incomplete <= {LIVE}/zoneinfo - | {LIVE} mode 700
wrong: the latest dataset is incomplete <= latest 2022a.1.0, tz/2022a.1.0/zoneinfo - | latest 2022a.1.0, {OLD} mode 700
wrong: no zone files in /usr <= {SYSTEM}/Europe -, {SYSTEM}/America -
wrong: not world-readable <= {LIVE}/zoneinfo/Europe/Paris mode 640 | {LIVE}/icutz mode 711 | {SYSTEM}/Europe mode 750
wrong: not every user can enter <= /var/db mode 750 | tz mode 700
wrong: no version <= {SYSTEM}/+VERSION - | {SYSTEM}/+VERSION = 2021a.1
wrong: icutz exists <= live system, icutz > @2021b.1.0/icutz | live system, icutz > x | live system, icutz /
wrong: icutz does not <= icutz - | icutz > @2021b.1.0/zoneinfo | icutz /
wrong: the live dataset has schema 44l, the system 46l <= /usr/share/icu/icutzformat.txt = 46l
wrong: localtime <= localtime - | localtime > zoneinfo/Europe/Paris | localtime > @2021b.1.0/zoneinfo/Europe/Paris
wrong: localtime <= localtime > /var/db/timezone/zoneinfo/Mars | localtime = TZif | localtime > /usr/share/zoneinfo/Mars
wrong: /etc/localtime <= /etc/localtime > /usr/share/zoneinfo/Europe/Paris | /etc/localtime =
wrong: tz_latest <= tz_latest > /elsewhere | tz_latest > @ | live system, tz_latest = | latest 2147483648a
note: the latest dataset <= latest 2022a.1.0, tz/2022a.1.0/icutz/icutz44l.dat mode 640 | latest 2022a.1.0 46l
note: the latest dataset <= latest 2022a.1.0 - | tz_latest > @2022a.1.0 | tz_latest > @2021b.1.0/
note: /usr/share/zoneinfo <= /usr/share/zoneinfo -
note: there are unused datasets <= marker | needs_cleanup.begun =
"""


@pytest.mark.parametrize("situation, verdict", rows(VERDICTS))
def test_check(situation, verdict, start):
    links = "/usr/share/zoneinfo > /var/db/timezone/zoneinfo, /etc/localtime > /var/db/timezone/localtime, "
    stage(UPDATED + links + situation)
    status, texts = start(*CHECK)
    *_, found = [text for text in ["", *texts] if text[:5] in ("", "wrong", "note:")]
    assert found.startswith(verdict) and bool(found) == bool(verdict) and status == found.startswith("wrong"), texts
    if status and "reinstall" not in texts[-1]:
        command = texts[-1].replace("/usr/sbin/tzreconcile", *RELEASE)
        assert run(["bash", "-c", command])[0] == 0 and start(*CHECK)[0] == 0
