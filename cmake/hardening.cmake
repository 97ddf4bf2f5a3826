# Everything after this include is built with the flags of hardening.flags; scripts/dependencies builds the libraries with the same.
file(READ ${CMAKE_CURRENT_LIST_DIR}/hardening.flags hardening)
separate_arguments(hardening UNIX_COMMAND "${hardening}")
set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${CMAKE_CURRENT_LIST_DIR}/hardening.flags)
add_compile_options("$<$<COMPILE_LANGUAGE:C,CXX>:${hardening}>")
add_link_options(-Wl,--dynamicbase,--nxcompat)

# The guard and the failure handler are the product's own. The checked memcpy and its like come from the compiler's archive, which
# must follow every other library.
add_library(tavi_stack_protector STATIC ${CMAKE_SOURCE_DIR}/src/core/StackProtector.c)
link_libraries(tavi_stack_protector)
string(APPEND CMAKE_CXX_STANDARD_LIBRARIES " -l:libssp.a")
