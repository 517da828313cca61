# What `cmake --install` leaves behind: headers, libraries, the command with its manual page, and the two ways in which
# other builds find them. Nothing in it names the prefix, so the tree can be moved.
include(CMakePackageConfigHelpers)

install(TARGETS qxesm qxhost EXPORT qxesmTargets
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
  FILE_SET HEADERS DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})
# Loaded by name, never linked.
install(TARGETS qxeavl LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR})
if(TARGET qxsm)
  set_target_properties(qxsm PROPERTIES INSTALL_RPATH "$ORIGIN/../${CMAKE_INSTALL_LIBDIR}")
  install(TARGETS qxsm RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
  install(FILES ${PROJECT_SOURCE_DIR}/docs/qxsm.1 DESTINATION ${CMAKE_INSTALL_MANDIR}/man1)
endif()
install(FILES ${PROJECT_SOURCE_DIR}/LICENSE DESTINATION ${CMAKE_INSTALL_DOCDIR})

set(QXESM_CMAKE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/qxesm)
configure_package_config_file(${PROJECT_SOURCE_DIR}/cmake/qxesmConfig.cmake.in ${PROJECT_BINARY_DIR}/qxesmConfig.cmake
  INSTALL_DESTINATION ${QXESM_CMAKE_DIR} NO_SET_AND_CHECK_MACRO)
write_basic_package_version_file(${PROJECT_BINARY_DIR}/qxesmConfigVersion.cmake COMPATIBILITY SameMinorVersion)
install(EXPORT qxesmTargets NAMESPACE qxesm:: DESTINATION ${QXESM_CMAKE_DIR})
install(FILES ${PROJECT_BINARY_DIR}/qxesmConfig.cmake ${PROJECT_BINARY_DIR}/qxesmConfigVersion.cmake
  DESTINATION ${QXESM_CMAKE_DIR})

# The .pc files find the prefix from where they stand. Any depth of the library folder will do (lib, lib64,
# lib/x86_64-linux-gnu); an absolute one would tie the tree to its place.
if(IS_ABSOLUTE "${CMAKE_INSTALL_LIBDIR}" OR IS_ABSOLUTE "${CMAKE_INSTALL_INCLUDEDIR}")
  message(FATAL_ERROR "CMAKE_INSTALL_LIBDIR and CMAKE_INSTALL_INCLUDEDIR are folders below the prefix, not absolute")
endif()
file(RELATIVE_PATH QXESM_PC_TO_PREFIX /prefix/${CMAKE_INSTALL_LIBDIR}/pkgconfig /prefix)
string(REGEX REPLACE "/$" "" QXESM_PC_TO_PREFIX "${QXESM_PC_TO_PREFIX}")
foreach(pc qxesm qxhost)
  configure_file(${PROJECT_SOURCE_DIR}/cmake/${pc}.pc.in ${PROJECT_BINARY_DIR}/${pc}.pc @ONLY)
  install(FILES ${PROJECT_BINARY_DIR}/${pc}.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
endforeach()
