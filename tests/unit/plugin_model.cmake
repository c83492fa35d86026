rvd_test(plugin_model_test
  SOURCES ${CMAKE_CURRENT_LIST_DIR}/plugin_model_test.cpp ${CMAKE_CURRENT_LIST_DIR}/../support/DecisionModel.cpp
  LIBRARIES facebook_plugin_objects rvd_fakes)
