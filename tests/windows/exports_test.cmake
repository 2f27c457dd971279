# A module exports five names as they are, and nothing else.
#
#   cmake -DOBJDUMP=objdump -DFILES=a.dll;b.dll -P exports_test.cmake
cmake_minimum_required(VERSION 3.25)

set(expected DllCanUnloadNow DllGetClassObject DllInstall DllRegisterServer DllUnregisterServer)

foreach(file IN LISTS FILES)
  execute_process(COMMAND ${OBJDUMP} -p ${file} OUTPUT_VARIABLE dump COMMAND_ERROR_IS_FATAL ANY)
  string(REGEX REPLACE ".*\\[Ordinal/Name Pointer\\] Table" "" table "${dump}")
  string(REGEX REPLACE "\n\n.*" "" table "${table}")
  # Brackets would join the elements of a list.
  string(REGEX REPLACE "\\[ *[0-9]+\\]" "" table "${table}")
  string(REGEX MATCHALL "[^ \t\n]+" names "${table}")
  if(NOT names STREQUAL expected)
    message(SEND_ERROR "${file} exports: ${names}")
  endif()
  message("${file}: ${names}")
endforeach()
