rvd_test(json_reader_contract_test
  SOURCES ${CMAKE_CURRENT_LIST_DIR}/json_reader_contract_test.cpp
  LIBRARIES rvd_http rvd_fakes)
