# A manual page documents every function in its NAME section. For each of them a page of its name
# is made that includes (.so) the documented one, so that "man FUNCTION" finds it.
#
#   zelo_man_links(PAGE DIRECTORY): writes the links of PAGE into DIRECTORY
function(zelo_man_links page directory)
  cmake_path(GET page FILENAME file)
  cmake_path(GET page EXTENSION LAST_ONLY section)
  string(SUBSTRING "${section}" 1 -1 section)
  file(READ ${page} text)
  string(REGEX MATCH "\n\\.SH NAME\n[^\\]*" names "${text}")
  string(REGEX MATCHALL "[A-Za-z_]+" names "${names}")
  foreach(name IN LISTS names)
    if(name MATCHES "^(ZELO|zelo)" AND NOT "${name}.${section}" STREQUAL file)
      file(WRITE ${directory}/${name}.${section} ".so man${section}/${file}\n")
    endif()
  endforeach()
endfunction()
