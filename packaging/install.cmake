# Rules for cmake --install. The public header is installed in include/tavo, which the CMake package and tavo.pc add to
# the include path. The installed files find each other by relative paths.
set(headers_dir ${CMAKE_INSTALL_INCLUDEDIR}/tavo)
set(package_dir ${CMAKE_INSTALL_LIBDIR}/cmake/tavo)
install(FILES include/tavo.h DESTINATION ${headers_dir})
install(TARGETS tavo EXPORT tavo DESTINATION ${CMAKE_INSTALL_LIBDIR}
  INCLUDES DESTINATION ${headers_dir})

# Devices already have these two libraries. Desktops get them in a private folder, because their names are too generic
# for the system's library path: Debian's android-liblog, for example, contains another liblog.
if(NOT ANDROID)
  install(TARGETS log wexaaudio EXPORT tavo DESTINATION ${CMAKE_INSTALL_LIBDIR}/tavo)
  install(TARGETS wexaaudio_av DESTINATION ${CMAKE_INSTALL_LIBDIR}/tavo)  # wexaaudio loads it
endif()

include(CMakePackageConfigHelpers)
write_basic_package_version_file(${CMAKE_BINARY_DIR}/packaging/tavoConfigVersion.cmake
  COMPATIBILITY SameMajorVersion)
install(EXPORT tavo NAMESPACE tavo:: FILE tavoTargets.cmake DESTINATION ${package_dir})
install(FILES packaging/tavoConfig.cmake ${CMAKE_BINARY_DIR}/packaging/tavoConfigVersion.cmake
  DESTINATION ${package_dir})

file(RELATIVE_PATH pc_to_prefix /${CMAKE_INSTALL_LIBDIR}/pkgconfig /)
string(REGEX REPLACE "/$" "" pc_to_prefix ${pc_to_prefix})
configure_file(packaging/tavo.pc.in packaging/tavo.pc @ONLY)
install(FILES ${CMAKE_BINARY_DIR}/packaging/tavo.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

if(TARGET tavo_command)
  install(TARGETS tavo_command DESTINATION ${CMAKE_INSTALL_BINDIR})
  if(TARGET tavo_postgresql)  # the command loads it
    install(TARGETS tavo_postgresql DESTINATION ${CMAKE_INSTALL_LIBDIR}/tavo)
  endif()
  install(DIRECTORY packaging/cluster DESTINATION ${CMAKE_INSTALL_DOCDIR})
  install(FILES packaging/tavo.1 DESTINATION ${CMAKE_INSTALL_MANDIR}/man1)
  install(FILES packaging/tavo.bash RENAME tavo
    DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions)
  install(FILES packaging/tavo.zsh RENAME _tavo DESTINATION ${CMAKE_INSTALL_DATADIR}/zsh/vendor-completions)
  install(FILES packaging/tavo.fish DESTINATION ${CMAKE_INSTALL_DATADIR}/fish/vendor_completions.d)
endif()

# The web page, if it has been built: cmake --preset web && cmake --build --preset web.
install(FILES build/web/tavo.html DESTINATION ${CMAKE_INSTALL_DATADIR}/tavo OPTIONAL)

install(FILES README.md CHANGELOG.md packaging/copyright DESTINATION ${CMAKE_INSTALL_DOCDIR})
install(DIRECTORY docs/ DESTINATION ${CMAKE_INSTALL_DOCDIR}/docs
  FILES_MATCHING REGEX "\\.(md|svg|png)$" PATTERN api.md EXCLUDE)
install(DIRECTORY examples DESTINATION ${CMAKE_INSTALL_DOCDIR})
