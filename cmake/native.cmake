# The native build of the pure code, for the sanitizers and fuzzers.
find_program(WX_CONFIG wx-config REQUIRED)
execute_process(COMMAND ${WX_CONFIG} --cxxflags base OUTPUT_VARIABLE wx_flags OUTPUT_STRIP_TRAILING_WHITESPACE
    COMMAND_ERROR_IS_FATAL ANY)
execute_process(COMMAND ${WX_CONFIG} --libs base OUTPUT_VARIABLE wx_libs OUTPUT_STRIP_TRAILING_WHITESPACE
    COMMAND_ERROR_IS_FATAL ANY)
string(REPLACE "-I" "-isystem" wx_flags "${wx_flags}")
separate_arguments(wx_flags UNIX_COMMAND "${wx_flags}")
separate_arguments(wx_libs UNIX_COMMAND "${wx_libs}")
find_package(SQLite3 REQUIRED)
find_package(ZLIB REQUIRED)
find_package(Threads REQUIRED)

add_library(tavi_native INTERFACE)
target_compile_options(tavi_native INTERFACE ${wx_flags} -g)
target_include_directories(tavi_native INTERFACE ${CMAKE_SOURCE_DIR}/src ${CMAKE_SOURCE_DIR})
target_link_libraries(tavi_native INTERFACE ${wx_libs} SQLite::SQLite3 ZLIB::ZLIB Threads::Threads)
if(TAVI_SANITIZE)
    target_compile_options(tavi_native INTERFACE -fsanitize=${TAVI_SANITIZE} -fno-sanitize-recover=all -fno-omit-frame-pointer)
    target_link_options(tavi_native INTERFACE -fsanitize=${TAVI_SANITIZE})
endif()

list(TRANSFORM pure_sources PREPEND ${CMAKE_SOURCE_DIR}/src/ OUTPUT_VARIABLE pure_files)
add_library(tavi_pure STATIC ${pure_files})
target_link_libraries(tavi_pure PUBLIC tavi_native PRIVATE tavi_warnings)

add_subdirectory(tests)
if(CMAKE_CXX_COMPILER_ID STREQUAL "Clang")
    add_subdirectory(fuzz)
endif()
