# Makes libtwreporting.so.0 and libtwreporting.a of tonewerk_reporting_objects.
set(twreporting_map ${CMAKE_CURRENT_LIST_DIR}/libtwreporting.map)
add_library(twreporting SHARED $<TARGET_OBJECTS:tonewerk_reporting_objects>)
set_target_properties(twreporting PROPERTIES
  VERSION ${PROJECT_VERSION} SOVERSION 0 LINKER_LANGUAGE CXX LINK_DEPENDS ${twreporting_map})
target_include_directories(twreporting INTERFACE ${PROJECT_SOURCE_DIR}/include)
target_link_libraries(twreporting PRIVATE Threads::Threads)
target_link_options(twreporting PRIVATE
  -Wl,--version-script=${twreporting_map} -Wl,-z,now -Wl,-Bsymbolic)
# A sanitizer's symbols are only in the program.
if(NOT TONEWERK_SANITIZE)
  target_link_options(twreporting PRIVATE -Wl,-z,defs)
endif()

# The archive has one object, so that its names can be local, as in the shared library. Section groups that
# other objects of a program may also contain (inlined functions) become plain sections first. Otherwise the
# linker could discard ours for another object's, which the local names cannot refer to.
# Only GNU ld has that option, and CMake may choose another linker for clang.
find_program(TWREPORTING_LD NAMES ld.bfd ld REQUIRED)
set(twreporting_archive ${CMAKE_CURRENT_BINARY_DIR}/libtwreporting.a)
set(twreporting_object ${CMAKE_CURRENT_BINARY_DIR}/twreporting.o)
add_custom_command(
  OUTPUT ${twreporting_archive}
  COMMAND ${TWREPORTING_LD} -r --force-group-allocation -o ${twreporting_object}
    $<TARGET_OBJECTS:tonewerk_reporting_objects>
  COMMAND ${CMAKE_OBJCOPY} --wildcard --keep-global-symbol=twr_* ${twreporting_object}
  COMMAND ${CMAKE_COMMAND} -E rm -f ${twreporting_archive}
  COMMAND ${CMAKE_AR} rcs ${twreporting_archive} ${twreporting_object}
  DEPENDS tonewerk_reporting_objects $<TARGET_OBJECTS:tonewerk_reporting_objects>
  COMMENT "Linking CXX static library libtwreporting.a"
  COMMAND_EXPAND_LISTS VERBATIM)
add_custom_target(twreporting_archive DEPENDS ${twreporting_archive})
add_library(twreporting_static STATIC IMPORTED GLOBAL)
set_target_properties(twreporting_static PROPERTIES
  IMPORTED_LOCATION ${twreporting_archive}
  IMPORTED_LINK_INTERFACE_LANGUAGES CXX
  INTERFACE_INCLUDE_DIRECTORIES ${PROJECT_SOURCE_DIR}/include
  INTERFACE_LINK_LIBRARIES Threads::Threads)
add_dependencies(twreporting_static twreporting_archive)
