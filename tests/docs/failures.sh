# shellcheck shell=bash
# How the tests of the pages report: all failures, not the first one alone.

failures=0

fail() {
    printf 'FAILED: %s\n' "$*" >&2
    failures=$((failures + 1))
}

# finish TEXT: ends the test; TEXT says what holds when nothing failed.
finish() {
    [ $failures -eq 0 ] || exit 1
    echo "$1"
}
