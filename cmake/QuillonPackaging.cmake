# Debian packages, one per install component (QuillonInstall.cmake):
#   quillon                the plug-in and its data, for a target that has
#                          the real platform libraries;
#   quillon-demo-platform  the stand-ins, the host and its service, for a
#                          development or demo machine.
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
set(CPACK_DEBIAN_PLUGIN_PACKAGE_SUGGESTS quillon-demo-platform)

set(CPACK_DEBIAN_PLATFORM_PACKAGE_NAME quillon-demo-platform)
set(CPACK_COMPONENT_PLATFORM_DEPENDS plugin)
set(CPACK_COMPONENT_PLATFORM_DESCRIPTION
    "Simulated platform and host for the quillon plug-in\n\
Stand-ins of the platform libraries that libquillon.so.1 links, with their\n\
file names and SONAMEs, the ws-runtime HTTP host and its systemd service.\n\
For development and demonstration machines, not for a real target.")

# The files under /etc are the administrator's once installed.
file(CONFIGURE OUTPUT ${PROJECT_BINARY_DIR}/install/plugin/conffiles
     CONTENT "${QUILLON_MARKER_DIR}/share.dir\n")
file(CONFIGURE OUTPUT ${PROJECT_BINARY_DIR}/install/platform/conffiles
     CONTENT "${QUILLON_DEFAULTS_FILE}\n")
set(CPACK_DEBIAN_PLUGIN_PACKAGE_CONTROL_EXTRA ${PROJECT_BINARY_DIR}/install/plugin/conffiles)
set(CPACK_DEBIAN_PLATFORM_PACKAGE_CONTROL_EXTRA ${PROJECT_BINARY_DIR}/install/platform/conffiles)

include(CPack)
