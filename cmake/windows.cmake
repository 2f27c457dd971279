# Building Windows programs with MinGW-w64 on another system: where the libraries around the component
# come from, and what their programs may depend on.

# Programs run on a PC that has nothing but the system's own DLLs.
target_link_options(zkusb_options INTERFACE -static)
# The same sources give the same bytes, in whichever folder and at whatever time they are built.
target_link_options(zkusb_options INTERFACE -Wl,--no-insert-timestamp)
target_compile_options(zkusb_options INTERFACE
  "$<$<COMPILE_LANGUAGE:CXX>:-ffile-prefix-map=${CMAKE_SOURCE_DIR}=.>")
# Every call of the system in its UTF-16 form, as Windows 7 offers it.
target_compile_definitions(zkusb_options INTERFACE UNICODE _UNICODE _WIN32_WINNT=0x0601 WINVER=0x0601)

# The header-only libraries of the building system, each linked into a folder of its own: their
# neighbours in the system's folder belong to another C library.
function(zkusb_header_library target folder header)
  find_path(${folder}_parent ${folder}/${header} PATHS /usr/include /usr/local/include
            NO_CMAKE_FIND_ROOT_PATH REQUIRED)
  set(own ${CMAKE_BINARY_DIR}/headers/${folder})
  file(MAKE_DIRECTORY ${own})
  file(CREATE_LINK ${${folder}_parent}/${folder} ${own}/${folder} SYMBOLIC)
  add_library(${target} INTERFACE IMPORTED GLOBAL)
  target_include_directories(${target} INTERFACE ${own})
endfunction()
zkusb_header_library(nlohmann_json::nlohmann_json nlohmann json.hpp)
zkusb_header_library(CLI11::CLI11 CLI CLI.hpp)

option(ZKUSB_CLANG_FOR_TESTS "Compile with clang what is only tested with" OFF)

# For the targets that are added to this folder, and to those below it, from now on.
macro(zkusb_compile_tests_with_clang)
  if(ZKUSB_CLANG_FOR_TESTS)
    foreach(tool CXX_COMPILER CXX_LINKER)
      list(PREPEND CMAKE_${tool}_LAUNCHER ${CMAKE_SOURCE_DIR}/scripts/clang-for-mingw.sh)
    endforeach()
  endif()
endmacro()

if(ZKUSB_BUILD_TESTS)
  # The test library, from its sources: the building system has it compiled for itself only.
  find_path(ZKUSB_GOOGLETEST CMakeLists.txt PATHS /usr/src/googletest NO_DEFAULT_PATH REQUIRED)
  block()
    zkusb_compile_tests_with_clang()
    add_subdirectory(${ZKUSB_GOOGLETEST} ${CMAKE_BINARY_DIR}/googletest EXCLUDE_FROM_ALL)
  endblock()
  target_compile_options(gtest PRIVATE -O0)
  target_compile_options(gmock PRIVATE -O0)
endif()

# The version resource of a DLL or program, for a resource script that includes cmake/version.rc: the version is that of
# the project.
enable_language(RC)
function(zkusb_version_resource name)
  string(REPLACE "." "," numbers "${PROJECT_VERSION}")
  target_compile_definitions(${name} PRIVATE $<$<COMPILE_LANGUAGE:RC>:
    ZKUSB_VERSION_NUMBERS=${numbers},0
    ZKUSB_VERSION=${PROJECT_VERSION}
    ZKUSB_FILE_NAME=$<TARGET_FILE_NAME:${name}>>)
  foreach(source ${ARGN})
    target_sources(${name} PRIVATE ${source})
    set_source_files_properties(${source} TARGET_DIRECTORY ${name} PROPERTIES
      OBJECT_DEPENDS ${CMAKE_SOURCE_DIR}/cmake/version.rc)
  endforeach()
endfunction()
