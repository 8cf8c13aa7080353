set(jni_sources
  tavo_jni.cpp)
