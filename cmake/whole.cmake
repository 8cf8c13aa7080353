# tavo_whole: the library, the codec library's stand-in and the log as one static library, for programs
# that put functions of their own in the place of malloc, read or pthread_create, or that call what the
# library does not export.
add_library(tavo_whole STATIC EXCLUDE_FROM_ALL
  $<TARGET_OBJECTS:tavo_objects> $<TARGET_OBJECTS:wexaaudio_objects>
  $<TARGET_OBJECTS:wexaaudio_av_objects> ${CMAKE_SOURCE_DIR}/desktop/wexaaudio/shared/codec_linked.cpp)
target_link_libraries(tavo_whole PUBLIC
  tavo_options log PkgConfig::wexaaudio_libs PkgConfig::wexaaudio_av_libs Threads::Threads m)
