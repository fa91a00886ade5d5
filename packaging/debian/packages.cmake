# Debian packages, one for each component: `cpack -G DEB` in a build directory whose prefix is /usr. scripts/package does all
# steps.
set(CPACK_GENERATOR DEB)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_COMPONENTS_ALL daemon tools development library python)

set(CPACK_PACKAGE_NAME tonewerk-reporting)
set(CPACK_PACKAGE_VERSION ${PROJECT_VERSION})
set(CPACK_DEBIAN_PACKAGE_RELEASE 1)
set(CPACK_PACKAGE_CONTACT "Tonewerk maintainers <maintainers@tonewerk.example>")
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_STRIP_FILES ON)
set(CPACK_INSTALL_DEFAULT_DIRECTORY_PERMISSIONS
  OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE WORLD_READ WORLD_EXECUTE)
set(CPACK_PRE_BUILD_SCRIPTS ${CMAKE_CURRENT_LIST_DIR}/finish.cmake)

set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SOURCE tonewerk-reporting)
set(CPACK_DEBIAN_PACKAGE_HOMEPAGE https://tonewerk.example/reporting)
set(CPACK_DEBIAN_PACKAGE_PRIORITY optional)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS_POLICY ">=")
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
set(same_version "(= ${PROJECT_VERSION}-${CPACK_DEBIAN_PACKAGE_RELEASE})")

set(CPACK_DEBIAN_DAEMON_PACKAGE_NAME tonewerk-reporting-daemon)
set(CPACK_DEBIAN_DAEMON_PACKAGE_SECTION sound)
set(CPACK_COMPONENT_DAEMON_DESCRIPTION "reporting daemon of an audio framework
Audio processes connect to the daemon, say what their audio is doing (playing,
volume, route, overloads, haptics), and go on with their work. It turns that
into reports to query, plot, keep on the device or forward: analytics events,
summaries, metric records, power-log events and JSON files.

It touches no audio, and sends nothing anywhere unless it is told to.")
# libcurl is loaded at run time, so that the package builder does not find it. twctl checks addresses with it.
set(curl_package "libcurl4 (>= 7.85)")
set(CPACK_DEBIAN_DAEMON_PACKAGE_DEPENDS
  "${curl_package}, systemd | systemd-standalone-sysusers | systemd-sysusers, systemd | systemd-standalone-tmpfiles | systemd-tmpfiles")
set(CPACK_DEBIAN_DAEMON_PACKAGE_RECOMMENDS "tonewerk-reporting-tools")
set(CPACK_DEBIAN_DAEMON_PACKAGE_SUGGESTS "apparmor, dbus, lttng-tools, pipewire-bin, procps")
set(CPACK_DEBIAN_DAEMON_PACKAGE_CONTROL_EXTRA
  ${CMAKE_CURRENT_LIST_DIR}/daemon/postinst ${CMAKE_CURRENT_LIST_DIR}/daemon/prerm ${CMAKE_CURRENT_LIST_DIR}/daemon/postrm
  ${CMAKE_CURRENT_BINARY_DIR}/conffiles ${CMAKE_CURRENT_BINARY_DIR}/triggers)

# Configuration files: dpkg keeps them when the user has changed them.
file(GLOB preferences CONFIGURE_DEPENDS RELATIVE ${CMAKE_CURRENT_SOURCE_DIR} ${CMAKE_CURRENT_SOURCE_DIR}/etc/preferences/*)
set(conffiles "/etc/apparmor.d/usr.bin.twreportingd\n/etc/tonewerk/device-facts.toml\n")
foreach(file IN LISTS preferences)
  string(REGEX REPLACE "^etc/" "/etc/tonewerk/" file ${file})
  string(APPEND conffiles "${file}\n")
endforeach()
file(CONFIGURE OUTPUT ${CMAKE_CURRENT_BINARY_DIR}/conffiles CONTENT "${conffiles}" @ONLY)
# For both libraries: the client library, and the one that programs with signposts load.
file(CONFIGURE OUTPUT ${CMAKE_CURRENT_BINARY_DIR}/triggers CONTENT "activate-noawait ldconfig\n" @ONLY)

set(CPACK_DEBIAN_LIBRARY_PACKAGE_NAME libtwreporting0)
set(CPACK_DEBIAN_LIBRARY_PACKAGE_SECTION libs)
set(CPACK_COMPONENT_LIBRARY_DESCRIPTION "reports from audio programs, client library
Programs describe with it what their audio is doing, from real-time threads,
too, to the reporting daemon. Without a daemon it does nothing, cheaply.")
set(CPACK_DEBIAN_LIBRARY_PACKAGE_CONTROL_EXTRA ${CMAKE_CURRENT_BINARY_DIR}/triggers)
set(CPACK_DEBIAN_LIBRARY_PACKAGE_SUGGESTS "tonewerk-reporting-daemon")

set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_NAME libtwreporting-dev)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_SECTION libdevel)
set(CPACK_COMPONENT_DEVELOPMENT_DESCRIPTION "reports from audio programs, development files
The headers of the reporting daemon's client library, in C and C++, what is
needed to link it, and the header that marks intervals for performance traces.")
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_DEPENDS "libtwreporting0 ${same_version}")
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_SUGGESTS "tonewerk-reporting-daemon")

set(CPACK_DEBIAN_TOOLS_PACKAGE_NAME tonewerk-reporting-tools)
set(CPACK_DEBIAN_TOOLS_PACKAGE_SECTION sound)
set(CPACK_COMPONENT_TOOLS_DESCRIPTION "tools for the reporting daemon of an audio framework
twctl queries what the reporting daemon has recorded, talks to it as its
clients do, and replays recordings. tw-pipewire reports what a PipeWire graph
plays.")
# The library is built here, so no installed package provides it yet.
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS ${PROJECT_BINARY_DIR}/src)
set(CPACK_DEBIAN_TOOLS_PACKAGE_DEPENDS "libtwreporting0 ${same_version}, ${curl_package}")
set(CPACK_DEBIAN_TOOLS_PACKAGE_RECOMMENDS "tonewerk-reporting-daemon")
set(CPACK_DEBIAN_TOOLS_PACKAGE_SUGGESTS "less")

set(CPACK_DEBIAN_PYTHON_PACKAGE_NAME python3-tonewerk-reporting)
set(CPACK_DEBIAN_PYTHON_PACKAGE_SECTION python)
set(CPACK_DEBIAN_PYTHON_PACKAGE_ARCHITECTURE all)
set(CPACK_DEBIAN_PYTHON_PACKAGE_SHLIBDEPS OFF)
set(CPACK_COMPONENT_PYTHON_DESCRIPTION "reports from audio programs, Python module
Python programs describe with it what their audio is doing to the reporting
daemon, without waiting for it. Without a daemon it does nothing, cheaply.")
set(CPACK_DEBIAN_PYTHON_PACKAGE_DEPENDS "python3 (>= 3.9), python3-msgpack")
set(CPACK_DEBIAN_PYTHON_PACKAGE_SUGGESTS "tonewerk-reporting-daemon")
set(CPACK_DEBIAN_PYTHON_PACKAGE_CONTROL_EXTRA
  ${CMAKE_CURRENT_LIST_DIR}/python/postinst ${CMAKE_CURRENT_LIST_DIR}/python/prerm)

include(CPack)
