# One target per folder: it sees the headers of its own folder tree and links
# only what it names, so that an include that the architecture forbids fails.
#
# Every target exports `src/` of the targets it may use through TAL_INCLUDE_ROOT:
# each folder's headers are reached as "<folder>/<Header>.h" through a directory
# of links that holds this folder alone.

set(TAL_INCLUDE_ROOT "${CMAKE_BINARY_DIR}/include")

# Makes "<folder>/…" includable for the target and for whoever links it.
function(tal_export_headers target folder)
  set(root "${TAL_INCLUDE_ROOT}/${target}")
  get_filename_component(parent "${root}/${folder}" DIRECTORY)
  file(MAKE_DIRECTORY "${parent}")
  file(CREATE_LINK "${CMAKE_SOURCE_DIR}/src/${folder}" "${root}/${folder}" SYMBOLIC)
  get_target_property(type ${target} TYPE)
  if(type STREQUAL "INTERFACE_LIBRARY")
    target_include_directories(${target} INTERFACE "${root}")
  else()
    target_include_directories(${target} PUBLIC "${root}")
  endif()
endfunction()

function(tal_warnings target)
  target_compile_options(${target} PRIVATE -Wall -Wextra -Wpedantic -Wshadow -Wconversion
    -Wnon-virtual-dtor -Wold-style-cast -Woverloaded-virtual -Werror)
  # g++ 12 sees overlapping copies in the concatenation of strings where there are none. clang-tidy reads the same
  # command line and does not know the option; g++ passes over a -Wno-… that it does not know.
  if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_CXX_COMPILER_VERSION VERSION_LESS 13)
    target_compile_options(${target} PRIVATE -Wno-restrict -Wno-unknown-warning-option)
  endif()
endfunction()

# tal_library(<target> FOLDER <folder below src> SOURCES … [LINKS …] [PRIVATE_LINKS …])
function(tal_library target)
  cmake_parse_arguments(ARG "" "FOLDER" "SOURCES;LINKS;PRIVATE_LINKS" ${ARGN})
  if(ARG_SOURCES)
    add_library(${target} STATIC ${ARG_SOURCES})
    tal_warnings(${target})
    target_link_libraries(${target} PUBLIC ${ARG_LINKS} PRIVATE ${ARG_PRIVATE_LINKS})
  else()
    add_library(${target} INTERFACE)
    target_link_libraries(${target} INTERFACE ${ARG_LINKS})
  endif()
  tal_export_headers(${target} ${ARG_FOLDER})
endfunction()

# `programs`: what `make build` leaves in bin/, without the tests and benchmarks.
add_custom_target(programs)
# `benchmarks`: what `make bench` runs.
add_custom_target(benchmarks)

# tal_program(<target> SOURCES … LINKS …): a program for users, in bin/ and installed.
function(tal_program target)
  cmake_parse_arguments(ARG "" "" "SOURCES;LINKS" ${ARGN})
  add_executable(${target} ${ARG_SOURCES})
  tal_warnings(${target})
  target_link_libraries(${target} PRIVATE ${ARG_LINKS})
  add_dependencies(programs ${target})
  # A prefix that the dynamic linker does not know holds the library that the program was installed with.
  set_target_properties(${target} PROPERTIES INSTALL_RPATH "$ORIGIN/../${CMAKE_INSTALL_LIBDIR}")
  install(TARGETS ${target} RUNTIME)
endfunction()

# tal_test(<target> SOURCES … LINKS …): a GoogleTest program whose cases CTest lists one by one, in bin-tests/.
function(tal_test target)
  cmake_parse_arguments(ARG "" "" "SOURCES;LINKS" ${ARGN})
  add_executable(${target} ${ARG_SOURCES})
  tal_warnings(${target})
  set_target_properties(${target} PROPERTIES RUNTIME_OUTPUT_DIRECTORY "${CMAKE_BINARY_DIR}/bin-tests")
  target_include_directories(${target} PRIVATE "${CMAKE_SOURCE_DIR}/tests")
  target_link_libraries(${target} PRIVATE ${ARG_LINKS} GTest::gmock GTest::gtest_main)
  gtest_discover_tests(${target} DISCOVERY_MODE PRE_TEST PROPERTIES TIMEOUT 300)
endfunction()

# tal_bench(<target> SOURCES … LINKS …): a Google Benchmark program that `make bench` builds and runs, in bin-bench/.
function(tal_bench target)
  cmake_parse_arguments(ARG "" "" "SOURCES;LINKS" ${ARGN})
  add_executable(${target} ${ARG_SOURCES})
  tal_warnings(${target})
  set_target_properties(${target} PROPERTIES RUNTIME_OUTPUT_DIRECTORY "${CMAKE_BINARY_DIR}/bin-bench")
  target_link_libraries(${target} PRIVATE ${ARG_LINKS} benchmark::benchmark)
  add_dependencies(benchmarks ${target})
endfunction()
