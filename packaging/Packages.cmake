# What CPack makes of the installed files: Debian packages, one a component, and archives of all of them together.
option(OSTRA_DEBIAN "Install what Debian's packages have besides: rules for udev, change log, what is known of the licence" OFF)

set(CPACK_PACKAGE_NAME ostra)
set(CPACK_PACKAGE_VENDOR ostra)
set(CPACK_PACKAGE_CONTACT "ostra maintainers <maintainers@users.noreply.c-seed-f42350d1.example>")
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "driver library and tools of a USB hand-held optical measuring instrument")
set(CPACK_PACKAGE_VERSION "${PROJECT_VERSION}")
set(CPACK_VERBATIM_VARIABLES ON)
set(CPACK_INSTALL_DEFAULT_DIRECTORY_PERMISSIONS
  OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE WORLD_READ WORLD_EXECUTE)

set(CPACK_COMPONENTS_ALL library development tools)
if(WIN32)
  list(APPEND CPACK_COMPONENTS_ALL symbols)
endif()
if(OSTRA_PYTHON)
  list(APPEND CPACK_COMPONENTS_ALL python)
endif()
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(CPACK_DEBIAN_LIBRARY_PACKAGE_NAME "libostra${PROJECT_VERSION_MAJOR}")
set(CPACK_DEBIAN_LIBRARY_PACKAGE_SECTION libs)
set(CPACK_DEBIAN_LIBRARY_DESCRIPTION "driver library of a hand-held optical measuring instrument
 Takes readouts of a USB light sensor with 128 values and writes its EEPROM,
 through four functions that any language can call.")
set(CPACK_DEBIAN_LIBRARY_PACKAGE_CONTROL_EXTRA "${CMAKE_CURRENT_SOURCE_DIR}/debian/triggers")
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_NAME libostra-dev)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_DEPENDS "libostra${PROJECT_VERSION_MAJOR} (= ${PROJECT_VERSION})")
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_CONTROL_EXTRA "${CMAKE_CURRENT_SOURCE_DIR}/debian/triggers")
set(CPACK_DEBIAN_DEVELOPMENT_DESCRIPTION "driver library of an optical instrument, development files
 The header, the manual page, what CMake and pkg-config need to find the
 library, example hosts, and the library on simulated instruments inside the
 host's own process.")
set(CPACK_DEBIAN_TOOLS_PACKAGE_NAME ostra)
set(CPACK_DEBIAN_TOOLS_PACKAGE_SECTION science)
set(CPACK_DEBIAN_TOOLS_PACKAGE_RECOMMENDS udev)
set(CPACK_DEBIAN_TOOLS_DESCRIPTION "command line of a hand-held optical measuring instrument
 Lists instruments, takes readouts and scans, backs up, checks and writes
 EEPROM images. Comes with a simulated instrument for work without hardware.")
set(CPACK_DEBIAN_TOOLS_PACKAGE_CONTROL_EXTRA "${CMAKE_CURRENT_SOURCE_DIR}/debian/postrm")
set(CPACK_DEBIAN_PYTHON_PACKAGE_NAME python3-ostra)
set(CPACK_DEBIAN_PYTHON_PACKAGE_SECTION python)
if(OSTRA_PYTHON)
  # The extension module fits one Python only.
  find_package(Python REQUIRED COMPONENTS Interpreter)
  math(EXPR OSTRA_NEXT_PYTHON "${Python_VERSION_MINOR} + 1")
  set(CPACK_DEBIAN_PYTHON_PACKAGE_DEPENDS
    "python3 (>= 3.${Python_VERSION_MINOR}), python3 (<< 3.${OSTRA_NEXT_PYTHON}), python3-numpy")
endif()
set(CPACK_DEBIAN_PYTHON_PACKAGE_SUGGESTS python3-matplotlib)
set(CPACK_DEBIAN_PYTHON_DESCRIPTION "hand-held optical measuring instrument in Python
 Takes readouts and scans as numpy arrays, works on EEPROM images, and brings
 simulated instruments for everybody's own tests.")
# Debian has symbols in packages of their own; to make them CPack takes what they hold from the files and strips those.
set(CPACK_DEBIAN_DEBUGINFO_PACKAGE ${OSTRA_DEBIAN})
if(OSTRA_DEBIAN OR WIN32)
  set(CPACK_STRIP_FILES OFF)
else()
  set(CPACK_STRIP_FILES ON)
endif()
set(CPACK_POST_BUILD_SCRIPTS "${CMAKE_CURRENT_SOURCE_DIR}/Repack.cmake")

if(OSTRA_DEBIAN)
  # Both have the date of the build, which SOURCE_DATE_EPOCH says.
  string(TIMESTAMP OSTRA_DATE "%a, %d %b %Y %H:%M:%S +0000" UTC)
  configure_file(debian/changelog.in "${CMAKE_CURRENT_BINARY_DIR}/changelog" @ONLY)
  execute_process(COMMAND gzip -9nkf changelog WORKING_DIRECTORY "${CMAKE_CURRENT_BINARY_DIR}" COMMAND_ERROR_IS_FATAL ANY)
  set(OSTRA_DEBIAN_COMPONENTS LIBRARY DEVELOPMENT TOOLS)
  if(OSTRA_PYTHON)
    list(APPEND OSTRA_DEBIAN_COMPONENTS PYTHON)
  endif()
  foreach(COMPONENT IN LISTS OSTRA_DEBIAN_COMPONENTS)
    string(TOLOWER ${COMPONENT} OSTRA_COMPONENT)
    install(FILES "${CMAKE_CURRENT_BINARY_DIR}/changelog.gz" debian/copyright
      DESTINATION "${CMAKE_INSTALL_DATADIR}/doc/${CPACK_DEBIAN_${COMPONENT}_PACKAGE_NAME}" COMPONENT ${OSTRA_COMPONENT})
  endforeach()
  install(FILES debian/libostra-dev.overrides DESTINATION "${CMAKE_INSTALL_DATADIR}/lintian/overrides"
    RENAME libostra-dev COMPONENT development)
  install(FILES debian/71-ostra.rules DESTINATION lib/udev/rules.d COMPONENT tools)
endif()

include(CPack)
