rvd_test(config_tests
  SOURCES unit/config_entitlements_test.cpp unit/config_ini_test.cpp unit/config_settings_test.cpp
  LIBRARIES rvd_config rvd_fakes)
