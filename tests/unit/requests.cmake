rvd_test(requests_tests
  SOURCES ${CMAKE_CURRENT_LIST_DIR}/requests_context_test.cpp
          ${CMAKE_CURRENT_LIST_DIR}/requests_pool_test.cpp
          ${CMAKE_CURRENT_LIST_DIR}/requests_table_test.cpp
          ${CMAKE_CURRENT_LIST_DIR}/requests_limits_test.cpp
          ${CMAKE_CURRENT_LIST_DIR}/requests_rate_test.cpp
  LIBRARIES rvd_requests
  LABELS unit)
