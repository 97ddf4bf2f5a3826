# The log, and what is checked before anything else. Included for the setup and for the uninstaller.

# Appends the text on the stack, in UTF-8, with the time.
Function ${UN}WriteLog
    Exch $0
    Push $1
    Push $2
    Push $3
    ${If} $0 != ""
        # The progress page shows the lines of the log only.
        SetDetailsPrint both
        DetailPrint $0
        SetDetailsPrint none
    ${EndIf}
    ${If} $LogFile != ""
        System::Call 'kernel32::GetDateFormatW(i 0x7f, i 0, p 0, w "yyyy-MM-dd", w.r1, i ${NSIS_MAX_STRLEN})'
        System::Call 'kernel32::GetTimeFormatW(i 0x7f, i 0, p 0, w "HH:mm:ss", w.r2, i ${NSIS_MAX_STRLEN})'
        ${If} $0 == ""
            StrCpy $0 "$\r$\n"
        ${Else}
            StrCpy $0 "$1 $2  $0$\r$\n"
        ${EndIf}
        FileOpen $3 $LogFile a
        ${If} $3 != ""
            FileSeek $3 0 END
            System::Call 'kernel32::WideCharToMultiByte(i 65001, i 0, w r0, i -1, p 0, i 0, p 0, p 0)i.r1'
            System::Alloc $1
            Pop $2
            System::Call 'kernel32::WideCharToMultiByte(i 65001, i 0, w r0, i -1, p r2, i r1, p 0, p 0)'
            # Without the terminator.
            IntOp $1 $1 - 1
            System::Call 'kernel32::WriteFile(p r3, p r2, i r1, *i.r1, p 0)'
            System::Free $2
            FileClose $3
        ${EndIf}
        ClearErrors
    ${EndIf}
    Pop $3
    Pop $2
    Pop $1
    Pop $0
FunctionEnd

# The last line of the log. $0: the exit code.
Function ${UN}EndLog
    ${If} $IsLogEnded != ""
        Return
    ${EndIf}
    StrCpy $IsLogEnded yes
    ${Switch} $0
        ${Case} 0
            ${Log} "Done, exit code 0"
            ${Break}
        ${Case} ${EXIT_CANCELLED}
            ${Log} "Cancelled by the user, exit code ${EXIT_CANCELLED}"
            ${Break}
        ${Default}
            ${Log} "Failed, exit code $0"
            ${Break}
    ${EndSwitch}
FunctionEnd

# Keeps the first failure; logs each.
Function ${UN}SetFailure
    Exch $0
    ${Log} "Error: $0"
    ${If} $Failure == ""
        StrCpy $Failure $0
    ${EndIf}
    Pop $0
FunctionEnd

# The message of $WinError, to $ErrorText.
Function ${UN}DescribeError
    Push $0
    # From the system, without line breaks.
    System::Call 'kernel32::FormatMessageW(i 0x12ff, p 0, i $WinError, i 0, w.r0, i ${NSIS_MAX_STRLEN}, p 0)'
    ${Do}
        StrCpy $ErrorText $0 1 -1
        ${If} $ErrorText != " "
        ${AndIf} $ErrorText != "."
            ${Break}
        ${EndIf}
        StrCpy $0 $0 -1
    ${Loop}
    StrCpy $ErrorText "error $WinError"
    ${If} $0 != ""
        StrCpy $ErrorText "$0 ($ErrorText)"
    ${EndIf}
    Pop $0
FunctionEnd

# Ends the program before it has changed anything. $0: the exit code, $Failure: the reason.
Function ${UN}RefuseToStart
    SetErrorLevel $0
    Call ${UN}EndLog
    MessageBox MB_OK|MB_ICONSTOP "$Failure" /SD IDOK
    Quit
FunctionEnd

# The path that the program was given, in full and without a backslash at its end. $0: the path, before and after.
Function ${UN}FullPath
    System::Call 'kernel32::GetFullPathNameW(w r0, i ${NSIS_MAX_STRLEN}, w.r1, p 0)i.r2'
    ${If} $2 > 0
    ${AndIf} $2 < ${NSIS_MAX_STRLEN}
        StrCpy $0 $1
    ${EndIf}
    StrCpy $1 $0 1 -1
    ${If} $1 == "\"
        StrCpy $0 $0 -1
    ${EndIf}
FunctionEnd

Function ${UN}OpenLog
    ${GetParameters} $1
    ClearErrors
    ${GetOptions} $1 "/LOG=" $0
    ${If} ${Errors}
    ${OrIf} $0 == ""
        StrCpy $0 "$TEMP\tavishell-setup.log"
    ${EndIf}
    Call ${UN}FullPath
    ClearErrors
    FileOpen $1 $0 a
    ${IfNot} ${Errors}
        StrCpy $LogFile $0
        FileSeek $1 0 END $2
        FileClose $1
        ${If} $2 > 0
            ${Log} ""
        ${EndIf}
    ${EndIf}
    ClearErrors
FunctionEnd

# What the setup and the uninstaller begin with. $0: the word for the log.
Function ${UN}Start
    Push $0
    StrCpy $Is64BitWindows ""
    StrCpy $HasModule64 ""
    ${If} ${IsWow64}
        StrCpy $Is64BitWindows yes
        ${If} ${IsNativeAMD64}
            StrCpy $HasModule64 yes
        ${EndIf}
    ${EndIf}
    Call ${UN}OpenLog
    Pop $0
    ${If} ${Silent}
        StrCpy $0 "$0, silent"
    ${EndIf}
    ${Log} "$0"
    ${WinVerGetMajor} $0
    ${WinVerGetMinor} $1
    ${WinVerGetBuild} $2
    StrCpy $3 "32-bit"
    ${If} $Is64BitWindows != ""
        StrCpy $3 "64-bit"
    ${EndIf}
    ${Log} "Windows $0.$1.$2, $3"

    ${IfNot} ${AtLeastWinVista}
        ${Fail} "This program needs Windows Vista or later."
        StrCpy $0 ${EXIT_FAILED}
        Call ${UN}RefuseToStart
    ${EndIf}
    # Windows destroys the mutex at the end of the program.
    System::Call 'kernel32::CreateMutexW(p 0, i 0, w "Global\TaviShellSetup")p.r0 ?e'
    Pop $1
    # Another user's mutex cannot be opened.
    ${If} $0 = 0
    ${OrIf} $1 = ${ERROR_ALREADY_EXISTS}
        ${Fail} "Another setup of ${PRODUCT} is running. Wait until it has ended, and try again."
        StrCpy $0 ${EXIT_ALREADY_RUNNING}
        Call ${UN}RefuseToStart
    ${EndIf}
FunctionEnd
