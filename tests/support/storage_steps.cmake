add_executable(storage_steps ${CMAKE_CURRENT_LIST_DIR}/StorageSteps.cpp)
target_link_libraries(storage_steps PRIVATE rvd_http rvd_credentials rvd_records rvd_preferences rvd_fakes)

# One point in fifteen; by hand the sweep takes every one.
add_test(NAME storage_kill_sweep.FindsTheOldOrTheNewStateAfterEveryKill
  COMMAND ${CMAKE_CURRENT_LIST_DIR}/storage-kill-sweep $<TARGET_FILE:storage_steps> 15)
set_tests_properties(storage_kill_sweep.FindsTheOldOrTheNewStateAfterEveryKill PROPERTIES TIMEOUT 300)
