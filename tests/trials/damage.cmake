# Files damaged in every way, one after the other. Not under ThreadSanitizer: a damaged file starts
# no other threads than a sound one, and lifecycle runs those there.
if(NOT TAVO_SANITIZE STREQUAL "thread")
  add_executable(trial_damage ${CMAKE_CURRENT_LIST_DIR}/damage.cpp)
  target_link_libraries(trial_damage PRIVATE codec_test trial GTest::gtest_main Threads::Threads)
  tavo_cases(trial_damage FIXTURES_REQUIRED codec_fixtures)
endif()
