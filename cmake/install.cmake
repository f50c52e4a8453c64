# What `make install` (cmake --install) puts where. Paths follow GNUInstallDirs, so
# CMAKE_INSTALL_PREFIX and DESTDIR work as everywhere else.
#
#   lib/                    libeventdetector, libevhost
#   lib/pkgconfig/          eventdetector.pc, evhost.pc
#   lib/cmake/evwatch/      the CMake package: find_package(evwatch) gives evwatch::eventdetector
#                           and evwatch::evhost
#   include/evwatch/        framework/, framework/host/ and detectors/: what a recorder's own
#                           host build compiles against (never host/, libevhost's internals)
#   bin/                    evwatch and camsim, side by side (`evwatch demo` runs the camsim
#                           beside it)
#   share/man/man1/         evwatch.1, camsim.1
#   share/doc/evwatch/examples/  evwatch.example.yaml
#   lib/systemd/system/     evwatch.service

include(CMakePackageConfigHelpers)

set(EVW_CMAKE_PACKAGE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/evwatch)

install(TARGETS evhost eventdetector EXPORT evwatchTargets
        LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
        ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR}
        RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})

# The public headers: the framework with the host contract, and every detector class.
install(DIRECTORY ${CMAKE_SOURCE_DIR}/framework ${CMAKE_SOURCE_DIR}/detectors
        DESTINATION ${EVW_INSTALL_INCLUDEDIR}
        FILES_MATCHING PATTERN "*.h")

# libeventdetector's exported target keeps its INTERFACE link to evwatch::evhost, as in the
# tree: a program that links evwatch::eventdetector gets our host with it, while the library
# file itself links no host (a recorder with its own links -leventdetector alone).
install(EXPORT evwatchTargets NAMESPACE evwatch:: DESTINATION ${EVW_CMAKE_PACKAGE_DIR})
configure_package_config_file(${CMAKE_SOURCE_DIR}/cmake/evwatchConfig.cmake.in
                              ${CMAKE_BINARY_DIR}/evwatchConfig.cmake
                              INSTALL_DESTINATION ${EVW_CMAKE_PACKAGE_DIR})
# 0.x: a minor version may break the interface.
write_basic_package_version_file(${CMAKE_BINARY_DIR}/evwatchConfigVersion.cmake
                                 COMPATIBILITY SameMinorVersion)
install(FILES ${CMAKE_BINARY_DIR}/evwatchConfig.cmake ${CMAKE_BINARY_DIR}/evwatchConfigVersion.cmake
        DESTINATION ${EVW_CMAKE_PACKAGE_DIR})

# The files that name installed paths are written at install time, for the prefix of that
# install (see install-time.cmake), and installed from there.
install(CODE "
  set(EVW_SOURCE_DIR \"${CMAKE_SOURCE_DIR}\")
  set(EVW_BINARY_DIR \"${CMAKE_BINARY_DIR}\")
  set(EVW_VERSION \"${PROJECT_VERSION}\")
  set(EVW_REL_LIBDIR \"${CMAKE_INSTALL_LIBDIR}\")
  set(EVW_REL_INCLUDEDIR \"${CMAKE_INSTALL_INCLUDEDIR}\")
  set(EVW_REL_BINDIR \"${CMAKE_INSTALL_BINDIR}\")
  set(EVW_REL_DOCDIR \"${CMAKE_INSTALL_DOCDIR}\")")
install(SCRIPT ${CMAKE_SOURCE_DIR}/cmake/install-time.cmake)
install(FILES ${CMAKE_BINARY_DIR}/install-time/evhost.pc ${CMAKE_BINARY_DIR}/install-time/eventdetector.pc
        DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

if(TARGET evwatch AND TARGET camsim)
  # Installed programs find the installed libraries beside them, wherever the prefix is.
  file(RELATIVE_PATH EVW_BIN_TO_LIB ${CMAKE_INSTALL_FULL_BINDIR} ${CMAKE_INSTALL_FULL_LIBDIR})
  set_target_properties(evwatch camsim PROPERTIES INSTALL_RPATH "$ORIGIN/${EVW_BIN_TO_LIB}")
  install(TARGETS evwatch camsim RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
  install(FILES ${CMAKE_SOURCE_DIR}/man/evwatch.1 ${CMAKE_SOURCE_DIR}/man/camsim.1
          DESTINATION ${CMAKE_INSTALL_MANDIR}/man1)
  install(FILES ${CMAKE_SOURCE_DIR}/packaging/evwatch.example.yaml
          DESTINATION ${CMAKE_INSTALL_DOCDIR}/examples)
  # systemd reads units under /usr/local/lib too, so the prefix's lib/ is right for both
  # /usr and /usr/local; a package may point it elsewhere.
  set(EVW_SYSTEMD_UNITDIR lib/systemd/system CACHE STRING
      "Where to install evwatch.service (relative: under the prefix)")
  install(FILES ${CMAKE_BINARY_DIR}/install-time/evwatch.service DESTINATION ${EVW_SYSTEMD_UNITDIR})
endif()
