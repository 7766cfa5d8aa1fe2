# Runs at install time (install(SCRIPT) from the top-level CMakeLists.txt):
# writes xavoprinter.pc with the full directories of the prefix the tree is
# installed to, which is the configured one unless `cmake --install
# --prefix` names another, and installs it (under DESTDIR when set).
foreach(dir LIBDIR INCLUDEDIR)
  if(IS_ABSOLUTE "${XAVO_PC_${dir}}")
    set(CMAKE_INSTALL_FULL_${dir} "${XAVO_PC_${dir}}")
  else()
    set(CMAKE_INSTALL_FULL_${dir} "${CMAKE_INSTALL_PREFIX}/${XAVO_PC_${dir}}")
  endif()
endforeach()
configure_file("${XAVO_PC_IN}" "${XAVO_PC_OUT}" @ONLY)
file(INSTALL "${XAVO_PC_OUT}" DESTINATION "${CMAKE_INSTALL_FULL_LIBDIR}/pkgconfig")
