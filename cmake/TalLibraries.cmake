# The libraries that the project stands on, each as one imported target.
# A library that one back-end alone needs is optional: without it that back-end
# is left out, and the summary at the end of the configure run says so.
find_package(PkgConfig REQUIRED)
find_package(Threads REQUIRED)

pkg_check_modules(SQLITE REQUIRED IMPORTED_TARGET sqlite3)
pkg_check_modules(CBOR REQUIRED IMPORTED_TARGET libcbor)
pkg_check_modules(TOMLPLUSPLUS REQUIRED IMPORTED_TARGET tomlplusplus)
pkg_check_modules(SYSTEMD IMPORTED_TARGET libsystemd)
pkg_check_modules(PIPEWIRE IMPORTED_TARGET libpipewire-0.3)
pkg_check_modules(PLIST IMPORTED_TARGET libplist-2.0)
pkg_check_modules(LTTNG_CTL IMPORTED_TARGET lttng-ctl)
pkg_check_modules(LTTNG_UST IMPORTED_TARGET lttng-ust)
pkg_check_modules(BABELTRACE IMPORTED_TARGET babeltrace2)
find_package(CLI11 REQUIRED)
find_package(nlohmann_json REQUIRED)

find_path(ASIO_INCLUDE_DIR asio.hpp REQUIRED)
add_library(tal_asio INTERFACE)
target_include_directories(tal_asio SYSTEM INTERFACE "${ASIO_INCLUDE_DIR}")
# asio asks a macro of the standard library for aligned_alloc, perhaps before any header has defined it: left to itself
# it allocates in one source file with malloc and frees in another with delete.
target_compile_definitions(tal_asio INTERFACE ASIO_STANDALONE ASIO_NO_DEPRECATED ASIO_HAS_STD_ALIGNED_ALLOC=1)
if(TAL_SANITIZE MATCHES "thread")
  # Its fences, which the thread sanitizer cannot follow, add nothing to the locks and queues that hand work over here.
  target_compile_definitions(tal_asio INTERFACE ASIO_DISABLE_FENCED_BLOCK)
endif()
target_link_libraries(tal_asio INTERFACE Threads::Threads)

if(NOT SYSTEMD_FOUND)
  message(STATUS "libsystemd not found: no journal, no readiness notification, no socket activation")
endif()
if(NOT PLIST_FOUND)
  message(STATUS "libplist-2.0 not found: probe lists cannot be read, so that traces give no results")
endif()
if(NOT LTTNG_CTL_FOUND)
  message(STATUS "lttng-ctl not found: tal-perftrail is left out, no traces can be recorded")
endif()
if(NOT LTTNG_UST_FOUND)
  message(STATUS "lttng-ust not found: signposts of clients are recorded nowhere")
endif()
if(NOT BABELTRACE_FOUND)
  message(STATUS "babeltrace2 not found: libtalskein is left out, traces give no results")
endif()
if(NOT PIPEWIRE_FOUND)
  message(STATUS "libpipewire-0.3 not found: tal-pipewire-reporter is left out")
endif()
