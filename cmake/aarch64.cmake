# Cross-compiles with Debian's compiler and the libraries that scripts/aarch64-sysroot.sh unpacks; runs programs in
# qemu.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR aarch64)
set(CMAKE_C_COMPILER aarch64-linux-gnu-gcc)
set(CMAKE_CXX_COMPILER aarch64-linux-gnu-g++)

cmake_path(SET CMAKE_SYSROOT NORMALIZE ${CMAKE_CURRENT_LIST_DIR}/../build/aarch64-sysroot)
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)
set(ENV{PKG_CONFIG_SYSROOT_DIR} ${CMAKE_SYSROOT})
set(ENV{PKG_CONFIG_LIBDIR}
  ${CMAKE_SYSROOT}/usr/lib/aarch64-linux-gnu/pkgconfig:${CMAKE_SYSROOT}/usr/share/pkgconfig)
set(CMAKE_CROSSCOMPILING_EMULATOR qemu-aarch64 -L ${CMAKE_SYSROOT})

# jni.h is the same for every processor, so this machine's JDK provides it.
if(DEFINED ENV{JAVA_HOME})
  set(java_home $ENV{JAVA_HOME})
else()
  set(java_home /usr/lib/jvm/default-java)
endif()
set(JAVA_INCLUDE_PATH ${java_home}/include CACHE PATH "Where jni.h is")
set(JAVA_INCLUDE_PATH2 ${java_home}/include/linux CACHE PATH "Where jni_md.h is")
