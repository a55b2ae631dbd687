# Tests of the platform stand-ins: one program for every tests/platform/*.cpp,
# linked with each stand-in that exists.
set(QEL_PLATFORM_TEST_LIBS)
if(TARGET webhost_runtime)
  # Imported targets are visible only in the directory that found them.
  find_package(OpenSSL REQUIRED)
  list(APPEND QEL_PLATFORM_TEST_LIBS webhost_runtime webhost_request OpenSSL::Crypto)
endif()
if(TARGET qelsysapi)
  list(APPEND QEL_PLATFORM_TEST_LIBS qelsysapi)
endif()
qel_test_program(platform_tests DIRS platform LIBS ${QEL_PLATFORM_TEST_LIBS} qel_foundation)

if(TARGET platform_tests AND TARGET qelsysapi)
  target_compile_definitions(platform_tests PRIVATE QEL_FRAMEWORK_LIB="$<TARGET_FILE:qelsysapi>")
endif()

if(TARGET platform_tests AND TARGET webhost_runtime)
  set(variant_targets
    webhost_runtime_variant_all webhost_runtime_variant_none
    webhost_runtime_variant_encrypt_key_only webhost_runtime_variant_no_mime)
  # Loaded with dlopen only, so the program must wait for them explicitly.
  add_dependencies(platform_tests ${variant_targets})
  target_compile_definitions(platform_tests PRIVATE
    QEL_RUNTIME_LIB="$<TARGET_FILE:webhost_runtime>"
    QEL_RUNTIME_VARIANT_ALL="$<TARGET_FILE:webhost_runtime_variant_all>"
    QEL_RUNTIME_VARIANT_NONE="$<TARGET_FILE:webhost_runtime_variant_none>"
    QEL_RUNTIME_VARIANT_ENCRYPT_KEY_ONLY="$<TARGET_FILE:webhost_runtime_variant_encrypt_key_only>"
    QEL_RUNTIME_VARIANT_NO_MIME="$<TARGET_FILE:webhost_runtime_variant_no_mime>")

  # The dynamic symbol table must hold the contract and nothing else, which
  # dlsym alone cannot show. Optional entry points expected, comma-separated.
  set(all_optional "GetEncryptKey,Decrypt,ReadAllFormDataWithMime,KeyValueWithMimeGetFirst,\
KeyValueWithMimeGetNext,KeyValueWithMimeGetKey,KeyValueWithMimeGetValue,FreeKeyValuePairWithMimeList")
  foreach(case
      "webhost_runtime=${all_optional}"
      "webhost_runtime_variant_all=${all_optional}"
      "webhost_runtime_variant_none="
      "webhost_runtime_variant_encrypt_key_only=GetEncryptKey"
      "webhost_runtime_variant_no_mime=GetEncryptKey,Decrypt")
    string(FIND "${case}" "=" at)
    string(SUBSTRING "${case}" 0 ${at} target)
    math(EXPR at "${at} + 1")
    string(SUBSTRING "${case}" ${at} -1 optional)
    add_test(NAME WebhostRuntimeExports.${target}
      COMMAND ${CMAKE_COMMAND} -DNM=${CMAKE_NM} -DLIB=$<TARGET_FILE:${target}> -DOPTIONAL=${optional}
              -P ${PROJECT_SOURCE_DIR}/platform/webhost_runtime/CheckExports.cmake)
  endforeach()
endif()
