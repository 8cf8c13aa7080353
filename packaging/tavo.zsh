#compdef tavo
# Zsh completion for the tavo command.
_arguments -s -S \
  '-h[print the names of the options and end]' \
  '--help[explain the options and end]' \
  '--version[print the version and end]' \
  '(-m --mode)'{-m+,--mode=}'[what to find]:mode:(highlight beats both)' \
  '(-l --length)'{-l+,--length=}'[length of the highlight]:seconds:' \
  '--max-beats=[maximum number of threshold-selected beats]:number:' \
  '--max-minutes=[refuse audio that lasts longer]:number:' \
  '(-j --jobs)'{-j+,--jobs=}'[files analysed in parallel]:number:' \
  '--timeout=[give up a file whose analysis takes longer]:number:' \
  '--normalize[refine the highlight of a quiet song]' \
  '--no-ffmpeg[decode nothing with the ffmpeg program]' \
  '(-f --format)'{-f+,--format=}'[form of the results]:format:(text json csv labels kdenlive llc ffmetadata edl fcpxml otio reaper)' \
  '(-o --output-dir)'{-o+,--output-dir=}'[folder for the marker files]:folder:_files -/' \
  '--print=[write this text for each song]:text:' \
  '--fps=[frames per second for edl and fcpxml]:rate:(23.976 24 25 29.97 29.97df 30 50 59.94 59.94df 60)' \
  '--force[overwrite files that exist]' \
  '--skip-existing[skip inputs whose marker file exists]' \
  '--click=[write the sound with a click on every beat]:WAV file:_files' \
  '(-q --quiet)'{-q,--quiet}'[no progress bar and no notes]' \
  '(-r --recursive)'{-r,--recursive}'[search folders inside folders too]' \
  '*--files-from=[take names from a list]:list:_files' \
  '(-0 --null)'{-0,--null}'[names in lists end with a NUL]' \
  '--clip=[cut the highlight into an audio file]:file or folder:_files' \
  '--fade=[seconds of fade at either end of the clip]:seconds:' \
  '--report=[write a page that shows and plays the result]:file:_files' \
  '--embed[put the sound into the page]' \
  '--store=[keep the results in a database]:file:_files' \
  '--retry-failed[analyse songs again that failed]' \
  '--redo[analyse every song again]' \
  '--from-store[write out what the store holds]' \
  '--failed[with --from-store: the songs that failed]' \
  '--patience=[seconds that a store without an answer is tried again]:number:' \
  '--shard=[only a share of the inputs, I/N]:share:(auto)' \
  '*:audio file or folder:_files'
