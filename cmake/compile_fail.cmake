# Compile-fail tests: code that the platform refuses must not build on the
# host either. dalix_add_compile_fail_tests(NAME SOURCE LIBRARIES libs...
# CASES number regex [number regex ...]) builds SOURCE once with DALIX_CASE=0
# as part of the normal build (so the file is otherwise sound), and adds one
# test per case that builds it with DALIX_CASE=<number> and passes when the
# build output matches <regex>: the expected diagnostic, not just any error.
function(dalix_add_compile_fail_tests name source)
  cmake_parse_arguments(PARSE_ARGV 2 arg "" "" "LIBRARIES;CASES")
  add_executable(${name}_control ${source})
  target_compile_definitions(${name}_control PRIVATE DALIX_CASE=0)
  target_compile_options(${name}_control PRIVATE ${DALIX_WARNINGS})
  target_link_libraries(${name}_control PRIVATE ${arg_LIBRARIES})
  set(cases ${arg_CASES})
  while(cases)
    list(POP_FRONT cases number regex)
    set(target ${name}_case_${number})
    add_executable(${target} EXCLUDE_FROM_ALL ${source})
    target_compile_definitions(${target} PRIVATE DALIX_CASE=${number})
    target_compile_options(${target} PRIVATE ${DALIX_WARNINGS})
    target_link_libraries(${target} PRIVATE ${arg_LIBRARIES})
    add_test(NAME ${name}.case_${number}
             COMMAND ${CMAKE_COMMAND} --build ${PROJECT_BINARY_DIR} --target ${target})
    # One build at a time in the shared tree; diagnostics in plain ASCII.
    set_tests_properties(${name}.case_${number} PROPERTIES
      PASS_REGULAR_EXPRESSION "${regex}" RESOURCE_LOCK dalix_build_tree ENVIRONMENT LC_ALL=C)
  endwhile()
endfunction()
