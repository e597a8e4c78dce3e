# bash completion for kelvo(1)                                -*- shell-script -*-
# Needs nothing but bash itself.
# shellcheck shell=bash

# Offers the current letters of -o with each letter that is not among them.
_kelvo_letters() {
    local prefix=$1 letters=$2 letter
    [[ $letters == *[^dticfso]* ]] && return
    for letter in d t i c f s o; do
        [[ $letters == *$letter* ]] || COMPREPLY+=("$prefix$letters$letter")
    done
}

_kelvo_names() {
    local kind=$1 prefix=$2 name
    compopt -o filenames 2>/dev/null
    while IFS= read -r name; do
        COMPREPLY+=("$prefix$name")
    done < <(compgen "$kind" -- "$3")
}

# The last directory of a list; what stands before it has to be offered along
# unless readline takes the colon for the beginning of a word.
_kelvo_directories() {
    local prefix=$1 list=$2
    if [[ $list == *:* ]]; then
        prefix+=${list%:*}:
        list=${list##*:}
        [[ $COMP_WORDBREAKS != *:* ]] || prefix=
    fi
    compopt -o nospace 2>/dev/null
    _kelvo_names -d "$prefix" "$list"
}

_kelvo() {
    local current=${COMP_WORDS[COMP_CWORD]} flags='-[fhbrlikzB]*' i
    local -i first=COMP_CWORD
    COMPREPLY=()

    # The pieces of a path that was broken at its colons.
    while ((first > 1)) && [[ ${COMP_WORDS[first]} == : || ${COMP_WORDS[first - 1]} == : ]]; do
        first+=-1
    done
    current=
    for ((i = first; i <= COMP_CWORD; i++)); do
        current+=${COMP_WORDS[i]}
    done

    if [[ ${COMP_WORDS[first - 1]} =~ ^${flags}([ots])$ ]]; then
        case ${BASH_REMATCH[1]} in
        o) _kelvo_letters '' "$current" ;;
        t) _kelvo_directories '' "$current" ;;
        esac
    elif [[ $current =~ ^(${flags}o)(.*)$ ]]; then
        _kelvo_letters "${BASH_REMATCH[1]}" "${BASH_REMATCH[2]}"
    elif [[ $current =~ ^(${flags}t)(.*)$ ]]; then
        _kelvo_directories "${BASH_REMATCH[1]}" "${BASH_REMATCH[2]}"
    elif [[ $current == -* ]]; then
        local options='-f -h -b -r -l -i -k -z -B -o -t -s'
        mapfile -t COMPREPLY < <(compgen -W "$options" -- "$current")
    else
        _kelvo_names -f '' "$current"
    fi
} && complete -F _kelvo kelvo
