# Completion of kral for fish: what may stand in a place is the tool's own answer.
# Installed by packages; else: kral completion fish | source

function __kral_complete
    set -l words (commandline -opc) (commandline -ct)
    for line in ($words[1] __complete $words[2..-1] 2>/dev/null)
        if test "$line" = ":files"
            __fish_complete_path (commandline -ct)
        else
            echo $line
        end
    end
end
complete -c kral -f -a '(__kral_complete)'
