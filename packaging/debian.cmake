# Debian packages, one for each component of the installation: `make deb`.
set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_NAME applicationsync)
set(CPACK_PACKAGE_VERSION ${PROJECT_VERSION})
set(CPACK_PACKAGE_CONTACT "ApplicationSync developers <applicationsync@example.org>")
set(CPACK_COMPONENTS_ALL library development program)
set(CPACK_COMPONENTS_GROUPING IGNORE)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_STRIP_FILES ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
set(CPACK_INSTALL_DEFAULT_DIRECTORY_PERMISSIONS OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE
                                                WORLD_READ WORLD_EXECUTE)
set(CPACK_PRE_BUILD_SCRIPTS ${CMAKE_CURRENT_LIST_DIR}/finish.cmake)

# The name of the library's package has the interface's version: hosts of another one need another package.
file(STRINGS ${CMAKE_SOURCE_DIR}/platform/Plugin.h interface_version REGEX "pluginInterfaceVersion = ")
string(REGEX REPLACE ".*= ([0-9]+).*" "\\1" interface_version "${interface_version}")
set(library_package libapplicationsync${interface_version})

set(CPACK_DEBIAN_LIBRARY_PACKAGE_NAME ${library_package})
set(CPACK_DEBIAN_LIBRARY_PACKAGE_SECTION libs)
set(CPACK_COMPONENT_LIBRARY_DESCRIPTION "application plug-in of a sync daemon
Keeps the apps of a phone in step with the list of a desktop host: the plug-in
 that a sync daemon loads and provides with the device's services.")

set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_NAME libapplicationsync-dev)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_DEPENDS "${library_package} (= ${PROJECT_VERSION})")
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_RECOMMENDS "libexpat1-dev, libzstd-dev, libgtest-dev, pkg-config")
set(CPACK_COMPONENT_DEVELOPMENT_DESCRIPTION "application plug-in of a sync daemon - what hosts are built with
The interfaces that a host of the plug-in implements, the value types, a
property-list codec, a suite of tests of the interfaces' contracts, and a
 small daemon to start from.")

set(CPACK_DEBIAN_PROGRAM_PACKAGE_NAME tsd)
set(CPACK_DEBIAN_PROGRAM_PACKAGE_SECTION utils)
set(CPACK_DEBIAN_PROGRAM_PACKAGE_DEPENDS "${library_package} (= ${PROJECT_VERSION})")
set(CPACK_COMPONENT_PROGRAM_DESCRIPTION "plays a sync daemon and its host against a device in a folder
Loads the application plug-in and syncs it with a host folder: shows every
call between the plug-in and the device, and makes any of them fail.")

foreach(component library development program)
  string(TOUPPER ${component} upper)
  set(documents ${CMAKE_INSTALL_DATADIR}/doc/${CPACK_DEBIAN_${upper}_PACKAGE_NAME})
  install(FILES ${CMAKE_CURRENT_LIST_DIR}/copyright ${CMAKE_CURRENT_LIST_DIR}/changelog DESTINATION ${documents}
          COMPONENT ${component})
endforeach()

include(CPack)
