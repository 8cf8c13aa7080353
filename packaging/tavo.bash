# Bash completion for the tavo command.
_tavo() {
    local word=${COMP_WORDS[COMP_CWORD]} before=${COMP_WORDS[COMP_CWORD - 1]} i
    COMPREPLY=()
    for ((i = 1; i < COMP_CWORD; i++)); do
        if [[ ${COMP_WORDS[i]} == -- ]]; then
            mapfile -t COMPREPLY < <(compgen -f -- "$word")
            return
        fi
    done
    # Bash splits --name=value into three words.
    if [[ $word == '=' ]]; then
        word=
    elif [[ $before == '=' ]]; then
        before=${COMP_WORDS[COMP_CWORD - 2]}
    fi
    case $before in
        -m | --mode) mapfile -t COMPREPLY < <(compgen -W 'highlight beats both' -- "$word") ;;
        -f | --format) mapfile -t COMPREPLY < <(compgen -W 'text json csv labels kdenlive
            llc ffmetadata edl fcpxml otio reaper' -- "$word") ;;
        --fps) mapfile -t COMPREPLY < <(compgen -W '23.976 24 25 29.97 29.97df 30 50 59.94
            59.94df 60' -- "$word") ;;
        --shard) mapfile -t COMPREPLY < <(compgen -W 'auto' -- "$word") ;;
        -o | --output-dir) mapfile -t COMPREPLY < <(compgen -d -- "$word") ;;
        -l | --length | -j | --jobs | --max-beats | --max-minutes | --fade | --print | --patience | --timeout) ;; # a number
        --click | --clip | --report | --files-from | --store) mapfile -t COMPREPLY < <(compgen -f -- "$word") ;;
        *)
            if [[ $word == -* ]]; then
                mapfile -t COMPREPLY < <(compgen -W '-h --help --version
                    -m --mode -l --length --max-beats --max-minutes -j --jobs --timeout --normalize --no-ffmpeg
                    -f --format --print -o --output-dir --fps --force --skip-existing --click --clip --fade --report --embed -q --quiet
                    -r --recursive --files-from -0 --null
                    --store --retry-failed --redo --from-store --failed --patience --shard' -- "$word")
            else
                mapfile -t COMPREPLY < <(compgen -f -- "$word")
            fi
            ;;
    esac
}
complete -o filenames -F _tavo tavo
