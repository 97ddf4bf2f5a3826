#pragma once

// Resource numbers, shared with the resource compiler. The shell finds icons by their place in ascending order of these
// numbers: the overlay badge must stay the fourth.
#define TAVI_MANIFEST 2

#define TAVI_ICON_RESTORE 130
#define TAVI_ICON_SERVICE 131
#define TAVI_ICON_MENU 137
#define TAVI_ICON_OVERLAY 140

#define TAVI_DIALOG_VERSIONS 102
#define TAVI_VERSIONS_MESSAGE 1001
#define TAVI_VERSIONS_LIST 1002
#define TAVI_VERSIONS_RESTORE 1003
#define TAVI_VERSIONS_COPY_TO 1004
#define TAVI_VERSIONS_ICON 1005
#define TAVI_VERSIONS_LABEL 1006
#define TAVI_VERSIONS_VIEW 1008

#define TAVI_DIALOG_PROGRESS 136
#define TAVI_PROGRESS_CLOSE 8
#define TAVI_PROGRESS_CANCEL 2
#define TAVI_PROGRESS_BAR 1009
#define TAVI_PROGRESS_STATUS 1010
#define TAVI_PROGRESS_REMAINING 1011
#define TAVI_PROGRESS_SPEED 1013
