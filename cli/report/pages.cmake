# Generates report_pages.cpp: the two pages of --report, with their style and scripts, as strings.
set(here ${CMAKE_CURRENT_LIST_DIR})
set(parts page.css song.html shared.js song.js index.html index.js)
list(TRANSFORM parts PREPEND ${here}/)
set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${parts})
set(report_pages ${CMAKE_CURRENT_BINARY_DIR}/report_pages.cpp)

# Keys that the command replaces are kept.
foreach(key TITLE DATA ROWS)
  set(${key} "@${key}@")
endforeach()
file(READ ${here}/page.css STYLE)
file(READ ${here}/shared.js shared)
foreach(page song index)
  file(READ ${here}/${page}.js SCRIPT)
  string(PREPEND SCRIPT "${shared}")
  configure_file(${here}/${page}.html ${CMAKE_CURRENT_BINARY_DIR}/${page}.html @ONLY)
  file(READ ${CMAKE_CURRENT_BINARY_DIR}/${page}.html ${page}_page)
endforeach()
file(CONFIGURE OUTPUT ${report_pages} @ONLY CONTENT [[
#include "cli/report/report_pages.h"

const char kSongPage[] = R"page(@song_page@)page";
const char kIndexPage[] = R"page(@index_page@)page";
]])
