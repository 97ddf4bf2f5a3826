# Files. A module that a program has loaded can be renamed, but neither written nor deleted: the old file gets a name NAME.N.old, and
# the next run or the next start of Windows deletes it. Included for the setup and for the uninstaller.

# What is at the path $0, to $1: none, file or folder.
Function ${UN}GetKind
    System::Call 'kernel32::GetFileAttributesW(w r0)i.r1'
    ${If} $1 = -1
        StrCpy $1 none
        Return
    ${EndIf}
    IntOp $1 $1 & ${FILE_ATTRIBUTE_DIRECTORY}
    ${If} $1 = 0
        StrCpy $1 file
    ${Else}
        StrCpy $1 folder
    ${EndIf}
FunctionEnd

# Stores in $1 what identifies the file or folder $0 whatever the spelling of its path (volume and file number), or the path itself
# if there is no such file.
Function ${UN}Identify
    # All kinds of sharing, OPEN_EXISTING, FILE_FLAG_BACKUP_SEMANTICS, which opens folders.
    System::Call 'kernel32::CreateFileW(w r0, i 0, i 7, p 0, i 3, i 0x02000000, p 0)p.r2'
    StrCpy $1 $0
    ${If} $2 = -1
        Return
    ${EndIf}
    System::Alloc 52
    Pop $3
    # BY_HANDLE_FILE_INFORMATION has the serial number of the volume at 28 and the number of the file at 44.
    System::Call 'kernel32::GetFileInformationByHandle(p r2, p r3)i.r4'
    ${If} $4 <> 0
        IntOp $4 $3 + 28
        System::Call '*$4(i.r5)'
        IntOp $4 $3 + 44
        System::Call '*$4(i.r6, i.r7)'
        StrCpy $1 "$5:$6:$7"
    ${EndIf}
    System::Free $3
    System::Call 'kernel32::CloseHandle(p r2)'
FunctionEnd

# Renames the file $0 to $1. Repeats that for a second: a virus scanner may have a new file open, and the uninstaller that has started
# this copy may not have ended.
Function ${UN}RenameFile
    ${For} $5 1 10
        System::Call 'kernel32::MoveFileExW(w r0, w r1, i ${MOVEFILE_WRITE_THROUGH})i.r2 ?e'
        Pop $WinError
        ${If} $2 <> 0
            StrCpy $WinError 0
        ${EndIf}
        ${If} $WinError <> ${ERROR_ACCESS_DENIED}
        ${AndIf} $WinError <> ${ERROR_SHARING_VIOLATION}
            Return
        ${EndIf}
        Sleep 100
    ${Next}
FunctionEnd

# Renames the file $0 to the first free name NAME.N.old. Without such a file, it does nothing and succeeds.
Function ${UN}SetAside
    StrCpy $AsidePath ""
    StrCpy $WinError 0
    Call ${UN}GetKind
    ${If} $1 == none
        Return
    ${EndIf}
    StrCpy $3 $0
    StrCpy $4 1
    ${Do}
        StrCpy $0 "$3.$4.old"
        Call ${UN}GetKind
        ${If} $1 == none
            ${Break}
        ${EndIf}
        IntOp $4 $4 + 1
    ${Loop}
    StrCpy $1 $0
    StrCpy $0 $3
    Call ${UN}RenameFile
    ${If} $WinError = 0
        StrCpy $AsidePath $1
        ${Log} "Renamed: $0 to $1"
    ${EndIf}
FunctionEnd

# Deletes the file or empty folder $0 at the next start of Windows. Nobody is asked to restart: what stays until then is harmless.
Function ${UN}DeleteAtNextStart
    System::Call 'kernel32::MoveFileExW(w r0, p 0, i ${MOVEFILE_DELAY_UNTIL_REBOOT})i.r1 ?e'
    Pop $WinError
    ${If} $1 <> 0
        ${Log} "In use, will be deleted at the next start of Windows: $0"
        IntOp $Scheduled $Scheduled + 1
    ${Else}
        Call ${UN}DescribeError
        ${Log} "Cannot be deleted, neither now nor at the next start: $0: $ErrorText"
    ${EndIf}
FunctionEnd

# Deletes the renamed files of $0 of this run and of earlier ones, and what an interrupted run has left.
Function ${UN}Sweep
    StrCpy $5 $0
    ${If} ${FileExists} "$5.new"
        Delete "$5.new"
    ${EndIf}
    ${GetFileName} $5 $6
    ${GetParent} $5 $7
    FindFirst $8 $9 "$5.*.old"
    ${DoUntil} $9 == ""
        # Only names with a plain number are ours.
        StrLen $1 "$6."
        StrCpy $0 $9 -4 $1
        IntOp $0 $0 + 0
        ${If} $9 == "$6.$0.old"
            StrCpy $0 "$7\$9"
            ClearErrors
            Delete $0
            ${If} ${Errors}
                Call ${UN}DeleteAtNextStart
            ${Else}
                ${Log} "Deleted: $0"
            ${EndIf}
        ${EndIf}
        ClearErrors
        FindNext $8 $9
        ${If} ${Errors}
            StrCpy $9 ""
        ${EndIf}
    ${Loop}
    FindClose $8
    ClearErrors
FunctionEnd

# Deletes the folder $0 if nothing but our own held files is in it; $Scheduled is their number before, and 1 after if the folder waits
# for the next start.
Function ${UN}RemoveFolder
    StrCpy $4 $Scheduled
    StrCpy $Scheduled 0
    Call ${UN}GetKind
    ${If} $1 != folder
        Return
    ${EndIf}
    ClearErrors
    RMDir $0
    ${IfNot} ${Errors}
        ${Log} "Deleted: $0"
        Return
    ${EndIf}
    ClearErrors
    StrCpy $1 0
    FindFirst $2 $3 "$0\*.*"
    ${DoUntil} $3 == ""
        ${If} $3 != "."
        ${AndIf} $3 != ".."
            IntOp $1 $1 + 1
        ${EndIf}
        FindNext $2 $3
        ${If} ${Errors}
            StrCpy $3 ""
        ${EndIf}
    ${Loop}
    FindClose $2
    ClearErrors
    ${If} $4 = $1
        Call ${UN}DeleteAtNextStart
    ${Else}
        ${Log} "Not empty, stays: $0"
    ${EndIf}
FunctionEnd

# Deletes the renamed files of the 64-bit module, and of the others, in $Folder.
Function ${UN}SweepFolder64
    StrCpy $0 "$Folder\${MODULE64}"
    Call ${UN}Sweep
FunctionEnd
Function ${UN}SweepFolder
    StrCpy $0 "$Folder\${MODULE32}"
    Call ${UN}Sweep
    StrCpy $0 "$Folder\${NOTICES}"
    Call ${UN}Sweep
    StrCpy $0 "$Folder\${UNINSTALLER}"
    Call ${UN}Sweep
FunctionEnd

# Deletes the renamed files in $Folder, and the folders if they are empty then.
Function ${UN}ClearFolder
    StrCpy $Scheduled 0
    Call ${UN}SweepFolder64
    ${If} $HasModule64 != ""
        StrCpy $0 "$Folder\x64"
        Call ${UN}RemoveFolder
    ${EndIf}
    Call ${UN}SweepFolder
    StrCpy $0 $Folder
    Call ${UN}RemoveFolder
FunctionEnd

# Takes back the recorded steps, the last one first.
Function ${UN}UndoFiles
    ${Do}
        ClearErrors
        Pop $8
        ${If} ${Errors}
        ${OrIf} $8 == begin
            ${Break}
        ${EndIf}
        Pop $0
        Pop $1
        ${Switch} $8
            ${Case} move
                Call ${UN}RenameFile
                ${If} $WinError <> 0
                    ${FailWithError} "$1 cannot be put back"
                ${Else}
                    ${Log} "Put back: $1"
                ${EndIf}
                ${Break}
            ${Case} delete
                Call ${UN}DeleteNewFile
                ${Break}
            ${Case} folder
                ClearErrors
                RMDir $0
                ${If} ${Errors}
                    Call ${UN}DeleteAtNextStart
                ${EndIf}
                ${Break}
        ${EndSwitch}
    ${Loop}
    ClearErrors
FunctionEnd

# Deletes the file $0, or renames it if a program has loaded it in the meantime.
Function ${UN}DeleteNewFile
    Call ${UN}GetKind
    ${If} $1 != file
        Return
    ${EndIf}
    ClearErrors
    Delete $0
    ${IfNot} ${Errors}
        Return
    ${EndIf}
    ClearErrors
    Call ${UN}SetAside
    ${If} $AsidePath == ""
        ${FailWithError} "$0 cannot be deleted"
        Return
    ${EndIf}
    StrCpy $0 $AsidePath
    Call ${UN}DeleteAtNextStart
FunctionEnd
