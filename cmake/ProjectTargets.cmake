# lmx_library(NAME SOURCES a.cpp … LINK lib …): one static library a folder.
function(lmx_library name)
  cmake_parse_arguments(arg "" "" "SOURCES;LINK;PRIVATE_LINK" ${ARGN})
  add_library(${name} STATIC ${arg_SOURCES})
  target_link_libraries(${name} PUBLIC project_flags ${arg_LINK} PRIVATE ${arg_PRIVATE_LINK})
  lmx_precompile(${name} product)
endfunction()

# lmx_test(NAME SOURCES a.cpp … LINK lib … [TIMEOUT s] [LABELS l …]): one GoogleTest program, one ctest entry.
function(lmx_test name)
  cmake_parse_arguments(arg "" "TIMEOUT" "SOURCES;LINK;LABELS" ${ARGN})
  if(NOT arg_TIMEOUT)
    set(arg_TIMEOUT 120)
  endif()
  add_executable(${name} ${arg_SOURCES})
  target_link_libraries(${name} PRIVATE project_flags test_flags ${arg_LINK} GTest::gmock GTest::gtest_main)
  lmx_precompile(${name} test)
  add_test(NAME ${name} COMMAND ${name})
  set_tests_properties(${name} PROPERTIES TIMEOUT ${arg_TIMEOUT} LABELS "${arg_LABELS}")
  set_property(TEST ${name} PROPERTY ENVIRONMENT
    "TSAN_OPTIONS=suppressions=${CMAKE_SOURCE_DIR}/tests/tsan.supp history_size=4"
    "LSAN_OPTIONS=suppressions=${CMAKE_SOURCE_DIR}/tests/lsan.supp"
    "ASAN_OPTIONS=detect_stack_use_after_return=1")
endfunction()
