include(CMakePackageConfigHelpers)

install(TARGETS maroset EXPORT MarosetTargets
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
  ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR}
  RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
foreach(header ${MAROSET_HEADERS})
  file(RELATIVE_PATH rel ${PROJECT_SOURCE_DIR} ${header})
  get_filename_component(dir ${rel} DIRECTORY)
  install(FILES ${header} DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/maroset/${dir})
endforeach()

install(EXPORT MarosetTargets NAMESPACE Maroset:: DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/Maroset)
configure_package_config_file(cmake/MarosetConfig.cmake.in
  ${PROJECT_BINARY_DIR}/MarosetConfig.cmake
  INSTALL_DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/Maroset)
write_basic_package_version_file(${PROJECT_BINARY_DIR}/MarosetConfigVersion.cmake
  COMPATIBILITY SameMajorVersion)
install(FILES ${PROJECT_BINARY_DIR}/MarosetConfig.cmake ${PROJECT_BINARY_DIR}/MarosetConfigVersion.cmake
  DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/Maroset)

configure_file(cmake/maroset.pc.in ${PROJECT_BINARY_DIR}/maroset.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/maroset.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
