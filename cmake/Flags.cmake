# Flags that every object of the project is built with, third-party test code included, so that
# 32-bit and sanitizer builds agree from end to end.
set(VLT_FLAGS -fno-strict-aliasing -ffunction-sections -fdata-sections -fstack-protector-strong)
set(VLT_LINK_FLAGS "")
if(VLT_M32)
  list(APPEND VLT_FLAGS -m32 -msse2 -mfpmath=sse)
  list(APPEND VLT_LINK_FLAGS -m32)
endif()
add_compile_definitions(_FILE_OFFSET_BITS=64)
if(VLT_M32)
  add_compile_definitions(_TIME_BITS=64)
endif()
if(VLT_SANITIZE STREQUAL "address")
  list(APPEND VLT_FLAGS -fsanitize=address,undefined -fno-sanitize-recover=all -fno-omit-frame-pointer)
  list(APPEND VLT_LINK_FLAGS -fsanitize=address,undefined)
elseif(VLT_SANITIZE STREQUAL "thread")
  list(APPEND VLT_FLAGS -fsanitize=thread -fno-omit-frame-pointer)
  list(APPEND VLT_LINK_FLAGS -fsanitize=thread)
elseif(VLT_SANITIZE)
  message(FATAL_ERROR "VLT_SANITIZE is address, thread or nothing, not '${VLT_SANITIZE}'")
endif()
if(VLT_FUZZ)
  list(APPEND VLT_FLAGS -fsanitize=fuzzer-no-link,address,undefined -fno-sanitize-recover=all)
  list(APPEND VLT_LINK_FLAGS -fsanitize=address,undefined)
endif()
if(VLT_COVERAGE)
  list(APPEND VLT_FLAGS --coverage -fprofile-update=atomic)
  # The symbol, for children that end without their exit handlers and write their counters themselves.
  list(APPEND VLT_LINK_FLAGS --coverage -Wl,-u,__gcov_dump)
endif()
add_compile_options(${VLT_FLAGS})
add_link_options(${VLT_LINK_FLAGS})

# Flags of our own code only.
add_library(vlt_strict INTERFACE)
target_compile_options(vlt_strict INTERFACE -Wall -Wextra -Wpedantic $<$<BOOL:${VLT_WERROR}>:-Werror>
  -Wno-unused-parameter -Wnon-virtual-dtor -fmacro-prefix-map=${PROJECT_SOURCE_DIR}/=)
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
  # GCC 12 sees overlapping copies in the library's own "text" + std::string (GCC bug 105651).
  target_compile_options(vlt_strict INTERFACE -Wno-restrict)
endif()
if(CMAKE_CXX_COMPILER_ID MATCHES "Clang")
  # The lock annotations are checked by clang alone. Interfaces have protected destructors on
  # purpose, which GCC's -Wnon-virtual-dtor accepts.
  target_compile_options(vlt_strict INTERFACE -Wthread-safety)
endif()
target_include_directories(vlt_strict INTERFACE ${PROJECT_SOURCE_DIR})
