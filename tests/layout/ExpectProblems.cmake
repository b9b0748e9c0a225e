# cmake -DPYTHON=<python> -DCHECK=<script> -DARGUMENTS=<a|b|c> -DEXPECTED=<file> -P ExpectProblems.cmake:
# runs the layout check on a fixture, which must fail (exit status 1) and name exactly the problems
# of EXPECTED.
string(REPLACE "|" ";" arguments "${ARGUMENTS}")
execute_process(COMMAND ${PYTHON} ${CHECK} ${arguments} RESULT_VARIABLE result OUTPUT_VARIABLE output)
file(READ ${EXPECTED} expected)
if(NOT result EQUAL 1)
  message(FATAL_ERROR "the check exited with ${result}, not 1:\n${output}")
endif()
if(NOT output STREQUAL expected)
  message(FATAL_ERROR "the check said:\n${output}\nexpected:\n${expected}")
endif()
