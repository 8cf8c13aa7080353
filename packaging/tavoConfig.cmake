# find_package(tavo) defines the target tavo::tavo, the library with its header tavo.h.
include(${CMAKE_CURRENT_LIST_DIR}/tavoTargets.cmake)
