# Benchmarks, one program a file of bench/. They never decide a test.
find_package(benchmark REQUIRED)
file(GLOB benches CONFIGURE_DEPENDS bench/*_bench.cpp)
foreach(source ${benches})
  get_filename_component(name ${source} NAME_WE)
  add_executable(${name} EXCLUDE_FROM_ALL ${source})
  target_link_libraries(${name} PRIVATE vlt_strict vltexports benchmark::benchmark)
endforeach()
