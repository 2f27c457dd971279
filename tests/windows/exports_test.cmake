# A module exports five names as they are, and nothing else.
#
#   cmake -DOBJDUMP=objdump -DFILES=a.dll;b.dll -P exports_test.cmake
cmake_minimum_required(VERSION 3.25)

set(expected DllCanUnloadNow DllGetClassObject DllInstall DllRegisterServer DllUnregisterServer)

foreach(file IN LISTS FILES)
  execute_process(COMMAND ${OBJDUMP} -p ${file} OUTPUT_VARIABLE dump COMMAND_ERROR_IS_FATAL ANY)
  string(REGEX REPLACE ".*\\[Ordinal/Name Pointer\\] Table" "" table "${dump}")
  string(REGEX REPLACE "\n\n.*" "" table "${table}")
  string(REGEX MATCHALL "\\] [^\n]+" names "${table}")
  list(TRANSFORM names REPLACE "^\\] " "")
  list(TRANSFORM names STRIP)
  if(NOT names STREQUAL expected)
    message(SEND_ERROR "${file} exports: ${names}")
  endif()
  message("${file}: ${names}")
endforeach()
