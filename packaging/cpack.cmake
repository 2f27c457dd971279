# The zip of a folder that scripts/package.sh has laid out, which says in the environment which folder and version.
set(CPACK_PACKAGE_NAME zkusb-monitor)
set(CPACK_PACKAGE_VENDOR "ZKUsbMonitor maintainers")
set(CPACK_PACKAGE_DESCRIPTION "Which USB devices a PC has, which drive letters are theirs, and what comes and goes")
set(CPACK_PACKAGE_VERSION $ENV{ZKUSB_VERSION})
set(CPACK_PACKAGE_FILE_NAME zkusb-monitor-$ENV{ZKUSB_VERSION}-windows)
set(CPACK_INSTALLED_DIRECTORIES "$ENV{ZKUSB_STAGE};/")
