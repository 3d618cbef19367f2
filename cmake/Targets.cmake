# How the project's libraries, programs and test programs are made.

# sentrova_target(NAME): the settings that every target of the project shares.
function(sentrova_target name)
  target_compile_features(${name} PRIVATE cxx_std_20)
  target_compile_options(${name} PRIVATE
    -fno-rtti -fvisibility=hidden -fstack-protector-strong)
  target_link_options(${name} PRIVATE -Wl,-z,relro -Wl,-z,now)
  target_include_directories(${name} PUBLIC ${PROJECT_SOURCE_DIR})
  target_link_libraries(${name} PRIVATE sentrova_warnings)
  set_target_properties(${name} PROPERTIES
    CXX_EXTENSIONS OFF POSITION_INDEPENDENT_CODE ON INSTALL_RPATH "${SENTROVA_ANDROID_LIBRARY_DIR}")
endfunction()

# sentrova_test(NAME SOURCES... LIBRARIES...): a GoogleTest program in <build>/tests, run here and on
# the device. sentrova_device_test: the same in <build>/device_tests, for what only the device shows.
function(sentrova_test_program name folder)
  cmake_parse_arguments(arg "" "" "SOURCES;LIBRARIES" ${ARGN})
  add_executable(${name} ${arg_SOURCES})
  sentrova_target(${name})
  # What a test program defines in place of a system or library function, the libraries must see.
  target_compile_options(${name} PRIVATE -fvisibility=default)
  target_link_libraries(${name} PRIVATE ${arg_LIBRARIES} GTest::gmock GTest::gtest_main)
  set_target_properties(${name} PROPERTIES
    RUNTIME_OUTPUT_DIRECTORY ${PROJECT_BINARY_DIR}/${folder} ENABLE_EXPORTS ON)
endfunction()

function(sentrova_test name)
  sentrova_test_program(${name} tests ${ARGN})
endfunction()

function(sentrova_device_test name)
  if(CMAKE_CROSSCOMPILING)
    sentrova_test_program(${name} device_tests ${ARGN})
  endif()
endfunction()
