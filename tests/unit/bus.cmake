rvd_test(bus_tests
  SOURCES ${CMAKE_CURRENT_LIST_DIR}/bus_values_test.cpp
          ${CMAKE_CURRENT_LIST_DIR}/bus_token_test.cpp
  LIBRARIES rvd_bus_values
  LABELS unit)
