# What the user reads, made by the plug-in with the compiled string table.
add_library(rvd_sentences_support STATIC ${CMAKE_CURRENT_LIST_DIR}/Sentences.cpp)
target_compile_definitions(rvd_sentences_support PRIVATE
  RVD_PLUGIN_RESOURCES="${CMAKE_BINARY_DIR}/plugins/TKFacebookAccountAccessPlugin/resources")
target_link_libraries(rvd_sentences_support PUBLIC facebook_plugin_objects rvd_fakes rvd_plugins)
add_dependencies(rvd_sentences_support facebook_plugin_resources)

add_executable(rvd-sentences ${CMAKE_CURRENT_LIST_DIR}/SentencesMain.cpp)
target_link_libraries(rvd-sentences PRIVATE rvd_sentences_support)
