# tavo_test(NAME sources... [LIBS libraries...]): one GoogleTest program, its cases known to CTest.
find_package(GTest REQUIRED)
include(GoogleTest)
function(tavo_test name)
  cmake_parse_arguments(arg "" "" "LIBS" ${ARGN})
  add_executable(${name} ${arg_UNPARSED_ARGUMENTS})
  target_link_libraries(${name} PRIVATE tavo_options tavo ${arg_LIBS} GTest::gtest_main Threads::Threads)
  if(CMAKE_CROSSCOMPILING)  # under an emulator the start costs more than the cases: one start for all
    add_test(NAME ${name} COMMAND ${name})
    set_tests_properties(${name} PROPERTIES TIMEOUT 1800)
  else()
    gtest_discover_tests(${name} DISCOVERY_MODE PRE_TEST PROPERTIES TIMEOUT 300)
  endif()
endfunction()
