# Turns a file into the elements of a C++ array of bytes: a string literal may not be as long as the
# file is.
#
#   cmake -DINPUT=machine.json -DOUTPUT=machine_bytes.inc -P embed_file.cmake
cmake_minimum_required(VERSION 3.25)

file(READ "${INPUT}" digits HEX)
if(digits STREQUAL "")
  message(FATAL_ERROR "${INPUT}: is empty")
endif()
string(REGEX REPLACE "(................................)" "\\1\n" digits "${digits}")
string(REGEX REPLACE "([0-9a-f][0-9a-f])" "0x\\1," digits "${digits}")
file(WRITE "${OUTPUT}" "${digits}\n")
