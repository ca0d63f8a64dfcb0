"""Runs the programs in libexec in the situations of programs.txt. Lets their tools fail, and kills them."""

import os
import re
from pathlib import Path

import pytest

from test_boots import RELEASE, STATE, TZ, compare, create, read_disk, read_paragraphs, run, stage
from test_faults import TRACE, calls

TOOLS = {"gnu": "/usr/bin:/bin", "busybox": Path("build/busybox").absolute()}
STUBS = Path("build/stubs").absolute()
NEW = Path(STATE, "new/2022a.1.0")
INSTALL, CLEAN_UP = ["sh", "libexec/install-dataset", NEW], ["sh", "libexec/clean-up"]
UPDATED = "live 2021b.1.0, latest 2021b.1.0, "
WITH_SOURCE = f"{UPDATED}new 2022a.1.0, "
# As another user, unless scripts/test has given an ordinary user a namespace in which there is no other user.
ALONE = Path("/proc/self/uid_map").read_text().split()[2] == "1"
AS_USER = ["env"] if ALONE else "setpriv --reuid 65534 --regid 65534 --clear-groups env".split()
# Stands in for systemd. The unit has failed if there is a file.
SYSTEMCTL = f"""[ "$*" != '--quiet is-failed tzreconcile' ] || exec [ -e /var/failed ]
[ "$*" = 'restart tzreconcile' ] && rm -f /var/failed && exec {RELEASE[-1]}"""
BASH = r"""stub() { printf '#!/bin/sh\n%s\n' "$2" >build/stubs/"$1"; chmod +x build/stubs/"$1"; }
remount() { mount --options-source disable -o remount,"$1" /var; }
"""


@pytest.fixture
def start(request):
    """A function that runs a command with the tools of GNU or busybox, or with stubs in their place."""
    create(STUBS, "/")
    path = f"PATH={STUBS}:{TOOLS[getattr(request, 'param', 'gnu')]}"
    return lambda *command: run(["setsid", "env", path, *command])


def stub(name, text):
    create(STUBS / name, "=", f"#!/bin/sh\n{text}".replace("\\", r"\\"))
    create(STUBS / name, "mode", "755")


def cases():
    for name, *case, script in read_paragraphs("tests/programs.txt"):
        for tools in ["gnu"] if script or name.startswith("check") else TOOLS:
            yield pytest.param(tools, name.split(":")[0], *case, script, id=f"{name}: {case[0]}-{tools}")


@pytest.mark.parametrize("start, program, situation, changes, texts, fails, script", cases(), indirect=["start"])
def test_program(start, program, situation, changes, texts, fails, script):
    default = f"{UPDATED}classic, " if program == "check" else WITH_SOURCE
    stage(f"{default}{situation}, {changes}")
    expected = {"fails": fails, "!": "\n! ".join(texts)} | read_disk()
    stage(default + situation)
    create(Path("/run/systemd/system"), "/")
    stub("systemctl", SYSTEMCTL)
    command = ["sh", f"libexec/{program}", *map(str, Path(STATE, "new").glob("*"))]
    before = read_disk()
    status, says = start(*["/bin/bash", "-c", BASH + script] * bool(script), *command)
    seen = [next((text for text in texts if text in line), line) for line in says]
    if program == "check":
        seen = [text for text in seen if text in texts or text.startswith(("wrong", "note"))]
        as_user = (status, says) if script else run([*AS_USER, f"PATH={TOOLS['busybox']}:{STUBS}", *command])
        assert read_disk() == before and (as_user[0], as_user[1][-2:]) == (status, says[-2:])
        assert status == any(text.startswith("wrong") for text in texts)
        for _ in range(5):
            if status and "reinstall" not in says[-1]:
                start("/bin/bash", "-c", says[-1])
                status, says = start(*command)
        for path in [Path(path) for path in read_disk() if re.search(r"\.\w{6}$", path)]:
            path.rename(path.with_suffix(".old"))
    compare(expected, {"fails": int(status != 0), "!": "\n! ".join(seen)} | read_disk())


# Stands in for a tool. The N-th call is traced. If the tool is killed, the process group of the program is killed. A
# faulty dataset is moved as where overlayfs cannot rename a directory: mv copies and deletes it.
TOOL = f"""if [ "${{2##*/}}" = old ]; then cp -a "$1" "$2" && rm -rf "$1"; exit; fi
echo >>{TRACE}.calls
[ $(wc -l <{TRACE}.calls) = "$N" ] || exec /bin/${{0##*/}} "$@"
strace -o{TRACE} $INJECT /bin/${{0##*/}} "$@"; status=$?; [ $status -lt 128 ] || kill -9 0; exit $status
"""
# The system calls that change the disk.
CHANGE = r"mkdir|rename|symlink|link|unlink|rmdir|copy_|sendfile|write|f?chmod|f?sync|.*O_CREAT"
# In tmpfs the newest files are deleted first: what is left looks whole to the end, and FAULTY is healed first.
OLD = "tz/2022a.1.0"
UNUSED = f"{OLD}/icutz/x =, {OLD}/zoneinfo/America/x =, dataset 2022a.1.0, {OLD}/icutz/x -, {OLD}/zoneinfo/America/x -"
FAULTY = f"{UNUSED}, {OLD}/zoneinfo/x > y"


@pytest.mark.parametrize("program, old", [(INSTALL, FAULTY), (CLEAN_UP, UNUSED)])
def test_kill(program, old, start):
    def cut(number, injection=""):
        stage(f"{WITH_SOURCE}{old}, tz/.new.x/y =, marker")
        for tool in "rm mktemp ln mkdir cp chmod sync mv".split():
            stub(tool, TOOL)
        run(["rm", "-f", TRACE, f"{TRACE}.calls"])
        status, _ = start(f"N={number}", f"INJECT={injection}", *program)
        create(STUBS, "/")
        return status

    def settle():
        begun = os.path.exists(f"{STATE}needs_cleanup.begun")
        left, whole = ({path.relative_to(top) for path in top.rglob("*")} for top in (Path(STATE, OLD), NEW))
        assert program is INSTALL or begun or left in (set(), whole), "deleted without a trace"
        assert run()[0] == 0 and os.path.isfile(f"{STATE}zoneinfo/Europe/Paris")
        assert start(*INSTALL)[0] == 0 and run()[0] == 0
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
    assert len(Path(f"{TRACE}.calls").read_text()) == number - 1
