# bash completion for morva
_morva() {
    local current=${COMP_WORDS[COMP_CWORD]} previous=${COMP_WORDS[COMP_CWORD-1]} command='' word
    for word in "${COMP_WORDS[@]:1:COMP_CWORD-1}"; do
        case $word in
            denoise | inspect | vad | level | report) command=$word && break ;;
        esac
    done

    case $previous in
        --frame) mapfile -t COMPREPLY < <(compgen -W '10 20 30 40' -- "$current") && return ;;
        --format) mapfile -t COMPREPLY < <(compgen -W 'text csv json' -- "$current") && return ;;
        --models) mapfile -t COMPREPLY < <(compgen -d -- "$current") && return ;;
        --model | --control | --vad-model | --level-model | -o | --output)
            mapfile -t COMPREPLY < <(compgen -f -- "$current") && return ;;
        -j | --jobs | --limit | --threshold | --release-threshold | --min-silence | --padding | --max-seconds)
            return ;;
    esac

    local engine='--model --models --control --frame --verbose --help' options
    case $command in
        '') options='denoise inspect vad level report --help --version' ;;
        denoise) options="$engine --output --jobs --limit --skip-existing --quiet" ;;
        vad) options="$engine --threshold --release-threshold --min-silence --padding --output --format" ;;
        level) options="$engine --output --format" ;;
        report) options="$engine --limit --vad-model --level-model --max-seconds" ;;
        inspect) options='--output --frame --json --verbose --help' ;;
    esac
    if [[ -z $command || $current == -* ]]; then
        mapfile -t COMPREPLY < <(compgen -W "$options" -- "$current")
    else
        mapfile -t COMPREPLY < <(compgen -f -- "$current")
    fi
}
complete -o filenames -F _morva morva
