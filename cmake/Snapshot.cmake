# The snapshot reader, whole: one archive of its floor and the ones below, for programs that do without
# the library.
set(objects "")
foreach(floor vltsnapshot vltcommon ztcore ztini ztfnd ztposix)
  list(APPEND objects $<TARGET_OBJECTS:${floor}>)
endforeach()
add_library(vlt_snapshot STATIC cmake/empty.cpp ${objects})
add_library(vltutils::snapshot ALIAS vlt_snapshot)
set_target_properties(vlt_snapshot PROPERTIES OUTPUT_NAME vltsnapshot EXPORT_NAME snapshot
  ARCHIVE_OUTPUT_DIRECTORY ${PROJECT_BINARY_DIR}/package)
target_link_libraries(vlt_snapshot INTERFACE Threads::Threads ${CMAKE_DL_LIBS})
vlt_surface(vlt_snapshot)
