find_package(GTest REQUIRED)
include(GoogleTest)

# Where the tests are cross-compiled: a build for this machine, whose songs, results and tools they take.
set(TAVO_NATIVE_BUILD "" CACHE PATH "A build for this machine, for tests that run under an emulator")
set(make_song_program $<TARGET_FILE:make_song>)
if(CMAKE_CROSSCOMPILING)
  set(make_song_program ${TAVO_NATIVE_BUILD}/bin/make_song)
endif()

# tavo_cases(NAME property value...): the cases of a GoogleTest program, known to CTest. Under an
# emulator the start costs more than the cases: one start for all of them.
function(tavo_cases name)
  if(CMAKE_CROSSCOMPILING)
    add_test(NAME ${name} COMMAND ${name})
    set_tests_properties(${name} PROPERTIES ${ARGN} TIMEOUT 1800)
  else()
    gtest_discover_tests(${name} DISCOVERY_MODE PRE_TEST PROPERTIES TIMEOUT 300 ${ARGN})
  endif()
endfunction()

# tavo_test(NAME sources... [LIBS libraries...]): one GoogleTest program, its cases known to CTest.
function(tavo_test name)
  cmake_parse_arguments(arg "" "" "LIBS" ${ARGN})
  add_executable(${name} ${arg_UNPARSED_ARGUMENTS})
  target_link_libraries(${name} PRIVATE tavo_options tavo ${arg_LIBS} GTest::gtest_main Threads::Threads)
  tavo_cases(${name})
endfunction()
