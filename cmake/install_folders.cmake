# SPDX-License-Identifier: Apache-2.0
# Where in an installation the bundle lies. The folder of libraries is the host's plug-in folder, under
# which the manifest gives the bundle its place.
#
# BUNDLE_INSTALL_FILE     the bundle's file, from the prefix
# BUNDLE_INSTALL_FOLDER   its folder, from the prefix
# WEB_INSTALL_FOLDER      the folder of the host's web page, from the prefix

set(manifest_file "${PROJECT_SOURCE_DIR}/resources/manifest.json")
set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS "${manifest_file}")
file(READ "${manifest_file}" manifest)
string(JSON install_path GET "${manifest}" kq installpath)
set(BUNDLE_INSTALL_FILE "${CMAKE_INSTALL_LIBDIR}/${install_path}")
cmake_path(GET BUNDLE_INSTALL_FILE PARENT_PATH BUNDLE_INSTALL_FOLDER)
set(WEB_INSTALL_FOLDER "${CMAKE_INSTALL_DATADIR}/editor-serialization/web")
