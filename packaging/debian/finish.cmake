# SPDX-License-Identifier: Apache-2.0
# Run by cpack on the files of a package before it packs them. Adds what only a Debian package has, and gives
# all files the time of $SOURCE_DATE_EPOCH, or else that of the changelog, so that the same sources make the same
# package. (The umask has to be the same: cpack leaves its mark in the package.)
set(here "${CMAKE_CURRENT_LIST_DIR}")

# The dependencies are not left out where the program that finds them is missing.
if(CPACK_GENERATOR STREQUAL "DEB")
  foreach(program IN ITEMS dpkg-shlibdeps file)
    execute_process(COMMAND ${program} --version OUTPUT_QUIET ERROR_QUIET RESULT_VARIABLE status)
    if(NOT status STREQUAL "0")
      message(FATAL_ERROR "Debian packages cannot be made without ${program} (packages dpkg-dev and file)")
    endif()
  endforeach()
  if(NOT EXISTS "${CPACK_TEMPORARY_DIRECTORY}/program/usr/share/editor-serialization/web/index.html")
    message(WARNING "The page has not been built (npm run build in web/), and is not in the package")
  endif()
  foreach(component package IN ZIP_LISTS CPACK_COMPONENTS_ALL CPACK_DEBIAN_PACKAGES)
    set(share "${CPACK_TEMPORARY_DIRECTORY}/${component}/usr/share")
    configure_file("${here}/copyright" "${share}/doc/${package}/copyright" COPYONLY)
    execute_process(COMMAND gzip -9n COMMAND_ERROR_IS_FATAL ANY
      INPUT_FILE "${here}/changelog" OUTPUT_FILE "${share}/doc/${package}/changelog.gz")
    if(EXISTS "${here}/${package}.lintian-overrides")
      configure_file("${here}/${package}.lintian-overrides" "${share}/lintian/overrides/${package}" COPYONLY)
    endif()
  endforeach()
endif()

if(NOT DEFINED ENV{SOURCE_DATE_EPOCH})
  file(STRINGS "${here}/changelog" times REGEX "^ -- ")
  list(GET times 0 newest)
  string(REGEX REPLACE ".*>  " "" newest "${newest}")
  execute_process(COMMAND date --date "${newest}" +%s COMMAND_ERROR_IS_FATAL ANY
    OUTPUT_VARIABLE newest OUTPUT_STRIP_TRAILING_WHITESPACE)
  set(ENV{SOURCE_DATE_EPOCH} "${newest}")
endif()
execute_process(COMMAND_ERROR_IS_FATAL ANY
  COMMAND chmod -R u=rwX,go=rX "${CPACK_TEMPORARY_DIRECTORY}")
execute_process(COMMAND_ERROR_IS_FATAL ANY
  COMMAND find "${CPACK_TEMPORARY_DIRECTORY}" -exec touch --no-dereference --date "@$ENV{SOURCE_DATE_EPOCH}" {} +)
