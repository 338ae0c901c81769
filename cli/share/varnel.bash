# Bash completion for the varnel command. The commands and each command's options are
# read from the command's own --help, so they never fall behind it.
_varnel() {
    local cur=${COMP_WORDS[COMP_CWORD]} command="" word i
    for ((i = 1; i < COMP_CWORD; i++)); do
        word=${COMP_WORDS[i]}
        [[ $word != -* ]] && { command=$word; break; }
    done
    if [[ -z $command ]]; then
        local commands
        commands=$("${COMP_WORDS[0]}" --help 2>/dev/null |
            sed -n '/^Subcommands:/,/^$/s/^  \([a-z][a-z-]*\) .*/\1/p')
        mapfile -t COMPREPLY < <(compgen -W "$commands --help --version" -- "$cur")
        return
    fi
    if [[ $cur == -* ]]; then
        local options
        options=$("${COMP_WORDS[0]}" "$command" --help 2>/dev/null |
            grep -oE '(^|[ ,])--?[A-Za-z][A-Za-z-]*' | tr -d ' ,' | sort -u)
        mapfile -t COMPREPLY < <(compgen -W "$options" -- "$cur")
        return
    fi
    case ${COMP_WORDS[COMP_CWORD - 1]} in
    --unit) mapfile -t COMPREPLY < <(compgen -W "mgdl mmol" -- "$cur") ;;
    --sim-type) mapfile -t COMPREPLY < <(compgen -W "1 2 3 4 5 6 7 8" -- "$cur") ;;
    *) mapfile -t COMPREPLY < <(compgen -f -- "$cur") ;;  # files: documents, profiles, captures, outputs
    esac
}
complete -o filenames -F _varnel varnel
