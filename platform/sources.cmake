set(platform_sources
  worker_group.cpp)
