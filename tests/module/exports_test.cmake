# The module shows its five names to the loader, and nothing else of what it is made of: another name would
# be open to be replaced by a client's, and could keep the module mapped.
#
#   cmake -DNM=nm -DMODULE=libZKUsbMonitor.so -P exports_test.cmake
cmake_minimum_required(VERSION 3.25)

execute_process(COMMAND ${NM} --dynamic --defined-only ${MODULE}
  OUTPUT_VARIABLE symbols COMMAND_ERROR_IS_FATAL ANY)
string(STRIP "${symbols}" symbols)
string(REGEX REPLACE "[0-9a-f]+ " "" symbols "${symbols}")
string(REPLACE "\n" ";" symbols "${symbols}")
list(SORT symbols)
set(expected "T DllCanUnloadNow;T DllGetClassObject;T DllInstall;T DllRegisterServer;T DllUnregisterServer")
if(NOT symbols STREQUAL expected)
  message(FATAL_ERROR "${MODULE} exports ${symbols}")
endif()

# Unloading has an order of its own, and the end of the process leaves everything as it is: no static object
# of the module has a destructor, nor has one of a thread, which would keep the module mapped.
execute_process(COMMAND ${NM} --dynamic --undefined-only ${MODULE}
  OUTPUT_VARIABLE imports COMMAND_ERROR_IS_FATAL ANY)
if(NOT imports MATCHES "CoCreateInstance")
  message(FATAL_ERROR "${MODULE} imports nothing of the platform, so it has not been read")
endif()
if(imports MATCHES "[a-z_]*atexit[^\n]*")
  message(FATAL_ERROR "${MODULE} has objects that are destroyed at some end: ${CMAKE_MATCH_0}")
endif()
