#!/usr/bin/env bash
# fuzz/seeds.sh DIR: first inputs for every fuzzer, into DIR/TARGET: short files in every shape, by
# Debian's encoders, behind the bytes with which each program's input begins.
set -euo pipefail
out=${1:?seeds.sh DIR}
for tool in ffmpeg lame flac oggenc; do
  command -v "$tool" >/dev/null || { echo "seeds.sh: $tool is missing" >&2; exit 1; }
done
mkdir -p "$out"
out=$(realpath -- "$out")
files=$(mktemp -d)
trap 'rm -rf "$files"' EXIT
cd "$files"

tone() { # tone FILE SECONDS RATE CHANNELS: hits every half second over a quiet tone
  ffmpeg -nostdin -v error -y -f lavfi \
    -i "aevalsrc=0.1*sin(1380*t)+0.5*sin(2760*t)*exp(-9*mod(t\\,0.5)):d=$2:s=$3" -ac "$4" \
    -fflags +bitexact "$1"
}
convert() { # convert IN OUT OPTIONS...
  local in=$1 to=$2
  shift 2
  ffmpeg -nostdin -v error -y -i "$in" -map_metadata -1 -fflags +bitexact -flags:a +bitexact "$@" "$to"
}

tone mono8.wav 1.2 8000 1
tone stereo8.wav 0.4 8000 2
tone six8.wav 0.1 8000 6
tone mono22.wav 0.5 22050 1
tone stereo44.wav 0.2 44100 2
tone long8.wav 6.5 8000 1

# WAV, and what is refused
convert mono8.wav wide.wav -c:a pcm_s24le
convert mono8.wav law.wav -c:a pcm_mulaw
convert stereo8.wav rf64.wav -c:a pcm_s16le -rf64 always

# MPEG audio
lame --quiet -b 8 -m m -t mono8.wav low.mp3
lame --quiet -b 8 -m m long8.wav long.mp3
lame --quiet -b 32 -t stereo44.wav delayed.mp3
lame --quiet -V 9 mono22.wav table.mp3
lame --quiet -b 16 -p -t stereo8.wav checked.mp3
lame --quiet -V 6 --add-id3v2 --tt Title --ta Artist --tl Album --tc Comment --ty 1999 --tn 3/9 \
  --tg Rock stereo44.wav tagged.mp3
convert stereo44.wav layer2.mp2 -c:a mp2 -b:a 64k
convert mono22.wav lsf.mp2 -ar 22050 -c:a mp2 -b:a 32k

# FLAC
flac --totally-silent -8 --no-padding -o table.flac mono8.wav
flac --totally-silent -8 --no-padding --no-seektable -b 256 -T TITLE=Title -T KEY=Am -o short.flac stereo8.wav
flac --totally-silent -8 --no-padding --no-seektable --channel-map=none -o six.flac six8.wav
ffmpeg -nostdin -v error -f lavfi -i 'aevalsrc=0.001*sin(300*t):d=18:s=8000' quiet.wav
flac --totally-silent --lax -8 --no-padding -b 65535 -o huge.flac quiet.wav
rm quiet.wav
flac --totally-silent -8 --no-padding -o wide.flac wide.wav

# AAC
convert mono8.wav mono.aac -c:a aac -b:a 8k
convert stereo44.wav stereo.aac -c:a aac -b:a 24k
convert six8.wav six.aac -c:a aac -b:a 32k
convert long8.wav long.aac -c:a aac -b:a 8k

{ # ADIF: its header, then what lies between the ADTS headers
  printf 'ADIF\x10\0\0\0\x0d\x88\0\0\0\0'
  ffmpeg -nostdin -v error -i mono.aac -map 0:a -c copy -bsf:a aac_adtstoasc -f data -
} >adif.aac

# MP4
convert mono.aac last.m4a -c:a copy -bsf:a aac_adtstoasc
convert stereo.aac first.m4a -c:a copy -bsf:a aac_adtstoasc -movflags +faststart
convert long.aac fragmented.mp4 -c:a copy -bsf:a aac_adtstoasc \
  -movflags +delay_moov+default_base_moof -frag_duration 700000
ffmpeg -nostdin -v error -y -i mono.aac -c copy -bsf:a aac_adtstoasc -metadata title=Title tagged.m4a
ffmpeg -nostdin -v error -y -f lavfi -i testsrc=size=16x16:rate=2:duration=1 -i mono.aac \
  -map 0:v -map 1:a -c:v mpeg4 -c:a copy -bsf:a aac_adtstoasc video.mp4
convert delayed.mp3 layer3.mp4 -c:a copy
convert mono8.wav alac.m4a -c:a alac

# Ogg
oggenc --quiet -q -1 -s 1 -t Title -o mono.ogg mono8.wav
oggenc --quiet -q -1 -s 2 -o stereo.ogg stereo8.wav
oggenc --quiet -q -1 -s 3 -o long.ogg long8.wav
convert mono8.wav opus.ogg -c:a libopus -b:a 8k
cat mono.ogg stereo.ogg >chained.ogg

# The same behind a tag, and cut short.
printf 'ID3\x03\0\0\0\0\0\x0a\0\0\0\0\0\0\0\0\0\0' >tag
for file in mono.aac short.flac delayed.mp3; do cat tag "$file" >"behind_tag_$file"; done
for file in low.mp3 table.flac mono.aac last.m4a mono.ogg mono22.wav wide.wav six8.wav; do
  head -c 700 "$file" >"cut_$file"
done
rm long8.wav mono22.wav wide.wav six8.wav
# What is recognised and refused, or looks like something else.
printf '\x30\x26\xb2\x75\x8e\x66\xcf\x11\xa6\xd9\0\xaa\0\x62\xce\x6c' >other.asf
{ printf G; head -c 187 low.mp3; printf G; head -c 300 low.mp3; } >other.ts
{ printf '\0\0\1\xba'; head -c 300 low.mp3; } >other.mpg

seed() { # seed TARGET NAME START FILE...
  local to="$out/$1/$2" start=$3
  shift 3
  mkdir -p "$(dirname "$to")"
  { printf '%b' "$start"; cat "$@"; } >"$to"
}
whole='\0\xff\0\xff\0\xff\x05\x05'
seeks='\x07\x30\x03\xc8\0\x21\x06\0'
for format in wav:.wav mpeg:.mp[23] flac:.flac aac:.aac mp4:.m[4p][a4] ogg:.ogg; do
  for file in *${format#*:}; do
    seed "source_${format%%:*}" "$file" "$whole" "$file"
    seed "source_${format%%:*}" "seeks_$file" "$seeks" "$file"
  done
done
for file in *.wav; do
  seed wav_reader "$file" '\x02\xff\x03\x20\0\x01\x02\xff\x01\x02\x02\x10\x02\x01\x01\x01' "$file"
done
for file in *.*; do
  head -c 1000 "$file" >head
  seed recognise "$file" '\0' head
  seed recognise_far "$file" '\0' head
done
mode=0
for file in *.mp3 *.flac *.aac *.m4a *.mp4 *.ogg mono8.wav; do
  seed job "$file" "\\x0$mode\x05\0\0\0" "$file"
  mode=$(((mode + 1) % 3))
done
head -c 44 mono8.wav >header
for mode in 0 1 2; do # data of no length: up to the end of the file, which is padding
  { head -c 40 header; printf '\0\0\0\0'; } >open
  seed job "pads_$mode" "\\x0$mode\x0a\0\0\xff" open
  seed job "stop_$mode" "\\x0$mode\0\x05\x03\xff" open
done

# Toolkit and stages: plain values of several lengths for each choice of a function.
tail -c 600 long.mp3 >noise
for target in peaks sorts transforms highlight; do
  for which in 0 1 2 3 4; do
    for length in 24 160 600; do
      head -c "$length" noise >values
      seed "$target" "${which}_$length" "\\x0$which" values
    done
  done
done
for which in 00 01 02 03 f0 f8 fc fd; do
  seed beats "$which" "\\x$which" noise
  seed beats "silence_$which" "\\x$which" <(head -c 300 /dev/zero)
done
for what in 0 1 2 3; do
  for rate in 00 02 06 0a 0c 0d 0f e3; do
    seed converter "${what}_$rate" "\\x0$what\\x$rate" noise
  done
done
