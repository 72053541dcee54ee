# The target `tidy` runs clang-tidy over everything but the tests, and fails on a finding. Configure with clang++ for it:
# g++ has options that clang-tidy does not know.
find_program(QUORVEL_RUN_CLANG_TIDY run-clang-tidy)
if(QUORVEL_RUN_CLANG_TIDY)
  add_custom_target(tidy COMMAND ${QUORVEL_RUN_CLANG_TIDY} -quiet -p ${PROJECT_BINARY_DIR}
                                 "^${PROJECT_SOURCE_DIR}/(src|client|capi|telephony-service|bridge|tools)/"
                    WORKING_DIRECTORY ${PROJECT_SOURCE_DIR} USES_TERMINAL VERBATIM)
endif()
