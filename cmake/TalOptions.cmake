# What a person building the project may choose.
option(TAL_BUILD_TESTS "Build the tests" ON)
option(TAL_BUILD_BENCH "Build the benchmarks" ON)
option(TAL_BUILD_FUZZERS "Build the fuzz targets (needs clang)" OFF)
set(TAL_SANITIZE "" CACHE STRING "Sanitizers to build with, for example address,undefined or thread")

if(TAL_SANITIZE)
  add_compile_options(-fsanitize=${TAL_SANITIZE} -fno-omit-frame-pointer -fno-sanitize-recover=all)
  add_link_options(-fsanitize=${TAL_SANITIZE})
endif()

find_program(TAL_CCACHE ccache)
if(TAL_CCACHE AND NOT CMAKE_CXX_COMPILER_LAUNCHER)
  set(CMAKE_C_COMPILER_LAUNCHER "${TAL_CCACHE}")
  set(CMAKE_CXX_COMPILER_LAUNCHER "${TAL_CCACHE}")
endif()
