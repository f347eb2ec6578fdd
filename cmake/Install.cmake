# What an installation holds: the library, the headers of its surface, the two package files that
# foreign builds find it by, the command, its manual.
include(CMakePackageConfigHelpers)

set(packages ${CMAKE_INSTALL_LIBDIR}/cmake/vltutils)
install(TARGETS vltutils vlt_snapshot EXPORT vltutilsTargets
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR})
install(EXPORT vltutilsTargets NAMESPACE vltutils:: DESTINATION ${packages})
install(DIRECTORY ${PROJECT_BINARY_DIR}/include/vltutils DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})

write_basic_package_version_file(${PROJECT_BINARY_DIR}/vltutilsConfigVersion.cmake
  COMPATIBILITY SameMajorVersion)
file(WRITE ${PROJECT_BINARY_DIR}/vltutilsConfig.cmake
  "include(CMakeFindDependencyMacro)\nfind_dependency(Threads)\n"
  "include(\"\${CMAKE_CURRENT_LIST_DIR}/vltutilsTargets.cmake\")\n")
install(FILES ${PROJECT_BINARY_DIR}/vltutilsConfig.cmake
  ${PROJECT_BINARY_DIR}/vltutilsConfigVersion.cmake DESTINATION ${packages})

# Relative to the file itself, so that a moved installation still works.
file(RELATIVE_PATH up /${CMAKE_INSTALL_LIBDIR}/pkgconfig /)
file(WRITE ${PROJECT_BINARY_DIR}/vltutils.pc
"prefix=\${pcfiledir}/${up}
libdir=\${prefix}/${CMAKE_INSTALL_LIBDIR}
includedir=\${prefix}/${CMAKE_INSTALL_INCLUDEDIR}

Name: vltutils
Description: Client-side support of a configuration storage service
Version: ${PROJECT_VERSION}
Libs: -L\${libdir} -lvltutils
Cflags: -I\${includedir}
")
install(FILES ${PROJECT_BINARY_DIR}/vltutils.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

# vltctl becomes vltctl-client for what needs the library, and looks for it here.
if(TARGET vltctl)
  set(client_directory ${CMAKE_INSTALL_PREFIX}/libexec/vltutils)
  file(RELATIVE_PATH library ${client_directory} ${CMAKE_INSTALL_PREFIX}/${CMAKE_INSTALL_LIBDIR})
  set_target_properties(vltctl-client PROPERTIES INSTALL_RPATH "$ORIGIN/${library}")
  install(TARGETS vltctl RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
  install(TARGETS vltctl-client RUNTIME DESTINATION libexec/vltutils)
  install(FILES ${PROJECT_SOURCE_DIR}/tools/vltctl-1.schema.json
    DESTINATION ${CMAKE_INSTALL_DATADIR}/vltutils)
  set(completions ${PROJECT_BINARY_DIR}/completion)
  install(FILES ${completions}/vltctl
    DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions)
  install(FILES ${completions}/_vltctl DESTINATION ${CMAKE_INSTALL_DATADIR}/zsh/site-functions)
  install(FILES ${completions}/vltctl.fish
    DESTINATION ${CMAKE_INSTALL_DATADIR}/fish/vendor_completions.d)
endif()
foreach(section 1 3 5 7)
  file(GLOB manuals ${PROJECT_SOURCE_DIR}/man/*.${section})
  install(FILES ${manuals} DESTINATION ${CMAKE_INSTALL_MANDIR}/man${section})
endforeach()
