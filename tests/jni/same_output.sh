#!/bin/sh
# same_output.sh TAVO SONG JAVA...: checks that the Java command prints the same highlight and beats as the command
# TAVO. The stream and the tempo, which no event reports, are ignored.
set -eu
tavo=$1
song=$2
shift 2
# shellcheck disable=SC2086 # the options are words
for options in '--mode highlight --length 10' '--mode beats --max-beats 8' '--mode both --length 5'; do
  native=$("$tavo" $options "$song" | grep -v -e '^  stream ' -e '^  tempo ')
  printf '%s\n%s\n' "$options" "$native" | grep '[0-9]:[0-9]'
  [ "$native" = "$("$@" $options "$song")" ]
done
# The exit status is 1 for a file that cannot be analysed and 2 for wrong usage. The standard output is empty.
# shellcheck disable=SC2086
for wrong in '1 /nowhere/song.wav' '2 --mode loud song.wav'; do
  status=0
  output=$("$@" ${wrong#* } 2>/dev/null) || status=$?
  [ "$status $output" = "${wrong%% *} " ]
done
