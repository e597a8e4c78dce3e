#!/usr/bin/env bash
# Looks for everything that the pages for developers name: files, functions,
# types, constants and tests.
# Usage: names_test.sh ROOT
# shellcheck disable=SC2016  # the backticks are Markdown

set -euo pipefail
# shellcheck source=tests/docs/failures.sh
. "$(dirname -- "$0")/failures.sh"
export LC_ALL=C
cd -- "$1"

pages=(README.md HACKING.md CONTRIBUTING.md SECURITY.md docs/threads.md)

# What stands between backticks in a page, one piece a line. Indented code counts
# as such a piece, blocks between fences do not.
pieces() {
    sed -E '/^ *```/,/^ *```/d; s/^ {7,}(.*)$/`\1`/' "$1" | tr '\n' ' ' |
        grep -oE '`[^`]+`' | tr -d '`'
}

# ---------------------------------------------------------------------- paths

# Pages may leave out the beginning that most files share.
path_exists() {
    local top
    for top in . trace/cmds trace/cmds/kelvo_utils; do
        if [ -e "$top/$1" ]; then return; fi
    done
    [[ $1 != */* ]] &&
        [ -n "$(find . \( -path ./.git -o -path ./build \) -prune -o -name "$1" -print -quit)" ]
}

# build/ may not be there; words in capitals stand for others.
is_path() {
    [[ $1 != build/* && $1 != /* && $1 != *[A-Z][A-Z]* || $1 == *.md || $1 == *.txt ]] &&
        [[ $1 =~ ^[A-Za-z0-9_.*-]+(/[A-Za-z0-9_.-]+)+/?$ ||
            $1 =~ ^[A-Za-z0-9_*-]+\.(cpp|h|sh|md|txt|json|tpl|bash|fish)$ ]]
}

paths=0
for page in "${pages[@]}"; do
    while read -r word; do
        if ! is_path "$word"; then continue; fi
        paths=$((paths + 1))
        path_exists "$word" || fail "$page names $word, which is no file"
    done < <(pieces "$page" | grep -vE '^(/|\*)' | tr ' ' '\n' | sort -u)
    while read -r link; do
        paths=$((paths + 1))
        [ -e "${page%"${page##*/}"}$link" ] || fail "$page links $link, which is not there"
    done < <(grep -oE '\]\([^)#]+' "$page" | cut -c3- | grep -v '^https://' || true)
done

# ---------------------------------------------------------------------- names

names() {
    grep -ohE '[A-Za-z_][A-Za-z0-9_]{3,}' | sort -u
}

# The names within pieces, without options and what is left open, such as PARM_*.
names_of_page() {
    pieces "$1" | sed -E 's/(^| )-[^ ]*//g; s/[a-zA-Z_]*(\*|\.\.\.)[a-z_.]*//g' | names
}

# Those of the recipes, which are to be added, and an example of how names look.
new_names='append_float64 FLOAT64 PARM_YESNO TRC_FUNC_FLOAT64 trace_record_float64 lower_case'

known=$({
    find trace tools tests fuzz bench cmake completions scripts .ci CMakeLists.txt \
        CMakePresets.json docs/*.[1-9] -type f ! -path tests/docs/names_test.sh ! -path 'fuzz/corpus/*' \
        -exec cat {} +
    find . -name .git -prune -o -path ./build -prune -o -print
    echo "$new_names"
} | names)
for page in "${pages[@]}"; do
    while read -r name; do
        fail "$page names $name, which stands in no source"
    done < <(comm -13 <(echo "$known") <(names_of_page "$page"))
done

# ---------------------------------------------------------------------- tests

# The rows of the promises in SECURITY.md name their tests as Suite.Case; an
# asterisk stands for all, Of/ is put in front of cases that have values.
tests=$(find tests -name '*.cpp' -exec cat {} + | tr '\n' ' ' |
    grep -oE 'TEST(_[FP])?\( *\w+, *\w+' | sed -E 's/.*\( *//; s/, */./')

is_test() {
    [[ $1 =~ ^(Of/)?[A-Za-z_]+\.[A-Za-z_*]+(/\*)?$ && $1 != *.md ]]
}

test_exists() {
    local name=${1#Of/}
    grep -q "^${name%%.*}\.$(sed 's/.*\.//; s/\*.*/.*/; s,/.*,,' <<<"$name")$" <<<"$tests"
}

promises=0
while IFS='|' read -r _ promise proof _; do
    promises=$((promises + 1))
    proofs=0
    while read -r piece; do
        if is_test "$piece"; then proofs=$((proofs + 1)); fi
    done < <(grep -oE '`[^`]+`' <<<"$proof" | tr -d '`')
    [ $proofs -gt 0 ] || fail "SECURITY.md names no test for: $promise"
done < <(sed -n '/^| Promise/,/^$/p' SECURITY.md | sed '1,2d; /^$/d')
while read -r piece; do
    if is_test "$piece" && ! test_exists "$piece"; then
        fail "SECURITY.md names the test $piece, which does not exist"
    fi
done < <(pieces SECURITY.md)

if [ $paths -lt 50 ] || [ $promises -lt 5 ]; then fail "the pages were not understood"; fi
finish "All is there: $paths paths, $promises promises and their tests."
