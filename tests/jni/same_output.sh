#!/bin/sh
# same_output.sh TAVO SONG JAVA...: the Java command prints, in every mode, what the command TAVO
# prints of the highlight and the beats. TAVO's lines of the stream and the tempo are left out: no
# event carries them.
set -eu
tavo=$1
song=$2
shift 2
for options in '--mode highlight' '--mode highlight --length 10' '--mode beats' \
    '--mode beats --max-beats 8' '--mode both --length 5'; do
    # shellcheck disable=SC2086 # the options are words
    native=$("$tavo" $options "$song" | grep -v -e '^  stream ' -e '^  tempo ')
    # shellcheck disable=SC2086
    java=$("$@" $options "$song")
    printf '%s\n%s\n' "$options" "$java"
    case $native in
    "$song"*' highlight  '[0-9]* | "$song"*' beats      '[0-9]*) ;;
    *) echo "no result from $tavo: $native" >&2 && exit 1 ;;
    esac
    if [ "$native" != "$java" ]; then
        printf 'instead of\n%s\n' "$native" >&2
        exit 1
    fi
done
# A file that cannot be analysed: status 1 and nothing on standard output. Wrong usage: 2.
for wrong in '1 /nowhere/song.wav' '2 --mode loud song.wav'; do
    status=0
    # shellcheck disable=SC2086
    output=$("$@" ${wrong#* } 2>/dev/null) || status=$?
    if [ "$status $output" != "${wrong%% *} " ]; then
        echo "$wrong: status $status, output: $output" >&2
        exit 1
    fi
done
