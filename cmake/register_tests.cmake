include(GoogleTest)

# A test of its own for each case; where programs start slowly and in an environment of their own, one
# for the whole program.
function(zkusb_register_tests name)
  if(WIN32)
    add_test(NAME ${name} COMMAND ${name})
  else()
    gtest_discover_tests(${name} TEST_PREFIX "${name}." DISCOVERY_TIMEOUT 60)
  endif()
endfunction()
