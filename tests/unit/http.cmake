rvd_test(http_test
  SOURCES ${CMAKE_CURRENT_LIST_DIR}/http_server_url_test.cpp
          ${CMAKE_CURRENT_LIST_DIR}/http_transfer_test.cpp
  LIBRARIES rvd_http rvd_fakes rvd_loopback_server)
