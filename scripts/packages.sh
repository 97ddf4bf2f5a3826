# What the scripts install, by use; sourced, never run.
packages_build=(dpkg-dev git make cmake ninja-build ccache g++ tcl googletest librsvg2-bin icoutils)
packages_wine=(wine wine32:i386)
for arch in "${arches[@]}"; do
    packages_build+=("g++-mingw-w64-${arch/_/-}-posix")
    # 64-bit prefixes run programs of both word sizes.
    [ "$arch" = i686 ] || packages_wine+=(wine64)
done
packages_setup=(nsis librsvg2-bin icoutils imagemagick)
packages_screen=(xvfb imagemagick xdotool fonts-dejavu-core fonts-liberation fonts-wine)
packages_native=(clang libclang-rt-14-dev libwxgtk3.2-dev libsqlite3-dev zlib1g-dev)
packages_lint=(clang-format clang-tidy gettext python3)
packages_endure=(sqlite3)
