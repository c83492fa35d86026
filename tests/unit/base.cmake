rvd_test(base_tests
  SOURCES unit/base_file_test.cpp unit/base_languages_test.cpp unit/base_text_test.cpp
  LIBRARIES rvd_base)
