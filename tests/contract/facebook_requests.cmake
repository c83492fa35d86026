rvd_test(facebook_requests_contract_test
  SOURCES ${CMAKE_CURRENT_LIST_DIR}/facebook_requests_contract_test.cpp
  LIBRARIES rvd_http rvd_credentials rvd_fakes rvd_loopback_server)
