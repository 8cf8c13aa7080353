# What every target of ours is compiled with. The precision of each floating-point step is part of the
# result: no contraction into fused multiply-adds, never -ffast-math.
add_library(tavo_options INTERFACE)
target_compile_options(tavo_options INTERFACE
  -ffp-contract=off -Wall -Wextra -Wshadow -Wconversion $<$<BOOL:${TAVO_WERROR}>:-Werror>)
target_include_directories(tavo_options INTERFACE ${CMAKE_SOURCE_DIR})
if(TAVO_SANITIZE)
  add_compile_options(-fsanitize=${TAVO_SANITIZE} -fno-omit-frame-pointer -fno-sanitize-recover=all)
  add_link_options(-fsanitize=${TAVO_SANITIZE})
endif()
