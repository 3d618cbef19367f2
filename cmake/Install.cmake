# What `cmake --install` puts where, in three components:
#   runtime      the two libraries, the platform's libraries for Linux, `sentrova`, servicemanager
#   development  headers, CMake package, pkg-config files, the examples' sources
#   standins     the virtual device's stand-ins for the vendor's two libraries, only when asked for
#
# The platform's libraries have names that others use too, and none has a version; they stand in a
# folder of their own, and so do the headers. All finds each other relative to itself, so that the
# tree can be moved; the android packages' libraries stay where the distribution has them.
if(CMAKE_LIBRARY_ARCHITECTURE AND NOT DEFINED CMAKE_INSTALL_LIBDIR)
  set(CMAKE_INSTALL_LIBDIR "lib/${CMAKE_LIBRARY_ARCHITECTURE}" CACHE PATH "Folder of libraries")
endif()
include(GNUInstallDirs)
include(CMakePackageConfigHelpers)

set(private_libdir ${CMAKE_INSTALL_LIBDIR}/sentrova)
set(header_dir ${CMAKE_INSTALL_INCLUDEDIR}/sentrova)
set(package_dir ${CMAKE_INSTALL_LIBDIR}/cmake/Sentrova)
set(libexec_dir ${CMAKE_INSTALL_LIBEXECDIR}/sentrova)

set(product_libraries SentrovaService SentrovaServiceImpl)
set(platform_libraries platform_properties binder dm fs_mgr)
set(standin_libraries zunogatekeeper zunofscrypt)

# installed_run_path(FOLDER TARGET...): lets what is installed in FOLDER find the project's libraries.
function(installed_run_path folder)
  file(RELATIVE_PATH to_libraries /prefix/${folder} /prefix/${CMAKE_INSTALL_LIBDIR})
  string(REGEX REPLACE "/$" "" libraries "$ORIGIN/${to_libraries}")
  set_target_properties(${ARGN} PROPERTIES INSTALL_RPATH
    "${libraries};${libraries}/sentrova;${SENTROVA_ANDROID_LIBRARY_DIR}")
endfunction()

installed_run_path(${CMAKE_INSTALL_LIBDIR} ${product_libraries})
installed_run_path(${private_libdir} ${platform_libraries} ${standin_libraries})
installed_run_path(${CMAKE_INSTALL_BINDIR} sentrova)
installed_run_path(${libexec_dir} servicemanager)

install(TARGETS ${product_libraries}
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT runtime)
install(TARGETS ${platform_libraries}
  LIBRARY DESTINATION ${private_libdir} COMPONENT runtime)
install(TARGETS ${standin_libraries}
  LIBRARY DESTINATION ${private_libdir} COMPONENT standins EXCLUDE_FROM_ALL)
install(TARGETS sentrova RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT runtime)
install(TARGETS servicemanager RUNTIME DESTINATION ${libexec_dir} COMPONENT runtime)
# What must be built before an installation.
add_custom_target(installables DEPENDS
  ${product_libraries} ${platform_libraries} ${standin_libraries} sentrova servicemanager)

# What the command-line client brings along.
foreach(file
    man/sentrova.8:${CMAKE_INSTALL_MANDIR}/man8
    completions/bash/sentrova:${CMAKE_INSTALL_DATADIR}/bash-completion/completions
    completions/zsh/_sentrova:${CMAKE_INSTALL_DATADIR}/zsh/site-functions)
  string(REGEX MATCH "^(.*):(.*)$" _ ${file})
  install(FILES ${PROJECT_SOURCE_DIR}/cli/${CMAKE_MATCH_1} DESTINATION ${CMAKE_MATCH_2}
    COMPONENT runtime)
endforeach()

# The public headers under their folders' names, and of the platform's what these include and what a
# loading program or a client calls. On Android the platform brings its own.
foreach(header
    common/export.h
    datadump/datadump.h
    interface/isentrova_service.h
    otautil/rangeset.h
    otautil/sysutil.h
    recovery_utils/mounts_ex.h
    recovery_utils/roots.h
    recovery_utils/roots_ex.h
    service/sentrova_service.h
    toolkit/zuno_func.h
    toolkitutil/findfile.h)
  get_filename_component(folder ${header} DIRECTORY)
  install(FILES ${PROJECT_SOURCE_DIR}/${header} DESTINATION ${header_dir}/${folder}
    COMPONENT development)
endforeach()
install(
  DIRECTORY ${PROJECT_SOURCE_DIR}/platform/include/binder ${PROJECT_SOURCE_DIR}/platform/include/fstab
  DESTINATION ${header_dir}/platform COMPONENT development)

configure_package_config_file(${CMAKE_CURRENT_LIST_DIR}/package/SentrovaConfig.cmake.in
  ${PROJECT_BINARY_DIR}/package/SentrovaConfig.cmake
  INSTALL_DESTINATION ${package_dir}
  PATH_VARS CMAKE_INSTALL_LIBDIR private_libdir header_dir)
write_basic_package_version_file(${PROJECT_BINARY_DIR}/package/SentrovaConfigVersion.cmake
  COMPATIBILITY SameMinorVersion)
install(
  FILES
    ${PROJECT_BINARY_DIR}/package/SentrovaConfig.cmake
    ${PROJECT_BINARY_DIR}/package/SentrovaConfigVersion.cmake
  DESTINATION ${package_dir} COMPONENT development)

# Of a cross build, as the target's system has it.
string(REGEX REPLACE "^${CMAKE_SYSROOT}/" "/" android_headers ${ANDROID_INCLUDE_DIR})
# The prefix as seen from the folder of the .pc files, which pkg-config calls pcfiledir.
file(RELATIVE_PATH prefix_from_pc /prefix/${CMAKE_INSTALL_LIBDIR}/pkgconfig /prefix)
string(REGEX REPLACE "/$" "" prefix_from_pc ${prefix_from_pc})
foreach(package sentrova-service sentrova-service-impl)
  configure_file(${CMAKE_CURRENT_LIST_DIR}/package/${package}.pc.in
    ${PROJECT_BINARY_DIR}/package/${package}.pc @ONLY)
  install(FILES ${PROJECT_BINARY_DIR}/package/${package}.pc
    DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig COMPONENT development)
endforeach()
install(DIRECTORY ${PROJECT_SOURCE_DIR}/examples
  DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/sentrova-dev COMPONENT development)
foreach(package runtime:sentrova development:sentrova-dev "standins:sentrova-standins:EXCLUDE_FROM_ALL")
  string(REPLACE ":" ";" parts ${package})
  list(POP_FRONT parts component name)
  install(FILES ${PROJECT_SOURCE_DIR}/LICENSE RENAME copyright
    DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/${name} COMPONENT ${component} ${parts})
endforeach()
