# libvltutils.so: all floors in one library that shows the names of cmake/exports.map and no other.
set(exports ${CMAKE_SOURCE_DIR}/cmake/exports.map)
file(GLOB startup CONFIGURE_DEPENDS source/Utilities/startup.cpp)
add_library(vltutils SHARED ${startup})
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
target_link_options(vltutils PRIVATE -Wl,--version-script=${exports} -Wl,-z,nodelete
  -Wl,-z,relro -Wl,-z,now -Wl,--gc-sections)
if(NOT VLT_SANITIZE)
  target_link_options(vltutils PRIVATE -Wl,-z,defs)
endif()
target_include_directories(vltutils INTERFACE
  $<BUILD_INTERFACE:${CMAKE_SOURCE_DIR}> $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}/vltutils>)
