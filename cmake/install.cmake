# What `cmake --install` puts under the prefix: the shared library, the public headers, a CMake
# package (kaVMAPParser::kaVMAPParser) and a pkg-config file. Nothing of the tests, benchmarks,
# fuzzers or the static core is installed.
include(CMakePackageConfigHelpers)

option(KA_INSTALL_MODULES "Install the module stand-ins in <libdir>/kaVMAPParser/modules/" ON)

set(KA_INSTALL_CMAKEDIR ${CMAKE_INSTALL_LIBDIR}/cmake/kaVMAPParser)
# The stand-ins are not a platform's modules, so they get a folder of their own rather than
# sitting beside the system's libraries; a host on this machine passes it to Open.
set(KA_INSTALL_MODULESDIR ${CMAKE_INSTALL_LIBDIR}/kaVMAPParser/modules)

install(TARGETS kaVMAPParser EXPORT kaVMAPParserTargets
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR})
# include/ holds only what a player includes; the internal headers stay in src/.
install(DIRECTORY ${PROJECT_SOURCE_DIR}/include/ DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}
  FILES_MATCHING PATTERN "*.h")

if(KA_INSTALL_MODULES)
  install(TARGETS kadl kaXMLParser kaSourceIO kaLogSys
    LIBRARY DESTINATION ${KA_INSTALL_MODULESDIR})
endif()

# ---- CMake package ----
install(EXPORT kaVMAPParserTargets NAMESPACE kaVMAPParser:: DESTINATION ${KA_INSTALL_CMAKEDIR})
configure_package_config_file(${PROJECT_SOURCE_DIR}/cmake/kaVMAPParserConfig.cmake.in
  ${PROJECT_BINARY_DIR}/package/kaVMAPParserConfig.cmake
  INSTALL_DESTINATION ${KA_INSTALL_CMAKEDIR}
  PATH_VARS KA_INSTALL_MODULESDIR)
# The table and record layouts are fixed within a major version.
write_basic_package_version_file(${PROJECT_BINARY_DIR}/package/kaVMAPParserConfigVersion.cmake
  VERSION ${PROJECT_VERSION} COMPATIBILITY SameMajorVersion)
install(FILES ${PROJECT_BINARY_DIR}/package/kaVMAPParserConfig.cmake
              ${PROJECT_BINARY_DIR}/package/kaVMAPParserConfigVersion.cmake
  DESTINATION ${KA_INSTALL_CMAKEDIR})

# ---- pkg-config ----
# The prefix is known only when installing (`cmake --install --prefix P`), so the file is made
# in two passes: the folders relative to ${prefix} now, the prefix itself at install time.
function(ka_pc_dir out dir)
  if(IS_ABSOLUTE "${dir}")
    set(${out} "${dir}" PARENT_SCOPE)
  else()
    set(${out} "\${prefix}/${dir}" PARENT_SCOPE)
  endif()
endfunction()
ka_pc_dir(KA_PC_LIBDIR "${CMAKE_INSTALL_LIBDIR}")
ka_pc_dir(KA_PC_INCLUDEDIR "${CMAKE_INSTALL_INCLUDEDIR}")
if(KA_INSTALL_MODULES)
  ka_pc_dir(KA_PC_MODULESDIR "${KA_INSTALL_MODULESDIR}/")
endif()
set(KA_PC_PREFIX "@KA_PC_PREFIX@")
set(ka_pc_staged ${PROJECT_BINARY_DIR}/package/kaVMAPParser.pc.staged)
set(ka_pc_final ${PROJECT_BINARY_DIR}/package/kaVMAPParser.pc)
configure_file(${PROJECT_SOURCE_DIR}/cmake/kaVMAPParser.pc.in ${ka_pc_staged} @ONLY)
install(CODE "
  set(KA_PC_PREFIX \"\${CMAKE_INSTALL_PREFIX}\")
  configure_file(\"${ka_pc_staged}\" \"${ka_pc_final}\" @ONLY)
")
install(FILES ${ka_pc_final} DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
