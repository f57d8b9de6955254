# SPDX-License-Identifier: Apache-2.0
# Bundles: shared libraries that a host's framework loads by the three functions that they export.

# project_bundle(<target> NAME <symbolic name> MANIFEST <file> SOURCES ... [LINKS ...])
#
# Declares the bundle lib<symbolic name>.so. It carries the JSON file MANIFEST in its section
# .us_resources, and of all that is linked into it exports only the three entry points.
function(project_bundle target)
  cmake_parse_arguments(arg "" "NAME;MANIFEST" "SOURCES;LINKS" ${ARGN})
  cmake_path(ABSOLUTE_PATH arg_MANIFEST NORMALIZE)
  set(BUNDLE_NAME "${arg_NAME}")
  set(BUNDLE_ARCHIVE "${CMAKE_CURRENT_BINARY_DIR}/${arg_NAME}_resources.zip")
  set(resources "${CMAKE_CURRENT_BINARY_DIR}/${arg_NAME}_resources.cpp")
  set(exports "${CMAKE_CURRENT_BINARY_DIR}/${arg_NAME}_exports.map")
  configure_file("${PROJECT_SOURCE_DIR}/framework/bundle_resources.cpp.in" "${resources}" @ONLY)
  configure_file("${PROJECT_SOURCE_DIR}/framework/bundle_exports.map.in" "${exports}" @ONLY)

  add_custom_command(
    OUTPUT "${BUNDLE_ARCHIVE}"
    COMMAND make_manifest_archive "${arg_NAME}" "${arg_MANIFEST}" "${BUNDLE_ARCHIVE}"
    DEPENDS make_manifest_archive "${arg_MANIFEST}"
    VERBATIM)
  set_source_files_properties("${resources}" PROPERTIES OBJECT_DEPENDS "${BUNDLE_ARCHIVE}")

  add_library(${target} MODULE ${arg_SOURCES} "${resources}")
  set_target_properties(${target} PROPERTIES OUTPUT_NAME "${arg_NAME}" LINK_DEPENDS "${exports}")
  target_include_directories(${target} PRIVATE "${PROJECT_SOURCE_DIR}")
  target_compile_definitions(${target} PRIVATE US_BUNDLE_NAME=${arg_NAME})
  target_link_libraries(${target} PRIVATE EditorSerialization::framework_headers ${arg_LINKS})
  project_hardening(${target})
  target_link_options(${target} PRIVATE "LINKER:--version-script=${exports}")
  if(NOT EDITOR_SERIALIZATION_SANITIZERS)
    # The sanitizers' own functions are found in the host.
    target_link_options(${target} PRIVATE "LINKER:--no-undefined")
  endif()
endfunction()

# project_uses_bundle(<target>)
#
# Has the project's bundle built before <target>, whose sources get its file as SERIALIZATION_BUNDLE.
function(project_uses_bundle target)
  add_dependencies(${target} com_vorplanex_serialization)
  target_compile_definitions(${target} PRIVATE
    SERIALIZATION_BUNDLE="$<TARGET_FILE:com_vorplanex_serialization>")
endfunction()
