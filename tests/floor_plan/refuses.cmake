# The check of the floor plan refuses what it should, and only that: each case is a small source tree with one include
# in it, held against the project's own plan.

# expect(RESULT FILE INCLUDE [REASON]): RESULT is `allowed` or `refused`, REASON a part of the refusal.
function(expect result file include)
  file(REMOVE_RECURSE ${SCRATCH})
  foreach(header src/property/value.h src/store/data_ark.h src/log/daemon_log.h client/client.h)
    file(WRITE ${SCRATCH}/${header} "#pragma once\n")
  endforeach()
  file(APPEND ${SCRATCH}/${file} "#pragma once\n  # include ${include}  // why\n")
  execute_process(COMMAND ${CMAKE_COMMAND} -DTREE=${SCRATCH} -DPLAN=${PROJECT}/docs/architecture.md
                          -P ${PROJECT}/cmake/floor_plan.cmake
                  RESULT_VARIABLE status OUTPUT_QUIET ERROR_VARIABLE output)
  string(REGEX REPLACE "[ \n]+" " " output "${output}")
  if(result STREQUAL allowed AND NOT status EQUAL 0)
    message(SEND_ERROR "${file} including ${include} was refused: ${output}")
  elseif(result STREQUAL refused AND (status EQUAL 0 OR NOT output MATCHES "${ARGN}"))
    message(SEND_ERROR "${file} including ${include} was not refused for \"${ARGN}\": ${output}")
  endif()
endfunction()

expect(allowed src/store/a.cpp "\"log/daemon_log.h\"")
expect(allowed src/store/a.cpp "\"data_ark.h\"")
expect(allowed src/store/a.cpp "<sys/stat.h>")
expect(allowed src/linux/base/a.cpp "<sys/epoll.h>")
expect(allowed client/a.cpp "<sys/epoll.h>")
expect(allowed tools/quorvelctl/a.cpp "\"store/data_ark.h\"")

expect(refused src/log/a.h "\"store/data_ark.h\"" "src/log may not include src/store")
expect(refused src/property/a.cpp "\"log/daemon_log.h\"" "may not include src/log")
expect(refused src/platform/a.h "\"../log/daemon_log.h\"" "may not include src/log")
expect(refused src/core/a.cpp "\"client/client.h\"" "may not include client")
expect(refused tools/telvane-sim/a.cpp "\"store/data_ark.h\"" "may not include src/store")
expect(refused src/store/a.cpp "<sys/epoll.h>" "Linux headers belong")
expect(refused src/files/a.h "<linux/openat2.h>" "Linux headers belong")
expect(refused src/files/a.h "\"log/missing.h\"" "no file of the project")
expect(refused src/attic/a.h "<cstdio>" "no folder of the floor plan")
