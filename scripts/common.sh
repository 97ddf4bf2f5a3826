# shellcheck shell=bash disable=SC2034
# Shared by the scripts of this folder; sourced, never run.
set -euo pipefail
root=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
build="$root/build"
cache="${TAVISHELL_CACHE:-${XDG_CACHE_HOME:-$HOME/.cache}/tavishell}"
jobs=$(nproc)

# Compiled objects outlive the build tree; an equal source is compiled once, in whatever folder.
export CMAKE_C_COMPILER_LAUNCHER=ccache CMAKE_CXX_COMPILER_LAUNCHER=ccache
export CCACHE_DIR="$cache/ccache" CCACHE_BASEDIR="$root" CCACHE_NOHASHDIR=1
# Objects that use a precompiled header are stored with these two only. By the compiler's list of included files, a macro that changed
# is seen, which it is not in preprocessed text; and nothing is preprocessed twice.
export CCACHE_SLOPPINESS=pch_defines,time_macros CCACHE_DEPEND=1

say() { printf '%s\n' "$*"; }
die() { printf 'error: %s\n' "$*" >&2; exit 1; }

# The architectures to build and test; TAVISHELL_ARCH limits them to one.
arches=(i686 x86_64)
case "${TAVISHELL_ARCH:-}" in
    '') ;;
    i686 | x86_64) arches=("$TAVISHELL_ARCH") ;;
    *) die "TAVISHELL_ARCH is i686 or x86_64" ;;
esac
# build_of ARCH, preset_of ARCH: its build folder and its CMake presets.
build_of() { [ "$1" = i686 ] && echo "$build" || echo "$build/$1"; }
preset_of() { [ "$1" = i686 ] && echo module || echo "module-$1"; }
# wine_of ARCH: the kind of Wine prefix that its programs run in.
wine_of() { [ "$1" = i686 ] && echo win32 || echo win64; }

# once_more COMMAND...: runs a command that uses the network, twice if need be. A second failure is no hiccup of a mirror.
once_more() { timeout 1200 "$@" || { say "failed, trying once more: $*" >&2; sleep 5; timeout 1200 "$@"; }; }

mkdir -p "$cache"
