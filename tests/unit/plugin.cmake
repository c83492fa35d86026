# The plug-in, subsystem by subsystem, over the fake host.
foreach(topic object catalogue options request response direct server fault)
  rvd_test(plugin_${topic}_test
    SOURCES ${CMAKE_CURRENT_LIST_DIR}/plugin_${topic}_test.cpp
    LIBRARIES facebook_plugin_objects rvd_fakes
    LABELS plugin)
endforeach()
