# Each file that is handed out carries a version resource with its own name, what it is, and the project's version.
#
#   cmake -DVERSION=1.2.3 -DFOLDER=build/windows-x64 -P versions_test.cmake
cmake_minimum_required(VERSION 3.25)

# Texts of a resource are UTF-16: two hexadecimal digits, then 00 for each character of these.
function(as_hex text result)
  string(HEX "${text}" digits)
  string(REGEX REPLACE "(..)" "\\100" digits "${digits}")
  set(${result} "${digits}" PARENT_SCOPE)
endfunction()

foreach(row "ZKUsbMonitor.dll|ZKUsbMonitor" "ZKUsbMonitorSimulated.dll|ZKUsbMonitor over a simulated PC"
            "zkusb.exe|ZKUsbMonitor command-line client" "zkusb_typelib.exe|ZKUsbMonitor type library printer")
  string(REGEX MATCH "^(.*)\\|(.*)$" matched "${row}")
  set(file ${CMAKE_MATCH_1})
  set(description ${CMAKE_MATCH_2})
  file(READ ${FOLDER}/${file} bytes HEX)
  # Name and value of one entry; at most one character of padding stands between them.
  foreach(entry "FileDescription|${description}" "OriginalFilename|${file}" "FileVersion|${VERSION}"
                "ProductVersion|${VERSION}")
    string(REGEX MATCH "^(.*)\\|(.*)$" matched "${entry}")
    as_hex("${CMAKE_MATCH_1}" name)
    as_hex("${CMAKE_MATCH_2}" value)
    if(NOT bytes MATCHES "${name}0000(0000)?${value}0000")
      message(SEND_ERROR "${file}: ${CMAKE_MATCH_0} is not in its version resource")
    endif()
  endforeach()
endforeach()
