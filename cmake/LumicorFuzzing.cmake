# One libFuzzer target per parser: fuzz/<name>.cpp builds fuzz_<name>.
# Seeds live in fuzz/corpus/<name>/; each target also runs a bounded number of
# iterations as a CTest test so that regressions show up in `make test`.
set(LUMICOR_FUZZ_RUNS 200000 CACHE STRING "libFuzzer runs per target under ctest")
# A fixed seed keeps the test runs repeatable; `make fuzz` explores with fresh seeds.
set(LUMICOR_FUZZ_SEED 1 CACHE STRING "libFuzzer seed of the ctest runs")
file(GLOB fuzz_sources CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/fuzz/*.cpp)
foreach(src ${fuzz_sources})
  get_filename_component(name ${src} NAME_WE)
  add_executable(fuzz_${name} ${src})
  target_link_libraries(fuzz_${name} PRIVATE Lumicor_static)
  target_include_directories(fuzz_${name} PRIVATE ${PROJECT_SOURCE_DIR})
  target_link_options(fuzz_${name} PRIVATE -fsanitize=fuzzer)
  set(corpus ${PROJECT_SOURCE_DIR}/fuzz/corpus/${name})
  set(work ${PROJECT_BINARY_DIR}/fuzz-work/${name})
  add_test(NAME fuzz.${name}
    COMMAND ${CMAKE_COMMAND} -E env ASAN_OPTIONS=detect_leaks=1
            sh -c "mkdir -p '${work}' && exec '$<TARGET_FILE:fuzz_${name}>' -runs=${LUMICOR_FUZZ_RUNS} -seed=${LUMICOR_FUZZ_SEED} -max_len=65536 -timeout=10 -rss_limit_mb=4096 -print_final_stats=1 '${work}' '${corpus}'")
  set_tests_properties(fuzz.${name} PROPERTIES TIMEOUT 1200)
endforeach()
