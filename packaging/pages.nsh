# The pages.

# The text of the finish page.
Var FinishNote

!define MUI_ICON "setup.ico"
!define MUI_UNICON "setup.ico"
!define MUI_WELCOMEFINISHPAGE_BITMAP "wizard.bmp"
!define MUI_UNWELCOMEFINISHPAGE_BITMAP "wizard.bmp"
!define MUI_FINISHPAGE_NOREBOOTSUPPORT
!define MUI_CUSTOMFUNCTION_ABORT OnCancel
!define MUI_CUSTOMFUNCTION_UNABORT un.OnCancel

!define MUI_WELCOMEPAGE_TITLE "${PRODUCT} ${VERSION}"
!define MUI_WELCOMEPAGE_TEXT "This program installs the command $\"Restore Previous Version$\" in the menus of the file manager.$\r$\n$\r$\n\
You need not close any window or restart the computer.$\r$\n$\r$\n$_CLICK"
!define MUI_PAGE_CUSTOMFUNCTION_LEAVE AskAboutService
!insertmacro MUI_PAGE_WELCOME
!insertmacro MUI_PAGE_DIRECTORY
!insertmacro MUI_PAGE_INSTFILES
!define MUI_FINISHPAGE_TITLE "The extension is installed"
!define MUI_FINISHPAGE_TEXT "$FinishNote"
!insertmacro MUI_PAGE_FINISH

!insertmacro MUI_UNPAGE_CONFIRM
!insertmacro MUI_UNPAGE_INSTFILES
!define MUI_FINISHPAGE_TITLE "The extension is uninstalled"
!define MUI_FINISHPAGE_TEXT "A file manager that is running can show the command until it ends. There is no need to restart the computer."
!insertmacro MUI_UNPAGE_FINISH

!insertmacro MUI_LANGUAGE English

# Without the service the file manager waits for it at each load of the module.
Function AskAboutService
    Call IsServiceInstalled
    ${If} $0 != ""
        Return
    ${EndIf}
    StrCpy $0 "The Tavi Remote Backup service is not installed on this computer. Install the service first if you can."
    StrCpy $0 "$0 Until it is installed, the file manager stops for 30 seconds each time it loads the extension."
    MessageBox MB_YESNO|MB_ICONEXCLAMATION|MB_DEFBUTTON2 "$0$\n$\nDo you want to continue without the service?" IDYES continue
    SetErrorLevel ${EXIT_CANCELLED}
    StrCpy $0 ${EXIT_CANCELLED}
    Call EndLog
    Quit
    continue:
FunctionEnd
