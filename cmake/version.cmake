# Writes version.h to OUT, at each build, from the project's VERSION and the commit in SOURCE. Only a build of the tag vVERSION has the
# plain number as its text.
execute_process(COMMAND git -C ${SOURCE} describe --tags --match v${VERSION} --always --abbrev=10 --dirty
    OUTPUT_VARIABLE commit OUTPUT_STRIP_TRAILING_WHITESPACE ERROR_QUIET)
set(text ${VERSION}.0)
if(NOT commit STREQUAL "v${VERSION}")
    string(REGEX REPLACE "^v.*-g" "" commit "${commit}")
    string(APPEND text " (unreleased ${commit})")
endif()
string(REPLACE . ", " numbers ${VERSION}.0)
file(CONFIGURE OUTPUT ${OUT} CONTENT "#define TAVI_VERSION_NUMBERS ${numbers}
#define TAVI_VERSION_TEXT \"${text}\"
")
