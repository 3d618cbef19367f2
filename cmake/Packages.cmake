# Debian packages for this machine of what Install.cmake installs, one a component:
#   cpack --config build/native/CPackConfig.cmake -B build/packages
set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_NAME sentrova)
set(CPACK_PACKAGE_VENDOR "The Sentrova developers")
set(CPACK_PACKAGE_CONTACT "The Sentrova developers <developers@sentrova.invalid>")
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_STRIP_FILES ON)

set(CPACK_COMPONENTS_ALL runtime development standins)
set(CPACK_COMPONENTS_GROUPING IGNORE)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SECTION utils)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
# The packages that the libraries and programs come from are read from them. Those of the project
# are of no package yet.
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS ${SENTROVA_ANDROID_LIBRARY_DIR})
foreach(target ${product_libraries} ${platform_libraries} ${standin_libraries})
  list(APPEND CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS $<TARGET_FILE_DIR:${target}>)
endforeach()

set(this_version "(= ${PROJECT_VERSION})")
set(CPACK_DEBIAN_RUNTIME_PACKAGE_NAME sentrova)
set(CPACK_DEBIAN_RUNTIME_PACKAGE_SUGGESTS sentrova-standins)
set(CPACK_COMPONENT_RUNTIME_DESCRIPTION "Rescue service of an encrypted device, and its client
The libraries libSentrovaService and libSentrovaServiceImpl with what they
need of the platform, the service manager, and the command-line client
sentrova.
.
What holds the device's secrets is the vendor's: libzunogatekeeper.so and
libzunofscrypt.so must be where the dynamic linker finds them, also for
sentrova. The package sentrova-standins has stand-ins to develop with.")

set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_NAME sentrova-dev)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_DEPENDS
  "sentrova ${this_version}, android-libbase-dev, android-libutils-dev")
set(CPACK_COMPONENT_DEVELOPMENT_DESCRIPTION "Rescue service of an encrypted device: development
Headers, the CMake package Sentrova, the pkg-config packages sentrova-service
and sentrova-service-impl, and two examples.")

set(CPACK_DEBIAN_STANDINS_PACKAGE_NAME sentrova-standins)
set(CPACK_DEBIAN_STANDINS_PACKAGE_DEPENDS "sentrova ${this_version}")
set(CPACK_COMPONENT_STANDINS_DESCRIPTION "Stand-ins for the vendor's libraries of a rescued device
libzunogatekeeper.so and libzunofscrypt.so as the project's virtual device has
them. They open what was provisioned with them; on a phone they open nothing.")

set(CPACK_OUTPUT_CONFIG_FILE ${PROJECT_BINARY_DIR}/CPackConfig.cmake)
include(CPack)
