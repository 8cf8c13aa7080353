set(wexaaudio_sources
  # shared
  io_file.cpp frame_index.cpp bundle.cpp av_decoder.cpp pcm16.cpp tags.cpp tags_id3v2.cpp
  # WAV, MPEG audio, FLAC
  wav_reader.cpp
  mpeg_header.cpp mpeg_scan.cpp mpeg_frames.cpp mpeg_reader.cpp mpeg_decoder.cpp
  flac_header.cpp flac_scan.cpp flac_reader.cpp flac_decoder.cpp
  # AAC, MP4, Ogg and Vorbis
  aac_config.cpp aac_stream.cpp adif_scan.cpp aac_reader.cpp aac_decoder.cpp
  mp4_index.cpp mp4_demux.cpp
  vorbis_setup.cpp ogg_scan.cpp ogg_index.cpp ogg_demux.cpp vorbis_decoder.cpp
  )
