# Shared by the scripts of this folder; sourced, never run.
set -euo pipefail
root=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
build="$root/build"
cache="${TAVISHELL_CACHE:-${XDG_CACHE_HOME:-$HOME/.cache}/tavishell}"
jobs=$(nproc)

say() { printf '%s\n' "$*"; }
die() { printf 'error: %s\n' "$*" >&2; exit 1; }

# Package mirrors fail now and then; one more try tells a hiccup from an outage.
once_more() { "$@" || { say "failed, trying once more: $*" >&2; sleep 5; "$@"; }; }

# need_packages PACKAGE...: installs what is missing, or says plainly what could not be had.
need_packages() {
    local missing=() package
    for package in "$@"; do
        dpkg-query -W -f='${db:Status-Status}\n' "$package" 2>/dev/null | grep -q '^installed$' || missing+=("$package")
    done
    [ ${#missing[@]} -eq 0 ] && return 0
    say "installing: ${missing[*]}"
    dpkg --print-foreign-architectures | grep -qx i386 || dpkg --add-architecture i386
    # The security index of i386 may be refused while the rest is fine: the install below is the real test.
    once_more apt-get update -q >/dev/null 2>&1 || true
    # One release for both architectures: multiarch packages must agree on their version.
    DEBIAN_FRONTEND=noninteractive once_more apt-get install -q -y -t bookworm --no-install-recommends "${missing[@]}" \
        >"$cache/apt.log" 2>&1 || { tail -20 "$cache/apt.log" >&2; die "these packages could not be installed: ${missing[*]}"; }
}

mkdir -p "$cache"
