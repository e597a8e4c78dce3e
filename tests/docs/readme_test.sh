#!/usr/bin/env bash
# Does what README.md says, line by line, and compares what it shows.
#
# Commands of ```sh blocks have to succeed; in ```console blocks they stand
# behind "$ ", and their output follows, where a line "..." stands for one or
# more lines. The ```text block is a piece of what scripts/demo prints. There is
# a rule for every command and every `piece of code`; one without a rule fails.
# Usage: readme_test.sh ROOT BUILD

set -euo pipefail
# shellcheck source=tests/docs/failures.sh
. "$(dirname -- "$0")/failures.sh"
root=$1 build=$2
readme=$root/README.md
commands=0
live_pid=''
follow_pid=''

unset CDPATH KV_TR_TEMPLATE_PATH KELVO_USE_LOWMEM NLSPATH POSIXLY_CORRECT
export LC_ALL=C TZ=UTC0

work=$(mktemp -d)
leave() {
    local pid
    for pid in $live_pid $follow_pid; do
        kill -KILL "$pid" || true
    done
    rm -rf "$work"
}
trap leave EXIT
cd "$work"

# Whether the text of file $1 is what $2 shows.
shows() {
    local pattern
    pattern=$(printf '%s\n' "$2" | sed 's/[][\\*?]/\\&/g; s/^\.\.\.$/*/')
    # shellcheck disable=SC2053  # it is a pattern
    [[ $'\n'$(<"$1")$'\n' == $'\n'$pattern$'\n' ]]
}

without_times() {
    sed -E 's/[0-9:]{8}\.[0-9]{9}/TIME/'
}

# ------------------------------------------------------------------- the rules

# The lines of scripts/demo that make the sample and print it.
check_demo() {
    local steps
    # shellcheck disable=SC2034  # used by these steps
    local sample=$build/tools/kelvo_sample/kelvo_sample kelvo=$build/trace/cmds/kelvo_main/kelvo
    # shellcheck disable=SC2016  # the variables stand in the line
    steps=$(grep -E '^"\$(sample|kelvo)" ' "$root/scripts/demo")
    [ "$(wc -l <<<"$steps")" -eq 2 ] || fail "scripts/demo: no sample and kelvo in it"
    mkdir demo
    (cd demo && mkdir build && eval "$steps") >demo.txt || fail "the steps of scripts/demo fail"
    [ "$(wc -l <<<"$1")" -eq 10 ] || fail "the first example has not ten lines"
    shows demo.txt $'...\n'"$1"$'\n...' || fail "scripts/demo does not print the first example"
}

check_script() {
    if [ ! -x "$root/${1%% *}" ]; then fail "$1: no such command"; fi
}

check_package() {
    grep -q "^set(CPACK_DEBIAN_[A-Z]*_PACKAGE_NAME $1)" "$root/cmake/Packaging.cmake" ||
        fail "$1: no such package"
    grep -q -- "-B build/package " "$root/scripts/package" || fail "packages: not in build/package"
}

check_preset() {
    grep -q "\"name\": \"$1\"" "$root/CMakePresets.json" || fail "$1: no such preset"
}

# The build that is tested takes the place of build/default.
set_path() {
    local program
    # shellcheck disable=SC2016  # $PWD stands in the line
    eval "${1//'$PWD/build/default'/$build}"
    for program in kelvo kelvo_sample; do
        [[ $(command -v $program) == "$build"/* ]] || fail "$1: does not lead to $program"
    done
}

# run COMMAND SHOWN: SHOWN is "-" when the README shows no output.
run() {
    local status=0
    eval "$1" >"$work/out" 2>"$work/err" || status=$?
    [ $status -eq 0 ] || fail "$1: status $status"
    [ ! -s "$work/err" ] || fail "$1: says $(<"$work/err")"
    if [ "$2" = - ] || shows "$work/out" "$2"; then
        return
    fi
    fail "$1: prints other lines than README.md shows:"
    diff <(printf '%s\n' "$2") "$work/out" >&2 || true
}

# wait_for COMMAND...: until it succeeds, or much time has passed.
wait_for() {
    local end=$((SECONDS + 100))
    until "$@"; do
        if [ $SECONDS -gt $end ]; then return 1; fi
        sleep 0.1
    done
}

# Goes on writing until the follow run is done.
start_live() {
    (eval "exec $1") >"$work/live.txt" 2>&1 &
    live_pid=$!
    wait_for test -s "$work/live.txt" || fail "$1: does not begin to write"
}

follow_shows() {
    without_times <"$work/follow.txt" >"$work/out"
    shows "$work/out" "$1"
}

# Its times are those of the clock.
follow() {
    local status=0
    (eval "exec $1") >"$work/follow.txt" 2>"$work/err" &
    follow_pid=$!
    wait_for follow_shows "$(without_times <<<"$2")" ||
        fail "$1: prints other lines than README.md shows: $(<"$work/follow.txt")"
    kill -INT "$follow_pid" || true
    wait "$follow_pid" || status=$?
    follow_pid=''
    [ $status -eq 0 ] || fail "$1: status $status"
    [ ! -s "$work/err" ] || fail "$1: says $(<"$work/err")"
    kill -INT "$live_pid" || true
    wait "$live_pid" || fail "the live sample: status $?"
    live_pid=''
}

# command_line COMMAND SHOWN: does what the command says, or asks for what it needs.
command_line() {
    local line=$1 package
    commands=$((commands + 1))
    case $line in
    scripts/*) check_script "$line" ;;
    'sudo apt-get install ./build/package/'*)
        package=${line##*/}
        check_package "${package%%_*}"
        ;;
    'cmake --preset '* | 'cmake --build --preset '* | 'sudo cmake --install build/'*)
        check_preset "${line##*[ /]}"
        ;;
    PATH=*) set_path "$line" ;;
    'kelvo_sample '*--live*) start_live "$line" ;;
    'kelvo -f '*) follow "$line" "$2" ;;
    'kelvo '* | 'LC_ALL=C kelvo '* | 'kelvo_sample '* | 'cd '* | 'grep '*) run "$line" "$2" ;;
    *) fail "no rule for the command \"$line\"" ;;
    esac
}

# A piece of code within the text.
code() {
    case $1 in
    scripts/* | .ci/run) check_script "$1" ;;
    kelvo_sample | grep) command -v "$1" >out || fail "$1: not found" ;;
    kelvo-dev) check_package "$1" ;;
    'man docs/'*) [ -s "$root/${1#man }" ] || fail "$1: no such page" ;;
    'kelvo -h') run "$1" - ;;
    _*.tpl) [ -s "$work/shop/$1" ] || fail "$1: no such template" ;;
    -[a-z]) kelvo -h | grep -q "^  $1 " || fail "$1: no such option" ;;
    [-+][0-9]*[rs]) run "kelvo -s $1 $work/shop/orders.trc" - ;;
    '-s +'*) run "kelvo $1 $work/shop/orders.trc" - ;;
    ... | '>>' | '<<') ;;
    *) fail "no rule for the code \"$1\"" ;;
    esac
}

# ------------------------------------------------------------------ the reading

block=''   # language of the block that the line stands in
example='' # the text block
command='' # command of a console block whose output is being collected
shown=''
codes=()

end_command() {
    [ -z "$command" ] || command_line "$command" "${shown%$'\n'}"
    command='' shown=''
}

while IFS= read -r line <&3; do
    case $block:$line in
    ?*:'```')
        end_command
        block=''
        ;;
    :'```'*)
        block=${line#'```'}
        case $block in
        text | sh | console) ;;
        *) fail "a block of \"$block\"" ;;
        esac
        ;;
    text:*) example+=$line$'\n' ;;
    sh:*) command_line "$(sed -E 's/ +#.*//' <<<"$line")" - ;;
    console:'$ '*)
        end_command
        command=${line#'$ '}
        ;;
    console:*) shown+=$line$'\n' ;;
    :*)
        while [[ $line =~ \`([^\`]+)\`(.*) ]]; do
            codes+=("${BASH_REMATCH[1]}")
            line=${BASH_REMATCH[2]}
        done
        ;;
    esac
done 3<"$readme"

cd "$work"
check_demo "${example%$'\n'}"
for piece in "${codes[@]}"; do
    code "$piece"
done
[ -z "$block" ] || fail "the last block does not end"
[ -z "$live_pid" ] || fail "nobody follows the live sample"
if [ $commands -lt 15 ] || [ ${#codes[@]} -lt 10 ]; then fail "README.md was not understood"; fi

finish "README.md shows what happens: $commands commands, ${#codes[@]} pieces of code."
