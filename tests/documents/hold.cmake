# Holds the documents against the tree: what they name exists. Run as: cmake -DTREE=<project> -P hold.cmake
cmake_minimum_required(VERSION 3.25)

file(GLOB_RECURSE documents RELATIVE ${TREE} ${TREE}/docs/*.md)
list(APPEND documents README.md CONTRIBUTING.md CHANGELOG.md)

# A path of the project in backticks, which may name a folder, or files by a pattern.
set(project_path "`((src|client|capi|telephony-service|bridge|tools|tests|fuzz|bench|cmake|packaging|scripts|docs|debian)/[^` ]*)")

# Every file that a document points to, in a link or as a path in backticks, is there.
set(named 0)
foreach(document IN LISTS documents)
  file(READ ${TREE}/${document} text)
  get_filename_component(folder ${TREE}/${document} DIRECTORY)
  string(REPLACE "](" "\nlink to " text "${text}")
  string(REGEX REPLACE "[][;]" " " text "${text}")  # what would make one list element of several
  string(REGEX MATCHALL "\nlink to [^)#: ]+" links "${text}")
  foreach(link IN LISTS links)
    string(SUBSTRING ${link} 9 -1 target)
    if(NOT EXISTS ${folder}/${target})
      message(SEND_ERROR "${document} links to ${target}, which is not there")
    endif()
    math(EXPR named "${named} + 1")
  endforeach()
  string(REGEX MATCHALL "${project_path}" paths "${text}")
  foreach(path IN LISTS paths)
    string(REGEX REPLACE "^`|/$" "" path ${path})
    file(GLOB found ${TREE}/${path})
    if(NOT found AND NOT path MATCHES "[A-Z]|…")
      message(SEND_ERROR "${document} names ${path}, which is not there")
    endif()
    math(EXPR named "${named} + 1")
  endforeach()
endforeach()
if(named LESS 80)
  message(SEND_ERROR "hardly anything was looked at: ${named} names")
endif()

# Every fixed name is still used by the source.
file(GLOB_RECURSE sources ${TREE}/src/*.h ${TREE}/src/*.cpp)
set(source "")
foreach(file IN LISTS sources)
  file(READ ${file} text)
  string(APPEND source "${text}")
endforeach()
file(READ ${TREE}/docs/names.md names)
string(REGEX REPLACE "\n## Our terms.*" "" names "${names}")
string(REGEX MATCHALL "\n\\| [^|]*`[^|]*\\|" rows "${names}")
foreach(row IN LISTS rows)
  string(REGEX MATCHALL "`[^`]+`" fixed "${row}")
  foreach(name IN LISTS fixed)
    string(REGEX REPLACE "`|…|:/$" "" name "${name}")
    string(FIND "${source}" "${name}" at)
    if(at EQUAL -1)
      message(SEND_ERROR "docs/names.md lists ${name}, which nothing uses")
    endif()
  endforeach()
endforeach()

# The page on the wire names each telephony field, SIM status, event and command.
file(READ ${TREE}/docs/wire.md wire)
file(READ ${TREE}/src/wire/telephony_state.h state)
file(READ ${TREE}/src/platform/telephony.h telephony)
string(REGEX MATCHALL "k[A-Za-z0-9]+(Field|Command) = \"[^\"]+|kSimStatus[A-Za-z]+ = \"[A-Z][^\"]+" told "${state}${telephony}")
string(REGEX MATCHALL "k[A-Za-z]+(Inserted|Changed) = \"[^\"]+" events "${telephony}")
list(LENGTH told count)
if(count LESS 20)
  message(SEND_ERROR "hardly a telephony field, status or command was found: ${count}")
endif()
foreach(definition IN LISTS told events)
  string(REGEX REPLACE ".*\"" "" name "${definition}")
  if(NOT wire MATCHES "`${name}[`( ]")
    message(SEND_ERROR "docs/wire.md does not name ${name}")
  endif()
endforeach()

# Figures that the documents repeat. Each row: how the source defines the figure, a document and what it says.
file(GLOB_RECURSE sources ${TREE}/bridge/*.h ${TREE}/bridge/*.cpp ${TREE}/telephony-service/*.h)
foreach(file IN LISTS sources)
  file(READ ${file} text)
  string(APPEND source "${text}")
endforeach()
set(figures
  "kMaximumCallBody = 16u << 10@docs/wire.md@a call's body | 16 KiB"
  "kHeldInputBudget = 4u << 20@docs/wire.md@all of them together | 4 MiB"
  "{Stage::partial, 10'000}, {Stage::sending, 30'000}}@docs/wire.md@from a call's first byte to its last | 10 seconds"
  "{Stage::partial, 10'000}, {Stage::sending, 30'000}}@docs/wire.md@from a reply's first byte to its last | 30 seconds"
  "kUnusedMilliseconds = 100@docs/wire.md@that made no call within 100 ms"
  "kAwakeMicroseconds = 50@docs/architecture.md@for 50 µs"
  "kMaximumConnections = 4096@docs/wire.md@less a reserve, and 3,072 at most"
  "kObserverShare = 4@docs/wire.md@a quarter as many observers"
  "kCapacity = 1024@docs/wire.md@remembers the newest 1,024"
  "kMaximumStateBody = 256u << 20@docs/wire.md@at most 256 MiB"
  "kMaximumNameLength = 255@docs/wire.md@name length, up to 255"
  "kPause = 60'000@docs/wire.md@once a minute at most"
  "kPatience = std::chrono::seconds(5)@docs/wire.md@five seconds is cut off"
  "kMaximumDepth = 512@docs/property-list.md@within each other | 512 |"
  "kMaximumRepeatedNodes = 1'000'000@docs/property-list.md@more than once | 1,000,000 |"
  "kFull = 256@docs/property-list.md@looks up 256 values"
  "kUnindexed = 8@docs/memory-layout.md@Up to 8 entries"
  "kLiveAnswers.size() == 97)@docs/data-ark.md@the 97 rows of"
  "kLargestFile = 0x7ffff000@docs/property-list.md@up to 0x7ffff000 bytes"
  "kRotationThreshold = 1'048'576@docs/files.md@each up to 1 MiB"
  "kInterval = 60@docs/architecture.md@once a minute at most"
  "kQuiet = std::chrono::milliseconds(250)@docs/modem-bridge.md@quiet time of 250 ms"
  "kLongestBurst = std::chrono::seconds(2)@docs/modem-bridge.md@2 s after the first"
  "kLongestRetry = std::chrono::seconds(30)@docs/modem-bridge.md@1 s, 2 s, up to 30 s"
  "kFirstOpenDelay = std::chrono::milliseconds(100)@docs/modem-bridge.md@after 0.1 s, 0.2 s"
  "kLongestOpenDelay = std::chrono::milliseconds(5000)@docs/modem-bridge.md@up to 5 s"
  "kSwapPatience = std::chrono::seconds(10)@docs/modem-bridge.md@is waited for, ten seconds"
  "kStartPatience = std::chrono::seconds(30)@docs/modem-bridge.md@thirty seconds after the"
  "kFindingDomain = 1@docs/modem-bridge.md@domain 1")
foreach(row IN LISTS figures)
  string(REPLACE "@" ";" row "${row}")
  list(GET row 0 definition)
  list(GET row 1 document)
  list(GET row 2 words)
  file(READ ${TREE}/${document} said)
  string(FIND "${source}" "${definition};" at)
  if(at EQUAL -1)
    message(SEND_ERROR "nothing defines ${definition} any more: does ${document} still say \"${words}\" rightly?")
  endif()
  string(FIND "${said}" "${words}" at)
  if(at EQUAL -1)
    message(SEND_ERROR "${document} does not say \"${words}\", though the source has ${definition}")
  endif()
endforeach()

# Every decision stands in the list of them.
file(READ ${TREE}/docs/decisions/README.md list)
file(GLOB decisions RELATIVE ${TREE}/docs/decisions ${TREE}/docs/decisions/*.md)
list(REMOVE_ITEM decisions README.md)
foreach(decision IN LISTS decisions)
  if(NOT list MATCHES "\\(${decision}\\)")
    message(SEND_ERROR "docs/decisions/README.md does not list ${decision}")
  endif()
endforeach()

# The architecture page names each header of the platform seam, and its lock map has a row for each lock.
file(READ ${TREE}/docs/architecture.md architecture)
file(GLOB headers RELATIVE ${TREE}/src/platform ${TREE}/src/platform/*.h)
foreach(header IN LISTS headers)
  string(FIND "${architecture}" "`${header}`" at)
  if(at EQUAL -1)
    message(SEND_ERROR "docs/architecture.md does not name src/platform/${header}")
  endif()
endforeach()
string(REGEX MATCHALL "\n *(constinit )?Lock [a-z_]+" locks "${source}")
string(REGEX MATCHALL "\n\\| [a-z-]+ lock[ ,|]" rows "${architecture}")
list(LENGTH locks lock_count)
list(LENGTH rows row_count)
if(NOT lock_count EQUAL row_count OR lock_count LESS 5)
  message(SEND_ERROR "src has ${lock_count} locks, the lock map in docs/architecture.md ${row_count}")
endif()

# No source file is longer than a reader can keep in mind.
file(GLOB_RECURSE files ${TREE}/src/*.h ${TREE}/src/*.cpp ${TREE}/client/*.cpp ${TREE}/capi/*.cpp ${TREE}/bridge/*.cpp
     ${TREE}/telephony-service/*.cpp ${TREE}/tools/*.cpp ${TREE}/tests/*.cpp)
foreach(file IN LISTS files)
  file(STRINGS ${file} lines REGEX "[^ ]")
  list(LENGTH lines count)
  if(count GREATER 400)
    message(SEND_ERROR "${file} has ${count} lines, 400 are the limit")
  endif()
endforeach()
