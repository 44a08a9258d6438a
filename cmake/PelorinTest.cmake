# What every test of the project gets.

# pelorin_add_test(NAME [TIMEOUT seconds] [LABELS ...] COMMAND ...)
#
# add_test() with what every test here gets: a bound on its time, 300 seconds
# unless said otherwise; sanitizers that end the process at their first finding;
# and the sanitizer in its name, because ./test runs several builds as one suite.
set(test_prefix "")
if(PELORIN_SANITIZE)
  string(REGEX REPLACE "(.).*" "\\1san." test_prefix ${PELORIN_SANITIZE})
elseif(CMAKE_CXX_COMPILER_ID STREQUAL "Clang")
  set(test_prefix "clang.")
endif()
set(sanitizer_options
  "ASAN_OPTIONS=detect_leaks=1:detect_stack_use_after_return=1:check_initialization_order=1:strict_string_checks=1"
  "UBSAN_OPTIONS=print_stacktrace=1"
  "TSAN_OPTIONS=halt_on_error=1:atexit_sleep_ms=50:second_deadlock_stack=1")
function(pelorin_add_test name)
  cmake_parse_arguments(T "" "TIMEOUT" "LABELS;COMMAND" ${ARGN})
  if(NOT T_TIMEOUT)
    set(T_TIMEOUT 300)
  endif()
  add_test(NAME ${test_prefix}${name} COMMAND ${T_COMMAND})
  set_tests_properties(${test_prefix}${name} PROPERTIES
    TIMEOUT ${T_TIMEOUT} LABELS "${T_LABELS}" ENVIRONMENT "${sanitizer_options}")
endfunction()
