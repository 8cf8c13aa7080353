# Replaces the NDK's toolchain file. Sets the same variables and makes the compiler find Android's jni.h and log
# library, but uses Debian's cross compiler and C library.
include(${CMAKE_CURRENT_LIST_DIR}/../../cmake/aarch64.cmake)
unset(JAVA_INCLUDE_PATH CACHE)
unset(JAVA_INCLUDE_PATH2 CACHE)
set(ANDROID 1)
set(ANDROID_ABI arm64-v8a)
set(includes ${CMAKE_SYSROOT}/usr/include/android)
set(CMAKE_CXX_FLAGS_INIT "-isystem ${includes}/nativehelper -isystem ${includes}")
set(CMAKE_SHARED_LINKER_FLAGS_INIT -L${TAVO_ANDROID_LIBRARIES})
list(APPEND CMAKE_TRY_COMPILE_PLATFORM_VARIABLES TAVO_ANDROID_LIBRARIES)
