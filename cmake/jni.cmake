# jni.h: the NDK's compiler has its own, elsewhere it comes from a JDK, of which nothing is linked.
if(NOT ANDROID)
  find_package(JNI QUIET)
  if(NOT JAVA_INCLUDE_PATH OR NOT JAVA_INCLUDE_PATH2)
    message(FATAL_ERROR "jni.h not found: install a JDK (default-jdk-headless), set JAVA_HOME, "
      "or build without the bridge (-DTAVO_BUILD_JNI=OFF)")
  endif()
  target_include_directories(tavo_jni_headers SYSTEM INTERFACE
    ${JAVA_INCLUDE_PATH} ${JAVA_INCLUDE_PATH2})
endif()
