# Installation of the two libraries: find_package(zarn) and pkg-config.
include(CMakePackageConfigHelpers)

set(package_dir ${CMAKE_INSTALL_LIBDIR}/cmake/zarn)

# The headers are included by their paths from the repository root, hence a root of their own.
install(
  TARGETS zarn_host zarn_filters
  EXPORT zarn-targets
  FILE_SET HEADERS DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/zarn
  FILE_SET generated DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/zarn)
install(EXPORT zarn-targets NAMESPACE zarn:: DESTINATION ${package_dir})
configure_package_config_file(
  ${PROJECT_SOURCE_DIR}/cmake/zarn-config.cmake.in ${PROJECT_BINARY_DIR}/zarn-config.cmake
  INSTALL_DESTINATION ${package_dir})
# Before 1.0 a minor version may change the interface.
write_basic_package_version_file(${PROJECT_BINARY_DIR}/zarn-config-version.cmake
                                 COMPATIBILITY SameMinorVersion)
install(FILES ${PROJECT_BINARY_DIR}/zarn-config.cmake
              ${PROJECT_BINARY_DIR}/zarn-config-version.cmake DESTINATION ${package_dir})

# The .pc files find everything from their own place, so an installation can be moved.
file(RELATIVE_PATH pc_includedir ${CMAKE_INSTALL_FULL_LIBDIR}/pkgconfig
     ${CMAKE_INSTALL_FULL_INCLUDEDIR}/zarn)
set(pc_host_cflags)
set(pc_filters_cflags)
set(pc_host_libs)
set(pc_filters_libs)
if(NOT BUILD_SHARED_LIBS)
  set(pc_host_cflags "-DZARN_HOST_STATIC_DEFINE")
  set(pc_filters_cflags "-DZARN_FILTERS_STATIC_DEFINE")
  set(pc_host_libs "-fopenmp")
  set(pc_filters_libs "-fopenmp")
  if(ZARN_SIMD)
    string(APPEND pc_host_libs " -lhwy")
    string(APPEND pc_filters_libs " -lhwy")
  endif()
endif()
foreach(part host filters)
  configure_file(${PROJECT_SOURCE_DIR}/cmake/zarn-${part}.pc.in
                 ${PROJECT_BINARY_DIR}/zarn-${part}.pc @ONLY)
  install(FILES ${PROJECT_BINARY_DIR}/zarn-${part}.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
endforeach()
