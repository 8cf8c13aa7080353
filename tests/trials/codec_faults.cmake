# Every answer of the codec library made wrong at every call. The scripted codec library's symbols
# come before libwexaaudio.so's.
tavo_test(trial_codec_faults ${CMAKE_CURRENT_LIST_DIR}/codec_faults.cpp LIBS scripted_codec song trial)
set(codec_faults_sanitized 0)
if(TAVO_SANITIZE)
  set(codec_faults_sanitized 1)
endif()
target_compile_definitions(trial_codec_faults PRIVATE CODEC_FAULTS_SANITIZED=${codec_faults_sanitized})
