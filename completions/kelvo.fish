# fish completion for kelvo(1)

function __kelvo_letters --description 'The letters of -o so far, with each one that is missing'
    set -l letters (commandline -ct | string replace -r -- '^-[fhbrlikzB]*o' '')
    for field in d:date 't:time of day with nanoseconds' 'i:thread id' 'c:component id' \
            'f:number of the kind' 's:sequence number' 'o:offset in the file'
        set -l parts (string split -m 1 : -- $field)
        if not string match -q -- "*$parts[1]*" $letters
            printf '%s%s\t%s\n' "$letters" $parts
        end
    end
end

function __kelvo_directories --description 'The directories of -t so far, with each next one'
    set -l list (commandline -ct | string replace -r -- '^-[fhbrlikzB]*t' '')
    set -l before (string match -r -- '^.*:' $list)
    set -l last (string replace -r -- '^.*:' '' $list)
    for found in (__fish_complete_directories $last '')
        printf '%s%s\n' "$before" $found
    end
end

complete -c kelvo -s f -d 'Follow the files as they grow'
complete -c kelvo -s h -f -d 'Print a usage summary'
complete -c kelvo -s b -d 'Brief: leave out blocks of data'
complete -c kelvo -s r -d 'Raw: use no templates'
complete -c kelvo -s l -d 'Load all templates in advance'
complete -c kelvo -s i -d 'Show how many files are done'
complete -c kelvo -s k -d 'Keep the local time zone'
complete -c kelvo -s z -d 'Take no lock on the files'
complete -c kelvo -s B -d 'Print only the base program names'
complete -c kelvo -s o -x -a '(__kelvo_letters)' -d 'Fields before each record'
complete -c kelvo -s t -x -a '(__kelvo_directories)' -d 'Directories of template files'
complete -c kelvo -s s -x -d 'First record: [date] time, or [+-]number and s or r'
