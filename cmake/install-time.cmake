# Runs at install time (cmake --install): writes the files that name installed paths, with
# the prefix the install is for, so that `cmake --install --prefix P` is as right as the
# prefix given at configure time. Set by install.cmake first: EVW_SOURCE_DIR, EVW_BINARY_DIR,
# EVW_VERSION, EVW_REL_{LIBDIR,INCLUDEDIR,BINDIR,DOCDIR}.

set(PROJECT_VERSION ${EVW_VERSION})
set(EVW_PREFIX "${CMAKE_INSTALL_PREFIX}")
foreach(kind LIBDIR INCLUDEDIR BINDIR DOCDIR)
  if(IS_ABSOLUTE "${EVW_REL_${kind}}")
    set(EVW_FULL_${kind} "${EVW_REL_${kind}}")
    set(EVW_PC_${kind} "${EVW_REL_${kind}}")
  else()
    set(EVW_FULL_${kind} "${EVW_PREFIX}/${EVW_REL_${kind}}")
    set(EVW_PC_${kind} "\${prefix}/${EVW_REL_${kind}}")
  endif()
endforeach()

foreach(name evhost.pc eventdetector.pc evwatch.service)
  if(EXISTS "${EVW_SOURCE_DIR}/packaging/${name}.in")
    configure_file("${EVW_SOURCE_DIR}/packaging/${name}.in"
                   "${EVW_BINARY_DIR}/install-time/${name}" @ONLY)
  endif()
endforeach()
