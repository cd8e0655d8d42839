# Packs once more what CPack has packed, in the order of names, which CPack leaves to the file system: the same files are the
# same package. And drops the maintainer scripts that CPack makes to call ldconfig: the library's trigger does that.
set(FOLDER "${CPACK_TEMPORARY_DIRECTORY}/repacked")
foreach(PACKAGE IN LISTS CPACK_PACKAGE_FILES)
  file(REMOVE_RECURSE "${FOLDER}")
  if(PACKAGE MATCHES "\\.deb$")
    execute_process(COMMAND dpkg-deb --raw-extract "${PACKAGE}" "${FOLDER}" COMMAND_ERROR_IS_FATAL ANY)
    if(PACKAGE MATCHES "/libostra[^/]*$")
      file(REMOVE "${FOLDER}/DEBIAN/postinst" "${FOLDER}/DEBIAN/postrm")
    endif()
    execute_process(COMMAND sort -k 2 -o "${FOLDER}/DEBIAN/md5sums" "${FOLDER}/DEBIAN/md5sums" COMMAND_ERROR_IS_FATAL ANY)
    execute_process(COMMAND dpkg-deb --root-owner-group --build "${FOLDER}" "${PACKAGE}"
      OUTPUT_QUIET COMMAND_ERROR_IS_FATAL ANY)
  elseif(PACKAGE MATCHES "\\.tar\\.gz$")
    file(MAKE_DIRECTORY "${FOLDER}")
    execute_process(COMMAND tar -xzf "${PACKAGE}" -C "${FOLDER}" COMMAND_ERROR_IS_FATAL ANY)
    file(GLOB TOP RELATIVE "${FOLDER}" "${FOLDER}/*")
    execute_process(COMMAND tar --sort=name --owner=root:0 --group=root:0 --use-compress-program "gzip -9n" -cf "${PACKAGE}" -C "${FOLDER}" ${TOP}
      COMMAND_ERROR_IS_FATAL ANY)
  endif()
endforeach()
file(REMOVE_RECURSE "${FOLDER}")
