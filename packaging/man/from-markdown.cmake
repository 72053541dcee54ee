# Makes a manual page of pages in docs/, so that both say the same. Run as:
#   cmake -DLOWDOWN=… -DTREE=… -DPAGE=name.section -DABOUT=sentence -DSOURCES=a.md,b.md [-DQUESTIONS=ON] -DOUT=… -P from-markdown.cmake
# QUESTIONS adds the table of questions about the device, made from the one that the daemon is built with.
cmake_minimum_required(VERSION 3.25)
string(REGEX MATCH "^(.*)\\.([0-9])$" matched ${PAGE})
set(name ${CMAKE_MATCH_1})
set(section ${CMAKE_MATCH_2})

set(text "# NAME\n\n${name} \\- ${ABOUT}\n\n")
string(REPLACE "," ";" sources ${SOURCES})
foreach(source IN LISTS sources)
  file(READ ${TREE}/docs/${source} page)
  string(APPEND text "${page}\n")
endforeach()

if(QUESTIONS)
  file(STRINGS ${TREE}/src/platform/device_questions.h rows REGEX "^    {\"[A-Za-z0-9_-]+\".*},?$")
  list(LENGTH rows count)
  if(count LESS 50)
    message(FATAL_ERROR "only ${count} questions found in device_questions.h")
  endif()
  string(APPEND text "# Questions about the device\n\n"
                     "What the machine can answer by itself has a kind; the other answers come from the file alone.\n\n"
                     "| question | kind | unit |\n|---|---|---|\n")
  foreach(row IN LISTS rows)
    string(REGEX MATCH "{\"([A-Za-z0-9_-]+)\"(, PropertyKind::([a-z]+))?(, \"([^\"]*)\")?" matched "${row}")
    string(APPEND text "| ${CMAKE_MATCH_1} | ${CMAKE_MATCH_3} | ${CMAKE_MATCH_5} |\n")
  endforeach()
endif()

# Links to pages that are manual pages too name those; other links keep their words.
foreach(link "property-list=quorvel-files(5)" "data-ark=quorvel-files(5)" "files=quorvel-files(5)" "wire=quorvel-wire(7)")
  string(REGEX MATCH "^(.*)=(.*)$" matched ${link})
  string(REPLACE "[${CMAKE_MATCH_1}.md](${CMAKE_MATCH_1}.md)" "${CMAKE_MATCH_2}" text "${text}")
endforeach()
string(REGEX REPLACE "\\[([^]\n]*)\\]\\([^)\n]*\\.md\\)" "\\1" text "${text}")
string(APPEND text "\n# SEE ALSO\n\nquorvelctl(1), libquorvel(3), quorvel-files(5), quorvel-wire(7), quorveld(8)\n")

file(WRITE ${OUT}.md "${text}")
string(TOUPPER ${name} title)
execute_process(COMMAND ${LOWDOWN} -s -Tman -m "title: ${title}" -m "section: ${section}" ${OUT}.md
                OUTPUT_VARIABLE made COMMAND_ERROR_IS_FATAL ANY)
file(REMOVE ${OUT}.md)
# A font that every formatter knows, headings on the lines of their macros, as programs that index pages expect them, and
# no stretched lines: newer formatters go back to what AD says at each paragraph.
string(REPLACE "\\fC" "\\f(CR" made "${made}")
string(REGEX REPLACE "\n\\.(SH|SS)\n" "\n.\\1 " made "${made}")
string(REGEX REPLACE "\n(\\.TH [^\n]*\n)" "\n\\1.ds AD l\n.ad l\n" made "${made}")
file(WRITE ${OUT} "'\\\" t\n${made}")
