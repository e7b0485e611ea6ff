# What `cmake --install` puts where, in two components that the Debian
# packages follow:
#   plugin    libquillon.so.1, its explanation texts and the marker naming
#             them, the documentation: all a target with the real platform
#             libraries needs;
#   platform  the stand-ins of those libraries, the ws-runtime host, its
#             service unit and defaults, the example scenarios: what any
#             Debian machine adds to serve the plug-in, simulated or live.
# Included after every unit, so that units need no install rules of their own.
# The plug-in looks for its texts through this marker at a fixed path, outside
# any prefix.
set(QUILLON_MARKER_DIR /etc/korvane/share)
set(QUILLON_SHARE_DIR ${CMAKE_INSTALL_DATADIR}/korvane)
set(QUILLON_UNIT_SUBDIR lib/systemd/system)
set(QUILLON_UNIT_DIR ${CMAKE_INSTALL_PREFIX}/${QUILLON_UNIT_SUBDIR})
set(QUILLON_DEFAULTS_FILE /etc/default/ws-runtime)

# Installed programs and libraries find each other relative to themselves
# when they land outside the loader's own directories, so an installed tree
# can be moved and names no build folder.
list(FIND CMAKE_C_IMPLICIT_LINK_DIRECTORIES ${CMAKE_INSTALL_FULL_LIBDIR} libdir_is_system)
if(libdir_is_system EQUAL -1)
  set(quillon_program_rpath "$ORIGIN/${QUILLON_BIN_TO_LIB}")
  set(quillon_library_rpath "$ORIGIN")
else()
  set(quillon_program_rpath "")
  set(quillon_library_rpath "")
endif()

# quillon_install_libraries(<component> <targets...>)
# Shared libraries with their SONAME links and without the development link:
# nothing links against them at build time on an installed system.
function(quillon_install_libraries component)
  foreach(target IN LISTS ARGN)
    if(TARGET ${target})
      set_target_properties(${target} PROPERTIES INSTALL_RPATH "${quillon_library_rpath}")
      install(TARGETS ${target} LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
              COMPONENT ${component} NAMELINK_SKIP)
    endif()
  endforeach()
endfunction()

quillon_install_libraries(plugin quillon)
# The optional transfer libraries are opened at run time by their SONAMEs;
# the relocation stand-in stays a test-only library.
quillon_install_libraries(platform
  ws_runtime kopdm_clientapi_sim kosdlib kopenduloSdPlugin kosslinit curlimpl)

set_target_properties(ws-runtime PROPERTIES INSTALL_RPATH "${quillon_program_rpath}")
install(TARGETS ws-runtime RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT platform)

install(DIRECTORY ${PROJECT_SOURCE_DIR}/data/share/errors
        DESTINATION ${QUILLON_SHARE_DIR} COMPONENT plugin)

# quillon_install_path(<variable> <directory>)
# The install script's code that sets <variable> to <directory> (relative to
# the prefix, or absolute) under the prefix given at install time, which
# `cmake --install --prefix` and CPack may change after configuring.
function(quillon_install_path variable directory)
  if(IS_ABSOLUTE "${directory}")
    set(code "set(${variable} \"${directory}\")\n")
  else()
    set(code "set(${variable} \"\${CMAKE_INSTALL_PREFIX}/${directory}\")\n")
  endif()
  set(${variable}_CODE "${code}" PARENT_SCOPE)
endfunction()

# The marker and the unit name installed paths, so they are written when the
# prefix is final: at install time.
quillon_install_path(QUILLON_FULL_SHARE_DIR ${QUILLON_SHARE_DIR})
install(CODE "${QUILLON_FULL_SHARE_DIR_CODE}
  file(WRITE \"${PROJECT_BINARY_DIR}/install/share.dir\" \"\${QUILLON_FULL_SHARE_DIR}\\n\")"
  COMPONENT plugin)
install(FILES ${PROJECT_BINARY_DIR}/install/share.dir
        DESTINATION ${QUILLON_MARKER_DIR} COMPONENT plugin)
install(FILES ${PROJECT_SOURCE_DIR}/README.md DESTINATION ${CMAKE_INSTALL_DOCDIR} COMPONENT plugin)
install(DIRECTORY ${PROJECT_SOURCE_DIR}/docs/ DESTINATION ${CMAKE_INSTALL_DOCDIR} COMPONENT plugin)

quillon_install_path(CMAKE_INSTALL_FULL_BINDIR ${CMAKE_INSTALL_BINDIR})
quillon_install_path(CMAKE_INSTALL_FULL_DOCDIR ${CMAKE_INSTALL_DOCDIR})
install(CODE "${CMAKE_INSTALL_FULL_BINDIR_CODE}${CMAKE_INSTALL_FULL_DOCDIR_CODE}
  configure_file(\"${PROJECT_SOURCE_DIR}/packaging/ws-runtime.service.in\"
                 \"${PROJECT_BINARY_DIR}/install/ws-runtime.service\" @ONLY)"
  COMPONENT platform)
install(FILES ${PROJECT_BINARY_DIR}/install/ws-runtime.service
        DESTINATION ${QUILLON_UNIT_SUBDIR} COMPONENT platform)
install(FILES ${PROJECT_SOURCE_DIR}/packaging/ws-runtime.default
        DESTINATION /etc/default RENAME ws-runtime COMPONENT platform)
install(DIRECTORY ${PROJECT_SOURCE_DIR}/examples/scenarios
        DESTINATION ${CMAKE_INSTALL_DOCDIR}/examples COMPONENT platform)
