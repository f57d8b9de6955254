# SPDX-License-Identifier: Apache-2.0
# What is installed: the program, the bundle, and for other hosts the messaging library, the loader of
# bundles, their headers and a CMake package.
#
#   bin/serialization_host
#   lib/libeditor_messaging.so.<version>
#   lib/libeditor_framework.a
#   lib/<"installpath" of the bundle's manifest>
#   lib/cmake/EditorSerialization/, lib/pkgconfig/
#   include/editor_serialization/
#   lib/systemd/system/                 the program as a service
#   share/man/, share/bash-completion/, share/zsh/, share/fish/
#   share/editor-serialization/web/     the page that the program serves to browsers
#   share/editor-serialization/nats/    configurations for nats-server
#   share/editor-serialization/prometheus/ alerts for those who watch the program
#   share/editor-serialization/systemd/ how nats-server's service takes one of them

#   lib/sysusers.d/                     the user that the service runs as
#   share/doc/editor-serialization/
#
# In three components: `library`, `development`, and `program` for all that names none.

include(CMakePackageConfigHelpers)
set(CMAKE_INSTALL_DEFAULT_COMPONENT_NAME program)
set(documentation_folder "${CMAKE_INSTALL_DATADIR}/doc/editor-serialization")

install(TARGETS serialization_host)
install(TARGETS com_vorplanex_serialization LIBRARY DESTINATION "${BUNDLE_INSTALL_FOLDER}")

# The page; without Node.js there is none.
install(DIRECTORY "${PROJECT_SOURCE_DIR}/web/dist/" DESTINATION "${WEB_INSTALL_FOLDER}" OPTIONAL)

install(FILES "${MANUAL_FOLDER}/serialization_host.1.gz" DESTINATION "${CMAKE_INSTALL_MANDIR}/man1")
install(FILES "${MANUAL_FOLDER}/editor-serialization.7.gz" DESTINATION "${CMAKE_INSTALL_MANDIR}/man7")
install(FILES "${MANUAL_FOLDER}/serialization_host.bash" RENAME serialization_host
  DESTINATION "${CMAKE_INSTALL_DATADIR}/bash-completion/completions")
# Debian's zsh looks there.
install(FILES "${MANUAL_FOLDER}/serialization_host.zsh" RENAME _serialization_host
  DESTINATION "${CMAKE_INSTALL_DATADIR}/zsh/vendor-completions")
install(FILES "${MANUAL_FOLDER}/serialization_host.fish"
  DESTINATION "${CMAKE_INSTALL_DATADIR}/fish/vendor_completions.d")

set(header_folder "${CMAKE_INSTALL_INCLUDEDIR}/editor_serialization")
install(TARGETS editor_futures editor_messaging editor_framework EXPORT EditorSerializationTargets
  LIBRARY COMPONENT library NAMELINK_COMPONENT development
  ARCHIVE COMPONENT development
  INCLUDES DESTINATION "${header_folder}")
foreach(header IN ITEMS
    framework/bundle_runner.h
    futures/future.h
    futures/detail/shared_future_state.h
    platform/data_buffer.h
    platform/messaging/channels.h
    platform/messaging/in_process_bus.h
    platform/messaging/memory_budget.h
    platform/messaging/message_service.h
    platform/messaging/nats/nats_bus.h
    platform/messaging/transport.h)
  cmake_path(GET header PARENT_PATH folder)
  install(FILES "${PROJECT_SOURCE_DIR}/${header}" DESTINATION "${header_folder}/${folder}" COMPONENT development)
endforeach()

set(package_folder "${CMAKE_INSTALL_LIBDIR}/cmake/EditorSerialization")
set(package_files
  "${PROJECT_BINARY_DIR}/EditorSerializationConfig.cmake"
  "${PROJECT_BINARY_DIR}/EditorSerializationConfigVersion.cmake")
configure_package_config_file(
  "${PROJECT_SOURCE_DIR}/cmake/EditorSerializationConfig.cmake.in"
  "${PROJECT_BINARY_DIR}/EditorSerializationConfig.cmake"
  INSTALL_DESTINATION "${package_folder}"
  PATH_VARS BUNDLE_INSTALL_FILE)
write_basic_package_version_file(
  "${PROJECT_BINARY_DIR}/EditorSerializationConfigVersion.cmake"
  COMPATIBILITY SameMinorVersion)
install(FILES ${package_files} DESTINATION "${package_folder}" COMPONENT development)
install(EXPORT EditorSerializationTargets
  NAMESPACE EditorSerialization:: DESTINATION "${package_folder}" COMPONENT development)

set(pkgconfig_folder "${CMAKE_INSTALL_LIBDIR}/pkgconfig")
cmake_path(RELATIVE_PATH CMAKE_INSTALL_PREFIX BASE_DIRECTORY "${CMAKE_INSTALL_PREFIX}/${pkgconfig_folder}"
           OUTPUT_VARIABLE pkgconfig_prefix)
configure_file("${PROJECT_SOURCE_DIR}/packaging/editor-messaging.pc.in"
  "${PROJECT_BINARY_DIR}/editor-messaging.pc" @ONLY)
install(FILES "${PROJECT_BINARY_DIR}/editor-messaging.pc" DESTINATION "${pkgconfig_folder}" COMPONENT development)

install(DIRECTORY "${PROJECT_SOURCE_DIR}/packaging/nats" "${PROJECT_SOURCE_DIR}/packaging/prometheus"
  DESTINATION "${CMAKE_INSTALL_DATADIR}/editor-serialization")
install(FILES "${PROJECT_SOURCE_DIR}/packaging/systemd/serialization-host@.service"
  DESTINATION lib/systemd/system)
install(FILES "${PROJECT_SOURCE_DIR}/packaging/systemd/nats-server-editor.conf"
  DESTINATION "${CMAKE_INSTALL_DATADIR}/editor-serialization/systemd")
install(FILES "${PROJECT_SOURCE_DIR}/packaging/systemd/sysusers.conf" RENAME editor-serialization.conf
  DESTINATION lib/sysusers.d)
install(DIRECTORY "${PROJECT_SOURCE_DIR}/docs/" DESTINATION "${documentation_folder}")
install(FILES "${PROJECT_SOURCE_DIR}/NOTICE" DESTINATION "${documentation_folder}")
install(DIRECTORY "${PROJECT_SOURCE_DIR}/examples/embedding" DESTINATION "${documentation_folder}/examples"
  COMPONENT development)

include(packages)
