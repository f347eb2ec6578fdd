# With VLT_FUZZ (clang) each *_fuzz.cpp is a libFuzzer program of its own. Otherwise all of them are
# linked into one program, which replays their corpora: a test for each.
file(GLOB fuzzers CONFIGURE_DEPENDS fuzz/*_fuzz.cpp)
if(NOT VLT_FUZZ)
  add_executable(fuzz_replay fuzz/replay.cpp ${fuzzers})
  target_link_libraries(fuzz_replay PRIVATE vlt_strict vltexports)
endif()
set(replayed "")
foreach(source ${fuzzers})
  get_filename_component(name ${source} NAME_WE)
  string(REGEX REPLACE "_fuzz$" "" topic ${name})
  if(VLT_FUZZ)
    add_executable(${name} ${source})
    target_link_libraries(${name} PRIVATE vlt_strict vltexports)
    target_link_options(${name} PRIVATE -fsanitize=fuzzer)
  else()
    # All targets have the one name that libFuzzer asks for.
    set_source_files_properties(${source} PROPERTIES
      COMPILE_DEFINITIONS LLVMFuzzerTestOneInput=Fuzz_${topic})
    string(APPEND replayed "VLT_FUZZ_TARGET(${topic})\n")
    add_test(NAME Fuzz.${topic}
      COMMAND fuzz_replay ${topic} ${PROJECT_SOURCE_DIR}/fuzz/corpus/${topic})
    set_tests_properties(Fuzz.${topic} PROPERTIES LABELS fuzz TIMEOUT 120)
  endif()
endforeach()
if(NOT VLT_FUZZ)
  file(CONFIGURE OUTPUT fuzz_targets.inc CONTENT "${replayed}")
  target_include_directories(fuzz_replay PRIVATE ${CMAKE_CURRENT_BINARY_DIR})
endif()
