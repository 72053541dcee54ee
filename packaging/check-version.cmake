# Fails when the version of the newest entry of debian/changelog is not VERSION. TREE: the project.
file(STRINGS ${TREE}/debian/changelog first LIMIT_COUNT 1)
if(NOT first MATCHES "^quorveld \\(([^)]+)\\) ")
  message(FATAL_ERROR "debian/changelog begins with: ${first}")
endif()
if(NOT CMAKE_MATCH_1 STREQUAL VERSION)
  message(FATAL_ERROR "debian/changelog is at ${CMAKE_MATCH_1}, the project at ${VERSION}")
endif()
