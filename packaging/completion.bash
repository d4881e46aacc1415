# Completion of options, as the programs list them, and of files.
_clipfile_programs() {
    local current=${COMP_WORDS[COMP_CWORD]} program=$1
    if [[ $current == -* ]]; then
        mapfile -t COMPREPLY < <(compgen -W "$("$program" --help 2>/dev/null | grep -oE -- '--[a-z][a-z-]+')" -- "$current")
    elif [[ $program == *clipfile && $COMP_CWORD -eq 1 ]]; then
        mapfile -t COMPREPLY < <(compgen -W "inspect verify recover retention control" -- "$current")
    elif [[ $program == *clipfile && ${COMP_WORDS[1]} == control && $COMP_CWORD -eq 3 ]]; then
        mapfile -t COMPREPLY < <(compgen -W "status record.start record.stop record.split files preview events" -- "$current")
    else
        case ${COMP_WORDS[COMP_CWORD - 1]} in
            --file-type) mapfile -t COMPREPLY < <(compgen -W "normal fragment" -- "$current") ;;
            --mode) mapfile -t COMPREPLY < <(compgen -W "sync on" -- "$current") ;;
            --recover) mapfile -t COMPREPLY < <(compgen -W "no ask yes" -- "$current") ;;
            *) mapfile -t COMPREPLY < <(compgen -f -- "$current") ;;
        esac
    fi
}
complete -o filenames -F _clipfile_programs receiver clipfile
