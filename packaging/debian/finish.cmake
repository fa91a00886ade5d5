# Adds what Debian requires in a package: its documents, compressed manuals, and no sections that only compilers and debuggers
# read. cpack runs this on the trees of all components before it packs them.
foreach(component IN LISTS CPACK_COMPONENTS_ALL)
  string(TOUPPER ${component} name)
  set(tree ${CPACK_TEMPORARY_DIRECTORY}/${component})
  set(documents ${tree}/usr/share/doc/${CPACK_DEBIAN_${name}_PACKAGE_NAME})
  file(MAKE_DIRECTORY ${documents})
  file(COPY ${CMAKE_CURRENT_LIST_DIR}/copyright DESTINATION ${documents})
  file(COPY_FILE ${CMAKE_CURRENT_LIST_DIR}/changelog ${documents}/changelog.Debian)

  file(GLOB_RECURSE pages ${tree}/usr/share/man/*.[1-8])
  execute_process(COMMAND gzip --best --no-name ${documents}/changelog.Debian ${pages} COMMAND_ERROR_IS_FATAL ANY)

  set(overrides ${CMAKE_CURRENT_LIST_DIR}/${component}/lintian-overrides)
  if(EXISTS ${overrides})
    file(MAKE_DIRECTORY ${tree}/usr/share/lintian/overrides)
    file(COPY_FILE ${overrides} ${tree}/usr/share/lintian/overrides/${CPACK_DEBIAN_${name}_PACKAGE_NAME})
  endif()

  file(GLOB_RECURSE binaries ${tree}/usr/bin/* ${tree}/usr/lib/*.so.*)
  foreach(binary IN LISTS binaries)
    if(NOT IS_SYMLINK ${binary})
      execute_process(COMMAND strip --remove-section=.comment --remove-section=.note ${binary} COMMAND_ERROR_IS_FATAL ANY)
    endif()
  endforeach()
  file(GLOB_RECURSE archives ${tree}/usr/lib/*.a)
  if(archives)
    execute_process(
      COMMAND strip --strip-debug --remove-section=.comment --remove-section=.note --enable-deterministic-archives ${archives}
      COMMAND_ERROR_IS_FATAL ANY)
  endif()

  # Does not depend on the umask.
  execute_process(COMMAND chmod -R u=rwX,go=rX ${tree} COMMAND_ERROR_IS_FATAL ANY)
endforeach()
