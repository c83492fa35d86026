rvd_test(storage_tests
  SOURCES unit/credentials_evidence_test.cpp unit/credentials_key_test.cpp unit/credentials_keychain_test.cpp
    unit/credentials_move_test.cpp unit/credentials_out_of_reach_test.cpp unit/preferences_test.cpp
    unit/records_damage_test.cpp unit/records_database_test.cpp unit/records_test.cpp
    unit/records_void_request_test.cpp unit/state_directory_test.cpp unit/state_value_text_test.cpp
  LIBRARIES rvd_credentials rvd_records rvd_preferences rvd_fakes)
find_package(sdbus-c++ 1.2 REQUIRED)
rvd_test(secret_service_tests
  SOURCES unit/credentials_secret_service_test.cpp support/SanitizerOptions.cpp
  LIBRARIES rvd_secret_service rvd_credentials rvd_records rvd_fakes SDBusCpp::sdbus-c++)
