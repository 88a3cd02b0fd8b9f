# A platform that is not ours (docs/porting.md): libzelocore.so and libzelosdk.so below
# ZELO_PLATFORM. A header that is not there is taken from ours.
if(ZELO_TESTS OR ZELO_BENCH)
  message(FATAL_ERROR "the tests are of our platform: set ZELO_TESTS and ZELO_BENCH to OFF")
endif()

# zelo_platform_library(NAME)
function(zelo_platform_library name)
  find_library(${name}_library ${name} PATHS ${ZELO_PLATFORM}/lib ${ZELO_PLATFORM}/lib/${CMAKE_LIBRARY_ARCHITECTURE}
    REQUIRED NO_DEFAULT_PATH NO_CMAKE_FIND_ROOT_PATH)
  find_path(${name}_headers ${name}.h
    PATHS ${ZELO_PLATFORM}/include ${PROJECT_SOURCE_DIR}/platform/lib${name}/include
    REQUIRED NO_DEFAULT_PATH NO_CMAKE_FIND_ROOT_PATH)
  # With -l, as the linker would record the path of a library that has no SONAME.
  add_library(${name} INTERFACE)
  target_include_directories(${name} INTERFACE $<BUILD_INTERFACE:${${name}_headers}>
    $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}>)
  get_filename_component(directory ${${name}_library} DIRECTORY)
  target_link_directories(${name} INTERFACE $<BUILD_INTERFACE:${directory}>)
  target_link_options(${name} INTERFACE $<BUILD_INTERFACE:-Wl,-rpath-link,${directory}>)
  target_link_libraries(${name} INTERFACE -l${name})
  list(APPEND zelo_platform_directories ${directory})
  list(REMOVE_DUPLICATES zelo_platform_directories)
  set(zelo_platform_directories ${zelo_platform_directories} PARENT_SCOPE)
  install(TARGETS ${name} EXPORT zeloscheduler-targets)
endfunction()
zelo_platform_library(zelocore)
zelo_platform_library(zelosdk)
