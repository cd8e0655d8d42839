# Packs once more what CPack has packed, in the order of names, which CPack leaves to the file system: the same files are the
# same package. And drops the maintainer scripts that CPack makes to call ldconfig: the library's trigger does that.
set(FOLDER "${CPACK_TEMPORARY_DIRECTORY}/repacked")
foreach(PACKAGE IN LISTS CPACK_PACKAGE_FILES)
  file(REMOVE_RECURSE "${FOLDER}")
  if(PACKAGE MATCHES "\\.d?deb$")
    execute_process(COMMAND dpkg-deb --raw-extract "${PACKAGE}" "${FOLDER}" COMMAND_ERROR_IS_FATAL ANY)
    if(PACKAGE MATCHES "/libostra[^/]*$")
      file(REMOVE "${FOLDER}/DEBIAN/postinst" "${FOLDER}/DEBIAN/postrm")
    endif()
    if(PACKAGE MATCHES "/([^/_]*)-dbgsym_[^/]*$")
      # As Debian has it: change log and licence are those of the package.
      file(MAKE_DIRECTORY "${FOLDER}/usr/share/doc")
      file(CREATE_LINK "${CMAKE_MATCH_1}" "${FOLDER}/usr/share/doc/${CMAKE_MATCH_1}-dbgsym" SYMBOLIC)
      file(GLOB_RECURSE SYMBOLS "${FOLDER}/usr/lib/*.debug")
      file(CHMOD ${SYMBOLS} PERMISSIONS OWNER_READ OWNER_WRITE GROUP_READ WORLD_READ)
    endif()
    # CPack has the packages of symbols with paths of this machine there.
    execute_process(COMMAND sh -c "find * -path DEBIAN -prune -o -type f -print | LC_ALL=C sort | xargs md5sum >DEBIAN/md5sums"
      WORKING_DIRECTORY "${FOLDER}" COMMAND_ERROR_IS_FATAL ANY)
    execute_process(COMMAND dpkg-deb --root-owner-group --build "${FOLDER}" "${PACKAGE}"
      OUTPUT_QUIET COMMAND_ERROR_IS_FATAL ANY)
  elseif(PACKAGE MATCHES "\\.tar\\.gz$")
    file(MAKE_DIRECTORY "${FOLDER}")
    execute_process(COMMAND tar -xzf "${PACKAGE}" -C "${FOLDER}" COMMAND_ERROR_IS_FATAL ANY)
    file(GLOB TOP RELATIVE "${FOLDER}" "${FOLDER}/*")
    set(MODIFIED)
    if(DEFINED ENV{SOURCE_DATE_EPOCH})
      set(MODIFIED "--mtime=@$ENV{SOURCE_DATE_EPOCH}")  # CPack dates the outermost folder when it makes it
    endif()
    execute_process(COMMAND tar --sort=name --owner=root:0 --group=root:0 ${MODIFIED} --use-compress-program "gzip -9n"
        -cf "${PACKAGE}" -C "${FOLDER}" ${TOP}
      COMMAND_ERROR_IS_FATAL ANY)
  elseif(PACKAGE MATCHES "\\.zip$")
    file(ARCHIVE_EXTRACT INPUT "${PACKAGE}" DESTINATION "${FOLDER}")
    file(REMOVE "${PACKAGE}")
    execute_process(COMMAND sh -c "find . -exec touch -d \"@\${SOURCE_DATE_EPOCH:-$(date +%s)}\" {} +
        find * -type f | LC_ALL=C sort | TZ=UTC zip -9Xq \"$0\" -@" "${PACKAGE}"
      WORKING_DIRECTORY "${FOLDER}" COMMAND_ERROR_IS_FATAL ANY)
  endif()
endforeach()
file(REMOVE_RECURSE "${FOLDER}")
