# Fails when the installed service is exposed more than the project allows. SERVICE: the unit file.
if(NOT EXISTS "${SYSTEMD_ANALYZE}")
  message(STATUS "there is no systemd-analyze")
  return()
endif()
execute_process(COMMAND ${SYSTEMD_ANALYZE} security --offline=true --no-pager --threshold=5 ${SERVICE}
                RESULT_VARIABLE result OUTPUT_VARIABLE report ERROR_VARIABLE report)
string(REGEX MATCH "Overall exposure level[^\n]*" summary "${report}")
message(STATUS "${summary}")
if(NOT result EQUAL 0 OR summary STREQUAL "")
  message(FATAL_ERROR "${report}")
endif()
