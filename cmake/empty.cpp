// A library needs a source of its own; see Floors.cmake.
