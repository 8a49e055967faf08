# What `cmake --install` puts into a prefix: the annotation library with its header, the
# toolkit stand-in and (outside Windows) the platform layer with theirs, a CMake package
# (find_package(anno CONFIG) gives anno::anno, anno::toolkit and, outside Windows,
# anno::winapi) and pkg-config files (anno, anno-toolkit, anno-winapi).
include(CMakePackageConfigHelpers)

set(ANNO_INSTALL_CMAKEDIR ${CMAKE_INSTALL_LIBDIR}/cmake/anno)
set(ANNO_INSTALL_PKGCONFIGDIR ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

set(anno_installed_targets anno anno_toolkit)
set_target_properties(anno_toolkit PROPERTIES EXPORT_NAME toolkit)
if(TARGET anno_winapi)
  list(APPEND anno_installed_targets anno_winapi)
  set_target_properties(anno_winapi PROPERTIES EXPORT_NAME winapi)
endif()

install(TARGETS ${anno_installed_targets}
  EXPORT annoTargets
  RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR}
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
  ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR}
  INCLUDES DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})

install(FILES ${PROJECT_SOURCE_DIR}/include/anno/anno.h
              ${PROJECT_SOURCE_DIR}/toolkit/include/anno/toolkit.h
        DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/anno)
if(TARGET anno_winapi)
  install(FILES ${PROJECT_SOURCE_DIR}/winapi/include/anno/winapi_test.h
          DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/anno)
endif()

install(EXPORT annoTargets NAMESPACE anno:: DESTINATION ${ANNO_INSTALL_CMAKEDIR})
configure_package_config_file(${CMAKE_CURRENT_LIST_DIR}/annoConfig.cmake.in
  ${CMAKE_CURRENT_BINARY_DIR}/annoConfig.cmake
  INSTALL_DESTINATION ${ANNO_INSTALL_CMAKEDIR})
write_basic_package_version_file(${CMAKE_CURRENT_BINARY_DIR}/annoConfigVersion.cmake
  COMPATIBILITY SameMajorVersion)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/annoConfig.cmake
              ${CMAKE_CURRENT_BINARY_DIR}/annoConfigVersion.cmake
        DESTINATION ${ANNO_INSTALL_CMAKEDIR})

# pkg-config files find the prefix from their own place, so a package installed with
# `cmake --install --prefix` anywhere, or moved, still points at itself.
if(IS_ABSOLUTE ${CMAKE_INSTALL_LIBDIR} OR IS_ABSOLUTE ${CMAKE_INSTALL_INCLUDEDIR})
  set(pc_prefix ${CMAKE_INSTALL_PREFIX})
else()
  file(RELATIVE_PATH pc_up /prefix/${ANNO_INSTALL_PKGCONFIGDIR} /prefix)
  string(REGEX REPLACE "/$" "" pc_up "${pc_up}")
  set(pc_prefix "\${pcfiledir}/${pc_up}")
endif()
function(anno_pkg_config name description requires libs)
  set(pc_name ${name})
  set(pc_description ${description})
  set(pc_requires ${requires})
  set(pc_libs ${libs})
  configure_file(${PROJECT_SOURCE_DIR}/cmake/anno.pc.in ${CMAKE_CURRENT_BINARY_DIR}/${name}.pc
                 @ONLY)
  install(FILES ${CMAKE_CURRENT_BINARY_DIR}/${name}.pc DESTINATION ${ANNO_INSTALL_PKGCONFIGDIR})
endfunction()
anno_pkg_config(anno "${PROJECT_DESCRIPTION}" "" "-lanno")
anno_pkg_config(anno-toolkit "In-memory stand-in for the toolkit's sibling modules (C++20)"
                "anno" "-lanno_toolkit")
if(TARGET anno_winapi)
  anno_pkg_config(anno-winapi "Windows heap and global-memory functions over the C runtime"
                  "" "-lanno_winapi")
endif()

if(ANNO_BUILD_TESTS AND NOT CMAKE_CROSSCOMPILING AND TARGET anno_winapi)
  # Installs into a prefix under the build tree and builds a small consumer against it,
  # once through find_package and once through pkg-config.
  add_test(NAME install.consumer_builds_with_find_package_and_pkg_config
    COMMAND ${CMAKE_COMMAND}
      -DBUILD_DIR=${PROJECT_BINARY_DIR}
      -DWORK_DIR=${PROJECT_BINARY_DIR}/install-test
      -DCONSUMER_DIR=${PROJECT_SOURCE_DIR}/tests/install/consumer
      -DGENERATOR=${CMAKE_GENERATOR}
      -DCXX=${CMAKE_CXX_COMPILER}
      "-DCXX_FLAGS=${CMAKE_CXX_FLAGS}"
      "-DLINK_FLAGS=${CMAKE_EXE_LINKER_FLAGS}"
      -P ${PROJECT_SOURCE_DIR}/tests/install/install_test.cmake)
endif()
