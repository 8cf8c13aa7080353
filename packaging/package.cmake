# cpack: a .deb and a .tar.gz of what is installed. scripts/test-package.sh tries them out.
set(CPACK_GENERATOR DEB TGZ)
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "finds the highlight, the tempo and the beats of songs")
set(CPACK_PACKAGE_DESCRIPTION "\
The command tavo reads WAV, MP3, AAC, MP4, FLAC and Ogg Vorbis files and says
where the strongest sustained loud passage starts, how fast the song is, and at
which times it can be cut on a beat; as text, JSON, CSV, markers for editors or
a page that plays. The library libtavo does the same for C programs, with a class for
Java.")
set(CPACK_PACKAGE_CONTACT "tavo maintainers <maintainers@tavo.invalid>")
set(CPACK_RESOURCE_FILE_README ${CMAKE_SOURCE_DIR}/README.md)
set(CPACK_PACKAGE_DIRECTORY ${CMAKE_BINARY_DIR}/packages)
set(CPACK_STRIP_FILES ON)

set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SECTION sound)
set(CPACK_DEBIAN_PACKAGE_RECOMMENDS "ffmpeg")
set(CPACK_DEBIAN_PACKAGE_SUGGESTS "default-jre-headless, python3-numpy")
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS ${CMAKE_LIBRARY_OUTPUT_DIRECTORY})
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
# What a package that links to libtavo depends on, and the refreshing of the loader's cache. CPack's
# own way would warn about the private libraries, which have no versions.
set(control ${CMAKE_BINARY_DIR}/packaging/control)
file(WRITE ${control}/shlibs "libtavo ${PROJECT_VERSION_MAJOR} tavo (>= ${PROJECT_VERSION})\n")
file(WRITE ${control}/triggers "activate-noawait ldconfig\n")
set(CPACK_DEBIAN_PACKAGE_CONTROL_EXTRA ${control}/shlibs ${control}/triggers)
include(CPack)
