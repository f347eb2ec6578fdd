# What depends on the system, picked here and nowhere else; docs/porting.md has what a port writes.
#
# X_linux.cpp needs Linux. X_plain.cpp keeps the same promise, as far as it goes, with POSIX alone.
# X_posix.cpp is for both. VLT_FOREIGN_SOURCES: a regular expression of the sources that are not built.
option(VLT_PLAIN_POSIX "Build as for a system that has POSIX and no more" OFF)
if(CMAKE_SYSTEM_NAME STREQUAL "Linux" AND NOT VLT_PLAIN_POSIX)
  # What needs glibc, too, is plain with another C library, as musl.
  include(CheckCXXSymbolExists)
  check_cxx_symbol_exists(__GLIBC__ cstdlib VLT_GLIBC)
  set(plain_seams "")
  if(NOT VLT_GLIBC)
    set(plain_seams AbandonedMutex LockUntil UpperCase)
  endif()
  set(VLT_FOREIGN_SOURCES "_mac\\.cpp$")
  file(GLOB_RECURSE seams CONFIGURE_DEPENDS zt/*_plain.cpp)
  foreach(seam ${seams})
    string(REGEX REPLACE ".*/(.*)_plain\\.cpp$" "\\1" seam ${seam})
    if(seam IN_LIST plain_seams)
      string(APPEND VLT_FOREIGN_SOURCES "|/${seam}_linux\\.cpp$")
    else()
      string(APPEND VLT_FOREIGN_SOURCES "|/${seam}_plain\\.cpp$")
    endif()
  endforeach()
else()
  add_compile_definitions(VLT_PLAIN_POSIX)  # read by tests only
  set(VLT_FOREIGN_SOURCES "_(mac|linux)\\.cpp$")
endif()

# The linker's flags, for ELF: nothing undefined; one export list, never unloaded, tables read-only
# after the start, without what nothing refers to.
set(VLT_LINK_CLOSED -Wl,-z,defs)
set(VLT_LINK_SHARED -Wl,--version-script=${PROJECT_SOURCE_DIR}/cmake/exports.map -Wl,-z,nodelete
  -Wl,-z,relro -Wl,-z,now -Wl,--gc-sections)
