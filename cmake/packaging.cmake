# What is installed where, and the Debian package that is made of it (scripts/package).
#
# The directories are named outright: the programs look for the library in ../lib beside their own
# directory, which a multiarch library directory would not be.
install(TARGETS zlkkiftools kifcache RUNTIME DESTINATION bin)
install(TARGETS zellibs LIBRARY DESTINATION lib)

# To write other tools over hosts and recordings: the library's face in C, the records in C++.
configure_file(packaging/zellibs.pc.in zellibs.pc @ONLY)
install(FILES lib/zellibs/include/zellibs.h lib/zellibs/include/nodes.def DESTINATION include/zellibs)
install(DIRECTORY lib/records DESTINATION include/zellibs FILES_MATCHING PATTERN *.h)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/zellibs.pc DESTINATION share/pkgconfig)

# The tools' own names, in a directory of their own: they do not replace the system's ps or lspci.
file(MAKE_DIRECTORY ${CMAKE_CURRENT_BINARY_DIR}/tools)
foreach(tool ${ZLKKIFTOOLS_TOOLS})
  file(CREATE_LINK ../../../bin/zlkkiftools ${CMAKE_CURRENT_BINARY_DIR}/tools/${tool} SYMBOLIC)
endforeach()
install(DIRECTORY ${CMAKE_CURRENT_BINARY_DIR}/tools/ DESTINATION lib/zlkkiftools/bin)

install(FILES completions/zlkkiftools completions/kifcache
        DESTINATION share/bash-completion/completions)
install(FILES packaging/copyright DESTINATION share/doc/zlkkiftools)
install(FILES packaging/lintian-overrides DESTINATION share/lintian/overrides RENAME zlkkiftools)

# Installs ${source} in ${destination}, compressed, as ${name}.gz.
find_program(GZIP gzip REQUIRED)
function(install_compressed source destination name)
  set(compressed ${CMAKE_CURRENT_BINARY_DIR}/compressed/${name}.gz)
  add_custom_command(OUTPUT ${compressed}
    COMMAND ${GZIP} -9nc ${CMAKE_CURRENT_SOURCE_DIR}/${source} > ${compressed}
    DEPENDS ${source} VERBATIM)
  set(documents ${documents} ${compressed} PARENT_SCOPE)
  install(FILES ${compressed} DESTINATION ${destination})
endfunction()

file(MAKE_DIRECTORY ${CMAKE_CURRENT_BINARY_DIR}/compressed)
install_compressed(packaging/changelog share/doc/zlkkiftools changelog.Debian)
file(GLOB pages RELATIVE ${CMAKE_CURRENT_SOURCE_DIR} CONFIGURE_DEPENDS man/*.[15])
foreach(page ${pages})
  string(REGEX MATCH "[15]$" section ${page})
  get_filename_component(name ${page} NAME)
  install_compressed(${page} share/man/man${section} ${name})
endforeach()
add_custom_target(documents ALL DEPENDS ${documents})

# The package's version is that of its changelog.
file(STRINGS packaging/changelog newest LIMIT_COUNT 1)
if(NOT newest MATCHES "\\(([0-9.]+)-([0-9]+)\\)" OR NOT CMAKE_MATCH_1 VERSION_EQUAL PROJECT_VERSION)
  message(FATAL_ERROR "packaging/changelog does not begin with version ${PROJECT_VERSION}")
endif()
set(CPACK_DEBIAN_PACKAGE_RELEASE ${CMAKE_MATCH_2})
set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_STRIP_FILES ON)
set(CPACK_PACKAGE_CONTACT
  "zlkkiftools maintainers <maintainers@users.noreply.c-seed-e7d34527.example>")
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "system information tools for live and for recorded hosts")
set(CPACK_DEBIAN_PACKAGE_DESCRIPTION
  "Sixteen tools in one program (ps, lspci, lsof, irqinfo, uptime and others)
that show processes, PCI devices, interrupts, boot options and volumes of
the machine they run on, or of one that was recorded into a file before.
.
kifcache records a machine into such a file, checks it, and turns it into
text or JSON Lines and back. The tools' own names stand in
/usr/lib/zlkkiftools/bin, outside the usual search path.")
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SECTION utils)
set(CPACK_DEBIAN_PACKAGE_DEPENDS hwdata)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS ${CMAKE_LIBRARY_OUTPUT_DIRECTORY})
set(CPACK_DEBIAN_PACKAGE_CONTROL_EXTRA ${CMAKE_CURRENT_SOURCE_DIR}/packaging/triggers)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
include(CPack)
