# One static library a floor; a floor links the ones below it and nothing else.
find_package(Threads REQUIRED)

function(vlt_floor name)
  cmake_parse_arguments(ARG "" "" "GLOBS;LINKS" ${ARGN})
  file(GLOB sources CONFIGURE_DEPENDS ${ARG_GLOBS})
  list(FILTER sources EXCLUDE REGEX "_(test|mac)\\.cpp$")
  list(FILTER sources EXCLUDE REGEX "/startup\\.cpp$")
  if(NOT sources)
    return()
  endif()
  add_library(${name} STATIC ${sources})
  target_link_libraries(${name} PRIVATE vlt_strict PUBLIC Threads::Threads ${CMAKE_DL_LIBS})
  foreach(lower ${ARG_LINKS})
    if(TARGET ${lower})
      target_link_libraries(${name} PUBLIC ${lower})
    endif()
  endforeach()
endfunction()

vlt_floor(ztposix GLOBS zt/posix/*.cpp)
vlt_floor(ztini LINKS ztposix GLOBS ztini/*.cpp)
vlt_floor(ztfnd LINKS ztposix GLOBS zt/fnd/*.cpp zt/fnd/osdep/*.cpp)
vlt_floor(ztcore LINKS ztfnd ztini ztposix
  GLOBS ztcom/ztcore/*.cpp source/Common/ZtUtils/COM/*.cpp source/Common/ZtUtils/General/*.cpp)
vlt_floor(vlcore LINKS ztcore ztfnd ztini ztposix
  GLOBS source/*.cpp source/Common/*.cpp source/Common/Posix/*.cpp source/Pharlap/*.cpp
        source/Posix/*.cpp source/Utilities/*.cpp vlloader/source/*.cpp)

# Everything, for tests of the inside. A process never links this and the shared library both.
add_library(vltutils_static INTERFACE)
foreach(floor vlcore ztcore ztfnd ztini ztposix)
  if(TARGET ${floor})
    target_link_libraries(vltutils_static INTERFACE ${floor})
  endif()
endforeach()
