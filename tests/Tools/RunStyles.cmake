# Runs the styles program once and checks what it did. Arguments:
#   PROGRAM, ARGS (separated by "|"), STATUS (the exit status expected),
#   optional OUTPUT and ERROR (regular expressions standard output and
#   standard error must match), SAME_AS (a file standard output must equal),
#   INPUT (a file for standard input) and WORK_DIR (made empty first).
string(REPLACE "|" ";" arguments "${ARGS}")
if(WORK_DIR)
  file(REMOVE_RECURSE "${WORK_DIR}")
  file(MAKE_DIRECTORY "${WORK_DIR}")
endif()
set(input_option)
if(INPUT)
  set(input_option INPUT_FILE "${INPUT}")
endif()
execute_process(COMMAND "${PROGRAM}" ${arguments} ${input_option}
  RESULT_VARIABLE status OUTPUT_VARIABLE output ERROR_VARIABLE error)
set(report "styles ${arguments}\n--- status ${status}\n--- output\n${output}--- error\n${error}")
if(NOT status STREQUAL STATUS)
  message(FATAL_ERROR "expected status ${STATUS}\n${report}")
endif()
if(DEFINED OUTPUT AND NOT output MATCHES "${OUTPUT}")
  message(FATAL_ERROR "output does not match ${OUTPUT}\n${report}")
endif()
if(DEFINED ERROR AND NOT error MATCHES "${ERROR}")
  message(FATAL_ERROR "error does not match ${ERROR}\n${report}")
endif()
if(SAME_AS)
  file(READ "${SAME_AS}" expected)
  if(NOT output STREQUAL expected)
    message(FATAL_ERROR "output differs from ${SAME_AS}\n${report}")
  endif()
endif()
