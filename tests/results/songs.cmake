# Makes the songs whose results must be the same in every run and on every processor: each way of
# converting the rate, one and four segments, slow to fast. -DMAKE_SONG=... -DDIRECTORY=...
file(MAKE_DIRECTORY ${DIRECTORY})
foreach(song IN ITEMS
    "stereo_120;--seconds;70;--bpm;120;--loud-at;24"
    "mono_48k_87;--seconds;40;--bpm;87;--rate;48000;--channels;1"
    "fast_173;--seconds;30;--bpm;173;--seed;2"
    "slow_62;--seconds;45;--bpm;62;--rate;32000;--seed;3"
    "block_2_140;--seconds;25;--bpm;140;--rate;22050"
    "own_rate_100;--seconds;25;--bpm;100;--rate;11025;--channels;1"
    "low_rate_95;--seconds;20;--bpm;95;--rate;8000;--channels;1"
    "one_segment_130;--seconds;4.5;--bpm;130")
  list(POP_FRONT song name)
  execute_process(COMMAND ${MAKE_SONG} ${DIRECTORY}/${name}.wav ${song} COMMAND_ERROR_IS_FATAL ANY)
endforeach()
