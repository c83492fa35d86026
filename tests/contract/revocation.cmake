# What a revocation leaves to those who come while it is under way. More of them: RVD_INTERLEAVINGS=10000.
add_executable(revocation_interleavings ${CMAKE_CURRENT_LIST_DIR}/revocation_interleavings_test.cpp)
target_link_libraries(revocation_interleavings
  PRIVATE facebook_plugin_objects rvd_credentials rvd_records rvd_requests rvd_fakes GTest::gmock_main
          Threads::Threads)
gtest_discover_tests(revocation_interleavings
  TEST_PREFIX "revocation_interleavings." DISCOVERY_TIMEOUT 60 PROPERTIES TIMEOUT 3000)
