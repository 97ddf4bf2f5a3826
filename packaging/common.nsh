# Names and macros that the setup and the uninstaller share.

!define CLASS_ID "{5e0c31a7-8d42-4b19-a6f3-2c7d90e1b845}"
!define UNINSTALL_KEY "Software\Microsoft\Windows\CurrentVersion\Uninstall\tavishell"

# The files, from the folder of the product.
!define MODULE32 "tavishell.dll"
!define MODULE64 "x64\tavishell.dll"
!define NOTICES "third-party-notices.txt"
!define UNINSTALLER "uninstall.exe"

!define EXIT_CANCELLED 1
!define EXIT_FAILED 1603
!define EXIT_ALREADY_RUNNING 1618

# Codes of Windows.
!define ERROR_FILE_NOT_FOUND 2
!define ERROR_ACCESS_DENIED 5
!define ERROR_SHARING_VIOLATION 32
!define ERROR_ALREADY_EXISTS 183
!define FILE_ATTRIBUTE_DIRECTORY 0x10
!define MOVEFILE_DELAY_UNTIL_REBOOT 4
!define MOVEFILE_WRITE_THROUGH 8

# Whether Windows is a 64-bit one, and whether its file manager loads 64-bit x86 modules.
Var Is64BitWindows
Var HasModule64
# The path of the log; empty if it cannot be written.
Var LogFile
# The version and folder of the entry in the list of programs; empty without one.
Var OldVersion
Var OldFolder
# The first error, as a sentence; empty if there is none.
Var Failure
# The failure that made the run put everything back; $Failure then is that of the putting back.
Var Cause
# The code of the last file operation, 0 for success.
Var WinError
# Output of DescribeError.
Var ErrorText
# Whether the log has its last line.
Var IsLogEnded

# ${CallShared} NAME: calls the function's copy in the setup or in the uninstaller.
!macro CallShared NAME
    !ifdef __UNINSTALL__
        Call un.${NAME}
    !else
        Call ${NAME}
    !endif
!macroend
!define CallShared "!insertmacro CallShared"

# ${UseNativeView}: the next instructions see the registry as a program of the word size of Windows does.
!macro UseNativeView
    ${If} $Is64BitWindows != ""
        SetRegView 64
    ${Else}
        SetRegView 32
    ${EndIf}
!macroend
!define UseNativeView "!insertmacro UseNativeView"

# ${Log} TEXT: writes a line to the log and to the details of the progress page.
!macro Log TEXT
    Push `${TEXT}`
    ${CallShared} WriteLog
!macroend
!define Log "!insertmacro Log"

# ${Fail} TEXT: the run has failed; the caller returns.
!macro Fail TEXT
    Push `${TEXT}`
    ${CallShared} SetFailure
!macroend
!define Fail "!insertmacro Fail"

# ${FailWithError} TEXT: the same, with the message of the last file operation.
!macro FailWithError TEXT
    ${CallShared} DescribeError
    ${Fail} `${TEXT}: $ErrorText.`
!macroend
!define FailWithError "!insertmacro FailWithError"

# ${Try} FUNCTION LABEL: calls a function; goes to the label if it failed.
!macro Try FUNCTION LABEL
    Call ${FUNCTION}
    StrCmp $Failure "" 0 ${LABEL}
!macroend
!define Try "!insertmacro Try"

# ${Undo} ACTION PATH TO: records what takes a step back. The records are on the stack, so that the last step is undone first, and a
# function that records one must leave nothing else there.
#   move PATH TO    renames a file
#   delete PATH     deletes a file of this run
#   folder PATH     deletes a folder of this run
!macro Undo ACTION PATH TO
    Push `${TO}`
    Push `${PATH}`
    Push ${ACTION}
!macroend
!define Undo "!insertmacro Undo"
!define BeginUndo "Push begin"

# ${BeginRollback}, ${EndFailedRun} DONE: before and after the steps are undone. DONE: what has failed, as in "could not be DONE".
!macro BeginRollback
    ${Log} "Putting back what was there before"
    StrCpy $Cause $Failure
    StrCpy $Failure ""
!macroend
!define BeginRollback "!insertmacro BeginRollback"
!macro EndFailedRun DONE
    SetErrorLevel ${EXIT_FAILED}
    StrCpy $0 ${EXIT_FAILED}
    ${CallShared} EndLog
    StrCpy $0 "Everything is as it was before."
    ${If} $Cause == ""
        StrCpy $Cause $Failure
    ${ElseIf} $Failure != ""
        StrCpy $0 "Not everything could be put back: $Failure"
    ${EndIf}
    ${If} $LogFile != ""
        StrCpy $0 "$0$\n$\nDetails: $LogFile"
    ${EndIf}
    MessageBox MB_OK|MB_ICONSTOP "${PRODUCT} could not be ${DONE}.$\n$\n$Cause$\n$\n$0" /SD IDOK
    Abort "${PRODUCT} could not be ${DONE}. $Cause"
!macroend
!define EndFailedRun "!insertmacro EndFailedRun"

# The folder of the product: that of this run, or the one that it leaves.
Var Folder
# Output of SetAside: the path of the renamed file; empty if there was none.
Var AsidePath
# How many entries of a folder are deleted at the next start of Windows only.
Var Scheduled
