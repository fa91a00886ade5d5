# The options with which the distribution builds its own programs, as printed by
# `DEB_BUILD_MAINT_OPTIONS=hardening=+all dpkg-buildflags`, for every target: an overrun or a wrong index ends the process where
# it happens. Control-flow protection and the library's assertions are added. `scripts/check-hardening` compares these options
# with the distribution's, and checks the binaries.
include(CheckPIESupported)
check_pie_supported(LANGUAGES C CXX)
set(CMAKE_POSITION_INDEPENDENT_CODE ON)
# Code that is linked only into programs: no other library can replace its symbols, so calls need no indirection.
add_compile_options($<$<STREQUAL:$<TARGET_PROPERTY:TYPE>,STATIC_LIBRARY>:-fPIE>)

add_compile_options(-fstack-protector-strong -Wformat -Werror=format-security)
# The C library refuses this option without optimisation. A level that a package sets is kept.
if(NOT "${CMAKE_C_FLAGS} ${CMAKE_CXX_FLAGS}" MATCHES "_FORTIFY_SOURCE")
  add_compile_options($<$<CONFIG:Release,RelWithDebInfo,MinSizeRel>:-D_FORTIFY_SOURCE=2>)
endif()
add_compile_definitions($<$<COMPILE_LANGUAGE:CXX>:_GLIBCXX_ASSERTIONS>)
if(CMAKE_SYSTEM_PROCESSOR MATCHES "^(x86_64|amd64|AMD64)$")
  add_compile_options(-fcf-protection)
elseif(CMAKE_SYSTEM_PROCESSOR MATCHES "^(aarch64|arm64)$")
  add_compile_options(-mbranch-protection=standard)
endif()
add_link_options(-Wl,-z,relro -Wl,-z,now)
