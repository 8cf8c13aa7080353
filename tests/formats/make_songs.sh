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
convert() { # convert IN OUT OPTIONS...
  in=$1 to=$2
  shift 2
  ffmpeg -nostdin -v error -y -i "$in" -fflags +bitexact -flags:a +bitexact "$@" "$to"
}

"$make_song" song.wav
flac --totally-silent -5 -o song.flac song.wav
lame --quiet -b 160 -t song.wav constant.mp3
lame --quiet -V 2 song.wav variable.mp3
lame --quiet -V 2 -t song.wav variable_bare.mp3 # without the encoder's table
convert song.wav song.aac -c:a aac -b:a 160k
convert song.aac song.m4a -c:a copy -bsf:a aac_adtstoasc
oggenc --quiet -q 6 -s 1 -o song.ogg song.wav

# The song as late as the encoders make it.
for samples in 576 1024; do
  convert song.wav late.wav -af "adelay=${samples}S:all=1"
  flac --totally-silent -5 -o "late_$samples.flac" late.wav
  rm late.wav
done
touch .complete
