set(core_sources
  instance.cpp
  lifecycle.cpp
  jobs.cpp)
