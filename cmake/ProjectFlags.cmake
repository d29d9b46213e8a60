# The compiler flags of every target of ours; imported libraries are left alone.
add_library(project_flags INTERFACE)
target_compile_options(project_flags INTERFACE
  -Wall -Wextra -Wpedantic -Wshadow -Wconversion -Wnon-virtual-dtor -Wformat=2 -Wno-missing-field-initializers)
if(LMX_WERROR)
  target_compile_options(project_flags INTERFACE -Werror)
endif()
# GCC 12 takes the short form of a std::string for the whole of it when it inlines operator+ and then reports writes
# behind its end.
if(CMAKE_CXX_COMPILER_ID STREQUAL GNU AND CMAKE_CXX_COMPILER_VERSION VERSION_LESS 13)
  target_compile_options(project_flags INTERFACE -Wno-array-bounds -Wno-stringop-overflow)
endif()
# Some libraries ask for -pthread, which defines a macro: a precompiled header serves only those who all have it.
target_compile_options(project_flags INTERFACE -pthread)
target_include_directories(project_flags INTERFACE ${CMAKE_SOURCE_DIR}/src ${CMAKE_SOURCE_DIR})
target_link_libraries(project_flags INTERFACE Threads::Threads)
if(LMX_SANITIZE)
  target_compile_options(project_flags INTERFACE -fsanitize=${LMX_SANITIZE} -fno-omit-frame-pointer -O1 -g1)
  target_link_options(project_flags INTERFACE -fsanitize=${LMX_SANITIZE})
  # GCC 12 reports std::optional members under a sanitizer that it does not report without; release keeps the check.
  target_compile_options(project_flags INTERFACE $<$<CXX_COMPILER_ID:GNU>:-Wno-maybe-uninitialized>)
  if(LMX_SANITIZE MATCHES undefined)
    target_compile_options(project_flags INTERFACE -fno-sanitize-recover=undefined)
  endif()
endif()

# For the sources of tests, behind project_flags: they are compiled more often than run, and a stack trace needs lines only.
add_library(test_flags INTERFACE)
target_compile_options(test_flags INTERFACE -O0 -g1)
if(LMX_SANITIZE MATCHES undefined)
  target_compile_options(test_flags INTERFACE -fno-sanitize=undefined)  # a third of their time; the product keeps it
endif()
