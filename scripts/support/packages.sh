# Sourced by the scripts that test the packages of build/packages in a separate Debian.

# Prints the suite of this machine, for which the packages were built.
suite() { (. /etc/os-release && echo "$VERSION_CODENAME"); }

# Prints the package mirror of this machine.
mirror() {
  apt-get indextargets --format '$(REPO_URI)' 'Created-By: Packages' "Codename: $(suite)" 'Component: main' | head -1
}

# names_of FILE...: prints the names of the packages in one line.
names_of() {
  local file
  for file in "$@"; do dpkg-deb --field "$file" Package; done | paste -sd' '
}

# dependencies_of FILE...: prints the dependencies of the packages, without the packages themselves. Takes the first of
# alternatives.
dependencies_of() {
  local file
  for file in "$@"; do dpkg-deb --field "$file" Pre-Depends Depends | sed 's/^[A-Za-z-]*: //' | tr ',' '\n'; done |
    sed 's/|.*//; s/(.*//; s/ //g; /^$/d' | grep -vxF "$(names_of "$@" | tr ' ' '\n')" | sort -u | paste -sd,
}

# build_examples SYSROOT DIRECTORY: builds the example programs with the commands in their own comments. Only the packages
# of the library are available, unpacked to SYSROOT. The programs go to DIRECTORY. Stops at the first command that fails.
build_examples() {
  local sysroot=$1 directory=$2 file program command
  mkdir -p "$sysroot"
  for file in build/packages/libtwreporting*.deb; do dpkg-deb --extract "$file" "$sysroot"; done
  for program in report.c report.cpp player.c player.cpp; do
    command=$(sed -n 's|.*: \(c[c+]* [a-z]*\.c.*-pthread\).*|\1|p' examples/$program)
    (
      cd examples
      export PKG_CONFIG_SYSROOT_DIR=$sysroot PKG_CONFIG_ALLOW_SYSTEM_CFLAGS=1 PKG_CONFIG_ALLOW_SYSTEM_LIBS=1
      PKG_CONFIG_LIBDIR=$(echo "$sysroot"/usr/lib/*/pkgconfig)
      export PKG_CONFIG_LIBDIR
      set -f
      eval "$command -o '$directory/$program.out'"
    ) || { echo "examples/$program cannot be built by: $command"; return 1; }
  done
}
