# exports.map, the linker's version script: the names of packaging/exports.txt are visible, nothing else.
set(exports ${CMAKE_SOURCE_DIR}/packaging/exports.txt)
set(version_script ${CMAKE_BINARY_DIR}/exports.map)
set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${exports})
file(STRINGS ${exports} export_names REGEX "^[A-Za-z_]")
list(JOIN export_names ";\n    " export_lines)
file(CONFIGURE OUTPUT ${version_script}
  CONTENT "{\n  global:\n    @export_lines@;\n  local:\n    *;\n};\n" @ONLY)
