#!/usr/bin/env bash
# Installs the build into a directory of its own and works with nothing but what
# is there: builds the example as its README says and the program that stands in
# trace_writer(3), and prints their traces.
# Usage: install_test.sh BUILD CMAKE CXX [FLAG...]
# Status 77: skipped, there is no pkg-config.

set -euo pipefail
build=$1 cmake=$2 cxx=$3
shift 3

fail() {
    printf 'FAILED: %s\n' "$*" >&2
    exit 1
}

command -v pkg-config >/dev/null || {
    echo "SKIPPED: there is no pkg-config"
    exit 77
}
unset DESTDIR KV_TR_TEMPLATE_PATH KELVO_USE_LOWMEM POSIXLY_CORRECT
export LC_ALL=C TZ=UTC0

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

# Moved afterwards, so that nothing may remember where it was put.
"$cmake" --install "$build" --prefix "$work/made" >"$work/log" || {
    cat "$work/log"
    fail "cmake --install"
}
mv "$work/made" "$work/prefix"
prefix=$work/prefix

for file in bin/kelvo share/man/man1/kelvo.1 share/man/man5/kelvo-trace.5 \
    share/man/man5/kelvo-template.5 share/man/man3/trace_writer.3 share/bash-completion/completions/kelvo \
    share/fish/vendor_completions.d/kelvo.fish include/kelvo/trace_writer.h; do
    [ -s "$prefix/$file" ] || fail "$file is not installed"
done

pc=$(find "$prefix" -name kelvo-trace.pc)
[ -n "$pc" ] || fail "kelvo-trace.pc is not installed"
export PKG_CONFIG_PATH=${pc%/*}
read -ra library <<<"$(pkg-config --cflags --libs kelvo-trace)"

cd "$prefix/share/doc/kelvo/examples" || fail "the examples are not installed"
"$cxx" "$@" -std=c++20 -Wall -Wextra write_trace.cpp -o "$work/write_trace" "${library[@]}" ||
    fail "the example does not compile"
"$work/write_trace" "$work/copy.trc" || fail "the example does not run"
"$prefix/bin/kelvo" "$work/copy.trc" >"$work/out" 2>"$work/err" || fail "kelvo: status $?"
[ ! -s "$work/err" ] || fail "kelvo says: $(cat "$work/err")"

# The README shows what comes out, of another thread at another time of day.
records() {
    sed -nE 's/^ +[0-9:]{8}\.[0-9]{9} T\( *[0-9a-f]+\)(.*)/\1/p' "$1"
}
diff <(records README.md) <(records "$work/out") || fail "this is not what the README shows"
[ "$(records "$work/out" | wc -l)" -eq 4 ] || fail "there should be 4 records"

cd "$work"
page=$prefix/share/man/man3/trace_writer.3
sed -n '/^\.Bd -literal/,/^\.Ed/p' "$page" | sed '1d; $d; s/\\e/\\/g' >two_threads.cpp
sed -n 's/\\(dq/"/g; s/^\.Dl 1 /1 /p' "$page" >_TWO.tpl
"$cxx" "$@" -std=c++20 -Wall -Wextra two_threads.cpp -o two_threads "${library[@]}" ||
    fail "the program of trace_writer(3) does not compile"
./two_threads two.trc || fail "the program of trace_writer(3) does not run"
"$prefix/bin/kelvo" -o '' two.trc >out 2>err || fail "kelvo: status $?"
for worker in 1 2; do
    [ "$(grep -c "worker $worker: step [0-9]" out)" -eq 10 ] || fail "not all of worker $worker"
done
echo "The installed tree is complete and works."
