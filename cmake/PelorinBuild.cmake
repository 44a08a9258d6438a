# Warnings, sanitizers and the pelorin_component() function.

add_library(pelorin_flags INTERFACE)
target_compile_options(pelorin_flags INTERFACE
  -Wall -Wextra -Wpedantic -Wshadow -Wconversion -Wcast-qual -Wformat=2 -Wimplicit-fallthrough
  $<$<COMPILE_LANGUAGE:CXX>:-Wnon-virtual-dtor;-Wold-style-cast;-Woverloaded-virtual>
  -fno-omit-frame-pointer
  $<$<BOOL:${PELORIN_WERROR}>:-Werror>
  $<$<CXX_COMPILER_ID:Clang>:-Wthread-safety>)

# Hardening. What costs time where it counts stays out of users' builds: the
# checked standard containers are for debug builds.
target_compile_options(pelorin_flags INTERFACE -fstack-protector-strong -fstack-clash-protection
  $<$<STREQUAL:${CMAKE_SYSTEM_PROCESSOR},x86_64>:-fcf-protection>)
target_compile_definitions(pelorin_flags INTERFACE $<$<CONFIG:Debug>:_GLIBCXX_ASSERTIONS>)
if(NOT PELORIN_SANITIZE)
  target_compile_options(pelorin_flags INTERFACE
    $<$<CONFIG:Release,RelWithDebInfo,MinSizeRel>:-U_FORTIFY_SOURCE;-D_FORTIFY_SOURCE=3>)
endif()

if(PELORIN_SANITIZE)
  add_compile_options(-fsanitize=${PELORIN_SANITIZE} -fno-sanitize-recover=all)
  add_link_options(-fsanitize=${PELORIN_SANITIZE})
  if(CMAKE_CXX_COMPILER_ID STREQUAL "Clang")
    add_link_options(-fsanitize-link-c++-runtime -lstdc++)  # C programs, too
  endif()
endif()
if(PELORIN_FUZZ)
  add_compile_options(-fsanitize=fuzzer-no-link)
endif()
if(PELORIN_FAST_BUILD)
  add_compile_options(-g1)  # line numbers are what reports need
  find_program(lld ld.lld)
  if(lld)
    add_link_options(-fuse-ld=lld)
  endif()
endif()

# pelorin_compile_together(TARGET)
#
# With PELORIN_FAST_BUILD, the sources of TARGET are compiled as one: headers cost more
# than they do. Not in every build, so that forgotten #includes are found.
function(pelorin_compile_together target)
  if(PELORIN_FAST_BUILD)
    set_target_properties(${target} PROPERTIES UNITY_BUILD ON UNITY_BUILD_BATCH_SIZE 20)
  endif()
endfunction()

if(CMAKE_BUILD_TYPE STREQUAL "Debug")
  add_compile_definitions(PLR_DEBUG=1)
endif()

# pelorin_component(NAME LEVEL n LIBRARY pelorin|platform HEADERS ... SOURCES ... [PRIVATE_LIBS ...])
#
# A named group of files of one level. A file may include files of its own
# component and of lower levels only; tools/check_layers.py reads the table
# that this function writes to layers.txt in the build folder and holds every
# #include against it. HEADERS are installed; private ones stand under SOURCES.
set_property(GLOBAL PROPERTY PELORIN_LAYERS "")
set_property(GLOBAL PROPERTY PELORIN_HEADERS "")
set_property(GLOBAL PROPERTY PELORIN_FILES "")
function(pelorin_component name)
  cmake_parse_arguments(C "" "LEVEL;LIBRARY" "HEADERS;SOURCES;PRIVATE_LIBS" ${ARGN})
  foreach(file IN LISTS C_HEADERS C_SOURCES)
    set_property(GLOBAL APPEND_STRING PROPERTY PELORIN_LAYERS
      "${C_LEVEL} ${name} ${C_LIBRARY} ${file}\n")
  endforeach()
  list(TRANSFORM C_HEADERS PREPEND ${PROJECT_SOURCE_DIR}/ OUTPUT_VARIABLE headers)
  list(TRANSFORM C_SOURCES PREPEND ${PROJECT_SOURCE_DIR}/ OUTPUT_VARIABLE sources)
  set_property(GLOBAL APPEND PROPERTY PELORIN_HEADERS ${C_HEADERS})
  set_property(GLOBAL APPEND PROPERTY PELORIN_FILES ${C_HEADERS} ${C_SOURCES})
  list(FILTER sources INCLUDE REGEX "\\.cpp$|\\.c$")
  if(sources)
    add_library(component_${name} OBJECT ${sources})
    target_include_directories(component_${name} PUBLIC
      ${PROJECT_SOURCE_DIR}/include ${PROJECT_SOURCE_DIR}/platform/include
      PRIVATE ${PROJECT_SOURCE_DIR})
    target_link_libraries(component_${name} PRIVATE pelorin_flags ${C_PRIVATE_LIBS})
    pelorin_compile_together(component_${name})
    set_property(GLOBAL APPEND PROPERTY PELORIN_OBJECTS_${C_LIBRARY} component_${name})
  endif()
endfunction()
