# Sourced by the other scripts, from any directory; they go on at the top of the tree.
# shellcheck shell=bash
set -euo pipefail
cd "$(dirname "$(realpath "${BASH_SOURCE[0]}")")/.."
PATH=$PATH:/usr/sbin:/sbin # where zic is, and an ordinary user does not look

die() {
  printf '%s: %s\n' "${0##*/}" "$*" >&2
  exit 1
}

# need PACKAGE...: installs the Debian packages, unless all are there.
need() {
  local as_root=() log
  (($(dpkg-query -W -f '${db:Status-Status}\n' "$@" 2>/dev/null | grep -cx installed) < $#)) || return 0
  ((EUID == 0)) || as_root=(sudo)
  "${as_root[@]}" apt-get update -qq
  log=$("${as_root[@]}" env DEBIAN_FRONTEND=noninteractive apt-get install -y -qq --no-install-recommends "$@" 2>&1) ||
    die "$log"
}

# build PRESET [DIRECTORY [OPTION...]]: builds in build/DIRECTORY, or in the preset's own, with these options of cmake.
build() {
  need cmake g++ ninja-build
  cmake --preset "$1" -B "build/${2:-$1}" "${@:3}" >/dev/null
  cmake --build "build/${2:-$1}" -- --quiet
}

# in_sandbox: succeeds in a sandbox.
in_sandbox() { grep -q '^tzreconcile-sandbox /var ' /proc/self/mounts; }

# sandbox COMMAND...: runs the command at the top of the tree in a private mount namespace, with empty file systems on
# /var, /usr/share and /run, and a copy of /etc, so that the machine's own paths stay as they are. As an ordinary user
# it does so in a user namespace. The tree is mounted at /mnt first, since it may be below a path that is covered next.
sandbox() {
  local private=(unshare --mount)
  ((EUID == 0)) || private+=(--map-root-user)
  "${private[@]}" true || die 'no private mount namespace: run it as root, or allow user namespaces with
sysctl user.max_user_namespaces=10000 and, where it exists, kernel.apparmor_restrict_unprivileged_userns=0'
  "${private[@]}" bash -euc '
    mount --rbind . /mnt
    cd /mnt
    mount -t tmpfs tzreconcile-sandbox /var
    mount -t tmpfs tzreconcile-sandbox /usr/share
    mount -t tmpfs tzreconcile-sandbox /run
    cp -a /etc /run 2>/dev/null || true # without files that only root can read
    mount --bind /run/etc /etc
    ln -sfn /var/db/timezone/localtime /etc/localtime
    exec "$@"' sandbox "$@"
}

# stage_system VERSION: makes the system dataset of the sandbox, with the zones in build/tzdata.zi.
stage_system() {
  mkdir -p /usr/share/icu
  zic -d /usr/share/zoneinfo.default build/tzdata.zi
  echo "$1" >/usr/share/zoneinfo.default/+VERSION
  echo 44l >/usr/share/icu/icutzformat.txt
}

# make_update DIRECTORY SCHEMA: makes a dataset in which Paris is two hours east of UTC all year. Its ICU files are
# ICU's own with the version replaced.
make_update() {
  mkdir -p "$1/zoneinfo" "$1/icutz"
  printf 'Zone Europe/Paris 2 - CEST\nZone America/Los_Angeles -8 - PST\n' | zic -d "$1/zoneinfo" -
  derb -c -s - zoneinfo64.res | sed "/TZVersion/s/\"[^\"]*\"/\"$(basename "$1" .1.0)\"/" >"$1/zoneinfo64.txt"
  genrb --quiet --destdir "$1/icutz" "$1/zoneinfo64.txt"
  # ICU opens zoneinfo64.res; tzreconcile reads the schema from the other name.
  cp "$1/icutz/zoneinfo64.res" "$1/icutz/icutz$2.dat"
}
