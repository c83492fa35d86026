rvd_test(storage_contract_tests
  SOURCES contract/access_log_test.cpp contract/account_store_test.cpp contract/credential_store_test.cpp
    contract/keychain_test.cpp
    contract/notification_center_test.cpp contract/preferences_test.cpp contract/serial_queue_test.cpp
    support/SanitizerOptions.cpp
  LIBRARIES rvd_secret_service rvd_credentials rvd_records rvd_preferences rvd_fakes)
