# Shared by scripts/demo, scripts/endure and tests/host: starts the file manager and the service in a Wine prefix and sends them
# commands. Sourced after common.sh, never run. `prefix` is the prefix, `out` the folder with what the programs print.

# Of the programs here and of those under Wine (scripts/wine-run sets the same).
export LC_ALL=C.UTF-8 TZ=UTC0

# use_programs ARCH: the file manager and the module of that architecture, and a Wine prefix of its kind. The service is a 32-bit
# program also on a 64-bit Windows, unless only 64-bit programs are built.
use_programs() {
    programs=$(build_of "$1")
    export WINEARCH
    WINEARCH=$(wine_of "$1")
    manager_program="$programs/tools/filemanager/explorer.exe"
    module="$programs/tavishell.dll"
    service_program="$build/tools/service/taviservice.exe"
    [ -f "$service_program" ] || service_program="$programs/tools/service/taviservice.exe"
}
use_programs "${arches[0]}"
# The class of the module.
class='{5E0C31A7-8D42-4B19-A6F3-2C7D90E1B845}'

trap 'printf "error: line %s: %s\n" "$LINENO" "$BASH_COMMAND" >&2' ERR
trap 'exit 130' INT TERM

# open_session NAME: a prefix and an empty output folder in the build folder of the programs, for one run at a time.
open_session() {
    prefix="$programs/$1-prefix"
    out="$programs/$1"
    mkdir -p "$out"
    exec 7>"$out.lock"
    flock -n 7 || die "another scripts/$1 is running"
    rm -rf "${out:?}"/*
}
# close_session CODE: ends what was started, and the script.
close_session() {
    local name
    trap - EXIT
    for name in "${!pids[@]}"; do kill_program "$name"; done
    stop_server
    rm -f "$out"/*.fifo
    exit "$1"
}

# wait_for SECONDS WHAT COMMAND...: until the command succeeds.
wait_for() {
    local limit=$((SECONDS + $1)) what=$2
    shift 2
    until "$@"; do
        [ $SECONDS -lt $limit ] || die "waited in vain for $what"
        sleep 0.02
    done
}

# --- programs

# No program may hold the lock of the session after the script has ended.
windows() { timeout -k 5 120 "$root/scripts/wine-run" "$prefix" "$@" 7>&-; }
service() { windows "$service_program" "$@"; }
register_module() { windows 'C:\windows\system32\regsvr32.exe' /s "$1" || die "the module cannot be registered"; }
stop_server() { WINEPREFIX="$prefix" timeout -k 5 30 wineserver -k 2>/dev/null || true; }

declare -A pids=() inputs=()
# start NAME INPUT PROGRAM...: in the background. INPUT is a file, or - for commands by `order`. The output goes to NAME.txt and
# NAME.errors.
start() {
    local name=$1 input=$2 fifo="$out/$1.fifo" fd
    shift 2
    if [ "$input" = - ]; then
        [ -z "${inputs[$name]:-}" ] || { fd=${inputs[$name]}; exec {fd}>&-; }
        rm -f "$fifo"
        mkfifo "$fifo"
        # Opened for both, it waits for no reader.
        exec {fd}<>"$fifo"
        inputs[$name]=$fd
        input=$fifo
    fi
    # The redirections below come into force later; until then, nobody must read what an earlier program printed.
    : >"$out/$name.txt"
    "$root/scripts/wine-run" "$prefix" "$@" <"$input" >"$out/$name.txt" 2>"$out/$name.errors" 7>&- &
    pids[$name]=$!
}
# start_manager NAME INPUT FOLDER [--hidden]
start_manager() { start "$1" "$2" "$manager_program" "${@:3}"; }
# start_service NAME [BYTES_PER_SECOND [SEARCH_MS]]
start_service() {
    start "$1" - "$service_program" run "${@:2}"
    wait_for 60 "the service" grep -q '^ready' "$out/$1.txt"
}
lives() { kill -0 "${pids[$1]}" 2>/dev/null; }
kill_program() { { kill -KILL "${pids[$1]}" && wait "${pids[$1]}"; } 2>/dev/null || true; }
# await_end NAME SECONDS: leaves the exit code in $ended, or "none" if the program had to be killed.
await_end() {
    local limit=$((SECONDS + $2))
    while lives "$1" && [ $SECONDS -lt $limit ]; do sleep 0.02; done
    ended=none
    if lives "$1"; then kill_program "$1"; return; fi
    ended=0
    wait "${pids[$1]}" 2>/dev/null || ended=$?
}

# send NAME COMMAND: to a program that was started with the input -.
send() { printf '%s\n' "$2" >&"${inputs[$1]}"; }
# order NAME COMMAND: sends a command, waits for its end and prints what the program answered. Fails if the command fails.
order() {
    local name=$1 first answer
    first=$(($(wc -l <"$out/$name.txt") + 1))
    send "$name" "$2"
    wait_for 120 "the end of: $2" has_answered "$name" $first
    answer=$(tail -n +$first "$out/$name.txt" | sed -n '/^> /,/^\(done$\|failed: \)/p')
    [ "${answer##*$'\n'}" = done ] || { printf '%s\n' "$answer" >&2; return 1; }
    sed '1d;$d' <<<"$answer"
}
has_answered() { # NAME FIRST-LINE
    local alive=
    # Asked first, since a program may end right after its answer.
    lives "$1" && alive=1
    tail -n +"$2" "$out/$1.txt" | grep -qE '^(done$|failed: )' && return
    [ -n "$alive" ] || { cat "$out/$1.errors" >&2; die "$1 has ended"; }
    return 1
}

# sql DATABASE STATEMENT
sql() { sqlite3 -cmd '.timeout 20000' "$@"; }
