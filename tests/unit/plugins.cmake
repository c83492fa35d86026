set(testModules ${CMAKE_CURRENT_BINARY_DIR}/test-modules)

# One bundle with one module; ENTRY: the members of its entry point, nothing for a module without one.
function(rvd_test_module name entry)
  add_library(test_module_${name} MODULE unit/plugins_test_module.cpp)
  set_target_properties(test_module_${name} PROPERTIES
    PREFIX "" OUTPUT_NAME ${name} LIBRARY_OUTPUT_DIRECTORY ${testModules}/${name})
  if(entry)
    target_compile_definitions(test_module_${name} PRIVATE "TEST_MODULE_ENTRY=${entry}")
  else()
    target_compile_definitions(test_module_${name} PRIVATE TEST_MODULE_WITHOUT_ENTRY)
  endif()
  add_dependencies(plugins_tests test_module_${name})
endfunction()

rvd_test(plugins_tests
  SOURCES unit/plugins_catalogue_test.cpp unit/plugins_module_test.cpp unit/plugins_string_table_test.cpp
  LIBRARIES rvd_plugins rvd_fakes)
target_compile_definitions(plugins_tests PRIVATE
  TEST_MODULES="${testModules}" BUILT_PLUGINS="${CMAKE_BINARY_DIR}/plugins")
add_dependencies(plugins_tests facebook_plugin)

rvd_test_module(Working "kRVDAccountAccessPluginABIVersion, \"WorkingPlugin\", supports, initWorking")
rvd_test_module(OtherVersion "99, \"OtherPlugin\", abortingSupports, abortingInit")
rvd_test_module(NullInit "kRVDAccountAccessPluginABIVersion, \"NullPlugin\", supports, initNull")
rvd_test_module(ThrowingInit "kRVDAccountAccessPluginABIVersion, \"ThrowingPlugin\", supports, initThrowing")
rvd_test_module(Incomplete "kRVDAccountAccessPluginABIVersion, \"IncompletePlugin\", supports, nullptr")
rvd_test_module(WithoutEntry "")
file(WRITE ${testModules}/NoModule/NoModule.so "no module\n")

find_program(MSGFMT msgfmt REQUIRED)
foreach(language de en)
  set(words ${testModules}/Working/resources/Localizable/${language}.mo)
  add_custom_command(OUTPUT ${words}
    COMMAND ${CMAKE_COMMAND} -E make_directory ${testModules}/Working/resources/Localizable
    COMMAND ${MSGFMT} -o ${words} ${CMAKE_CURRENT_SOURCE_DIR}/unit/plugins_test_words/${language}.po
    DEPENDS unit/plugins_test_words/${language}.po)
  list(APPEND testModuleWords ${words})
endforeach()
add_custom_target(test_module_words DEPENDS ${testModuleWords})
add_dependencies(plugins_tests test_module_words)
