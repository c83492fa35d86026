pkg_check_modules(ICU REQUIRED IMPORTED_TARGET icu-uc)
rvd_test(upper_case_tests
  SOURCES unit/upper_case_test.cpp ${CMAKE_SOURCE_DIR}/Facebook/FacebookAccessPlugin/UpperCase.cpp
  LIBRARIES PkgConfig::ICU)

find_program(PYTHON3 python3 PATHS /usr/bin NO_DEFAULT_PATH REQUIRED)
add_test(NAME upper_case_table.IsWhatTheGeneratorMakes
  COMMAND ${CMAKE_CURRENT_SOURCE_DIR}/support/same-output
    ${CMAKE_SOURCE_DIR}/Facebook/FacebookAccessPlugin/UpperCaseTable.inc
    ${PYTHON3} ${CMAKE_SOURCE_DIR}/scripts/generate-upper-case)
