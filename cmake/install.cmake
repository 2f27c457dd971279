# What `cmake --install` puts on a system other than Windows: the client with its libraries in a folder of their own, where
# it finds them, and its manual page and completion, which it prints itself.
include(GNUInstallDirs)
set(own ${CMAKE_INSTALL_LIBDIR}/zkusb)
set_target_properties(zkusb ZKUsbMonitor zkusb_platform PROPERTIES INSTALL_RPATH "$ORIGIN")
install(TARGETS zkusb ZKUsbMonitor zkusb_platform RUNTIME DESTINATION ${own} LIBRARY DESTINATION ${own})
set(pages ${CMAKE_BINARY_DIR}/generated/pages)
install(CODE "
  file(MAKE_DIRECTORY \"${pages}\")
  execute_process(COMMAND \"$<TARGET_FILE:zkusb>\" --man-page OUTPUT_FILE \"${pages}/zkusb.1\" COMMAND_ERROR_IS_FATAL ANY)
  execute_process(COMMAND \"$<TARGET_FILE:zkusb>\" --bash-completion OUTPUT_FILE \"${pages}/zkusb\"
                  COMMAND_ERROR_IS_FATAL ANY)
  set(bin \"\$ENV{DESTDIR}\${CMAKE_INSTALL_PREFIX}/${CMAKE_INSTALL_BINDIR}\")
  file(MAKE_DIRECTORY \"\${bin}\")
  file(RELATIVE_PATH program \"\${CMAKE_INSTALL_PREFIX}/${CMAKE_INSTALL_BINDIR}\" \"\${CMAKE_INSTALL_PREFIX}/${own}/zkusb\")
  file(CREATE_LINK \"\${program}\" \"\${bin}/zkusb\" SYMBOLIC)
")
install(FILES ${pages}/zkusb.1 DESTINATION ${CMAKE_INSTALL_MANDIR}/man1)
install(FILES ${pages}/zkusb DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions)
