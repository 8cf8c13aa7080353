# The device brings both libraries that libtavo.so stands on: the log from the NDK, the codec library
# by its path.
set(TAVO_WEXAAUDIO "" CACHE FILEPATH "libwexaaudio.so for the processor that is built for")
if(NOT EXISTS "${TAVO_WEXAAUDIO}")
  message(FATAL_ERROR "TAVO_WEXAAUDIO must name libwexaaudio.so, not \"${TAVO_WEXAAUDIO}\"")
endif()
# An application's libraries lie in one folder, where Android looks by itself.
set(CMAKE_SKIP_RPATH ON)
add_library(wexaaudio SHARED IMPORTED GLOBAL)
# By name, not by path, whether or not that library says its name itself.
set_target_properties(wexaaudio PROPERTIES IMPORTED_LOCATION ${TAVO_WEXAAUDIO} IMPORTED_NO_SONAME ON)
