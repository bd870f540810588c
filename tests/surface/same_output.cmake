# Runs programs over one recording. Each must succeed, all must print the same, and what they print
# must match an expression.
#   cmake -DPROGRAMS=<program>|<program>... -DRECORDING=<file> -DEXPECTED=<regex> -P same_output.cmake
string(REPLACE "|" ";" PROGRAMS "${PROGRAMS}")
unset(first)
foreach(program IN LISTS PROGRAMS)
  execute_process(COMMAND ${program} INPUT_FILE ${RECORDING}
                  OUTPUT_VARIABLE output ERROR_VARIABLE errors RESULT_VARIABLE result)
  if(NOT result EQUAL 0)
    message("${output}${errors}")
    message(FATAL_ERROR "${program} ended with ${result}")
  endif()
  if(NOT DEFINED first)
    set(first "${output}")
    message("${output}")
  elseif(NOT output STREQUAL first)
    message("${output}")
    message(FATAL_ERROR "${program} printed something else")
  endif()
endforeach()
if(NOT first MATCHES "${EXPECTED}")
  message(FATAL_ERROR "expected: ${EXPECTED}")
endif()
