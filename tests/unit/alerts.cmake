rvd_test(alerts_tests
  SOURCES ${CMAKE_CURRENT_LIST_DIR}/alerts_test.cpp
  LIBRARIES rvd_alerts
  LABELS unit)
