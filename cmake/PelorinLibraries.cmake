# The libraries that users link, and their installation: two, shared and static, and
# one for tests.

find_package(Threads REQUIRED)
set(header_dir ${CMAKE_INSTALL_INCLUDEDIR}/pelorin)

function(pelorin_library target kind output component)
  get_property(objects GLOBAL PROPERTY PELORIN_OBJECTS_${component})
  list(TRANSFORM objects REPLACE "(.+)" "$<TARGET_OBJECTS:\\1>")
  add_library(${target} ${kind} ${objects})
  target_compile_features(${target} PUBLIC cxx_std_20)
  target_include_directories(${target} PUBLIC
    $<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}/include>
    $<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}/platform/include>
    $<INSTALL_INTERFACE:${header_dir}>)
  target_link_libraries(${target} PUBLIC Threads::Threads)
  set_target_properties(${target} PROPERTIES OUTPUT_NAME ${output}
    VERSION ${PROJECT_VERSION} SOVERSION ${PROJECT_VERSION_MAJOR})
  if(kind STREQUAL "SHARED")
    set(script ${PROJECT_SOURCE_DIR}/cmake/${output}.map)
    target_link_options(${target} PRIVATE -Wl,--version-script=${script} -Wl,-z,defs,-z,relro,-z,now)
    set_target_properties(${target} PROPERTIES LINK_DEPENDS ${script})
    if(PELORIN_SANITIZE)
      # The sanitizer's runtime comes with the program, not with the library.
      set_property(TARGET ${target} PROPERTY LINK_OPTIONS -Wl,--version-script=${script})
    endif()
  endif()
endfunction()

pelorin_library(pelorin_platform SHARED pelorin-platform platform)
pelorin_library(pelorin_platform_static STATIC pelorin-platform platform)
get_property(has_upper GLOBAL PROPERTY PELORIN_OBJECTS_pelorin)
set(installed pelorin_platform pelorin_platform_static)
set_target_properties(pelorin_platform PROPERTIES EXPORT_NAME platform)
set_target_properties(pelorin_platform_static PROPERTIES EXPORT_NAME platform-static)
add_library(Pelorin::platform ALIAS pelorin_platform)
if(has_upper)
  pelorin_library(pelorin SHARED pelorin pelorin)
  pelorin_library(pelorin_static STATIC pelorin pelorin)
  target_link_libraries(pelorin PUBLIC pelorin_platform)
  target_link_libraries(pelorin_static PUBLIC pelorin_platform_static)
  set_target_properties(pelorin_static PROPERTIES EXPORT_NAME pelorin-static)
  add_library(Pelorin::pelorin ALIAS pelorin)
  list(APPEND installed pelorin pelorin_static)

  # For tests, an archive that goes with either kind: users link the kind.
  pelorin_library(pelorin_testing STATIC pelorin-test test)
  set_target_properties(pelorin_testing PROPERTIES EXPORT_NAME test-archive)
  list(APPEND installed pelorin_testing)
  foreach(kind "" _static)
    string(REPLACE _ - suffix "${kind}")
    add_library(pelorin_test_kit${kind} INTERFACE)
    target_link_libraries(pelorin_test_kit${kind} INTERFACE pelorin_testing pelorin${kind})
    set_target_properties(pelorin_test_kit${kind} PROPERTIES EXPORT_NAME test${suffix})
    add_library(Pelorin::test${suffix} ALIAS pelorin_test_kit${kind})
    list(APPEND installed pelorin_test_kit${kind})
  endforeach()
endif()

include(CMakePackageConfigHelpers)
install(TARGETS ${installed} EXPORT PelorinTargets)
install(EXPORT PelorinTargets NAMESPACE Pelorin:: DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/Pelorin)
configure_package_config_file(${PROJECT_SOURCE_DIR}/cmake/PelorinConfig.cmake.in
  ${PROJECT_BINARY_DIR}/PelorinConfig.cmake INSTALL_DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/Pelorin)
write_basic_package_version_file(${PROJECT_BINARY_DIR}/PelorinConfigVersion.cmake
  COMPATIBILITY SameMinorVersion)
install(FILES ${PROJECT_BINARY_DIR}/PelorinConfig.cmake ${PROJECT_BINARY_DIR}/PelorinConfigVersion.cmake
  DESTINATION ${CMAKE_INSTALL_LIBDIR}/cmake/Pelorin)
foreach(pc pelorin pelorin-platform pelorin-test)
  configure_file(${PROJECT_SOURCE_DIR}/cmake/${pc}.pc.in ${PROJECT_BINARY_DIR}/${pc}.pc @ONLY)
  install(FILES ${PROJECT_BINARY_DIR}/${pc}.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
endforeach()

get_property(headers GLOBAL PROPERTY PELORIN_HEADERS)
foreach(header IN LISTS headers)
  string(REGEX REPLACE "^(platform/)?include/" "" relative ${header})
  get_filename_component(folder ${relative} DIRECTORY)
  install(FILES ${PROJECT_SOURCE_DIR}/${header} DESTINATION ${header_dir}/${folder})
endforeach()

get_property(layers GLOBAL PROPERTY PELORIN_LAYERS)
file(WRITE ${PROJECT_BINARY_DIR}/layers.txt "${layers}")
