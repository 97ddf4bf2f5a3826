# Everything from here on is built with the flags of hardening.flags; scripts/dependencies builds the libraries with the same ones.
file(READ ${CMAKE_CURRENT_LIST_DIR}/hardening.flags hardening)
separate_arguments(hardening UNIX_COMMAND "${hardening}")
set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${CMAKE_CURRENT_LIST_DIR}/hardening.flags)
add_compile_options("$<$<COMPILE_LANGUAGE:C,CXX>:${hardening}>")
add_link_options(-Wl,--dynamicbase,--nxcompat)

# The guard and the failure are ours; the checked memcpy and its like come from the compiler's archive, behind every other library.
add_library(tavi_hardening STATIC ${CMAKE_CURRENT_LIST_DIR}/hardening_runtime.c)
link_libraries(tavi_hardening)
string(APPEND CMAKE_CXX_STANDARD_LIBRARIES " -l:libssp.a")
