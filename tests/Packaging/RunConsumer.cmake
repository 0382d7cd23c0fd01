# Builds and runs the consumer project. MODE is "find" (install the build tree
# to a prefix first) or "subdirectory" (build the library from source).
function(run)
  execute_process(COMMAND ${ARGN} RESULT_VARIABLE result)
  if(NOT result EQUAL 0)
    message(FATAL_ERROR "failed (${result}): ${ARGN}")
  endif()
endfunction()

file(REMOVE_RECURSE "${WORK_DIR}")
if(MODE STREQUAL "find")
  run(${CMAKE_COMMAND} --install "${BUILD_DIR}" --prefix "${WORK_DIR}/prefix")
  set(configure_args "-DCMAKE_PREFIX_PATH=${WORK_DIR}/prefix")
else()
  set(configure_args "-DSTYLES_SOURCE_DIR=${SOURCE_DIR}")
endif()
run(${CMAKE_COMMAND} -S "${CONSUMER_DIR}" -B "${WORK_DIR}/build" ${configure_args}
    -DCMAKE_BUILD_TYPE=Release)
run(${CMAKE_COMMAND} --build "${WORK_DIR}/build" -j 2)
run("${WORK_DIR}/build/consumer")
