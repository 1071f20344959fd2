# Installs the current build into a fresh prefix and uses it the way a
# program outside this tree would: through find_package(midebug) and through
# pkg-config. Fails on the first thing that is missing or does not work.
#
#   cmake -DBUILD_DIR=<build> -DCONFIG=<config> -DWORK_DIR=<scratch dir>
#         -DCONSUMER_DIR=<tests/install/consumer> -DLIBDIR=<CMAKE_INSTALL_LIBDIR>
#         -DBINDIR=<CMAKE_INSTALL_BINDIR> -DINCLUDEDIR=<CMAKE_INSTALL_INCLUDEDIR>
#         -DVERSION=<x.y.z> -DSOVERSION=<n>
#         -DGENERATOR=<generator> -DCXX_COMPILER=<c++ compiler>
#         [-DBUILD_TYPE=<type>] [-DCONSUMER_FLAGS="<flag> <flag>"]
#         -P CheckInstall.cmake

cmake_minimum_required(VERSION 3.25)

foreach(var BUILD_DIR WORK_DIR CONSUMER_DIR LIBDIR BINDIR INCLUDEDIR VERSION SOVERSION GENERATOR CXX_COMPILER)
  if(NOT DEFINED ${var} OR "${${var}}" STREQUAL "")
    message(FATAL_ERROR "CheckInstall.cmake needs -D${var}=...")
  endif()
endforeach()
foreach(var LIBDIR BINDIR INCLUDEDIR)
  if(IS_ABSOLUTE "${${var}}")
    message(FATAL_ERROR "${var} is absolute (${${var}}); the install cannot be checked in a scratch prefix")
  endif()
endforeach()

# Runs a command; stops the check with its output when it fails. The output
# is left in <out_var> when one is given.
function(run what)
  cmake_parse_arguments(PARSE_ARGV 1 arg "" "OUTPUT" "COMMAND")
  execute_process(COMMAND ${arg_COMMAND}
    RESULT_VARIABLE code OUTPUT_VARIABLE out ERROR_VARIABLE err)
  if(NOT code EQUAL 0)
    list(JOIN arg_COMMAND " " shown)
    message(FATAL_ERROR "${what} failed (${code}):\n  ${shown}\n${out}\n${err}")
  endif()
  if(arg_OUTPUT)
    set(${arg_OUTPUT} "${out}${err}" PARENT_SCOPE)
  endif()
endfunction()

set(prefix "${WORK_DIR}/prefix")
set(libdir "${prefix}/${LIBDIR}")
file(REMOVE_RECURSE "${WORK_DIR}")
file(MAKE_DIRECTORY "${WORK_DIR}")

set(config_args "")
if(CONFIG)
  set(config_args --config "${CONFIG}")
endif()
run("Installing the build" COMMAND "${CMAKE_COMMAND}" --install "${BUILD_DIR}" --prefix "${prefix}" ${config_args})

# The library, under the name the loader looks for and the name the linker
# takes, and with that soname recorded in it.
foreach(name libmidebug.so libmidebug.so.${SOVERSION} libmidebug.so.${VERSION})
  if(NOT EXISTS "${libdir}/${name}")
    message(FATAL_ERROR "${libdir}/${name} is not installed")
  endif()
endforeach()
find_program(READELF readelf)
find_program(OBJDUMP objdump)
# Prints the dynamic section of a file, or nothing when no tool can.
function(dynamic_section file out_var)
  if(READELF)
    run("Reading ${file}" COMMAND "${READELF}" -d "${file}" OUTPUT out)
  elseif(OBJDUMP)
    run("Reading ${file}" COMMAND "${OBJDUMP}" -p "${file}" OUTPUT out)
  else()
    set(out "")
  endif()
  set(${out_var} "${out}" PARENT_SCOPE)
endfunction()
dynamic_section("${libdir}/libmidebug.so" library_dynamic)
if(library_dynamic STREQUAL "")
  message(STATUS "Neither readelf nor objdump is installed: the soname is not checked")
elseif(NOT library_dynamic MATCHES "(SONAME[ \t]+|soname: \\[)libmidebug\\.so\\.${SOVERSION}[] \t\r\n]")
  message(FATAL_ERROR "The installed library does not have the soname libmidebug.so.${SOVERSION}:\n${library_dynamic}")
endif()

# The console debugger runs from the prefix, finding the installed library.
set(program "${prefix}/${BINDIR}/midebug")
if(NOT EXISTS "${program}")
  message(FATAL_ERROR "${program} is not installed")
endif()
run("${program} --help" COMMAND "${program}" --help OUTPUT help)
if(NOT help MATCHES "usage: midebug")
  message(FATAL_ERROR "${program} --help printed no usage:\n${help}")
endif()

# Only the headers are needed to compile against the package; the boundary
# header is there, at the include root the package names.
if(NOT EXISTS "${prefix}/${INCLUDEDIR}/midebug/midebug.h")
  file(GLOB_RECURSE found LIST_DIRECTORIES false RELATIVE "${prefix}" "${prefix}/*.h")
  message(FATAL_ERROR "${INCLUDEDIR}/midebug/midebug.h is not installed; headers found: ${found}")
endif()

# Runs a consumer program and checks the line it prints when the library
# answered as expected.
function(check_consumer what program)
  run("Running the consumer built ${what}" COMMAND "${program}" OUTPUT out)
  if(NOT out MATCHES "midebug consumer ok: ")
    message(FATAL_ERROR "The consumer built ${what} did not report success:\n${out}")
  endif()
  dynamic_section("${program}" consumer_dynamic)
  if(NOT consumer_dynamic STREQUAL ""
     AND NOT consumer_dynamic MATCHES "(NEEDED[ \t]+|Shared library: \\[)libmidebug\\.so\\.${SOVERSION}[] \t\r\n]")
    message(FATAL_ERROR "The consumer built ${what} does not depend on libmidebug.so.${SOVERSION}:\n${consumer_dynamic}")
  endif()
  message(STATUS "Consumer built ${what}: ${out}")
endfunction()

# 1. CMake: find_package(midebug) and midebug::midebug.
set(consumer_build "${WORK_DIR}/consumer-cmake")
set(consumer_args "")
if(BUILD_TYPE)
  list(APPEND consumer_args "-DCMAKE_BUILD_TYPE=${BUILD_TYPE}")
endif()
if(CONSUMER_FLAGS)
  list(APPEND consumer_args "-DMIDEBUG_CONSUMER_FLAGS=${CONSUMER_FLAGS}")
endif()
run("Configuring the consumer" OUTPUT configured COMMAND
  "${CMAKE_COMMAND}" -S "${CONSUMER_DIR}" -B "${consumer_build}" -G "${GENERATOR}"
  "-DCMAKE_CXX_COMPILER=${CXX_COMPILER}"
  "-DCMAKE_PREFIX_PATH=${prefix}"
  -DCMAKE_FIND_USE_PACKAGE_REGISTRY=OFF
  "-DMIDEBUG_EXPECTED_VERSION=${VERSION}"
  ${consumer_args})
# The package found must be the one just installed, not another one on the
# machine.
string(FIND "${configured}" "midebug package: ${prefix}/" at)
if(at EQUAL -1)
  message(FATAL_ERROR "The consumer did not find the package in ${prefix}:\n${configured}")
endif()
run("Building the consumer" COMMAND "${CMAKE_COMMAND}" --build "${consumer_build}")
check_consumer("with find_package" "${consumer_build}/consumer")

# 2. pkg-config: the same program, compiled with what midebug.pc says.
find_program(PKG_CONFIG NAMES pkg-config pkgconf)
if(NOT PKG_CONFIG)
  message(STATUS "pkg-config is not installed: the pkg-config half is skipped")
  return()
endif()
set(ENV{PKG_CONFIG_PATH} "${libdir}/pkgconfig")
set(ENV{PKG_CONFIG_LIBDIR} "${libdir}/pkgconfig")
run("pkg-config midebug" OUTPUT pc_flags COMMAND "${PKG_CONFIG}" --cflags --libs midebug)
run("pkg-config --modversion midebug" OUTPUT pc_version COMMAND "${PKG_CONFIG}" --modversion midebug)
run("pkg-config --variable=libdir midebug" OUTPUT pc_libdir COMMAND "${PKG_CONFIG}" --variable=libdir midebug)
string(STRIP "${pc_flags}" pc_flags)
string(STRIP "${pc_version}" pc_version)
string(STRIP "${pc_libdir}" pc_libdir)
if(NOT pc_version STREQUAL VERSION)
  message(FATAL_ERROR "midebug.pc gives version '${pc_version}', not ${VERSION}")
endif()
file(REAL_PATH "${pc_libdir}" pc_libdir_real)
file(REAL_PATH "${libdir}" libdir_real)
if(NOT pc_libdir_real STREQUAL libdir_real)
  message(FATAL_ERROR "midebug.pc gives libdir '${pc_libdir}', not ${libdir}")
endif()
separate_arguments(pc_flags UNIX_COMMAND "${pc_flags}")
separate_arguments(extra_flags UNIX_COMMAND "${CONSUMER_FLAGS}")
set(pc_program "${WORK_DIR}/consumer-pkgconfig")
run("Compiling the consumer with pkg-config's flags" COMMAND
  "${CXX_COMPILER}" -std=c++20 -Wall -Wextra -Wpedantic -Werror ${extra_flags}
  "${CONSUMER_DIR}/main.cpp" -o "${pc_program}" ${pc_flags} "-Wl,-rpath,${pc_libdir}")
check_consumer("with pkg-config" "${pc_program}")
