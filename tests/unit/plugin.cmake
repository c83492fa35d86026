# The plug-in, subsystem by subsystem, over the fake host.
foreach(topic object catalogue options request response direct server fault)
  rvd_test(plugin_${topic}_test
    SOURCES ${CMAKE_CURRENT_LIST_DIR}/plugin_${topic}_test.cpp
    LIBRARIES facebook_plugin_objects rvd_fakes
    LABELS plugin)
  # With a sanitizer's checks in between, g++ loses track of what an optional holds.
  if(RVD_SANITIZER AND CMAKE_CXX_COMPILER_ID STREQUAL GNU)
    target_compile_options(plugin_${topic}_test PRIVATE -Wno-maybe-uninitialized)
  endif()
endforeach()
