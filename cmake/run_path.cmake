# zelo_run_from_build_tree(TARGET DESTINATION): TARGET, which is installed into DESTINATION, finds the
# libraries of the build tree as long as it is there, and has no run path once it is installed.
#
# CMake's own way to this leaves an empty element at the end of the run path in the build tree, as
# room for the one of the installed file. The loader reads it as the current directory, so that
# whoever owns that directory could have a root who tries the build tree load a library of his.
function(zelo_run_from_build_tree target destination)
  # The second is where a platform of somebody else's is (platform.cmake).
  set(directories ${CMAKE_LIBRARY_OUTPUT_DIRECTORY} ${zelo_platform_directories})
  set_target_properties(${target} PROPERTIES
    BUILD_WITH_INSTALL_RPATH ON
    INSTALL_RPATH "${directories}")
  if(NOT IS_ABSOLUTE ${destination})
    set(destination "\${CMAKE_INSTALL_PREFIX}/${destination}")
  endif()
  install(CODE "file(RPATH_REMOVE FILE \"\$ENV{DESTDIR}${destination}/$<TARGET_FILE_NAME:${target}>\")")
endfunction()
