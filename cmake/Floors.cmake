# One static library a floor, as cmake/floors.txt lists them; a floor links the ones below it and
# nothing else. Sets VLT_FLOORS: the libraries, highest first, as the linker wants them.
find_package(Threads REQUIRED)

file(STRINGS cmake/floors.txt lines REGEX "^[0-9]")
set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS cmake/floors.txt)
set(VLT_FLOORS "")
set(assigned "")
foreach(line ${lines})
  string(REGEX MATCHALL "[^ ]+" words "${line}")
  list(POP_FRONT words number name)
  list(TRANSFORM words APPEND ".cpp")
  file(GLOB sources CONFIGURE_DEPENDS ${words})
  list(FILTER sources EXCLUDE REGEX "${VLT_FOREIGN_SOURCES}")
  list(FILTER sources EXCLUDE REGEX "/startup\\.cpp$")
  list(REMOVE_ITEM sources "" ${assigned})
  list(APPEND assigned ${sources})
  set(${name}_TESTS ${sources})
  list(FILTER sources EXCLUDE REGEX "_test\\.cpp$")
  list(FILTER ${name}_TESTS INCLUDE REGEX "_test\\.cpp$")

  add_library(${name} STATIC ${sources})
  target_link_libraries(${name} PRIVATE vlt_strict PUBLIC Threads::Threads ${CMAKE_DL_LIBS})
  foreach(lower ${VLT_FLOORS})
    if(VLT_FLOOR_${lower} LESS number)
      target_link_libraries(${name} PUBLIC ${lower})
    endif()
  endforeach()
  set(VLT_FLOOR_${name} ${number})
  list(PREPEND VLT_FLOORS ${name})
endforeach()

# Each floor whole, with the floors below it and nothing undefined: one that uses a higher floor does
# not link. Built by ./dev house.
add_custom_target(floors_closed)
foreach(name ${VLT_FLOORS})
  add_library(${name}_closed SHARED EXCLUDE_FROM_ALL cmake/empty.cpp)
  set_target_properties(${name}_closed PROPERTIES LINKER_LANGUAGE CXX
    LIBRARY_OUTPUT_DIRECTORY ${PROJECT_BINARY_DIR}/closed)
  target_link_libraries(${name}_closed PRIVATE ${name})
  set_property(TARGET ${name}_closed PROPERTY LINK_LIBRARY_OVERRIDE "WHOLE_ARCHIVE,${name}")
  target_link_options(${name}_closed PRIVATE ${VLT_LINK_CLOSED})
  add_dependencies(floors_closed ${name}_closed)
endforeach()
