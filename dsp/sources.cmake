set(dsp_sources
  fft.cpp
  dft.cpp
  peaks.cpp
  sort.cpp
  stats.cpp
  mel.cpp
  matrix.cpp)
