# libvltutils.so: all floors in one library that shows the names of cmake/exports.map and no other.
set(exports ${PROJECT_SOURCE_DIR}/cmake/exports.map)
file(GLOB startup CONFIGURE_DEPENDS source/Utilities/startup.cpp)
add_library(vltutils SHARED ${startup})
add_library(vltutils::vltutils ALIAS vltutils)
set_target_properties(vltutils PROPERTIES
  LINKER_LANGUAGE CXX VERSION ${PROJECT_VERSION} SOVERSION ${PROJECT_VERSION_MAJOR}
  LINK_DEPENDS ${exports})
# The snapshot reader is for programs that do without the library.
set(shared ${VLT_FLOORS})
list(REMOVE_ITEM shared vltsnapshot)
target_link_libraries(vltutils PRIVATE vlt_strict ${shared})
# Whole, also where one floor brings another: what nobody refers to is the surface itself.
list(JOIN shared "," floors)
set_property(TARGET vltutils PROPERTY LINK_LIBRARY_OVERRIDE "WHOLE_ARCHIVE,${floors}")
target_link_options(vltutils PRIVATE ${VLT_LINK_SHARED})
if(NOT VLT_SANITIZE)
  target_link_options(vltutils PRIVATE ${VLT_LINK_CLOSED})
endif()

# The surface as clients see it: one flat directory, <vltutils/...>, whose headers name each other so. In
# the tree they keep their places, and name each other by them.
set(surface
  source/Common/ZtUtils/General/vlt_vlTracer.h
  source/Utilities/vltutils.h source/Common/vltInterfaces.h source/Common/vltTypes.h
  zt/fnd/Exception.h zt/fnd/GuidType.h zt/fnd/StringFwd.h zt/fnd/osdep/OSException.h
  ztcom/ztcore/ztunknown.h client/vltutils.hpp client/results.hpp source/Snapshot/snapshot.hpp)
foreach(header ${surface})
  file(READ ${PROJECT_SOURCE_DIR}/${header} text)
  foreach(other ${surface})
    get_filename_component(name ${other} NAME)
    string(REPLACE "#include \"${other}\"" "#include <vltutils/${name}>" text "${text}")
    string(REPLACE "(${other})" "(vltutils/${name})" text "${text}")
  endforeach()
  get_filename_component(name ${header} NAME)
  file(CONFIGURE OUTPUT ${PROJECT_BINARY_DIR}/include/vltutils/${name} CONTENT "${text}" @ONLY)
  set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/${header})
endforeach()
# vlt_surface(target): clients of the target find these headers, which need C++17.
function(vlt_surface target)
  target_include_directories(${target} INTERFACE
    $<BUILD_INTERFACE:${PROJECT_BINARY_DIR}/include> $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}>)
  target_compile_features(${target} INTERFACE cxx_std_17)
endfunction()
vlt_surface(vltutils)
