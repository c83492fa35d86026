rvd_test(texts_contract_tests
  SOURCES contract/log_contract_test.cpp contract/string_table_contract_test.cpp
  LIBRARIES rvd_log rvd_plugins rvd_fakes
  LABELS contract)
