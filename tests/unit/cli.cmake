rvd_test(cli_tests
  SOURCES unit/cli_output_test.cpp unit/cli_period_test.cpp unit/cli_values_test.cpp
  LIBRARIES rvd_cli rvd_proxies hostile_texts)
