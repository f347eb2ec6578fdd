# Benchmarks, one program a file of bench/. They never decide a test.
find_package(benchmark REQUIRED)
file(GLOB benches CONFIGURE_DEPENDS bench/*_bench.cpp)
foreach(source ${benches})
  get_filename_component(name ${source} NAME_WE)
  add_executable(${name} EXCLUDE_FROM_ALL ${source})
  target_link_libraries(${name} PRIVATE vlt_strict vltexports benchmark::benchmark)
endforeach()

# Beside other libraries: packages of the distribution, needed by this program only.
find_package(PkgConfig REQUIRED)
pkg_check_modules(PEERS IMPORTED_TARGET glib-2.0 inih libcrypto spdlog)
if(PEERS_FOUND)
  file(GLOB peers CONFIGURE_DEPENDS bench/peers/*.cpp)
  add_executable(peers EXCLUDE_FROM_ALL ${peers})
  target_link_libraries(peers PRIVATE vlt_strict vltexports PkgConfig::PEERS)
  add_dependencies(peers vltutils)
endif()

add_executable(growth EXCLUDE_FROM_ALL bench/growth/growth.cpp)
target_link_libraries(growth PRIVATE vlt_strict vltexports)
add_dependencies(growth vltctl)
