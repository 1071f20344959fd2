# Fails when an include climbs the house. From the ground up: platform, then
# kernel and mi side by side (neither includes the other), process, inspect,
# the boundary header src/midebug.h, and the programs in tools/ that see only
# that boundary. Only src/platform includes the operating system's headers.
#
#   cmake -DSOURCE_DIR=<repository root> -P CheckLayers.cmake

set(rank_platform 0)
set(rank_kernel 1)
set(rank_mi 1)
set(rank_process 2)
set(rank_inspect 3)

# Headers of the operating system: only the platform layer wraps them.
set(system_headers_regex "^(unistd|fcntl|signal|poll|pthread|dirent|spawn|termios|pty|dlfcn|sys/.*|netinet/.*|arpa/.*)\\.h$")

set(violations "")

function(check_file file layer)
  file(STRINGS "${file}" lines REGEX "^[ \t]*#[ \t]*include[ \t]*[<\"]")
  file(RELATIVE_PATH shown "${SOURCE_DIR}" "${file}")
  foreach(line IN LISTS lines)
    if(line MATCHES "#[ \t]*include[ \t]*\"([^\"]+)\"")
      set(target "${CMAKE_MATCH_1}")
      if(layer STREQUAL "tools")
        if(target MATCHES "/" )
          list(APPEND violations "${shown}: includes \"${target}\"; programs see only \"midebug.h\"")
        endif()
      elseif(target MATCHES "^([a-z]+)/")
        set(to "${CMAKE_MATCH_1}")
        if(NOT DEFINED rank_${to})
          list(APPEND violations "${shown}: includes \"${target}\" from no known layer")
        elseif(layer STREQUAL "boundary")
        elseif(NOT to STREQUAL layer AND NOT rank_${to} LESS rank_${layer})
          list(APPEND violations "${shown}: ${layer} includes \"${target}\" (${to} is not below it)")
        endif()
      elseif(target STREQUAL "midebug.h" AND NOT layer STREQUAL "tools")
        list(APPEND violations "${shown}: the library includes its own boundary header")
      endif()
    elseif(line MATCHES "#[ \t]*include[ \t]*<([^>]+)>")
      if(NOT layer STREQUAL "platform" AND CMAKE_MATCH_1 MATCHES "${system_headers_regex}")
        list(APPEND violations "${shown}: <${CMAKE_MATCH_1}> outside src/platform")
      endif()
    endif()
  endforeach()
  set(violations "${violations}" PARENT_SCOPE)
endfunction()

foreach(layer platform kernel mi process inspect)
  file(GLOB_RECURSE files "${SOURCE_DIR}/src/${layer}/*.h" "${SOURCE_DIR}/src/${layer}/*.cpp" "${SOURCE_DIR}/src/${layer}/*.def")
  foreach(file IN LISTS files)
    check_file("${file}" ${layer})
  endforeach()
endforeach()
check_file("${SOURCE_DIR}/src/midebug.h" boundary)
file(GLOB_RECURSE tool_files "${SOURCE_DIR}/tools/*.h" "${SOURCE_DIR}/tools/*.cpp")
foreach(file IN LISTS tool_files)
  check_file("${file}" tools)
endforeach()

if(violations)
  list(JOIN violations "\n  " shown)
  message(FATAL_ERROR "Includes that climb the layers:\n  ${shown}")
endif()
message(STATUS "No include climbs the layers.")
