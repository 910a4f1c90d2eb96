# bash completion for delvix-cli: commands, options, and the ids of the devices running now.
# Where a file is wanted the shell's own file name completion takes over.

_delvix_cli_devices()
{
    # The CSV's first column without its header; nothing when the gateway reaches no device.
    "$1" --format csv devices 2>/dev/null | tail -n +2 | cut -d, -f1
}

_delvix_cli()
{
    local cur=${COMP_WORDS[COMP_CWORD]} prev=${COMP_WORDS[COMP_CWORD - 1]}
    # The commands and options of --help, in its order (tests/dist/check-install compares).
    local commands="devices modules info classes family-tree registry level settings processes
        loaded-modules ls pull push install run rm mif scan compare snapshot diff"
    local options="--format --output -o --csv-raw --fail-on-difference --hash-limit --volume --help -h --version"
    COMPREPLY=()

    case $prev in
        --format)
            COMPREPLY=($(compgen -W "xml json csv junit" -- "$cur"))
            return
            ;;
        -o | --output | --volume | --hash-limit)
            return
            ;;
    esac
    if [[ $cur == -* ]]; then
        COMPREPLY=($(compgen -W "$options" -- "$cur"))
        return
    fi

    # The command, and how many of its arguments come before the word being completed.
    local command="" argument=0 i
    for ((i = 1; i < COMP_CWORD; i++)); do
        case ${COMP_WORDS[i]} in
            --format | -o | --output | --volume | --hash-limit) ((i++)) ;;
            -*) ;;
            *)
                if [[ -z $command ]]; then
                    command=${COMP_WORDS[i]}
                else
                    ((argument++))
                fi
                ;;
        esac
    done

    case $command in
        "") COMPREPLY=($(compgen -W "$commands help" -- "$cur")) ;;
        help) ((argument == 0)) && COMPREPLY=($(compgen -W "$commands" -- "$cur")) ;;
        devices | mif | scan | compare) ;;
        # Each side is a snapshot file (the shell's completion) or a running device.
        diff) ((argument < 2)) && COMPREPLY=($(compgen -W "$(_delvix_cli_devices "${COMP_WORDS[0]}")" -- "$cur")) ;;
        *) ((argument == 0)) && COMPREPLY=($(compgen -W "$(_delvix_cli_devices "${COMP_WORDS[0]}")" -- "$cur")) ;;
    esac
    return 0
}
complete -o bashdefault -o default -F _delvix_cli delvix-cli
