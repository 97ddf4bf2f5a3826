add_library(tavi_warnings INTERFACE)
target_compile_options(tavi_warnings INTERFACE
    -Wall -Wextra -Wpedantic -Werror -Wshadow -Wconversion -Wsign-conversion -Wnon-virtual-dtor -Woverloaded-virtual
    -Wold-style-cast -Wimplicit-fallthrough -Wformat=2 -Wundef -Wunused)
# COM and window callbacks cast between function types by design, and their interfaces have no virtual destructor.
target_compile_options(tavi_warnings INTERFACE -Wno-cast-function-type -Wno-non-virtual-dtor -Wno-unknown-pragmas)
