# Generates report_pages.cpp: the two pages of --report as arrays of strings. Each page is split where the command
# inserts its data.
set(here ${CMAKE_CURRENT_LIST_DIR})
set(parts page.html page.css shared.js song.html song.js index.html index.js)
list(TRANSFORM parts PREPEND ${here}/)
set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${parts})
set(report_pages ${CMAKE_CURRENT_BINARY_DIR}/report_pages.cpp)

set(DATA ")page\", R\"page(")
file(READ ${here}/page.css STYLE)
foreach(page song index)
  file(READ ${here}/${page}.html MAIN)
  file(READ ${here}/shared.js SCRIPT)
  file(READ ${here}/${page}.js own)
  string(APPEND SCRIPT "${own}")
  configure_file(${here}/page.html ${CMAKE_CURRENT_BINARY_DIR}/${page}.html @ONLY)
  file(READ ${CMAKE_CURRENT_BINARY_DIR}/${page}.html ${page}_page)
endforeach()
file(CONFIGURE OUTPUT ${report_pages} @ONLY CONTENT [[
extern const char *const kSongPage[2];
extern const char *const kIndexPage[2];
const char *const kSongPage[] = {R"page(@song_page@)page"};
const char *const kIndexPage[] = {R"page(@index_page@)page"};
]])
