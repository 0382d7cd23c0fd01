# The preset commands on set files and folders that go wrong: a damaged and an
# unreadable set file, recovered by "preset recover"; a read-only and a full
# file system (mounted in a private mount namespace, so root only), and a
# folder the user cannot write, where every edit must fail with status 3 and
# the reason and leave the set as it was. Root ignores a folder's mode, so as
# root those commands run as "nobody" through setpriv. What this machine
# cannot set up is skipped. Arguments: PROGRAM, SAMPLE, WORK_DIR.
file(REMOVE_RECURSE "${WORK_DIR}")
file(MAKE_DIRECTORY "${WORK_DIR}/ro")
set(runner)

# run(STATUS ERROR_REGEX OUTPUT_REGEX ARGS...): one run of "styles preset".
function(run expected error_regex output_regex)
  execute_process(COMMAND ${runner} "${PROGRAM}" preset ${ARGN}
    RESULT_VARIABLE status OUTPUT_VARIABLE output ERROR_VARIABLE error)
  if(NOT status STREQUAL expected OR NOT error MATCHES "${error_regex}"
     OR NOT output MATCHES "${output_regex}")
    message(FATAL_ERROR "preset ${ARGN}\n--- status ${status}, expected ${expected}\n"
      "--- output\n${output}--- error\n${error}")
  endif()
endfunction()

set(folder "${WORK_DIR}")
file(WRITE "${folder}/bad.qsty" "{\"paragraph\": ")
execute_process(COMMAND mkfifo "${folder}/pipe.qsty")
run(4 "bad.qsty:.*\\[invalid-json\\].*preset recover --folder .* bad" "^$" list --folder ${folder} bad)
run(3 "pipe.qsty: cannot be read: not a regular file.*preset recover" "^$" show --folder ${folder} pipe X)
foreach(set bad pipe)
  run(0 "^$" "moved the damaged set file to .*${set}.qsty.damaged-[0-9]+T[0-9]+Z; the preset set \"${set}\" starts afresh"
    recover --folder ${folder} ${set})
  run(1 "\"${set}\" loads; nothing to recover" "^$" recover --folder ${folder} ${set})
endforeach()
run(0 "^$" "^bad\npipe\n$" list --folder ${folder})
run(1 "no preset set \"none\"" "^$" recover --folder ${folder} none)
# An empty set name is bad usage; it cannot pass through run()'s list.
execute_process(COMMAND "${PROGRAM}" preset add --folder ${folder} "" ${SAMPLE} Emphasis
  RESULT_VARIABLE status ERROR_VARIABLE error)
if(NOT status EQUAL 2 OR NOT error MATCHES "a preset set needs a name")
  message(FATAL_ERROR "an empty set name gives ${status}: ${error}")
endif()

set(skipped)
find_program(UNSHARE unshare)
foreach(case "remount,ro;Read-only file system" "fill;No space left on device")
  list(GET case 0 breakage)
  list(GET case 1 reason)
  set(folder "${WORK_DIR}/mounted")
  file(MAKE_DIRECTORY "${folder}")
  execute_process(COMMAND ${UNSHARE} --mount --propagation private sh -c "
      mount -t tmpfs -o size=256k tmpfs \"$0\" || exit 99
      \"$1\" preset add --folder \"$0\" con \"$2\" Emphasis >/dev/null || exit 98
      if [ $3 = fill ]; then cat /dev/zero > \"$0/filler\" 2>/dev/null; else mount -o remount,ro \"$0\"; fi
      \"$1\" preset add --folder \"$0\" con \"$2\" 'Heading 1'; echo status $?
      \"$1\" preset list --folder \"$0\" con" "${folder}" "${PROGRAM}" "${SAMPLE}" "${breakage}"
    RESULT_VARIABLE status OUTPUT_VARIABLE output ERROR_VARIABLE error)
  if(NOT UNSHARE OR status EQUAL 99 OR NOT status MATCHES "^[0-9]+$")
    list(APPEND skipped "${breakage}")
  elseif(NOT output STREQUAL "status 3\nEmphasis\n"
         OR NOT error MATCHES "cannot save the preset set \"con\": ${reason}")
    message(FATAL_ERROR "${breakage}\n--- status ${status}\n--- output\n${output}--- error\n${error}")
  endif()
endforeach()

set(folder "${WORK_DIR}/ro")
run(0 "^$" "added preset" add --folder ${folder} con ${SAMPLE} Emphasis)
file(CHMOD "${folder}" PERMISSIONS OWNER_READ OWNER_EXECUTE GROUP_READ GROUP_EXECUTE
  WORLD_READ WORLD_EXECUTE)
execute_process(COMMAND id -u OUTPUT_VARIABLE uid OUTPUT_STRIP_TRAILING_WHITESPACE)
find_program(SETPRIV setpriv)
if(uid STREQUAL "0" AND NOT SETPRIV)
  message("SKIPPED: ${skipped} and a read-only folder, which binds no root without setpriv")
  return()
elseif(uid STREQUAL "0")
  set(runner "${SETPRIV}" --reuid=65534 --regid=65534 --clear-groups)
endif()
set(reason "cannot save the preset set \"con\": Permission denied")
run(3 "${reason}" "^$" add --folder ${folder} con ${SAMPLE} "Heading 1")
run(3 "${reason}" "^$" add --folder ${folder} con ${SAMPLE} Emphasis --replace)
run(3 "${reason}" "^$" delete --folder ${folder} con Emphasis)
set(runner)
run(0 "^$" "^Emphasis\n$" list --folder ${folder} con)
file(CHMOD "${folder}" PERMISSIONS OWNER_READ OWNER_WRITE OWNER_EXECUTE)
if(skipped)
  message("SKIPPED: cannot mount a file system here for: ${skipped}")
endif()
