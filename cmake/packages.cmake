# SPDX-License-Identifier: Apache-2.0
# The packages that cpack makes: a tar archive of all that is installed, and three for Debian,
#
#   libeditor-messaging0     the library that the bundle and its host share
#   libeditor-messaging-dev  its headers, CMake package and pkg-config file, the loader of bundles
#   editor-serialization     the bundle, the program, the page, the units, the manual, the documentation
#
# Those for Debian are meant to be made by the preset `package`, which has Debian's folders. The same sources
# make the same bytes: packaging/debian/finish.cmake says how.

set(CPACK_GENERATOR TGZ DEB)
set(CPACK_PACKAGE_NAME editor-serialization)
set(CPACK_PACKAGE_VENDOR "The Editor Serialization authors")
set(CPACK_PACKAGE_CONTACT "The Editor Serialization authors <authors@editor-serialization.example.org>")
set(CPACK_PACKAGE_DIRECTORY "${PROJECT_BINARY_DIR}/packages")
set(CPACK_STRIP_FILES ON)
set(CPACK_INSTALL_DEFAULT_DIRECTORY_PERMISSIONS
  OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE WORLD_READ WORLD_EXECUTE)
set(CPACK_COMPONENTS_ALL library development program)
set(CPACK_COMPONENTS_GROUPING IGNORE)
set(CPACK_DEBIAN_PACKAGES libeditor-messaging0 libeditor-messaging-dev editor-serialization)
set(CPACK_COMPONENT_PROGRAM_DEPENDS library)
set(CPACK_COMPONENT_DEVELOPMENT_DEPENDS library program)

set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_DEBIAN_ENABLE_COMPONENT_DEPENDS ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_LIBRARY_PACKAGE_NAME libeditor-messaging0)
set(CPACK_DEBIAN_LIBRARY_PACKAGE_SECTION libs)
set(CPACK_DEBIAN_LIBRARY_PACKAGE_CONTROL_EXTRA "${PROJECT_SOURCE_DIR}/packaging/debian/triggers")
set(CPACK_DEBIAN_LIBRARY_PACKAGE_CONTROL_STRICT_PERMISSION ON)
set(CPACK_DEBIAN_LIBRARY_DESCRIPTION "message service for the document-serialization bundle
A plug-in that opens and saves the documents of a browser-based editor takes
its requests from this library, in the process or over NATS.")
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_NAME libeditor-messaging-dev)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_DEVELOPMENT_DESCRIPTION "message service for the document-serialization bundle (development)
What a host of one's own takes that runs the bundle of editor-serialization:
headers, a CMake package, a pkg-config file and a loader for bundles.")
set(CPACK_DEBIAN_PROGRAM_PACKAGE_NAME editor-serialization)
set(CPACK_DEBIAN_PROGRAM_PACKAGE_SECTION editors)
set(CPACK_DEBIAN_PROGRAM_DESCRIPTION "documents on disk for a browser-based document editor
A plug-in bundle that opens text files in any charset and document packages
for an editor that runs in a browser, and saves them, with a program that
serves it over NATS, from one user's machine to several servers.")
set(CPACK_DEBIAN_PROGRAM_PACKAGE_RECOMMENDS "ca-certificates, nats-server")
set(CPACK_DEBIAN_PROGRAM_PACKAGE_CONTROL_EXTRA
  "${PROJECT_SOURCE_DIR}/packaging/debian/postinst" "${PROJECT_SOURCE_DIR}/packaging/debian/postrm")
set(CPACK_DEBIAN_PROGRAM_PACKAGE_CONTROL_STRICT_PERMISSION ON)

# Each package depends on those of the libraries that its files are linked with, as dpkg-shlibdeps finds them;
# of the project's own library, whose interface may change with every version until 1.0, on this version.
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS "${CMAKE_LIBRARY_OUTPUT_DIRECTORY}")
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS_POLICY "=")
set(CPACK_PRE_BUILD_SCRIPTS "${PROJECT_SOURCE_DIR}/packaging/debian/finish.cmake")
include(CPack)
