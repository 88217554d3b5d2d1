# cpack runs this when each package's files are in a folder, before it packs them.
if(NOT CPACK_GENERATOR STREQUAL "DEB")
  return()  # rpm handles dates and manuals itself
endif()
file(GLOB trees LIST_DIRECTORIES true ${CPACK_TEMPORARY_DIRECTORY}/*)
foreach(tree IN LISTS trees)
  get_filename_component(group ${tree} NAME)
  string(TOUPPER ${group} group)
  set(ENV{PACKAGE_ARCHITECTURE} "${CPACK_DEBIAN_${group}_PACKAGE_ARCHITECTURE}")
  execute_process(
    COMMAND ${CMAKE_CURRENT_LIST_DIR}/finish-tree ${tree} ${CPACK_DEBIAN_${group}_PACKAGE_NAME} ${CPACK_PACKAGE_VERSION}
            "${CPACK_PACKAGE_CONTACT}" "${CPACK_DEBIAN_${group}_PACKAGE_RECOMMENDS}" ${CPACK_PINWELL_COMPILED_IN_${group}}
    COMMAND_ERROR_IS_FATAL ANY)
  if(group STREQUAL "LIBRARY")
    # Fails if a symbol of an earlier version is missing, or a symbol has no version.
    file(GLOB_RECURSE library ${tree}/usr/lib*/libpinwell-ticket.so.${CPACK_PACKAGE_VERSION}*)
    execute_process(
      COMMAND dpkg-gensymbols -p${CPACK_DEBIAN_LIBRARY_PACKAGE_NAME} -v${CPACK_PACKAGE_VERSION} -P${tree} -e${library}
              -I${CMAKE_CURRENT_LIST_DIR}/symbols -O${CPACK_PINWELL_SYMBOLS} -c4
      COMMAND_ERROR_IS_FATAL ANY)
  endif()
endforeach()
