# Failures of memory, threads, locks and files, at every place. What is tried does not depend on the
# processor, and takes minutes under an emulator.
if(CMAKE_CROSSCOMPILING)
  return()
endif()
set(fault_songs ${CMAKE_BINARY_DIR}/fault_songs)
add_test(NAME fault_songs
  COMMAND ${CMAKE_CURRENT_LIST_DIR}/make_fault_songs.sh ${make_song_program} ${fault_songs})
set_tests_properties(fault_songs PROPERTIES FIXTURES_SETUP fault_songs TIMEOUT 300)

# How many places the quick tier tries, and in how many formats where one test goes through them.
set(fault_sample 8)
set(fault_formats 6)
if(TAVO_SANITIZE STREQUAL "thread")
  set(fault_sample 3)
  set(fault_formats 1)
elseif(TAVO_SANITIZE)
  set(fault_sample 4)
endif()
add_executable(trial_faults faults.cpp fault_run.cpp fault_plan.cpp)
target_compile_definitions(trial_faults PRIVATE FAULT_SONGS="${fault_songs}"
  FAULT_SAMPLE=${fault_sample} FAULT_FORMATS=${fault_formats})
target_link_libraries(trial_faults PRIVATE tavo_whole trial GTest::gtest_main)
foreach(call malloc calloc realloc free av_malloc av_mallocz av_free av_freep
    av_packet_alloc av_packet_free av_new_packet av_frame_alloc av_frame_free
    avcodec_alloc_context3 avcodec_free_context avcodec_open2 avcodec_send_packet
    avcodec_receive_frame avformat_alloc_context avformat_open_input avformat_close_input
    avio_alloc_context avio_context_free av_dict_set av_read_frame av_vorbis_parse_init
    av_vorbis_parse_free ogg_sync_buffer
    pthread_create pthread_mutex_init pthread_mutex_destroy pthread_cond_init pthread_cond_destroy
    open dup read lseek64 close fopen fwrite fclose
    mtsrc_seekstream mtsrc_getstream construct_decbuf DecodePcmMT)
  target_link_options(trial_faults PRIVATE -Wl,--wrap=${call})
endforeach()
tavo_cases(trial_faults FIXTURES_REQUIRED fault_songs)
