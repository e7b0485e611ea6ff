# Debian packages, one per install component (QuillonInstall.cmake):
#   quillon                the plug-in and its data, for a target that has
#                          the real platform libraries;
#   quillon-platform       the host, its service and the platform
#                          libraries, for any Debian machine: simulated, or
#                          live over linuxptp's ptp4l.
# `make package` configures a /usr tree for them (preset "package") and runs
# CPack there.
set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_NAME quillon)
set(CPACK_PACKAGE_VENDOR "quillon developers")
set(CPACK_PACKAGE_CONTACT "quillon developers <quillon@localhost>")
set(CPACK_PACKAGING_INSTALL_PREFIX ${CMAKE_INSTALL_PREFIX})
set(CPACK_STRIP_FILES ON)
set(CPACK_COMPONENTS_ALL plugin platform)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SECTION net)

# Depends from the shared libraries each package links; the platform's own
# libraries are found in the build tree and, being no Debian package's, add
# nothing there.
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS ${CMAKE_LIBRARY_OUTPUT_DIRECTORY})
set(CPACK_DEBIAN_ENABLE_COMPONENT_DEPENDS ON)

set(CPACK_DEBIAN_PLUGIN_PACKAGE_NAME quillon)
set(CPACK_COMPONENT_PLUGIN_DESCRIPTION
    "Time-synchronisation web-service plug-in\n\
libquillon.so.1 publishes the time synchronisation state of the target as\n\
JSON over HTTP inside a host web-server runtime. It needs the platform's host\n\
runtime, time-sync manager client and syncable-device libraries.")
set(CPACK_DEBIAN_PLUGIN_PACKAGE_SUGGESTS quillon-platform)

set(CPACK_DEBIAN_PLATFORM_PACKAGE_NAME quillon-platform)
set(CPACK_COMPONENT_PLATFORM_DEPENDS plugin)
set(CPACK_COMPONENT_PLATFORM_DESCRIPTION
    "Host and platform libraries serving the quillon plug-in\n\
The ws-runtime HTTP host with its systemd service, and the platform\n\
libraries that libquillon.so.1 links (time-sync manager client,\n\
syncable-device library, URL transfer binding) under their own file names\n\
and SONAMEs. For any Debian machine: it serves a simulated time service, or\n\
the live state of linuxptp's ptp4l daemons read over their management\n\
sockets, and keeps the time keeper's coherency requirements across restarts.")
# The same files under the name this package had before.
set(CPACK_DEBIAN_PLATFORM_PACKAGE_CONFLICTS quillon-demo-platform)
set(CPACK_DEBIAN_PLATFORM_PACKAGE_REPLACES quillon-demo-platform)
set(CPACK_DEBIAN_PLATFORM_PACKAGE_SUGGESTS linuxptp)

# The files under /etc are the administrator's once installed.
file(CONFIGURE OUTPUT ${PROJECT_BINARY_DIR}/install/plugin/conffiles
     CONTENT "${QUILLON_MARKER_DIR}/share.dir\n")
file(CONFIGURE OUTPUT ${PROJECT_BINARY_DIR}/install/platform/conffiles
     CONTENT "${QUILLON_DEFAULTS_FILE}\n")
set(CPACK_DEBIAN_PLUGIN_PACKAGE_CONTROL_EXTRA ${PROJECT_BINARY_DIR}/install/plugin/conffiles)
# Its own postrm calls ldconfig as CPack's would, and purges the state.
set(CPACK_DEBIAN_PLATFORM_PACKAGE_CONTROL_EXTRA ${PROJECT_BINARY_DIR}/install/platform/conffiles
    ${PROJECT_SOURCE_DIR}/packaging/debian/prerm ${PROJECT_SOURCE_DIR}/packaging/debian/postrm)

include(CPack)
