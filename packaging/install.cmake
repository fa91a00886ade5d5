# Runs while files are installed, for the files that depend on the prefix. `cmake --install --prefix` and cpack choose the prefix
# then, so it is not known when the build is configured.
cmake_minimum_required(VERSION 3.25)
cmake_path(ABSOLUTE_PATH CMAKE_INSTALL_PREFIX NORMALIZE OUTPUT_VARIABLE prefix)

# tonewerk_place(DESTINATION file...): installs files below the prefix, like install(FILES). In the files it replaces @prefix@,
# and /usr/bin of the project's programs, by the real paths.
function(tonewerk_place destination)
  cmake_path(ABSOLUTE_PATH destination BASE_DIRECTORY ${prefix} OUTPUT_VARIABLE directory)
  # With the prefix /usr, configuration goes to /etc. With any other prefix, all files stay below the prefix.
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

# tonewerk_leave_to_the_system(program...): removes the run path of the programs below /usr, where the system finds the libraries.
function(tonewerk_leave_to_the_system)
  if(prefix STREQUAL "/usr")
    foreach(program IN LISTS ARGN)
      file(RPATH_REMOVE FILE $ENV{DESTDIR}${prefix}/${program})
    endforeach()
  endif()
endfunction()
