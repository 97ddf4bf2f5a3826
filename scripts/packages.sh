# What the scripts install, by use; sourced, never run.
packages_build=(dpkg-dev git make cmake ninja-build ccache g++ tcl googletest librsvg2-bin icoutils)
packages_wine=(wine wine32:i386)
[[ ${arches[*]} != *i686* ]] || packages_build+=(g++-mingw-w64-i686-posix)
# A 64-bit prefix runs programs of both word sizes.
[[ ${arches[*]} != *x86_64* ]] || packages_build+=(g++-mingw-w64-x86-64-posix) packages_wine+=(wine64)
packages_setup=(nsis librsvg2-bin icoutils imagemagick)
packages_screen=(xvfb imagemagick xdotool fonts-dejavu-core fonts-liberation fonts-wine)
packages_native=(clang libclang-rt-14-dev libwxgtk3.2-dev libsqlite3-dev zlib1g-dev)
packages_lint=(clang-format clang-tidy gettext python3)
packages_endure=(sqlite3)
