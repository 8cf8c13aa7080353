# The docs target builds the API reference in docs/html in the build folder.
find_program(DOXYGEN_PROGRAM doxygen)
if(DOXYGEN_PROGRAM)
  configure_file(docs/Doxyfile.in docs/Doxyfile @ONLY)
  add_custom_target(docs COMMAND ${DOXYGEN_PROGRAM} ${CMAKE_BINARY_DIR}/docs/Doxyfile VERBATIM)
endif()
