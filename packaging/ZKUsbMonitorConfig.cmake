# ZKUsbMonitor for CMake, from the unpacked zip:
#
#   find_package(ZKUsbMonitor REQUIRED)                                  with CMAKE_PREFIX_PATH at the zip's folder
#   target_link_libraries(program PRIVATE ZKUsbMonitor::ZKUsbMonitor)    headers, and the system's libraries
#   zkusb_monitor_deploy(program)                                        DLL and manifest beside the program
#
# With ZKUSB_MONITOR_SIMULATED set to ON the DLL over a simulated PC is put there instead.
get_filename_component(ZKUsbMonitor_FOLDER "${CMAKE_CURRENT_LIST_DIR}/../../.." ABSOLUTE)
if(CMAKE_SIZEOF_VOID_P EQUAL 4)
  set(ZKUsbMonitor_BINARIES "${ZKUsbMonitor_FOLDER}/x86")
else()
  set(ZKUsbMonitor_BINARIES "${ZKUsbMonitor_FOLDER}/x64")
endif()
if(NOT EXISTS "${ZKUsbMonitor_BINARIES}/ZKUsbMonitor.dll")
  set(ZKUsbMonitor_FOUND FALSE)
  set(ZKUsbMonitor_NOT_FOUND_MESSAGE "there is no ${ZKUsbMonitor_BINARIES}/ZKUsbMonitor.dll")
  return()
endif()
option(ZKUSB_MONITOR_SIMULATED "Use the DLL over a simulated PC" OFF)

if(NOT TARGET ZKUsbMonitor::ZKUsbMonitor)
  add_library(ZKUsbMonitor::ZKUsbMonitor INTERFACE IMPORTED)
  set_target_properties(ZKUsbMonitor::ZKUsbMonitor PROPERTIES
    INTERFACE_INCLUDE_DIRECTORIES "${ZKUsbMonitor_FOLDER}/include"
    INTERFACE_LINK_LIBRARIES "ole32;oleaut32;uuid")
endif()

function(zkusb_monitor_deploy target)
  set(files "${ZKUsbMonitor_BINARIES}/ZKUsbMonitor.dll" "${ZKUsbMonitor_BINARIES}/ZKUsbMonitor.Assembly.manifest")
  if(ZKUSB_MONITOR_SIMULATED)
    set(files "${ZKUsbMonitor_BINARIES}/ZKUsbMonitorSimulated.dll"
              "${ZKUsbMonitor_BINARIES}/simulated/ZKUsbMonitor.Assembly.manifest")
  endif()
  add_custom_command(TARGET ${target} POST_BUILD
    COMMAND "${CMAKE_COMMAND}" -E copy_if_different ${files} "$<TARGET_FILE_DIR:${target}>" VERBATIM)
endfunction()
