# Run by cpack when the packages are made: packs each again, and puts its bill of materials beside it.
foreach(package IN LISTS CPACK_PACKAGE_FILES)
  execute_process(COMMAND ${CMAKE_CURRENT_LIST_DIR}/repack ${package} COMMAND_ERROR_IS_FATAL ANY)
  get_filename_component(file ${package} NAME)
  string(REGEX REPLACE "_.*" "" name ${file})
  string(REGEX REPLACE "\\.deb$" ".spdx.json" bill ${file})
  file(GLOB installed ${CPACK_TEMPORARY_DIRECTORY}/*/usr/share/doc/${name}/${name}.spdx.json)
  configure_file(${installed} ${CPACK_PACKAGE_DIRECTORY}/${bill} COPYONLY)
endforeach()
