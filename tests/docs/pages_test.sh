#!/usr/bin/env bash
# Holds the manual pages and the completions against the sources: what there is
# is documented, and what is documented exists.
# Usage: pages_test.sh ROOT

set -euo pipefail
# shellcheck source=tests/docs/failures.sh
. "$(dirname -- "$0")/failures.sh"
export LC_ALL=C
cd -- "$1"

options=trace/cmds/kelvo_main/options.cpp
page=docs/kelvo.1

# same WHAT A_NAME A B_NAME B: both are lists, one item a line, and neither may be
# empty: then it was not found where it is looked for.
same() {
    local what=$1 line
    if [ -z "$3" ] || [ -z "$5" ]; then
        fail "$what: none found in $([ -n "$3" ] && echo "$4" || echo "$2")"
        return
    fi
    while IFS=$'\t' read -r -d $'\n' line; do
        fail "$what: \"$line\" is in $2 but not in $4"
    done < <(comm -23 <(sort -u <<<"$3") <(sort -u <<<"$5"))
    while IFS=$'\t' read -r -d $'\n' line; do
        fail "$what: \"$line\" is in $4 but not in $2"
    done < <(comm -13 <(sort -u <<<"$3") <(sort -u <<<"$5"))
}

# Lines of a file from the first that matches to the next that matches.
part() {
    sed -n "/$2/,/$3/p" "$1"
}

letters_of() {
    grep -o . <<<"$1" || true
}

# ------------------------------------------------------------ kelvo's options

option_string=$(sed -n 's/.*OPTION_STRING\[\] = "\([^"]*\)".*/\1/p' $options)
with_argument=$(grep -o '.:' <<<"$option_string" | tr -d :)
all_options=$(letters_of "${option_string//:/}")

same "option" "the option string" "$all_options" "$page" \
    "$(sed -n 's/^\.It Fl \([A-Za-z]\)\( Ar .*\)\{0,1\}$/\1/p' $page)"
same "option with argument" "the option string" "$with_argument" "$page" \
    "$(sed -n 's/^\.It Fl \([A-Za-z]\) Ar .*/\1/p' $page)"
same "option" "the option string" "$all_options" "the synopsis of $page" \
    "$(part $page '^\.Sh SYNOPSIS' '^\.Sh DESCRIPTION' |
        sed -n 's/^\.Op Fl \([A-Za-z]*\).*/\1/p' | grep -o .)"
completions=completions/kelvo.options
same "option" "the option string" "$all_options" "$completions" \
    "$(sed -n 's/^\([A-Za-z]\)|.*/\1/p' $completions)"
same "option with argument" "the option string" "$with_argument" "$completions" \
    "$(sed -n 's/^\([A-Za-z]\)|[^|]*|[^|].*/\1/p' $completions)"

prefix_letters=$(letters_of "$(sed -n 's/.*PREFIX_LETTERS\[\] = "\([^"]*\)".*/\1/p' $options)")
same "letter of -o" "$options" "$prefix_letters" "$page" \
    "$(part $page '^\.It Fl o Ar' '^\.El' | sed -n 's/^\.It Cm \([a-z]\)$/\1/p')"
same "letter of -o" "$options" "$prefix_letters" "$completions" \
    "$(sed -n 's/^o||letters //p' $completions | tr , '\n' | sed -n 's/=.*//p')"

# ----------------------------------------------------------- its environment

same "environment name" "the sources" \
    "$(grep -rhoE 'getenv\("K(V|ELVO)_[A-Z_]*"\)' trace tools | cut -d'"' -f2)" "the pages" \
    "$(sed -n 's/^\.It Ev \(K[EV][A-Z_]*\)$/\1/p' docs/*.[1-9])"

# --------------------------------------------------------------- its messages

# Format strings as one line each: adjacent literals joined, quotes plain, the
# newline at the end cut.
messages=$(find trace -name '*.cpp' -exec cat {} + | sed 's,^ *//.*,,' | tr '\n' ' ' |
    sed 's/" *"//g' | grep -oE '"%s: 2625-[0-9]{3} ([^"\\]|\\.)*"' |
    sed 's/^"%s: //; s/"$//; s/\(\\n\)* *$//; s/\\"/"/g; s/ *$//')
documented=$(sed -n 's/^\.It \(2625-[0-9]* .*\)/\1/p' $page | sed 's/\\(dq/"/g')

# The words in capitals of the page stand for the conversions.
placeholder='\b(FILE|TEXT|LINE|N|X)\b'
same "message" "the sources" "$(sed -E 's/%[sdc]/*/g' <<<"$messages")" "$page" \
    "$(sed -E "s/$placeholder/*/g" <<<"$documented")"
while read -r number; do
    fail "message: $page has $number twice"
done < <(cut -d' ' -f1 <<<"$documented" | sort | uniq -d)

# Numbers that a page speaks of.
while read -r number; do
    grep -q "^$number " <<<"$messages" || fail "message: a page names $number, which does not exist"
done < <(grep -ohE '2625-[0-9]{3}' docs/*.[1-9] | sort -u)

# What damage is called.
warnings=$(grep -ohE '"?(invalid record [a-zA-Z]+|pCurRec out of bounds|Bad trace file, [a-z ]+)' \
    trace/cmds/kelvo_utils/file/corruption.cpp | tr -d '"')
same "warning" "corruption.cpp" "$warnings" "$page" \
    "$(sed -nE 's/^\.It ((invalid record [a-zA-Z]+|pCurRec out of bounds).*)/\1/p
               s/^\.It (Bad trace file, [a-z ]+).*/\1/p' $page | sed -E 's/ function type/ function/')"

# --------------------------------------------------------- kelvo_sample's options

sample=tools/kelvo_sample/option_table.cpp
same "option of kelvo_sample" "$sample" \
    "$(sed -nE "s/^    \{\"([a-z-]+)\", ('(.)'|0),.*/\1 \3/p" $sample)" "docs/kelvo_sample.1" \
    "$(sed -nE 's/^\.It Fl ([a-z])( Ar [a-z]+)? , Fl -([a-z-]+)( Ns = .*)?$/\3 \1/p
               s/^\.It Fl -([a-z-]+)( Ns = .*)?$/\1 /p' docs/kelvo_sample.1)"

# ------------------------------------------------------------ the writer library

writer=trace/writer/trace_writer.h
same "kind to append" "$writer" \
    "$(sed -nE 's/^    trace_writer_status (append_[a-z0-9_]+)\(const trace_origin.*/\1/p' $writer)" \
    "docs/trace_writer.3" "$(sed -nE 's/^\.It Fn (append_[a-z0-9_]+).*/\1/p' docs/trace_writer.3)"
same "status" "$writer" "$(sed -nE 's/^    (TRACE_WRITER_[A-Z_]+) = .*/\1/p' $writer)" \
    "docs/trace_writer.3" "$(sed -nE 's/^\.It Dv ([A-Z_]+)$/\1/p' docs/trace_writer.3)"

# ------------------------------------------------------------- the file format

format=trace/include/trace_file_fmt.h
same "record kind" "$format" \
    "$(sed -nE 's/^ *TRC_FUNC_([A-Z0-9_]+) = ([0-9a-fA-Fx]+),.*/\2 \1/p' $format |
        while read -r code name; do echo "$((code)) $name"; done)" "docs/kelvo-trace.5" \
    "$(sed -nE 's/^\.It ([0-9]+) Ta ([A-Z][A-Z0-9_]+) Ta .*/\1 \2/p' docs/kelvo-trace.5)"

same "field" "$format" \
    "$(sed -nE 's/.*offsetof\(trace_(file_header|record_header|record_error), ([A-Za-z_]+)\) == ([0-9]+).*/\3 \2/p' \
        $format)" "docs/kelvo-trace.5" \
    "$(sed -nE 's/^\.It ([0-9]+) Ta [0-9]+ Ta ([A-Za-z_]+) Ta .*/\1 \2/p' docs/kelvo-trace.5)"

# ---------------------------------------------------------------- templates

compiler=trace/cmds/kelvo_utils/template/compile.cpp
same "conversion letter" "$compiler" \
    "$(letters_of "$(sed -nE 's/.*(\{|every_length\()"([a-zA-Z]+)",.*/\2/p' $compiler)")" \
    "docs/kelvo-template.5" \
    "$(sed -nE 's/^\.It (([a-zA-Z] )+)Ta .*/\1/p; s/^([A-Z]) and ([A-Z]) are the same as.*/\1 \2/p' \
        docs/kelvo-template.5 | tr ' ' '\n' | grep .)"

# ------------------------------------------------------------------ pages

while read -r name section; do
    [ -e "docs/$name.$section" ] || fail "reference to $name($section), which is no page"
done < <(sed -nE 's/^\.Xr ((kelvo|trace_)[a-z_-]*) ([1-9]).*/\1 \3/p' docs/*.[1-9] | sort -u)

finish "The pages and completions agree with the sources."
