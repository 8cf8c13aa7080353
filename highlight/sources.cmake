set(highlight_sources
  power_envelope.cpp
  valleys.cpp
  search.cpp
  region.cpp
  tune.cpp
  position.cpp)
