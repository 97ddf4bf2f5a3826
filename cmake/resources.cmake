# Generates what src/ui/tavishell.rc includes: the version, the manifest, the message catalogues, and one file per icon, rendered from
# its SVG drawing in every size that Windows asks for.
find_program(RSVG_CONVERT rsvg-convert REQUIRED)
find_program(ICOTOOL icotool REQUIRED)

set(resource_folder ${CMAKE_BINARY_DIR}/resources)
file(MAKE_DIRECTORY ${resource_folder})
add_custom_target(tavi_version BYPRODUCTS ${resource_folder}/version.h
    COMMAND ${CMAKE_COMMAND} -DSOURCE=${CMAKE_SOURCE_DIR} -DVERSION=${PROJECT_VERSION} -DOUT=${resource_folder}/version.h
        -P ${CMAKE_SOURCE_DIR}/cmake/version.cmake VERBATIM)
configure_file(src/ui/module.manifest.in ${resource_folder}/module.manifest @ONLY)
set(resource_files ${resource_folder}/module.manifest ${resource_folder}/version.h ${CMAKE_SOURCE_DIR}/src/ui/resource.h)
# 13, 15 and 19 are check-mark sizes of menus.
set(icon_sizes 13 15 16 19 20 24 32 40 48 64 128 256)
file(GLOB icon_sources CONFIGURE_DEPENDS src/ui/icons/*.svg)
foreach(source IN LISTS icon_sources)
    cmake_path(GET source STEM name)
    # NAME-small.svg replaces the main drawing in small sizes, where thin strokes would blur.
    if(name MATCHES "-small$")
        continue()
    endif()
    set(pngs)
    set(small_source ${CMAKE_SOURCE_DIR}/src/ui/icons/${name}-small.svg)
    set(render)
    foreach(size IN LISTS icon_sizes)
        set(from ${source})
        if(size LESS 32 AND EXISTS ${small_source})
            set(from ${small_source})
        endif()
        set(png ${resource_folder}/${name}-${size}.png)
        list(APPEND render COMMAND ${RSVG_CONVERT} -w ${size} -h ${size} ${from} -o ${png})
        # The large ones stay compressed as PNG.
        if(size LESS 128)
            list(APPEND pngs ${png})
        else()
            list(APPEND pngs --raw=${png})
        endif()
    endforeach()
    set(icon ${resource_folder}/${name}.ico)
    set(depends ${source})
    if(EXISTS ${small_source})
        list(APPEND depends ${small_source})
    endif()
    add_custom_command(OUTPUT ${icon} ${render}
        COMMAND ${ICOTOOL} -c -o ${icon} ${pngs}
        DEPENDS ${depends} VERBATIM)
    list(APPEND resource_files ${icon})
endforeach()

# Each catalogue po/LANGUAGE.po becomes a resource. The tests alone get a pseudo language as well, once as a language that is read from
# right to left.
find_program(MSGFMT msgfmt REQUIRED)
file(GLOB catalogues CONFIGURE_DEPENDS po/*.po)
set(catalogue_list)
foreach(source IN LISTS catalogues)
    cmake_path(GET source STEM name)
    set(binary ${resource_folder}/${name}.mo)
    add_custom_command(OUTPUT ${binary} COMMAND ${MSGFMT} --no-hash -o ${binary} ${source} DEPENDS ${source} VERBATIM)
    list(APPEND resource_files ${binary})
    string(APPEND catalogue_list "tavi_${name} MOFILE \"${name}.mo\"\n")
endforeach()
file(CONFIGURE OUTPUT ${resource_folder}/catalogues.rc CONTENT "${catalogue_list}" @ONLY)
list(APPEND resource_files ${resource_folder}/catalogues.rc)
set(pseudo_catalogue ${resource_folder}/pseudo.mo)
add_custom_command(OUTPUT ${pseudo_catalogue}
    COMMAND ${CMAKE_SOURCE_DIR}/scripts/messages --pseudo ${pseudo_catalogue}
    DEPENDS docs/tavishell.pot scripts/messages VERBATIM)
file(CONFIGURE OUTPUT ${resource_folder}/pseudo.rc
    CONTENT "tavi_qps MOFILE \"pseudo.mo\"\ntavi_he MOFILE \"pseudo.mo\"\n" @ONLY)

add_custom_target(tavi_resources DEPENDS ${resource_files} ${pseudo_catalogue})
add_dependencies(tavi_resources tavi_version)
