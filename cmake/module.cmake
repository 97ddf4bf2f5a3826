# The Windows build: the product as a library, the module, tests, the programs that stand in for the platform, benchmarks.
enable_language(RC)

math(EXPR bits "8 * ${CMAKE_SIZEOF_VOID_P}")
set(CMAKE_CROSSCOMPILING_EMULATOR env WINEARCH=win${bits} ${CMAKE_SOURCE_DIR}/scripts/wine-run ${CMAKE_BINARY_DIR}/wineprefix)

if(NOT TAVI_DEPS)
    message(FATAL_ERROR "TAVI_DEPS is not set: build with scripts/build")
endif()

include(cmake/hardening.cmake)

# Flags of every Windows program; those with wxWidgets and SQLite add the libraries of tavi_platform.
add_library(tavi_platform_flags INTERFACE)
target_compile_definitions(tavi_platform_flags INTERFACE UNICODE _UNICODE _WIN32_WINNT=0x0600 WINVER=0x0600 NOMINMAX
    WIN32_LEAN_AND_MEAN)
# The module stores __FILE__, and its build id depends on its symbols. Its bytes must not depend on the folders of the build and of the
# libraries; ccache makes the first one's path relative.
file(RELATIVE_PATH to_root ${CMAKE_BINARY_DIR} ${CMAKE_SOURCE_DIR})
target_compile_options(tavi_platform_flags INTERFACE -ffunction-sections -fdata-sections
    -ffile-prefix-map=${CMAKE_SOURCE_DIR}/= -ffile-prefix-map=${to_root}=
    -ffile-prefix-map=${CMAKE_BINARY_DIR}=. -ffile-prefix-map=${TAVI_DEPS}/=libraries/)
target_link_options(tavi_platform_flags INTERFACE -static -Wl,--gc-sections -Wl,--no-insert-timestamp)

add_library(tavi_platform INTERFACE)
target_compile_definitions(tavi_platform INTERFACE __WXMSW__ wxUSE_GUI=0 wxDEBUG_LEVEL=0)
target_include_directories(tavi_platform SYSTEM INTERFACE ${TAVI_DEPS}/include)
target_include_directories(tavi_platform INTERFACE ${CMAKE_SOURCE_DIR}/src ${CMAKE_SOURCE_DIR})
target_link_options(tavi_platform INTERFACE -Wl,--enable-stdcall-fixup)
target_link_libraries(tavi_platform INTERFACE tavi_platform_flags ${TAVI_DEPS}/lib/libsqlite3.a ${TAVI_DEPS}/lib/libwxbase32u.a
    ${TAVI_DEPS}/lib/libz.a ole32 oleaut32 uuid shlwapi shell32 advapi32 comctl32 comdlg32 gdi32 user32 version)

# The DLL itself is thin: the process entry, the exports and the resources.
file(GLOB product_sources CONFIGURE_DEPENDS src/*/*.cpp)
list(REMOVE_ITEM product_sources ${CMAKE_SOURCE_DIR}/src/shell/DllMain.cpp ${CMAKE_SOURCE_DIR}/src/shell/Exports.cpp)
add_library(tavi_product STATIC ${product_sources})
target_link_libraries(tavi_product PUBLIC tavi_platform PRIVATE tavi_warnings)
# Functions and lines, which end up beside the module.
target_compile_options(tavi_product PRIVATE $<$<CONFIG:Release>:-g1>)

include(cmake/resources.cmake)

add_library(tavishell SHARED src/shell/DllMain.cpp src/shell/Exports.cpp src/shell/tavishell.def src/ui/tavishell.rc)
set_target_properties(tavishell PROPERTIES PREFIX "")
target_compile_options(tavishell PRIVATE $<$<AND:$<CONFIG:Release>,$<COMPILE_LANGUAGE:CXX>>:-g1>)
# The symbols go to a file of their own, which has the build id of the module. A section's name of more than eight characters would
# need a table of strings behind the image.
if(CMAKE_BUILD_TYPE STREQUAL "Release")
    target_link_options(tavishell PRIVATE -Wl,--build-id)
    add_custom_command(TARGET tavishell POST_BUILD
        COMMAND ${CMAKE_OBJCOPY} -p --only-keep-debug tavishell.dll tavishell.debug
        COMMAND ${CMAKE_OBJCOPY} -p --strip-all --rename-section .eh_frame=.eh_fram tavishell.dll
        BYPRODUCTS tavishell.debug VERBATIM)
endif()
# Only 32-bit names are decorated.
if(CMAKE_SIZEOF_VOID_P EQUAL 4)
    target_link_options(tavishell PRIVATE -Wl,--entry=_tavishellEntry@12)
else()
    target_link_options(tavishell PRIVATE -Wl,--entry=tavishellEntry)
endif()
set_property(SOURCE src/ui/tavishell.rc APPEND PROPERTY OBJECT_DEPENDS "${resource_files}")
target_include_directories(tavishell PRIVATE ${resource_folder})
add_dependencies(tavishell tavi_version)
target_link_libraries(tavishell PRIVATE tavi_product tavi_warnings)

# Built by scripts/check only: each header in a source of its own, which shows that it compiles alone.
file(GLOB headers RELATIVE ${CMAKE_SOURCE_DIR}/src CONFIGURE_DEPENDS src/*/*.h)
set(header_sources)
foreach(header IN LISTS headers)
    string(REPLACE "/" "_" name ${header})
    file(CONFIGURE OUTPUT ${CMAKE_BINARY_DIR}/headers/${name}.cpp CONTENT "#include \"${header}\"\n")
    list(APPEND header_sources ${CMAKE_BINARY_DIR}/headers/${name}.cpp)
endforeach()
add_library(tavi_headers OBJECT EXCLUDE_FROM_ALL ${header_sources})
target_link_libraries(tavi_headers PRIVATE tavi_platform tavi_warnings)

add_subdirectory(tools)
add_subdirectory(tests)
add_subdirectory(bench)
