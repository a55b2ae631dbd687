# End-to-end tests of the dev host: qelwebhost started on a free loopback
# port and driven by curl.
if(NOT TARGET qelwebhost)
  # Keep the gap visible in the test report instead of silently absent.
  add_test(NAME WebhostE2E.Unavailable
    COMMAND ${CMAKE_COMMAND} -E echo "skipped: qelwebhost not built (${QEL_WEBHOST_MISSING})")
  set_tests_properties(WebhostE2E.Unavailable PROPERTIES SKIP_REGULAR_EXPRESSION "skipped:")
  return()
endif()

find_package(OpenSSL REQUIRED)
add_executable(webhost_tests ${CMAKE_CURRENT_LIST_DIR}/WebhostE2ETest.cpp)
target_link_libraries(webhost_tests PRIVATE webhost_request OpenSSL::Crypto GTest::gtest_main GTest::gmock)
target_include_directories(webhost_tests PRIVATE ${PROJECT_SOURCE_DIR}/platform)
target_compile_definitions(webhost_tests PRIVATE
  QEL_WEBHOST_PATH="$<TARGET_FILE:qelwebhost>"
  QEL_RUNTIME_LIB="$<TARGET_FILE:webhost_runtime>")
add_dependencies(webhost_tests qelwebhost)
gtest_discover_tests(webhost_tests DISCOVERY_TIMEOUT 120 PROPERTIES TIMEOUT 120)
