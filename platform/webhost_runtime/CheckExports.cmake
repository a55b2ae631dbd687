# Checks the dynamic symbol table of a runtime build: the required entry
# points, exactly the optional ones named in OPTIONAL (comma-separated, without
# the common suffix), the contract's classes, and nothing else.
# Usage: cmake -DNM=<nm> -DLIB=<library> -DOPTIONAL=<names> -P CheckExports.cmake
cmake_minimum_required(VERSION 3.25)
set(suffix _C_REST_QEL_QLWS_)
set(required ReadRequestVariable SetHTTPResponseMimeType WriteOutput ReadAllFormData ReadUploadedFilesList)
string(REPLACE "," ";" optional_expected "${OPTIONAL}")

execute_process(COMMAND ${NM} -D --defined-only ${LIB}
  OUTPUT_VARIABLE listing RESULT_VARIABLE failed ERROR_VARIABLE errors)
if(failed)
  message(FATAL_ERROR "${NM} failed on ${LIB}: ${errors}")
endif()

set(problems "")
set(exported "")
string(REPLACE "\n" ";" lines "${listing}")
foreach(line IN LISTS lines)
  if(NOT line MATCHES "^[0-9a-fA-F]* +[A-Za-z] +([^ @]+)")
    continue()
  endif()
  set(name ${CMAKE_MATCH_1})
  if(name MATCHES "^(.*)${suffix}$")
    list(APPEND exported ${CMAKE_MATCH_1})
  # Members, vtable and type information of the contract's three classes.
  elseif(NOT name MATCHES "^_Z(T[VIS])?NK?3qel7webhost(16KeyValuePairList|17UploadedFilesList|14RequestMapping)")
    string(APPEND problems "  exports ${name}\n")
  endif()
endforeach()

foreach(entry IN LISTS required optional_expected)
  if(NOT entry IN_LIST exported)
    string(APPEND problems "  lacks ${entry}${suffix}\n")
  endif()
endforeach()
foreach(entry IN LISTS exported)
  if(NOT entry IN_LIST required AND NOT entry IN_LIST optional_expected)
    string(APPEND problems "  exports ${entry}${suffix}, which it should not\n")
  endif()
endforeach()

if(problems)
  message(FATAL_ERROR "${LIB}:\n${problems}")
endif()
