# The plug-in's tests: its units linked statically (service_tests), and the
# built libqelsysapisvc.so.5 loaded with dlopen and driven through its five
# entry points, as the web server does (plugin_tests).
if(NOT TARGET qelsysapisvc)
  return()
endif()

add_executable(service_tests
  ${CMAKE_CURRENT_LIST_DIR}/FormDataTest.cpp
  ${CMAKE_CURRENT_LIST_DIR}/RequestVariablesTest.cpp)
target_link_libraries(service_tests PRIVATE qel_service GTest::gtest_main GTest::gmock)
target_include_directories(service_tests PRIVATE ${CMAKE_CURRENT_LIST_DIR}/..)
gtest_discover_tests(service_tests DISCOVERY_TIMEOUT 120)

add_executable(plugin_tests
  ${CMAKE_CURRENT_LIST_DIR}/PluginHost.cpp
  ${CMAKE_CURRENT_LIST_DIR}/CatalogueTest.cpp
  ${CMAKE_CURRENT_LIST_DIR}/PluginTest.cpp
  ${CMAKE_CURRENT_LIST_DIR}/OperationsTest.cpp
  ${CMAKE_CURRENT_LIST_DIR}/PluginExportsTest.cpp)
target_link_libraries(plugin_tests PRIVATE webhost_runtime qelsysapi qel_foundation GTest::gtest_main GTest::gmock
  ${CMAKE_DL_LIBS})
target_include_directories(plugin_tests PRIVATE ${CMAKE_CURRENT_LIST_DIR}/.. ${PROJECT_SOURCE_DIR}/platform)
target_compile_definitions(plugin_tests PRIVATE
  QEL_PLUGIN_PATH="$<TARGET_FILE:qelsysapisvc>"
  QEL_RUNTIME_VARIANT_ALL="$<TARGET_FILE:webhost_runtime_variant_all>"
  QEL_RUNTIME_VARIANT_NONE="$<TARGET_FILE:webhost_runtime_variant_none>"
  QEL_RUNTIME_VARIANT_ENCRYPT_KEY_ONLY="$<TARGET_FILE:webhost_runtime_variant_encrypt_key_only>"
  QEL_RUNTIME_VARIANT_NO_MIME="$<TARGET_FILE:webhost_runtime_variant_no_mime>")
add_dependencies(plugin_tests qelsysapisvc webhost_runtime_variant_all webhost_runtime_variant_none
  webhost_runtime_variant_encrypt_key_only webhost_runtime_variant_no_mime)
gtest_discover_tests(plugin_tests DISCOVERY_TIMEOUT 120)
