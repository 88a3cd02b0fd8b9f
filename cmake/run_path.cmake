# zelo_run_from_build_tree(TARGET DESTINATION): TARGET has a run path to the libraries of the build
# tree, which installing it into DESTINATION removes.
#
# CMake's default reserves room for the installed file's run path by an empty element at the end of
# the build tree's. The loader takes that for the current directory: when root runs a program of
# the build tree, the owner of that directory could have it load a library of his.
function(zelo_run_from_build_tree target destination)
  # The second is set by platform.cmake.
  set(directories ${CMAKE_LIBRARY_OUTPUT_DIRECTORY} ${zelo_platform_directories})
  set_target_properties(${target} PROPERTIES
    BUILD_WITH_INSTALL_RPATH ON
    INSTALL_RPATH "${directories}")
  if(NOT IS_ABSOLUTE ${destination})
    set(destination "\${CMAKE_INSTALL_PREFIX}/${destination}")
  endif()
  install(CODE "file(RPATH_REMOVE FILE \"\$ENV{DESTDIR}${destination}/$<TARGET_FILE_NAME:${target}>\")")
endfunction()
