# Every program and DLL runs on a PC that has nothing but the system's own DLLs.
#
#   cmake -DOBJDUMP=objdump -DFOLDER=build/windows-x86 -P imports_test.cmake
cmake_minimum_required(VERSION 3.25)

set(system_dlls advapi32 cfgmgr32 kernel32 msvcrt ole32 oleaut32 setupapi shell32 shlwapi user32 gdi32)

file(GLOB files ${FOLDER}/*.dll ${FOLDER}/*.exe ${FOLDER}/bin/*.exe)
list(LENGTH files count)
if(NOT "${FOLDER}/ZKUsbMonitor.dll" IN_LIST files OR count LESS 10)
  message(SEND_ERROR "${FOLDER}: is not where the programs are")
endif()
foreach(file IN LISTS files)
  execute_process(COMMAND ${OBJDUMP} -p ${file} OUTPUT_VARIABLE dump COMMAND_ERROR_IS_FATAL ANY)
  string(REGEX MATCHALL "DLL Name: [^\n]+" imports "${dump}")
  if(NOT imports)
    message(SEND_ERROR "${file}: imports nothing, so it has not been read")
  endif()
  foreach(import IN LISTS imports)
    string(REGEX REPLACE "DLL Name: (.*)" "\\1" name "${import}")
    string(TOLOWER "${name}" name)
    string(REGEX REPLACE "\\.dll$" "" name "${name}")
    if(NOT name IN_LIST system_dlls)
      message(SEND_ERROR "${file} imports ${name}.dll")
    endif()
  endforeach()
  list(JOIN imports ", " imports)
  message("${file}: ${imports}")
endforeach()
