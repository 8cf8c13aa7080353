#!/bin/sh
# make_songs.sh MAKE_SONG DIR: one synthetic song in every format, by Debian's encoders. Nothing is
# done when DIR is complete and newer than this script and MAKE_SONG.
set -eu
make_song=$1
out=$2
if [ -e "$out/.complete" ] && [ "$out/.complete" -nt "$0" ] && [ "$out/.complete" -nt "$make_song" ]; then
  exit 0
fi
rm -rf "$out"
mkdir -p "$out"
cd "$out"

# A quarter of it is whole seconds, and so is its highlight: what the WAV source can reach.
"$make_song" song.wav --seconds 80 --bpm 118 --loud-at 31 --seed 5 >/dev/null
flac --totally-silent -5 -o song.flac song.wav
lame --quiet -b 160 -t song.wav constant.mp3
lame --quiet -V 2 song.wav variable.mp3
lame --quiet -V 2 -t song.wav variable_bare.mp3 # without the encoder's table
ffmpeg -nostdin -v error -y -i song.wav -fflags +bitexact -flags:a +bitexact -c:a aac -b:a 160k song.aac
ffmpeg -nostdin -v error -y -i song.aac -fflags +bitexact -c:a copy -bsf:a aac_adtstoasc song.m4a
oggenc --quiet -q 6 -s 1 -o song.ogg song.wav
touch .complete
