# What every target of the house is built with, and how a folder of src/ becomes a library.

add_library(quorvel_options INTERFACE)
target_compile_options(quorvel_options INTERFACE -Wall -Wextra -Wpedantic -Wconversion -Wshadow)
if(CMAKE_CXX_COMPILER_ID MATCHES "Clang")
  target_compile_options(quorvel_options INTERFACE -Wthread-safety)
endif()
# Ordinary code as well, for what is linked without optimising across files.
set(across_files OFF)
if(CMAKE_INTERPROCEDURAL_OPTIMIZATION AND CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
  set(across_files ON)
  target_compile_options(quorvel_options INTERFACE -ffat-lto-objects)
endif()
if(QUORVEL_SANITIZE)
  target_compile_options(quorvel_options INTERFACE -fsanitize=${QUORVEL_SANITIZE} -fno-omit-frame-pointer
                                                   -fno-sanitize-recover=all)
  target_link_options(quorvel_options INTERFACE -fsanitize=${QUORVEL_SANITIZE})
endif()

# The daemon's folders: no exception can leave a function, and nothing asks for a type at run time.
add_library(quorvel_daemon_options INTERFACE)
target_link_libraries(quorvel_daemon_options INTERFACE quorvel_options)
target_compile_options(quorvel_daemon_options INTERFACE -fno-exceptions -fno-rtti -ffunction-sections -fdata-sections)

# quorvel_folder(NAME SOURCES file... HEADERS file... LINKS folder...): a static library of one folder. The headers are each
# compiled alone by the target all_verify_interface_header_sets.
function(quorvel_folder name)
  cmake_parse_arguments(FOLDER "" "" "SOURCES;HEADERS;LINKS" ${ARGN})
  add_library(quorvel_${name} STATIC ${FOLDER_SOURCES})
  target_sources(quorvel_${name} PUBLIC FILE_SET HEADERS BASE_DIRS ${PROJECT_SOURCE_DIR}/src FILES ${FOLDER_HEADERS})
  target_link_libraries(quorvel_${name} PUBLIC ${FOLDER_LINKS} PRIVATE $<BUILD_INTERFACE:quorvel_daemon_options>)
  set_target_properties(quorvel_${name} PROPERTIES VERIFY_INTERFACE_HEADER_SETS ON)
  if(QUORVEL_SANITIZE)
    target_link_libraries(quorvel_${name} INTERFACE $<BUILD_INTERFACE:quorvel_options>)
  endif()
endfunction()
