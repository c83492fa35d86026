pkg_check_modules(ICU REQUIRED IMPORTED_TARGET icu-uc)
rvd_test(clients_tests
  SOURCES unit/clients_applications_test.cpp unit/clients_directory_test.cpp unit/clients_identities_test.cpp
          unit/clients_identity_races_test.cpp unit/clients_inspections_test.cpp
          unit/clients_inspector_test.cpp unit/clients_names_test.cpp unit/clients_units_test.cpp
  LIBRARIES rvd_clients rvd_fakes PkgConfig::ICU)

# The control: the same attempts, where what looks again is blind.
rvd_test(clients_identity_races_control SOURCES unit/clients_identity_races_test.cpp LIBRARIES rvd_clients rvd_fakes)
target_compile_definitions(clients_identity_races_control PRIVATE RVD_TEST_WITHOUT_LOOKING_AGAIN)
