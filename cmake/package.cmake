# What the zip for users holds, as `cmake --install` lays it out; scripts/package.sh puts both widths into one folder.
set(width $<IF:$<EQUAL:${CMAKE_SIZEOF_VOID_P},8>,x64,x86>)
set(CMAKE_INSTALL_DEFAULT_COMPONENT_NAME zkusb)

install(FILES
  $<TARGET_FILE:ZKUsbMonitor> $<TARGET_FILE:ZKUsbMonitorSimulated> $<TARGET_FILE:zkusb> $<TARGET_FILE:zkusb_typelib>
  ${CMAKE_BINARY_DIR}/ZKUsbMonitor.Assembly.manifest ${CMAKE_BINARY_DIR}/generated/zkusb_monitor.tlb
  DESTINATION ${width})
install(DIRECTORY ${CMAKE_BINARY_DIR}/simulated DESTINATION ${width})
# Where each function lies in the DLLs: what a reported address is looked up in.
install(DIRECTORY ${CMAKE_BINARY_DIR}/symbols/ DESTINATION symbols/${width} FILES_MATCHING PATTERN "*.map")

install(DIRECTORY include/ DESTINATION include FILES_MATCHING PATTERN "*.h")
install(FILES com/zkusb_monitor.idl com/idl/base_types.idl com/idl/stdole2.idl DESTINATION include)
install(DIRECTORY samples dotnet machines docs DESTINATION . PATTERN ".clang-format" EXCLUDE PATTERN ".gitignore" EXCLUDE
              PATTERN "bin" EXCLUDE PATTERN "obj" EXCLUDE)
install(FILES CHANGELOG.md DESTINATION . OPTIONAL)
install(FILES README.md packaging/NOTICES.txt packaging/LICENSE.txt DESTINATION .)

include(CMakePackageConfigHelpers)
write_basic_package_version_file(${CMAKE_BINARY_DIR}/generated/ZKUsbMonitorConfigVersion.cmake
  VERSION ${PROJECT_VERSION} COMPATIBILITY SameMajorVersion ARCH_INDEPENDENT)
install(FILES packaging/ZKUsbMonitorConfig.cmake ${CMAKE_BINARY_DIR}/generated/ZKUsbMonitorConfigVersion.cmake
              DESTINATION lib/cmake/ZKUsbMonitor)
file(WRITE ${CMAKE_BINARY_DIR}/generated/version.txt "${PROJECT_VERSION}\n")
