# The platform's own libraries as distribution packages: their headers stand in a folder of their
# own, and so do their shared objects, which are found at run time through the run path.
find_path(ANDROID_INCLUDE_DIR NAMES android-base/logging.h PATH_SUFFIXES android REQUIRED)
set(android_library_hints "${CMAKE_SYSROOT}/usr/lib/${CMAKE_LIBRARY_ARCHITECTURE}/android")
foreach(name base log utils cutils ext4_utils)
  find_library(ANDROID_${name}_LIBRARY NAMES ${name} HINTS ${android_library_hints} REQUIRED)
  add_library(android_${name} INTERFACE)
  target_include_directories(android_${name} SYSTEM INTERFACE ${ANDROID_INCLUDE_DIR})
  target_link_libraries(android_${name} INTERFACE ${ANDROID_${name}_LIBRARY})
endforeach()
set(SENTROVA_ANDROID_LIBRARY_DIR "/usr/lib/${CMAKE_LIBRARY_ARCHITECTURE}/android")
