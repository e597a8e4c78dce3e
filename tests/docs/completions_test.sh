#!/usr/bin/env bash
# Asks the bash completion what it offers, and lets the other shells, as far as
# they are installed, read their files.
# Usage: completions_test.sh DIRECTORY      (of the completions that were built)

set -euo pipefail
# shellcheck source=tests/docs/failures.sh
. "$(dirname -- "$0")/failures.sh"
completions=$1

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
cd "$work"
mkdir -p dirs/alpha dirs/beta
touch a.trc

for command in kelvo kelvo_sample; do
    # shellcheck disable=SC1090  # it is checked by itself
    . "$completions/$command.bash"
    if command -v shellcheck >/dev/null; then
        shellcheck "$completions/$command.bash" || fail "shellcheck found something"
    fi
done

# offers "WORDS" EXPECTED...: what is offered for the last word.
offers() {
    local line=$1 IFS=' ' offered expected
    shift
    expected=$(printf '%s\n' "$@" | sort)
    read -ra COMP_WORDS <<<"$line"
    [[ $line != *' ' ]] || COMP_WORDS+=('')
    COMP_CWORD=$((${#COMP_WORDS[@]} - 1))
    COMPREPLY=()
    "_${COMP_WORDS[0]}" || true
    offered=$(printf '%s\n' "${COMPREPLY[@]}" | sort)
    [ "$offered" = "$expected" ] ||
        fail "\"$line\" offers \"${offered//$'\n'/ }\", not \"${expected//$'\n'/ }\""
}

offers 'kelvo -' -f -h -b -r -l -i -k -z -B -o -t -s
offers 'kelvo a' a.trc
offers 'kelvo -b a' a.trc
offers 'kelvo -o ' d t i c f s o
offers 'kelvo -o tic' ticd ticf tics tico
offers 'kelvo -bo t' td ti tc tf ts to
offers 'kelvo -otidfs' -otidfsc -otidfso
offers 'kelvo -o tx' ''
offers 'kelvo -s ' ''
offers 'kelvo -t dirs/' dirs/alpha dirs/beta
offers 'kelvo -tdirs/b' -tdirs/beta
# readline breaks words at colons, and leaves what stands before as it is.
offers 'kelvo -t dirs/alpha : dirs/b' dirs/beta
offers 'kelvo -t dirs/alpha :' dirs
COMP_WORDBREAKS=${COMP_WORDBREAKS//:/}
offers 'kelvo -t dirs/alpha:dirs/b' dirs/alpha:dirs/beta

offers 'kelvo_sample --re' --records= --record-size=
offers 'kelvo_sample -p s' story strings
offers 'kelvo_sample --times seq' sequential
offers 'kelvo_sample -d dirs/a' dirs/alpha
offers 'kelvo_sample --seed 1 a' ''
# So are equals signs.
offers 'kelvo_sample --profile = m' mixed
COMP_WORDBREAKS=${COMP_WORDBREAKS//=/}
offers 'kelvo_sample --profile=m' --profile=mixed

for shell in 'zsh _kelvo' 'fish kelvo.fish' 'zsh _kelvo_sample' 'fish kelvo_sample.fish'; do
    read -r shell file <<<"$shell"
    command -v "$shell" >/dev/null || continue
    "$shell" -n "$completions/$file" || fail "$shell does not understand $file"
done

finish "The completions offer what they should."
