rvd_test(plugin_words_tests
  SOURCES
    unit/plugin_words_names_test.cpp
    unit/plugin_words_clauses_test.cpp
    unit/plugin_words_message_test.cpp
    unit/plugin_words_description_test.cpp
    unit/plugin_words_alert_test.cpp
    unit/plugin_words_language_test.cpp
  LIBRARIES rvd_sentences_support
  LABELS plugin)
