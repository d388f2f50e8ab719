# Lists every #include "folder/..." under src/ and fails when one points up a
# layer. A folder may include its own headers and those of the folders below
# it; folders on the same level (dialogs and cards) stay out of each other and
# meet only through interfaces in platform/.
#   cmake -DSRC=<src folder> [-DSTAMP=<file>] [-DVERBOSE=ON] -P CheckLayers.cmake
# STAMP is touched when the check passes, so a build can depend on it.
# The levels, lowest first; keep them in step with the libraries in src/.
set(levels platform:0 localdb:1 erp:2 labels:3 dialogs:4 cards:4 control:5)

if(NOT SRC)
  message(FATAL_ERROR "CheckLayers: SRC is not set")
endif()

get_filename_component(SRC "${SRC}" ABSOLUTE)

foreach(pair IN LISTS levels)
  string(REPLACE ":" ";" pair "${pair}")
  list(GET pair 0 folder)
  list(GET pair 1 level)
  set(level_${folder} ${level})
endforeach()

file(GLOB_RECURSE sources RELATIVE "${SRC}" "${SRC}/*.h" "${SRC}/*.cpp" "${SRC}/*.ui")
list(SORT sources)
set(faults "")
set(count 0)
foreach(source IN LISTS sources)
  string(REGEX MATCH "^[^/]+" from "${source}")
  if(NOT DEFINED level_${from})
    string(APPEND faults "  ${source}: the folder '${from}' has no level; add it to cmake/CheckLayers.cmake\n")
    continue()
  endif()
  file(STRINGS "${SRC}/${source}" lines REGEX "^[ \t]*#[ \t]*include[ \t]*\"[A-Za-z0-9_]+/|<header>[A-Za-z0-9_]+/")
  foreach(line IN LISTS lines)
    string(REGEX MATCH "\"([A-Za-z0-9_]+)/[^\"]*\"|<header>([A-Za-z0-9_]+)/[^<]*" target "${line}")
    set(to "${CMAKE_MATCH_1}${CMAKE_MATCH_2}")
    string(REGEX REPLACE "^\"|\"$|^<header>" "" target "${target}")
    math(EXPR count "${count} + 1")
    if(VERBOSE)
      message(STATUS "${source} -> ${target}")
    endif()
    if(to STREQUAL from)
      continue()
    endif()
    if(NOT DEFINED level_${to})
      string(APPEND faults "  ${source} includes ${target}: '${to}' is not a folder of src/\n")
    elseif(NOT level_${to} LESS level_${from})
      string(APPEND faults "  ${source} includes ${target}: ${from}/ may not use ${to}/ (give it an interface below instead)\n")
    endif()
  endforeach()
endforeach()

if(faults)
  message(FATAL_ERROR "Includes that point up a layer:\n${faults}")
endif()
message(STATUS "layers: ${count} includes between folders of src/, none pointing up")
if(STAMP)
  file(TOUCH "${STAMP}")
endif()
