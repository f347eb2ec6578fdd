# GoogleTest is built from the distribution's sources with our flags. Each test runs in a process of
# its own, inside a directory of its own (tests/support/main.cpp).
include(GoogleTest)
set(BUILD_GMOCK OFF CACHE BOOL "" FORCE)
set(INSTALL_GTEST OFF CACHE BOOL "" FORCE)
add_subdirectory(/usr/src/googletest ${PROJECT_BINARY_DIR}/googletest EXCLUDE_FROM_ALL SYSTEM)

file(GLOB support CONFIGURE_DEPENDS tests/support/*.cpp)
list(FILTER support EXCLUDE REGEX "_test\\.cpp$")
add_library(vlt_test_support STATIC ${support})
target_link_libraries(vlt_test_support PUBLIC vlt_strict gtest Threads::Threads)
# Linked by programs only: one form of code for both, as a precompiled header requires.
set_target_properties(vlt_test_support PROPERTIES POSITION_INDEPENDENT_CODE OFF)
target_compile_options(vlt_test_support PRIVATE -fPIE)
# The library is what is to be fast, not what looks at it: a test compiles in half the time.
target_compile_options(vlt_test_support PUBLIC $<$<CONFIG:RelWithDebInfo>:-O0>)
# What tests copy to load it.
add_library(vlt_test_module MODULE tests/support/modules/cosine.cpp)
add_dependencies(vlt_test_support vlt_test_module)
set_source_files_properties(tests/support/Modules.cpp PROPERTIES SKIP_PRECOMPILE_HEADERS ON
  COMPILE_DEFINITIONS VLT_TEST_MODULE="$<TARGET_FILE:vlt_test_module>")
if(VLT_PCH)
  target_precompile_headers(vlt_test_support PRIVATE <gtest/gtest.h> <algorithm> <atomic> <chrono>
    <filesystem> <fstream> <functional> <future> <iostream> <map> <memory> <set> <sstream> <string>
    <thread> <vector>)
endif()

# Tests that take more than two seconds, by themselves or with their like. They get the label
# "slow", and ./dev alone leaves them out.
set(slow_tests "Check.AHang*" "Check.AnExit*" "CheckBundles.Thousands*" "Failures/Oom.EveryCall*" "FailingCall.*"
  "Faults.AtEachPoint*"
  "FindFiles.ManyEntries*" "ForkStorm.*" "ForkThreads.*" "Hostile.A*Million*"
  "Help.ZshCompletes*" "Hostile.AHundredThousand*" "IniFileLockLocale.*" "Locales.*" "NamedEventHostile.LockFileShared*"
  "NamedEventHostile.SetsLocked*" "NamedEventLimits.StateFilesThatCannot*"
  "NamedEventLimits.ThousandUnusable*" "NamesInLocales.*" "Planted.*" "PowerCut*"
  "Prefork.SlowWrites*" "RegistrarKill.*" "Rendezvous*" "SnapshotRegistrar.*" "SnapshotStart.*"
  "VltctlSurroundings.WhatTakesLong*" "vltSettingsTable.EveryChoice*Server" "WriterReuse.EverySave*")
list(JOIN slow_tests ":" slow_tests)

# vlt_tests(name LABELS ... [SOURCES ...] [GLOBS ...] [LINKS ...] [TIMEOUT seconds])
function(vlt_tests name)
  cmake_parse_arguments(ARG "" "LABELS;TIMEOUT" "SOURCES;GLOBS;LINKS" ${ARGN})
  set(sources ${ARG_SOURCES})
  if(ARG_GLOBS)
    file(GLOB globbed CONFIGURE_DEPENDS ${ARG_GLOBS})
    list(APPEND sources ${globbed})
  endif()
  if(VLT_TEST_FILTER)
    list(FILTER sources INCLUDE REGEX "${VLT_TEST_FILTER}")
  endif()
  if(NOT sources)
    return()
  endif()
  add_executable(${name} ${sources})
  target_link_libraries(${name} PRIVATE vlt_test_support ${ARG_LINKS})
  if(VLT_PCH)
    target_precompile_headers(${name} REUSE_FROM vlt_test_support)
  endif()
  if("vltutils" IN_LIST ARG_LINKS)
    set_target_properties(${name} PROPERTIES
      CROSSCOMPILING_EMULATOR ${PROJECT_SOURCE_DIR}/tests/support/in-private-root)
  endif()
  if(NOT ARG_TIMEOUT)
    set(ARG_TIMEOUT 120)
  endif()
  gtest_discover_tests(${name} TEST_FILTER "-${slow_tests}" DISCOVERY_MODE PRE_TEST
    DISCOVERY_TIMEOUT 60 PROPERTIES TIMEOUT ${ARG_TIMEOUT} LABELS "${ARG_LABELS}")
  gtest_discover_tests(${name} TEST_FILTER "${slow_tests}" DISCOVERY_MODE PRE_TEST
    DISCOVERY_TIMEOUT 60 PROPERTIES TIMEOUT ${ARG_TIMEOUT} LABELS ${ARG_LABELS} LABELS slow)
endfunction()

vlt_tests(support_tests LABELS unit GLOBS tests/support/*_test.cpp)
# A floor's tests are linked with that floor and the ones below it. Those of the upper floors use
# exports too, as a client does that reads and frees what it is given.
foreach(floor ${VLT_FLOORS})
  set(linked ${floor})
  if(floor MATCHES "^vlt")
    set(linked vltexports)
  endif()
  if(floor STREQUAL "vltsnapshot")
    set(linked vltsnapshot vltexports)
  endif()
  set(globs)
  if(floor STREQUAL "vltexports")
    set(globs client/*_test.cpp)
  endif()
  vlt_tests(${floor}_tests LABELS unit SOURCES ${${floor}_TESTS} GLOBS ${globs} LINKS ${linked})
endforeach()

# Units of the command that use neither form of the library.
if(TARGET vltctl_common)
  vlt_tests(tools_tests LABELS unit GLOBS tools/common/*_test.cpp tools/vltctl-client/LibraryTrust*.cpp
    tools/vltctl-client/Candidates*.cpp
    LINKS vltctl_common)
  if(TARGET tools_tests)
    target_compile_definitions(tools_tests PRIVATE VLT_TEST_SOURCE="${PROJECT_SOURCE_DIR}")
  endif()
endif()
if(TARGET vltutils)
  vlt_tests(oom_tests LABELS e2e TIMEOUT 600 GLOBS tests/oom/*_test.cpp LINKS vltutils)
  vlt_tests(e2e_tests LABELS e2e TIMEOUT 300 GLOBS tests/e2e/*_test.cpp tests/e2e/Random*.cpp
    tests/power/*.cpp LINKS vltutils)
  if(TARGET e2e_tests)
    find_package(nlohmann_json REQUIRED)
    target_link_libraries(e2e_tests PRIVATE nlohmann_json::nlohmann_json)
    if(TARGET vltctl)
      add_dependencies(e2e_tests vltctl)
    endif()
    # A program of the snapshot reader's users, which need no later language than its header.
    add_executable(snapshot_client tests/e2e/snapshot_client.cpp)
    set_target_properties(snapshot_client PROPERTIES CXX_STANDARD 17)
    target_link_libraries(snapshot_client PRIVATE vlt_strict vltsnapshot nlohmann_json::nlohmann_json)
    add_dependencies(e2e_tests snapshot_client)
    target_compile_definitions(e2e_tests PRIVATE
      VLT_TEST_LIBRARY="$<TARGET_FILE:vltutils>" VLT_TEST_BIN="${PROJECT_BINARY_DIR}/bin"
      VLT_TEST_SOURCE="${PROJECT_SOURCE_DIR}")
  endif()
endif()

# Power cuts below real file systems: not part of any test run, as it mounts (tools/storm/power-blocks).
find_path(VLT_FUSE3_INCLUDE fuse3/fuse.h)
find_library(VLT_FUSE3_LIBRARY fuse3)
if(TARGET vltutils AND VLT_FUSE3_INCLUDE AND VLT_FUSE3_LIBRARY AND NOT VLT_M32)
  file(GLOB blocks CONFIGURE_DEPENDS tests/power/blocks/*.cpp)
  add_executable(power_blocks EXCLUDE_FROM_ALL ${blocks})
  target_include_directories(power_blocks SYSTEM PRIVATE ${VLT_FUSE3_INCLUDE}/fuse3)
  target_link_libraries(power_blocks PRIVATE vlt_test_support vltutils ${VLT_FUSE3_LIBRARY})
endif()
