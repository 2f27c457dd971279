# Lists that the generator must refuse with the number of the line, without writing a table.
function(expect_refused text message)
  file(WRITE ${DIRECTORY}/refused.tsv "${text}")
  file(REMOVE ${DIRECTORY}/refused.inc)
  execute_process(COMMAND ${CMAKE_COMMAND} -DINPUT=${DIRECTORY}/refused.tsv
                          -DOUTPUT=${DIRECTORY}/refused.inc -P ${GENERATOR}
                  RESULT_VARIABLE result ERROR_VARIABLE errors OUTPUT_QUIET)
  string(REGEX REPLACE "[ \n]+" " " errors "${errors}")  # messages are broken into lines
  if(result EQUAL 0 OR EXISTS ${DIRECTORY}/refused.inc OR NOT errors MATCHES "${message}")
    message(SEND_ERROR "'${text}' gave ${result} and said: ${errors}")
  endif()
endfunction()

set(malformed "not four hexadecimal digits, a tab")
expect_refused("" "no rows")
expect_refused("03E8\tA\n\n03E9\tB\n" "tsv:2: ${malformed}")
expect_refused("03E8\tA\n3E9\tB\n" "tsv:2: ${malformed}")
expect_refused("003E8\tA\n" "tsv:1: ${malformed}")
expect_refused("03G8\tA\n" "tsv:1: ${malformed}")
expect_refused("03E8 A\n" "tsv:1: ${malformed}")
expect_refused("03E8\tA;[\n03E9\tB]\n03EA\t\n" "tsv:3: ${malformed}")
expect_refused("03E8\tA\tB\n" "tsv:1: ${malformed}")
expect_refused("0000\tEnd\n" "tsv:1: the id is not above")
expect_refused("03E8\tA\\\n03E8\tA\n" "tsv:2: the id is not above")
expect_refused("1000\tA\n03E8\tB" "tsv:2: the id is not above")
