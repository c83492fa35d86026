rvd_test(rehearsal_tests
  SOURCES unit/rehearsal_test.cpp unit/rehearsal_property_test.cpp
  LIBRARIES facebook_plugin_objects rvd_rehearsal rvd_plugins rvd_credentials rvd_records rvd_fakes)
target_compile_definitions(rehearsal_tests PRIVATE BUILT_PLUGINS="${CMAKE_BINARY_DIR}/plugins")
add_dependencies(rehearsal_tests facebook_plugin_resources)
