include(GoogleTest)

# A test of its own for each case; where programs start slowly and in an environment of their own, one
# for the whole program.
function(zkusb_register_tests name)
  if(WIN32)
    add_test(NAME ${name} COMMAND ${name})
  else()
    # The leak check takes the thread-local data of a library that was loaded at run time for something
    # else where it happens to begin at a certain place in its page, and reads wild pointers there.
    # Where llvm-symbolizer is not installed, addr2line finds the lines of a report.
    gtest_discover_tests(${name} TEST_PREFIX "${name}." DISCOVERY_TIMEOUT 60
                         PROPERTIES ENVIRONMENT ASAN_OPTIONS=intercept_tls_get_addr=0:allow_addr2line=1)
  endif()
endfunction()
