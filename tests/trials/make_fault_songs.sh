#!/bin/sh
# make_fault_songs.sh MAKE_SONG DIR: songs whose analysis takes milliseconds, in every format, with
# tags. The brief ones are decoded in one part, the short ones in four; the long ones have a highlight
# that is not at their start; the many have more frames than an index first has room for. Nothing is
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

for song in 'brief 4.5 2' 'short 6 3' 'long 15 8' 'many 150 40'; do
  set -- $song
  # 11025 Hz goes through the block average, 8000 Hz through the interpolator.
  "$make_song" "$1.wav" --seconds "$2" --loud-at "$3" --channels 1 --rate 11025 >/dev/null
  "$make_song" low.wav --seconds "$2" --loud-at "$3" --channels 1 --rate 8000 >/dev/null
  lame --quiet -b 24 -m m --add-id3v2 --tt 'A Title' --ta 'An Artist' --tc 'A comment' "$1.wav" "$1.mp3"
  flac --totally-silent -5 -b 1024 -T 'TITLE=A Title' -T 'KEY=Am' -o "$1.flac" low.wav
  convert low.wav "$1.aac" -c:a aac -b:a 24k
  oggenc --quiet -q 1 -s 1 -t 'A Title' -a 'An Artist' -o "$1.ogg" low.wav
done
convert short.aac short.m4a -c copy -bsf:a aac_adtstoasc -metadata title='A Title' \
  -movflags +delay_moov+default_base_moof -frag_duration 700000
for song in brief long many; do
  convert $song.aac $song.m4a -c copy -bsf:a aac_adtstoasc -metadata title='A Title'
done
rm low.wav
touch .complete
