# Sourced by the other scripts, from any directory; they go on at the top of the tree.
# shellcheck shell=bash
set -euo pipefail
cd "$(dirname "$(realpath "${BASH_SOURCE[0]}")")/.."
umask 022 # what is staged and packaged is for all to read
PATH=$PATH:/usr/sbin:/sbin # where zic and mount helpers are, and an ordinary user does not look

die() {
  printf '%s: %s\n' "${0##*/}" "$*" >&2
  exit 1
}

# need PACKAGE...: installs the Debian packages that are missing. Does nothing when none is.
need() {
  local package missing=() as_root=()
  for package; do
    [[ $(dpkg-query -W -f '${db:Status-Status}' "$package" 2>/dev/null) == installed ]] || missing+=("$package")
  done
  ((${#missing[@]})) || return 0
  ((EUID == 0)) || as_root=(sudo)
  "${as_root[@]}" apt-get update -qq
  "${as_root[@]}" env DEBIAN_FRONTEND=noninteractive apt-get install -y -qq --no-install-recommends "${missing[@]}"
}

# quietly COMMAND...: prints what the command prints only if it fails.
quietly() {
  local output
  output=$("$@" 2>&1) || die "$* failed:"$'\n'"$output"
}

# build PRESET [DIRECTORY]: builds in build/DIRECTORY, or in the preset's own, with the compiler in $CXX.
build() {
  need cmake ninja-build
  [[ -v CXX ]] || need g++
  quietly cmake --preset "$1" -B "build/${2:-$1}"
  quietly cmake --build "build/${2:-$1}"
}

# run_pytest ARGUMENT...: runs pytest with a worker for each processor core, each in a sandbox of its own.
run_pytest() {
  need python3-pytest python3-pytest-xdist util-linux
  tests/sandbox /usr/bin/python3 -B -m pytest --quiet --tb short -p no:cacheprovider \
    --basetemp build/pytest --override-ini testpaths=tests \
    --dist load --tx "$(nproc)*popen//python=tests/sandbox /usr/bin/python3 -B" "$@"
}

# package DIRECTORY [OPTION...]: builds the Debian packages of the tracked files, with these options of
# dpkg-buildpackage, into DIRECTORY. They are built elsewhere: debhelper fails below a directory with a
# blank in its name.
package() (
  need build-essential cmake debhelper git
  tree=$(mktemp -d)
  trap 'rm -rf "$tree"' EXIT
  rm -rf "$1"
  mkdir -p "$1" "$tree/source"
  git ls-files -z | xargs -0 cp --parents -t "$tree/source"
  (cd "$tree/source" && dpkg-buildpackage --build=binary --no-sign "${@:2}") >"$1/log" 2>&1 ||
    die "the package was not built, see $1/log"
  mv "$tree"/*.deb "$1"
)

# in_sandbox: whether /var and /usr/share are those of tests/sandbox.
in_sandbox() { grep -q '^tzreconcile-sandbox /var ' /proc/self/mounts; }

# zone_rule OFFSET NAME: the zone source on standard input, with Europe/Paris at that offset from UTC, the whole year,
# from the end of the summer of 2026 on.
zone_rule() {
  awk -v rule="$1 - $2" '
    /^Z Europe\/Paris / { inside = 1 }
    inside && NF == 3 { print $0, "2026 O 25 1u"; print rule; inside = 0; changed = 1; next }
    { print }
    END { exit !changed }'
}

# following VERSION: the version after it, 2025b to 2025c, 2025z to 2025za.
following() {
  local last=${1: -1}
  if [[ $last == z ]]; then echo "${1}a"; else echo "${1%?}$(tr a-y b-z <<<"$last")"; fi
}

moment=@1800014400 # 2027-01-15 12:00 UTC, in the winter after that change of rule

# icu_zones ZONEINFO DIRECTORY: puts ICU's own zone data into DIRECTORY, but with Europe/Paris at the offset from UTC
# that it has in the zone files ZONEINFO at that moment, the whole year.
icu_zones() {
  local hour
  hour=$(TZDIR=$1 TZ=Europe/Paris date -d $moment +%-H)
  mkdir -p "$2"
  # A zone is a number where it is the same as the zone of that number, and the name of each is in a list before.
  derb -c -s - zoneinfo64.res | awk -v like="\"Etc/GMT-$((hour - 12))\"," '
    /^    [A-Z]/ { section = $1; entry = -1 }
    section == "Names{" && /^        "/ { number[$1] = ++entry }
    section == "Zones{" && /^        [:{]/ {
      same[++entry] = $1 == ":int" ? $3 : entry
      paris = entry == number["\"Europe/Paris\","]
      if (paris) print "        :int { " same[number[like]] " }"
    }
    !paris || /^    }/ { paris = 0; print }' >"$2/zoneinfo64.txt"
  genrb --quiet --destdir "$2" "$2/zoneinfo64.txt"
  rm "$2/zoneinfo64.txt"
}

# Asks ICU for the time of that moment in Europe/Paris: run by /usr/bin/python3, of the package python3-icu, with
# icu_environment. It takes the zone data that the link leads to, or those of the system partition without it.
# shellcheck disable=SC2034 # scripts use it
icu_clock="import icu
clock = icu.SimpleDateFormat('HH:mm', icu.Locale.getUK())
clock.setTimeZone(icu.TimeZone.createTimeZone('Europe/Paris'))
print(clock.format(${moment#@}.0))"
# shellcheck disable=SC2034
icu_environment=(ICU_DATA=/usr/share/icu ICU_TIMEZONE_FILES_DIR=/var/db/timezone/icutz)

# stage_system VERSION SCHEMA SOURCE: puts zone data compiled from SOURCE into the system partition below $root, for the
# C library and for ICU.
stage_system() {
  local icu
  icu=$(derb --version 2>&1 | sed -n 's/.*ICU version \([0-9]*\).*/icudt\1l/p')
  rm -rf "${root?}/usr/share/zoneinfo.default"
  mkdir -p "$root/usr/share/zoneinfo.default"
  zic -d "$root/usr/share/zoneinfo.default" "$3"
  icu_zones "$root/usr/share/zoneinfo.default" "$root/usr/share/icu/$icu"
  echo "$1" >"$root/usr/share/zoneinfo.default/+VERSION"
  echo "$2" >"$root/usr/share/icu/icutzformat.txt"
}

# stage_dataset VERSION SCHEMA SOURCE: installs a dataset below $root as an update installer does, its name last.
stage_dataset() {
  local dataset=/var/db/timezone/tz/$1
  mkdir -p "${root?}$dataset/zoneinfo"
  zic -d "$root$dataset/zoneinfo" "$3"
  icu_zones "$root$dataset/zoneinfo" "$root$dataset/icutz"
  # ICU opens the one name; the other says which schema it has.
  ln -f "$root$dataset/icutz/zoneinfo64.res" "$root$dataset/icutz/icutz$2.dat"
  ln -sfn "$dataset" "$root/var/db/timezone/tz_latest"
}
