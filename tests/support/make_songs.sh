#!/bin/sh
# make_songs.sh MAKE_SONG DIR: makes all songs for the tests, with make_song and Debian's encoders.
# DIR/codec: every kind of stream and container. DIR/formats: one song in each format. DIR/short: songs
# whose analysis takes milliseconds. DIR/jni: WAV files. Does nothing if DIR is complete and newer than
# this script and the sources of MAKE_SONG.
set -eu
make_song=$1
out=$2
exec 9>"$out.lock"
flock 9 # another build may make the same songs
here=$(dirname "$0")
if [ -e "$out/.complete" ] && [ -z "$(find "$0" "$here"/*song*.cpp -newer "$out/.complete")" ]; then
  exit 0
fi
rm -rf "$out"
mkdir -p "$out/codec" "$out/formats" "$out/short" "$out/jni"

convert() { # convert IN OUT OPTIONS...: converts with ffmpeg, without its version in the file
  in=$1 to=$2
  shift 2
  ffmpeg -nostdin -v error -y -i "$in" "$@" -map_metadata -1 -fflags +bitexact -flags:a +bitexact "$to"
}

cd "$out/codec"
"$make_song" song.wav --seconds 12
"$make_song" mono.wav --seconds 12 --channels 1
"$make_song" song48.wav --seconds 12 --rate 48000
"$make_song" six.wav --seconds 6 --channels 6

lame --quiet -b 128 -t song.wav cbr.mp3
lame --quiet -b 320 -h -t song48.wav cbr48.mp3
lame --quiet -V 2 song.wav vbr.mp3
lame --quiet -V 2 -t song.wav vbr_no_table.mp3
lame --quiet -b 96 -p -t song.wav checked.mp3
lame --quiet -b 64 -m m -t mono.wav mono.mp3
lame --quiet -b 56 --resample 22.05 -t song.wav lsf.mp3
lame --quiet -b 8 -m m --resample 8 -t song.wav low.mp3
convert song.wav layer2.mp2 -c:a mp2 -b:a 192k

flac --totally-silent -5 -o song.flac song.wav
flac --totally-silent -5 --no-seektable -T 'TITLE=A Title' -o no_table.flac song.wav
flac --totally-silent -5 -o mono.flac mono.wav
flac --totally-silent -5 --channel-map=none -o six.flac six.wav
convert song.wav wide.wav -c:a pcm_s24le -ar 96000 -af 'volume=0.77' -t 6
flac --totally-silent -5 -o wide.flac wide.wav
convert song.wav noise.wav -c:a pcm_s24le -af 'aeval=random(0)*1.8-0.9|random(1)*1.8-0.9' -t 6
flac --totally-silent --lax -0 -b 65535 -o noise.flac noise.wav

# The AAC encoder substitutes noise by default, more of it at low rates.
convert song.wav low.aac -c:a aac -b:a 128k
convert song48.wav high.aac -c:a aac -b:a 320k -aac_pns 0
convert mono.wav mono.aac -c:a aac -b:a 64k
convert six.wav six.aac -c:a aac -b:a 384k -aac_pns 0
convert song48.wav loud.aac -c:a aac -b:a 320k -aac_pns 0 -af volume=12dB # exceeds full scale
convert mono.wav core.aac -c:a aac -b:a 32k -ar 22050

# MP4 files of different layouts. Most of them contain the frames of low.aac.
convert low.aac last.m4a -c:a copy -bsf:a aac_adtstoasc
convert low.aac first.m4a -c:a copy -bsf:a aac_adtstoasc -movflags +faststart
convert high.aac high.m4a -c:a copy -bsf:a aac_adtstoasc -movflags +faststart
convert low.aac fragmented.mp4 -c:a copy -bsf:a aac_adtstoasc \
  -movflags +delay_moov+default_base_moof -frag_duration 700000
ffmpeg -nostdin -v error -f lavfi -i testsrc=size=64x64:rate=10:duration=12 video.avi
convert video.avi video.mp4 -i low.aac -map 0:v -map 1:a -c copy -bsf:a aac_adtstoasc
convert video.mp4 fragments.mp4 -c copy -movflags +delay_moov+default_base_moof -frag_duration 700000
convert mono.mp3 layer3.mp4 -c:a copy
convert cbr.mp3 stereo3.mp4 -c:a copy

oggenc --quiet -q 4 -s 1 -t 'A Title' -a 'An Artist' -l 'An Album' -o song.ogg song.wav
oggenc --quiet -q 2 -s 3 -o mono.ogg mono.wav
oggenc --quiet -q 2 -s 4 -o six.ogg six.wav
convert video.avi video.ogv -i song.ogg -map 0:v -map 1:a -c:v libtheora -c:a copy

cd "$out/formats"
# Every fourth hit is much stronger than the others, so that rounding of samples does not change the beats.
"$make_song" hits.wav --drums 0.08 --bed 0.37 --seconds 80 --loud-at 31 --seed 2
"$make_song" accents.wav --drums 0.6 --bed 0 --bpm 30 --seconds 80 --loud-at 31 --seed 9
convert hits.wav song.wav -i accents.wav -filter_complex amix=normalize=0 -c:a pcm_s16le
rm hits.wav accents.wav
flac --totally-silent -5 -o song.flac song.wav
lame --quiet -b 160 -t song.wav constant.mp3
convert song.wav song.aac -c:a aac -b:a 160k
convert song.aac song.m4a -c:a copy -bsf:a aac_adtstoasc
oggenc --quiet -q 6 -s 1 -o song.ogg song.wav

# A job decodes "brief" in one segment, the others in four. The highlight of "long" is not at its
# start. "many" has more frames than the initial capacity of a frame index. WAV and MP3 files are at
# 11025 Hz and resampled with block averages. The other files are at 8000 Hz and interpolated.
cd "$out/short"
while read -r name seconds loud_at; do
  "$make_song" "$name.wav" --seconds "$seconds" --loud-at "$loud_at" --channels 1 --rate 11025
  "$make_song" low.wav --seconds "$seconds" --loud-at "$loud_at" --channels 1 --rate 8000
  lame --quiet -b 24 -m m --add-id3v2 --tt 'A Title' --ta 'An Artist' --tc 'A comment' "$name.wav" "$name.mp3"
  flac --totally-silent -5 -b 1024 -T 'TITLE=A Title' -T 'KEY=Am' -o "$name.flac" low.wav
  convert low.wav "$name.aac" -c:a aac -b:a 24k
  oggenc --quiet -q 1 -s 1 -t 'A Title' -a 'An Artist' -o "$name.ogg" low.wav
  fragments=
  [ "$name" != long ] || fragments='-movflags +delay_moov+default_base_moof -frag_duration 700000'
  # shellcheck disable=SC2086 # words
  convert "$name.aac" "$name.m4a" -c copy -bsf:a aac_adtstoasc -metadata title='A Title' $fragments
  rm low.wav
done <<END
brief 4.5 2
long 15 8
many 150 40
END

cd "$out/jni"
"$make_song" song.wav --seconds 20 --loud-at 6
"$make_song" clip.wav --seconds 2

touch "$out/.complete"
