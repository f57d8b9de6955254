# SPDX-License-Identifier: Apache-2.0
# Compiler settings that hold for every target of the project, and the helpers with which the folders
# declare their libraries and tests.

set(CMAKE_CXX_STANDARD 20)
set(CMAKE_CXX_STANDARD_REQUIRED ON)
set(CMAKE_CXX_EXTENSIONS OFF)
set(CMAKE_POSITION_INDEPENDENT_CODE ON)
set(CMAKE_CXX_VISIBILITY_PRESET hidden)
set(CMAKE_VISIBILITY_INLINES_HIDDEN ON)
set(CMAKE_EXPORT_COMPILE_COMMANDS ON)

# Everything that runs lands in two folders, which lie to each other as in an installation, so that
# programs find libraries and bundles in the same way in both.
set(CMAKE_RUNTIME_OUTPUT_DIRECTORY "${PROJECT_BINARY_DIR}/${CMAKE_INSTALL_BINDIR}")
set(CMAKE_LIBRARY_OUTPUT_DIRECTORY "${PROJECT_BINARY_DIR}/${CMAKE_INSTALL_LIBDIR}")

option(EDITOR_SERIALIZATION_WARNINGS_AS_ERRORS "Treat compiler warnings as errors" ON)
set(EDITOR_SERIALIZATION_SANITIZERS "" CACHE STRING "Sanitizers to build with, as for -fsanitize=")
# 1 or 0; generator expressions cannot take the list, for its commas.
string(COMPARE NOTEQUAL "${EDITOR_SERIALIZATION_SANITIZERS}" "" EDITOR_SERIALIZATION_IS_SANITIZED)

add_compile_options(-Wall -Wextra -Wpedantic -Wconversion -Wshadow)
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_CXX_COMPILER_VERSION VERSION_LESS 13)
  # Cries wolf over every std::variant that is moved through an inlined temporary, and over
  # overlaps in plain concatenations of strings.
  add_compile_options(-Wno-maybe-uninitialized -Wno-restrict)
endif()
if(EDITOR_SERIALIZATION_WARNINGS_AS_ERRORS)
  add_compile_options(-Werror)
endif()
if(EDITOR_SERIALIZATION_SANITIZERS)
  add_compile_options(-fsanitize=${EDITOR_SERIALIZATION_SANITIZERS} -fno-omit-frame-pointer
                      -fno-sanitize-recover=all)
  add_link_options(-fsanitize=${EDITOR_SERIALIZATION_SANITIZERS})
endif()

# project_hardening(<target>)
#
# Has what is shipped end, where it can, as soon as a mistake in it is used to take it over: overrun
# buffers and stacks are noticed, tables of functions cannot be written, addresses cannot be foreseen,
# and calls go to beginnings of functions only. None of it takes time that can be measured.
include(CheckPIESupported)
check_pie_supported(LANGUAGES CXX)
function(project_hardening target)
  if(EDITOR_SERIALIZATION_SANITIZERS)
    return()  # They notice more, and put functions of their own in the way.
  endif()
  set(options -U_FORTIFY_SOURCE -D_FORTIFY_SOURCE=3 -fstack-protector-strong -fstack-clash-protection)
  if(CMAKE_SYSTEM_PROCESSOR MATCHES "x86_64|AMD64")
    list(APPEND options -fcf-protection)
  elseif(CMAKE_SYSTEM_PROCESSOR STREQUAL "aarch64")
    list(APPEND options -mbranch-protection=standard)
  endif()
  target_compile_options(${target} PRIVATE "$<$<CONFIG:Release>:${options}>")
  target_link_options(${target} PRIVATE "$<$<CONFIG:Release>:LINKER:-z,relro,-z,now>")
endfunction()

# project_run_path(<target> FOLDER...)
#
# Has the loader look for the target's libraries in these folders, in the build tree and where it is
# installed. A path that differed would be rewritten by the installation, and CMake ends those in a build
# tree with an empty entry: the loader takes that for the current folder, and runs whatever library lies
# there.
function(project_run_path target)
  set_target_properties(${target} PROPERTIES
    BUILD_WITH_INSTALL_RPATH ON
    INSTALL_RPATH "${ARGN}")
endfunction()

# project_library(<name> [STATIC|SHARED] [SOURCES ...] [LINKS ...] [PRIVATE_LINKS ...])
#
# Declares library `editor_<name>` with the alias EditorSerialization::<name>. Without sources it is
# header-only. Includes are written from the project's root ("json/value.h").
function(project_library name)
  cmake_parse_arguments(arg "SHARED" "" "SOURCES;LINKS;PRIVATE_LINKS" ${ARGN})
  set(target "editor_${name}")
  if(NOT arg_SOURCES)
    add_library(${target} INTERFACE)
    target_include_directories(${target} INTERFACE "$<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}>")
    target_compile_features(${target} INTERFACE cxx_std_20)
    target_link_libraries(${target} INTERFACE ${arg_LINKS})
  else()
    if(arg_SHARED)
      add_library(${target} SHARED ${arg_SOURCES})
      # Until 1.0 the interface may change with each version; packages depend on theirs.
      set_target_properties(${target} PROPERTIES
        VERSION ${PROJECT_VERSION} SOVERSION ${PROJECT_VERSION_MAJOR})
    else()
      add_library(${target} STATIC ${arg_SOURCES})
    endif()
    project_hardening(${target})
    target_include_directories(${target} PUBLIC "$<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}>")
    target_compile_features(${target} PUBLIC cxx_std_20)
    target_link_libraries(${target} PUBLIC ${arg_LINKS} PRIVATE ${arg_PRIVATE_LINKS})
  endif()
  set_target_properties(${target} PROPERTIES EXPORT_NAME ${name})
  add_library(EditorSerialization::${name} ALIAS ${target})
endfunction()

# What is tested is optimised as it ships; optimising the tests themselves took half of the build.
set(test_options "$<$<CONFIG:Release>:-O1>")
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_CXX_COMPILER_VERSION VERSION_LESS 13)
  # Both cry wolf over strings at -O1.
  list(APPEND test_options -Wno-array-bounds -Wno-stringop-overflow)
endif()

# The checks of UndefinedBehaviorSanitizer that stand at every pointer. In the tests' own sources they took two fifths
# of the compilation; what is tested keeps them, and AddressSanitizer finds most of what they find.
if(EDITOR_SERIALIZATION_SANITIZERS MATCHES "undefined")
  list(APPEND test_options -fno-sanitize=null,alignment,object-size,vptr)
endif()

# project_test(<name> SOURCES ... [LINKS ...])
#
# Declares the test program `<name>_test` and registers each of its tests with CTest as <name>.<test>.
function(project_test name)
  cmake_parse_arguments(arg "" "" "SOURCES;LINKS" ${ARGN})
  set(target "${name}_test")
  add_executable(${target} ${arg_SOURCES})
  target_include_directories(${target} PRIVATE "${PROJECT_SOURCE_DIR}")
  target_compile_options(${target} PRIVATE ${test_options})
  target_precompile_headers(${target} REUSE_FROM editor_test_support)
  target_link_libraries(${target} PRIVATE ${arg_LINKS} editor_test_support GTest::gmock GTest::gtest_main)
  # Without the values of parameters, which may be addresses and differ from run to run.
  gtest_discover_tests(${target} TEST_PREFIX "${name}." NO_PRETTY_VALUES DISCOVERY_TIMEOUT 60
                       PROPERTIES TIMEOUT 600
                                  # Earlier versions must not be kept among the user's own.
                                  ENVIRONMENT "XDG_STATE_HOME=${PROJECT_BINARY_DIR}/Testing/state")
endfunction()

# project_test_program(<variable> <target>)
#
# Sets the variable to the path under which tests start the program: its own, or that of a script which runs it in the
# emulator, since the kernel starts no programs for another processor.
function(project_test_program variable target)
  set(path "$<TARGET_FILE:${target}>")
  if(CMAKE_CROSSCOMPILING_EMULATOR)
    set(path "${PROJECT_BINARY_DIR}/emulated/${target}")
    list(JOIN CMAKE_CROSSCOMPILING_EMULATOR "' '" emulator)
    file(GENERATE OUTPUT "${path}"
      CONTENT "#!/bin/sh\nexec '${emulator}' '$<TARGET_FILE:${target}>' \"$@\"\n"
      FILE_PERMISSIONS OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE WORLD_READ WORLD_EXECUTE)
  endif()
  set(${variable} "${path}" PARENT_SCOPE)
endfunction()
