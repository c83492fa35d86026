# Each file of tests is one test of CTest's; pytest says within it what failed.
set(system_python /usr/bin/python3)  # the one for which Debian packages gi and pytest

file(GLOB integration_tests CONFIGURE_DEPENDS ${CMAKE_CURRENT_LIST_DIR}/test_*.py)
foreach(path ${integration_tests})
  get_filename_component(name ${path} NAME_WE)
  string(REGEX REPLACE "^test_" "integration." name ${name})
  add_test(NAME ${name}
    COMMAND ${system_python} -B -m pytest -q -p no:cacheprovider ${path} --build-dir ${CMAKE_BINARY_DIR})
  set_tests_properties(${name} PROPERTIES LABELS integration TIMEOUT 1800)
endforeach()

# What a newcomer runs first. Where it hangs it is told to end, so that it takes along what it has started.
foreach(answer allow refuse)
  add_test(NAME integration.demo_${answer}
    COMMAND timeout 600 ${CMAKE_SOURCE_DIR}/scripts/demo --answer ${answer} --build-dir ${CMAKE_BINARY_DIR})
  set_tests_properties(integration.demo_${answer} PROPERTIES LABELS integration TIMEOUT 700)
endforeach()
