# Turns the list of USB vendors into the rows of a C++ array.
#
#   cmake -DINPUT=usb-vendors.tsv -DOUTPUT=vendor_table.inc -P generate_vendor_table.cmake
#
# A line of the list is an id of four hexadecimal digits, a tab and the name; ids ascend and are not
# 0000. The first line that is anything else stops the script with its number, and nothing is written.
#
# Lines are cut out of quoted text, never taken as a CMake list: in a list, a semicolon, a bracket or
# a backslash at the end of a name would join or split rows without a word.
cmake_minimum_required(VERSION 3.25)

file(READ "${INPUT}" rest)
set(rows "")
set(number 0)
set(previous 0)
while(NOT rest STREQUAL "")
  math(EXPR number "${number} + 1")
  string(FIND "${rest}" "\n" end)
  if(end EQUAL -1)
    set(line "${rest}")
    set(rest "")
  else()
    string(SUBSTRING "${rest}" 0 ${end} line)
    math(EXPR next "${end} + 1")
    string(SUBSTRING "${rest}" ${next} -1 rest)
  endif()

  # A carriage return at the end is what a checkout with foreign line ends leaves.
  if(NOT line MATCHES "^([0-9A-Fa-f][0-9A-Fa-f][0-9A-Fa-f][0-9A-Fa-f])\t([^\t\r]+)\r?$")
    message(FATAL_ERROR "${INPUT}:${number}: not four hexadecimal digits, a tab and a name")
  endif()
  set(hex "${CMAKE_MATCH_1}")
  set(name "${CMAKE_MATCH_2}")
  math(EXPR id "0x${hex}")
  if(NOT id GREATER previous)
    message(FATAL_ERROR "${INPUT}:${number}: the id is not above the one before")
  endif()
  set(previous ${id})

  string(REPLACE "\\" "\\\\" name "${name}")
  string(REPLACE "\"" "\\\"" name "${name}")
  string(REPLACE "?" "\\?" name "${name}")  # two of them could begin a trigraph
  string(APPEND rows "{0x${hex}, u\"${name}\"},\n")
endwhile()
if(number EQUAL 0)
  message(FATAL_ERROR "${INPUT}: no rows")
endif()
file(WRITE "${OUTPUT}" "${rows}")
