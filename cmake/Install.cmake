# What `cmake --install <build> [--prefix <dir>]` puts in place: the library
# with its soname, the boundary header and the headers it reaches, the
# console debugger, the debug adapter, a CMake package (midebug::midebug) and
# a pkg-config file.

include(CMakePackageConfigHelpers)
include(${CMAKE_CURRENT_LIST_DIR}/PublicHeaders.cmake)

set(MIDEBUG_CMAKE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/midebug)

install(TARGETS midebug EXPORT midebugTargets
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
  ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR}
  RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})

# The installed program finds the installed library wherever the prefix is.
file(RELATIVE_PATH MIDEBUG_BIN_TO_LIB
  ${CMAKE_INSTALL_FULL_BINDIR} ${CMAKE_INSTALL_FULL_LIBDIR})
set_target_properties(midebug-cli midebug-dap PROPERTIES INSTALL_RPATH "$ORIGIN/${MIDEBUG_BIN_TO_LIB}")
install(TARGETS midebug-cli midebug-dap RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})

midebug_header_closure(MIDEBUG_PUBLIC_HEADERS
  ROOT ${CMAKE_CURRENT_SOURCE_DIR}/src
  HEADERS midebug.h)
foreach(header IN LISTS MIDEBUG_PUBLIC_HEADERS)
  get_filename_component(folder ${header} DIRECTORY)
  install(FILES src/${header} DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/midebug/${folder})
endforeach()

install(EXPORT midebugTargets
  NAMESPACE midebug::
  FILE midebugTargets.cmake
  DESTINATION ${MIDEBUG_CMAKE_DIR})
configure_package_config_file(
  ${CMAKE_CURRENT_LIST_DIR}/midebugConfig.cmake.in
  ${CMAKE_CURRENT_BINARY_DIR}/midebugConfig.cmake
  INSTALL_DESTINATION ${MIDEBUG_CMAKE_DIR})
# Before 1.0 a minor version may change the boundary, so only the same
# major.minor satisfies a request.
write_basic_package_version_file(
  ${CMAKE_CURRENT_BINARY_DIR}/midebugConfigVersion.cmake
  VERSION ${PROJECT_VERSION}
  COMPATIBILITY SameMinorVersion)
install(FILES
  ${CMAKE_CURRENT_BINARY_DIR}/midebugConfig.cmake
  ${CMAKE_CURRENT_BINARY_DIR}/midebugConfigVersion.cmake
  DESTINATION ${MIDEBUG_CMAKE_DIR})

# The .pc file names its prefix relative to itself (${pcfiledir}), since the
# prefix given to `cmake --install --prefix` is not known here.
if(IS_ABSOLUTE "${CMAKE_INSTALL_LIBDIR}")
  set(MIDEBUG_PC_PREFIX "${CMAKE_INSTALL_PREFIX}")
  set(MIDEBUG_PC_LIBDIR "${CMAKE_INSTALL_LIBDIR}")
else()
  file(RELATIVE_PATH MIDEBUG_PC_UP /prefix/${CMAKE_INSTALL_LIBDIR}/pkgconfig /prefix)
  string(REGEX REPLACE "/$" "" MIDEBUG_PC_UP "${MIDEBUG_PC_UP}")
  set(MIDEBUG_PC_PREFIX "\${pcfiledir}/${MIDEBUG_PC_UP}")
  set(MIDEBUG_PC_LIBDIR "\${prefix}/${CMAKE_INSTALL_LIBDIR}")
endif()
if(IS_ABSOLUTE "${CMAKE_INSTALL_INCLUDEDIR}")
  set(MIDEBUG_PC_INCLUDEDIR "${CMAKE_INSTALL_INCLUDEDIR}")
else()
  set(MIDEBUG_PC_INCLUDEDIR "\${prefix}/${CMAKE_INSTALL_INCLUDEDIR}")
endif()
configure_file(${CMAKE_CURRENT_LIST_DIR}/midebug.pc.in ${CMAKE_CURRENT_BINARY_DIR}/midebug.pc @ONLY)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/midebug.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
