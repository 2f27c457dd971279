# The module as a Windows DLL: ${CMAKE_BINARY_DIR}/NAME.dll.

# The sources behind the name are those the DLL has besides the component.
function(zkusb_windows_module name)
  set(resources ${CMAKE_SOURCE_DIR}/module/zkusb_monitor.rc)
  set(exports ${CMAKE_SOURCE_DIR}/module/exports.def)
  set(scripts ${CMAKE_SOURCE_DIR}/module/scripts)
  add_library(${name} SHARED
    ${CMAKE_SOURCE_DIR}/module/exports.cpp
    ${CMAKE_SOURCE_DIR}/platform/windows/thread_data.cpp ${exports} ${resources} ${ARGN})
  target_link_libraries(${name} PRIVATE zkusb_component)

  set_source_files_properties(${resources} PROPERTIES
    INCLUDE_DIRECTORIES "${CMAKE_BINARY_DIR}/generated;${CMAKE_SOURCE_DIR}/module"
    OBJECT_DEPENDS "${CMAKE_BINARY_DIR}/generated/zkusb_monitor.tlb;${CMAKE_SOURCE_DIR}/cmake/version.rc;${scripts}/module.rgs;${scripts}/event_notifier.rgs;${scripts}/usb_tree.rgs")
  zkusb_version_resource(${name})
  add_dependencies(${name} zkusb_type_library_file)

  # The thread library never gives back what its function takes: platform/windows/thread_data.cpp has another.
  target_link_options(${name} PRIVATE -Wl,--wrap=pthread_once)
  # 32-bit names of the calling convention carry the bytes of their parameters; the exported ones do not.
  target_link_options(${name} PRIVATE -s -Wl,--enable-stdcall-fixup -Wl,--kill-at
                      -Wl,-Map=${CMAKE_BINARY_DIR}/symbols/${name}.map)
  file(MAKE_DIRECTORY ${CMAKE_BINARY_DIR}/symbols)
  set_target_properties(${name} PROPERTIES
    PREFIX ""
    RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}
    ARCHIVE_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/lib
    LINK_DEPENDS ${exports})
endfunction()
