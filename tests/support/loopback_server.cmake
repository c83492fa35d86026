add_library(rvd_loopback_server STATIC ${CMAKE_CURRENT_LIST_DIR}/LoopbackServer.cpp)
target_link_libraries(rvd_loopback_server PUBLIC Threads::Threads)
