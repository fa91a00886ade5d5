# Run while files are installed: what of them depends on the prefix. `cmake --install --prefix` and cpack choose that anew,
# so nothing of it is known when the build is configured.
cmake_minimum_required(VERSION 3.25)
cmake_path(ABSOLUTE_PATH CMAKE_INSTALL_PREFIX NORMALIZE OUTPUT_VARIABLE prefix)

# tonewerk_place(DESTINATION file...): as install(FILES) does, below the prefix, with the real prefix in the files where they
# say @prefix@, or /usr/bin of our programs.
function(tonewerk_place destination)
  cmake_path(ABSOLUTE_PATH destination BASE_DIRECTORY ${prefix} OUTPUT_VARIABLE directory)
  # The configuration of what is below /usr is the system's; any other prefix keeps everything to itself.
  if(prefix STREQUAL "/usr" AND destination MATCHES "^etc/")
    set(directory /${destination})
  endif()
  cmake_path(ABSOLUTE_PATH CMAKE_INSTALL_BINDIR BASE_DIRECTORY ${prefix} OUTPUT_VARIABLE programs)

  file(INSTALL DESTINATION ${directory} TYPE FILE FILES ${ARGN})
  foreach(file IN LISTS ARGN)
    cmake_path(GET file FILENAME name)
    file(READ ${file} text)
    string(REGEX REPLACE "/usr/bin/(twreportingd|tw-)" "${programs}/\\1" text "${text}")
    string(REPLACE "@prefix@" "${prefix}" text "${text}")
    file(WRITE $ENV{DESTDIR}${directory}/${name} "${text}")
  endforeach()
endfunction()

# tonewerk_leave_to_the_system(program...): below /usr, where the system finds libraries by itself, no program says where they are.
function(tonewerk_leave_to_the_system)
  if(prefix STREQUAL "/usr")
    foreach(program IN LISTS ARGN)
      file(RPATH_REMOVE FILE $ENV{DESTDIR}${prefix}/${program})
    endforeach()
  endif()
endfunction()
