# On Windows the waits and the progress timer also run on the system's own
# clock, message queue and window timer.
if(WIN32)
  target_sources(${target} PRIVATE ${dir}/win32_wait_test.cpp)
endif()
