# The headers an installed midebug must carry: the boundary header and every
# file it reaches through #include "..." lines, .def tables included. Private
# headers stay out of the package, so an IDE cannot come to depend on them.
#
#   midebug_header_closure(<out-var> ROOT <include root> HEADERS <file>...)
#
# Sets <out-var> to the closure as paths relative to ROOT, sorted. A quoted
# include is looked for beside the including file first, then under ROOT, as
# the compiler does with -I<ROOT>; one found in neither place stops the
# configuration, since the installed header would not compile. Every file
# read is added to CMAKE_CONFIGURE_DEPENDS, so that a new include in any of
# them recomputes the list at the next build.

function(midebug_header_closure out_var)
  cmake_parse_arguments(PARSE_ARGV 1 arg "" "ROOT" "HEADERS")
  if(NOT arg_ROOT OR NOT arg_HEADERS)
    message(FATAL_ERROR "midebug_header_closure: ROOT and HEADERS are required")
  endif()
  get_filename_component(root "${arg_ROOT}" ABSOLUTE)

  set(pending "")
  foreach(header IN LISTS arg_HEADERS)
    get_filename_component(header "${header}" ABSOLUTE BASE_DIR "${root}")
    list(APPEND pending "${header}")
  endforeach()

  set(seen "")
  while(pending)
    list(POP_FRONT pending file)
    if(file IN_LIST seen)
      continue()
    endif()
    list(APPEND seen "${file}")
    set_property(DIRECTORY "${CMAKE_SOURCE_DIR}" APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS "${file}")

    get_filename_component(here "${file}" DIRECTORY)
    file(STRINGS "${file}" lines REGEX "^[ \t]*#[ \t]*include[ \t]*\"[^\"]+\"")
    foreach(line IN LISTS lines)
      string(REGEX REPLACE "^[ \t]*#[ \t]*include[ \t]*\"([^\"]+)\".*$" "\\1" name "${line}")
      if(EXISTS "${here}/${name}")
        get_filename_component(found "${here}/${name}" ABSOLUTE)
      elseif(EXISTS "${root}/${name}")
        get_filename_component(found "${root}/${name}" ABSOLUTE)
      else()
        file(RELATIVE_PATH shown "${root}" "${file}")
        message(FATAL_ERROR "${shown} includes \"${name}\", which is not under ${root}; "
                            "the installed headers would not compile")
      endif()
      file(RELATIVE_PATH inside "${root}" "${found}")
      if(inside MATCHES "^\\.\\./")
        file(RELATIVE_PATH shown "${root}" "${file}")
        message(FATAL_ERROR "${shown} includes \"${name}\" from outside ${root}")
      endif()
      list(APPEND pending "${found}")
    endforeach()
  endwhile()

  set(result "")
  foreach(file IN LISTS seen)
    file(RELATIVE_PATH inside "${root}" "${file}")
    list(APPEND result "${inside}")
  endforeach()
  list(SORT result)
  set(${out_var} "${result}" PARENT_SCOPE)
endfunction()
