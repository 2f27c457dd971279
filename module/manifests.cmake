# What stands in for a registration, made from the IDL: ${CMAKE_BINARY_DIR}/ZKUsbMonitor.Assembly.manifest beside the
# module, and the one of the same name in simulated/ for the module over a simulated PC. A program has one of them
# beside it, with the DLL that it names.
find_program(ZKUSB_PERL NAMES perl REQUIRED)
set(idl ${CMAKE_SOURCE_DIR}/com/zkusb_monitor.idl)
set(make_headers ${CMAKE_SOURCE_DIR}/com/idl/make_headers.pl)
set(width $<IF:$<EQUAL:${CMAKE_SIZEOF_VOID_P},8>,amd64,x86>)
set(manifests)
function(zkusb_manifest folder dll)
  set(manifest ${folder}/ZKUsbMonitor.Assembly.manifest)
  file(MAKE_DIRECTORY ${folder})
  add_custom_command(
    OUTPUT ${manifest}
    COMMAND ${ZKUSB_PERL} ${make_headers} ${idl} manifest ${width} ${dll} > ${manifest}
    DEPENDS ${idl} ${make_headers}
    VERBATIM)
  set(manifests ${manifests} ${manifest} PARENT_SCOPE)
endfunction()
zkusb_manifest(${CMAKE_BINARY_DIR} ZKUsbMonitor.dll)
zkusb_manifest(${CMAKE_BINARY_DIR}/simulated ZKUsbMonitorSimulated.dll)
add_custom_target(zkusb_manifests ALL DEPENDS ${manifests})
