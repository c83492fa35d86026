rvd_test(log_tests SOURCES unit/log_format_test.cpp unit/log_test.cpp LIBRARIES rvd_log)
