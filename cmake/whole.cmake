# tavo_whole: the library, the codec library's stand-in and the log once more, as one static library
# for programs that put functions of their own in the place of malloc, read or pthread_create, or
# that call what the library does not export.
include(${CMAKE_SOURCE_DIR}/platform/wexaaudio/sources.cmake)
list(TRANSFORM wexaaudio_sources PREPEND ${CMAKE_SOURCE_DIR}/platform/wexaaudio/)
add_library(tavo_whole STATIC EXCLUDE_FROM_ALL ${wexaaudio_sources})
foreach(folder core media_source pcm highlight beat dsp platform)
  include(${CMAKE_SOURCE_DIR}/${folder}/sources.cmake)
  list(TRANSFORM ${folder}_sources PREPEND ${CMAKE_SOURCE_DIR}/${folder}/)
  target_sources(tavo_whole PRIVATE ${${folder}_sources})
endforeach()
find_package(PkgConfig REQUIRED)
pkg_check_modules(whole_libs REQUIRED IMPORTED_TARGET libavcodec libavutil libavformat ogg)
target_link_libraries(tavo_whole PUBLIC tavo_options log PkgConfig::whole_libs Threads::Threads m)
