# Sourced by the project's scripts: strict mode, the project's root as working
# directory, and what several of them do.
# shellcheck shell=bash

set -euo pipefail
unset CDPATH

# Nothing here asks a question; a closed standard input is replaced, so that no
# program opens a file of its own as descriptor 0.
exec </dev/null

root=$(dirname -- "${BASH_SOURCE[0]}")/..
cd -- "$root"
root=$PWD

say() {
    printf '\n==> %s\n' "$*"
}

fail() {
    printf '\nerror: %s\n' "$*" >&2
    exit 1
}

# Configures and builds a preset: configure_and_build PRESET [TARGET...]
configure_and_build() {
    local preset=$1 targets=()
    shift
    [ $# -eq 0 ] || targets=(--target "$@")
    if [ -e "build/$preset" ] && [ ! -w "build/$preset" ]; then
        fail "build/$preset belongs to another user; remove it and try again"
    fi
    say "Configuring build/$preset"
    plain_memory cmake --preset "$preset" || return
    say "Building ${*:-everything} in build/$preset"
    plain_memory cmake --build --preset "$preset" "${targets[@]}"
}

# Runs a command without address-space randomisation where that is allowed: the
# sanitizers' runtimes of Debian 12 do not start, or start only now and then, on
# kernels that randomise more bits than they expect. The build needs it too,
# because it runs the test programs to list their cases.
plain_memory() {
    if setarch -R true 2>/dev/null; then
        setarch -R "$@"
    else
        "$@"
    fi
}

# The project's own files whose names match one of the patterns, NUL-separated:
# project_files '*.cpp' '*.h'
project_files() {
    local tests=(-name "$1")
    shift
    for pattern in "$@"; do
        tests+=(-o -name "$pattern")
    done
    find . \( -path ./.git -o -path ./build \) -prune -o -type f \( "${tests[@]}" \) -print0 |
        LC_ALL=C sort -z
}
