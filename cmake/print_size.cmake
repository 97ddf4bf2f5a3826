file(SIZE "${FILE}" bytes)
math(EXPR kib "(${bytes} + 512) / 1024")
cmake_path(GET FILE FILENAME name)
message("${name}: ${bytes} bytes (${kib} KiB)")
