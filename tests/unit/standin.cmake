rvd_test(standin_test
  SOURCES ${CMAKE_CURRENT_LIST_DIR}/standin_test.cpp
  LIBRARIES rvd_standin_server rvd_http rvd_credentials rvd_fakes rvd_certificates)
target_compile_definitions(standin_test PRIVATE RVD_STANDIN="$<TARGET_FILE:rvd-standin>")
add_dependencies(standin_test rvd-standin)
