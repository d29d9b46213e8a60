# lmx_precompile(TARGET product|test): reads the library headers that most sources include from one precompiled header
# for all targets of that kind. A source still includes what it uses: scripts/check-includes --compile builds without it.
# CMAKE_DISABLE_PRECOMPILE_HEADERS switches it off.
set(lmx_headers_product
  <algorithm> <array> <atomic> <cerrno> <chrono> <cmath> <condition_variable> <cstdint> <cstdio> <cstdlib> <cstring>
  <ctime> <deque> <functional> <map> <memory> <mutex> <optional> <set> <span> <string> <string_view> <thread> <utility>
  <variant> <vector>)
set(lmx_headers_test ${lmx_headers_product} <gmock/gmock.h> <gtest/gtest.h>)

function(lmx_precompile target kind)
  set(owner precompiled_${kind})
  if(NOT TARGET ${owner})
    add_library(${owner} OBJECT ${CMAKE_SOURCE_DIR}/cmake/precompiled.cpp)
    target_link_libraries(${owner} PRIVATE project_flags)
    if(kind STREQUAL test)
      target_link_libraries(${owner} PRIVATE test_flags GTest::gmock)
    endif()
    target_precompile_headers(${owner} PRIVATE ${lmx_headers_${kind}})
  endif()
  target_precompile_headers(${target} REUSE_FROM ${owner})
endfunction()
