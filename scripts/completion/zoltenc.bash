# Completion of zoltenc and avcdump for bash: source this file, or put it where bash-completion
# looks (/usr/share/bash-completion/completions/zoltenc).

# The long options that a program's help lists.
_zolt_options() {
    "$1" --help 2>/dev/null | grep -oE '(^|[ ,])--[a-z][a-z-]*' | grep -oE -- '--.*' | sort -u
}

# Completes the current word to one of the words of $1.
_zolt_words() {
    mapfile -t COMPREPLY < <(compgen -W "$1" -- "$cur")
}

_zolt_files() {
    compopt -o filenames 2>/dev/null || true
    mapfile -t COMPREPLY < <(compgen -f -- "$cur")
}

# Sets cur and previous: the word to complete and the option before it, with or without '='.
_zolt_place() {
    cur=${COMP_WORDS[COMP_CWORD]}
    previous=${COMP_WORDS[COMP_CWORD - 1]-}
    if [ "$cur" = = ]; then
        cur=
    elif [ "$previous" = = ]; then
        previous=${COMP_WORDS[COMP_CWORD - 2]-}
    fi
}

_zoltenc() {
    local cur previous
    _zolt_place
    case $previous in
        -f | --format) _zolt_words 'IYUV YUY2 AYUV BGRA RGBA ARGB BGR RGB' ;;
        --fit) _zolt_words 'crop pad scale' ;;
        --container) _zolt_words 'h264 mp4 mov mkv flv ts null md5' ;;
        -s | --size) _zolt_words '176x144 352x288 640x360 640x480 854x480 1280x720 1920x1080' ;;
        -r | --fps) _zolt_words '24000/1001 24 25 30000/1001 30 50 60000/1001 60' ;;
        -b | --bitrate | -g | --keyint | -n | --frames | --skip | --verify) COMPREPLY=() ;;
        *)
            case $cur in
                -*) _zolt_words "$(_zolt_options "$1")" ;;
                synt*) _zolt_words synthetic ;;
                *) _zolt_files ;;
            esac
            ;;
    esac
}

_avcdump() {
    local cur previous
    _zolt_place
    case $previous in
        --fps) _zolt_words '24000/1001 24 25 30000/1001 30 50 60000/1001 60' ;;
        *)
            case $cur in
                -*) _zolt_words "$(_zolt_options "$1")" ;;
                *) _zolt_files ;;
            esac
            ;;
    esac
}

complete -F _zoltenc zoltenc
complete -F _avcdump avcdump
