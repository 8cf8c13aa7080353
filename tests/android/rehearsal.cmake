# Builds the library with toolchain.cmake, which replaces the NDK's toolchain file, and checks the result. The log
# library and the codec library in the directory LIBRARIES replace those of a device.
# Arguments: -DSOURCE=... -DDIRECTORY=... -DLIBRARIES=...
file(REMOVE_RECURSE ${DIRECTORY})
set(configure ${CMAKE_COMMAND} -S ${SOURCE} -B ${DIRECTORY} -G Ninja -DCMAKE_BUILD_TYPE=Release
  -DCMAKE_TOOLCHAIN_FILE=${CMAKE_CURRENT_LIST_DIR}/toolchain.cmake
  -DTAVO_ANDROID_LIBRARIES=${LIBRARIES})

execute_process(COMMAND ${configure} RESULT_VARIABLE code OUTPUT_QUIET ERROR_VARIABLE error)
if(code EQUAL 0 OR NOT error MATCHES "TAVO_WEXAAUDIO")
  message(FATAL_ERROR "without a codec library: ${error}")
endif()
execute_process(COMMAND ${configure} -DTAVO_WEXAAUDIO=${LIBRARIES}/libwexaaudio.so
  COMMAND_ERROR_IS_FATAL ANY)
execute_process(COMMAND ${CMAKE_COMMAND} --build ${DIRECTORY} COMMAND_ERROR_IS_FATAL ANY)

file(GLOB_RECURSE built RELATIVE ${DIRECTORY} ${DIRECTORY}/*.so ${DIRECTORY}/*.jar ${DIRECTORY}/bin/*)
list(FILTER built EXCLUDE REGEX "CMakeFiles/")
if(NOT built STREQUAL "lib/libtavo.so")
  message(FATAL_ERROR "built more than the library: ${built}")
endif()
execute_process(COMMAND aarch64-linux-gnu-readelf -dW ${DIRECTORY}/lib/libtavo.so
  OUTPUT_VARIABLE dynamic COMMAND_ERROR_IS_FATAL ANY)
foreach(needed liblog.so libwexaaudio.so)
  if(NOT dynamic MATCHES "NEEDED[^\n]*\\[${needed}\\]")
    message(FATAL_ERROR "${needed} is not needed by name:\n${dynamic}")
  endif()
endforeach()
if(dynamic MATCHES "RUNPATH|RPATH" OR NOT dynamic MATCHES "SONAME[^\n]*\\[libtavo\\.so\\]")
  message(FATAL_ERROR "paths of this machine, or another name than libtavo.so:\n${dynamic}")
endif()
execute_process(COMMAND aarch64-linux-gnu-readelf -lW ${DIRECTORY}/lib/libtavo.so
  OUTPUT_VARIABLE segments COMMAND_ERROR_IS_FATAL ANY)
string(REGEX MATCHALL "\n +LOAD [^\n]*" loads "${segments}")
string(REGEX MATCHALL "\n +LOAD [^\n]* 0x4000" aligned "${segments}")
if(NOT loads OR NOT loads STREQUAL aligned)
  message(FATAL_ERROR "segments that are not aligned to 16 KiB:\n${segments}")
endif()
