#!/usr/bin/env bash
# Asks the bash completion what it offers, and lets the other shells, as far as
# they are installed, read their files.
# Usage: completions_test.sh ROOT

set -euo pipefail
# shellcheck source=tests/docs/failures.sh
. "$(dirname -- "$0")/failures.sh"
completions=$1/completions

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
cd "$work"
mkdir -p dirs/alpha dirs/beta
touch a.trc

# shellcheck disable=SC1091  # it is checked by itself
. "$completions/kelvo.bash"

# offers "WORDS" EXPECTED...: what is offered for the last word.
offers() {
    local line=$1 IFS=' ' offered expected
    shift
    expected=$(printf '%s\n' "$@" | sort)
    read -ra COMP_WORDS <<<"$line"
    [[ $line != *' ' ]] || COMP_WORDS+=('')
    COMP_CWORD=$((${#COMP_WORDS[@]} - 1))
    COMPREPLY=()
    _kelvo || true
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

for shell in 'zsh _kelvo' 'fish kelvo.fish'; do
    read -r shell file <<<"$shell"
    command -v "$shell" >/dev/null || continue
    "$shell" -n "$completions/$file" || fail "$shell does not understand $file"
done

finish "The completions offer what they should."
