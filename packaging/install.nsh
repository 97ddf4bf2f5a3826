# The installation.

Function .onInit
    StrCpy $0 "Setup of ${PRODUCT} ${VERSION}"
    Call Start
    Call ReadEntry
    ${If} $INSTDIR == ""
        Call ReadFolderSwitch
    ${EndIf}
    Call ChooseFolder
    # The current folder: nothing of this program keeps a folder of the product in use, and a program that it starts loads no library
    # from a folder that others can write.
    SetOutPath $WINDIR
FunctionEnd

Function OnCancel
    StrCpy $0 ${EXIT_CANCELLED}
    Call EndLog
FunctionEnd

Function .onInstSuccess
    StrCpy $0 0
    Call EndLog
FunctionEnd

# Also called after an error of NSIS itself, which stops the section: the files could not be unpacked, and nothing was changed yet.
Function .onInstFailed
    SetErrorLevel ${EXIT_FAILED}
    ${If} $IsLogEnded == ""
        ${Fail} "The files could not be unpacked to $PLUGINSDIR. Is the disk full?"
    ${EndIf}
    StrCpy $0 ${EXIT_FAILED}
    Call EndLog
FunctionEnd

# --- what is there

# Takes the folder of /D= as it is: NSIS ignores one that it finds invalid, and the setup would use the default instead.
Function ReadFolderSwitch
    System::Call 'kernel32::GetCommandLineW()w.r0'
    ${DoUntil} $0 == ""
        StrCpy $1 $0 4
        StrCmpS $1 " /D=" 0 +3
            StrCpy $INSTDIR $0 "" 4
            Return
        StrCpy $0 $0 "" 1
    ${Loop}
FunctionEnd

Function ChooseFolder
    ${If} $INSTDIR != ""
        StrCpy $0 $INSTDIR
        Call FullPath
        StrCpy $INSTDIR $0
    ${ElseIf} $OldFolder != ""
        StrCpy $INSTDIR $OldFolder
    ${Else}
        StrCpy $INSTDIR "$PROGRAMFILES64\Tavi"
    ${EndIf}
FunctionEnd

# Whether the service is there, to $0. It writes its key as a 32-bit program.
Function IsServiceInstalled
    SetRegView 32
    ReadRegStr $0 HKLM "Software\Tavi" "DataPath"
    ClearErrors
FunctionEnd

# --- the steps; each sets $Failure if it fails

Function DescribeRun
    ${Log} "Folder: $INSTDIR"
    Call IsServiceInstalled
    ${If} $0 == ""
        StrCpy $0 "Warning: the Tavi Remote Backup service is not installed."
        ${Log} "$0 Until it is, the file manager stops for 30 seconds each time it loads the extension."
    ${EndIf}
    ${If} $Is64BitWindows != ""
    ${AndIf} $HasModule64 == ""
        ${Log} "Warning: the file manager of this Windows cannot load x86 modules. Only the 32-bit module is installed."
    ${EndIf}
    ${If} $OldVersion != ""
        ${VersionCompare} "${VERSION}" $OldVersion $0
        ${If} $0 = 0
            StrCpy $0 "this version"
        ${ElseIf} $0 = 1
            StrCpy $0 "the older version $OldVersion"
        ${Else}
            StrCpy $0 "the newer version $OldVersion"
        ${EndIf}
        ${Log} "Found in the list of programs: $0 in $OldFolder"
    ${EndIf}
    StrCpy $Index ${VALUE_PATH}
    Call DescribeRegistration
    ${If} $Is64BitWindows != ""
        StrCpy $Index ${VALUE_PATH_64}
        Call DescribeRegistration
    ${EndIf}
FunctionEnd

Function DescribeRegistration
    Call SelectValue
    Call ReadText
    ${If} $Value != ""
        ${Log} "Registered before: $Value"
    ${EndIf}
FunctionEnd

# The files are unpacked before anything is changed: NSIS stops the section if it cannot write them, as on a full disk. The plug-in that
# runs the registration tool is one of them; NSIS does not unpack it again at its first call.
Function UnpackFiles
    InitPluginsDir
    ClearErrors
    SetOverwrite try
    File "/oname=$PLUGINSDIR\tavishell32.dll" "tavishell32.dll"
    File "/oname=$PLUGINSDIR\tavishell64.dll" "tavishell64.dll"
    File "/oname=$PLUGINSDIR\third-party-notices.txt" "third-party-notices.txt"
    File "/oname=$PLUGINSDIR\nsExec.dll" "${NSISDIR}\Plugins\x86-unicode\nsExec.dll"
    WriteUninstaller "$PLUGINSDIR\uninstall.exe"
    ${If} ${Errors}
        ${Fail} "The files could not be unpacked to $PLUGINSDIR. Is the disk full?"
    ${EndIf}
FunctionEnd

# Creates the folder $0 and those above it.
Function CreateFolder
    ${Do}
        Call GetKind
        ${If} $1 == folder
            Return
        ${EndIf}
        # The topmost one that is missing.
        StrCpy $2 $0
        ${Do}
            ${GetParent} $2 $3
            ${If} $3 == ""
                ${Break}
            ${EndIf}
            System::Call 'kernel32::GetFileAttributesW(w r3)i.r1'
            ${If} $1 <> -1
                ${Break}
            ${EndIf}
            StrCpy $2 $3
        ${Loop}
        System::Call 'kernel32::CreateDirectoryW(w r2, p 0)i.r1 ?e'
        Pop $WinError
        ${If} $1 = 0
            ${FailWithError} "The folder $2 cannot be created"
            Return
        ${EndIf}
        ${Undo} folder $2 ""
    ${Loop}
FunctionEnd

Function CreateFolders
    StrLen $0 $INSTDIR
    # The longest name, that of the renamed notices, has 30 characters; the limit of Windows is 260.
    ${If} $0 > 220
        ${Fail} "The name of the folder is too long: $INSTDIR."
        Return
    ${EndIf}
    StrCpy $0 $INSTDIR
    Call CreateFolder
    ${If} $Failure != ""
        Return
    ${EndIf}
    ${If} $HasModule64 != ""
        StrCpy $0 "$INSTDIR\x64"
        Call CreateFolder
        ${If} $Failure != ""
            Return
        ${EndIf}
    ${EndIf}
    Call UseInstalledSpelling
FunctionEnd

# ${ForEachNewFile} FUNCTION: calls the function with $8, the unpacked file, and $9, its final path, until it fails.
!macro ForEachNewFile FUNCTION
    !insertmacro CallForFile ${FUNCTION} "tavishell32.dll" "${MODULE32}"
    ${If} $HasModule64 != ""
        !insertmacro CallForFile ${FUNCTION} "tavishell64.dll" "${MODULE64}"
    ${EndIf}
    !insertmacro CallForFile ${FUNCTION} "third-party-notices.txt" "${NOTICES}"
    !insertmacro CallForFile ${FUNCTION} "uninstall.exe" "${UNINSTALLER}"
    done:
!macroend
!macro CallForFile FUNCTION SOURCE NAME
    StrCpy $8 "$PLUGINSDIR\${SOURCE}"
    StrCpy $9 "$INSTDIR\${NAME}"
    ${Try} ${FUNCTION} done
!macroend
!define ForEachNewFile "!insertmacro ForEachNewFile"

# Copies the unpacked files beside the old ones: a full disk is noticed before a file is replaced.
Function CopyFiles
    ${ForEachNewFile} CopyFile
FunctionEnd

# Copies $8 to $9.new.
Function CopyFile
    StrCpy $0 $9
    Call GetKind
    ${If} $1 == folder
        ${Fail} "$9 cannot be written: it is a folder."
        Return
    ${EndIf}
    StrCpy $0 "$9.new"
    Call GetKind
    ${If} $1 == folder
        ${Fail} "$0 cannot be written: it is a folder."
        Return
    ${EndIf}
    ${Undo} delete "$9.new" ""
    System::Call 'kernel32::CopyFileW(w r8, w "$9.new", i 0)i.r0 ?e'
    Pop $WinError
    ${If} $0 = 0
        ${FailWithError} "$9.new cannot be written"
    ${EndIf}
FunctionEnd

Function SwapFiles
    ${ForEachNewFile} SwapFile
FunctionEnd

# Renames $9 aside and $9.new to $9.
Function SwapFile
    StrCpy $0 $9
    Call SetAside
    ${If} $WinError <> 0
        ${FailWithError} "$9 is in use and cannot be replaced"
        Return
    ${EndIf}
    ${If} $AsidePath != ""
        ${Undo} move $AsidePath $9
    ${EndIf}
    StrCpy $0 "$9.new"
    StrCpy $1 $9
    Call RenameFile
    ${If} $WinError <> 0
        ${FailWithError} "$9 cannot be written"
        Return
    ${EndIf}
    ${Undo} delete $9 ""
    ${Log} "Written: $9"
FunctionEnd

Function RegisterModules
    StrCpy $View ${VIEW_32}
    StrCpy $Module "$INSTDIR\${MODULE32}"
    Call RegisterModule
    ${If} $Failure == ""
    ${AndIf} $HasModule64 != ""
        StrCpy $View ${VIEW_64}
        StrCpy $Module "$INSTDIR\${MODULE64}"
        Call RegisterModule
    ${EndIf}
FunctionEnd

# Registers $Module in $View, by the tool of that word size. The tool may end with code 0 although the registration has failed, so
# the registry decides.
Function RegisterModule
    StrCpy $0 "$SYSDIR\regsvr32.exe"
    ${If} $View = ${VIEW_64}
        # Windows shows a 32-bit program the 32-bit system folder.
        StrCpy $0 "$WINDIR\Sysnative\regsvr32.exe"
    ${EndIf}
    ${Log} 'Running: $0 /s "$Module"'
    nsExec::Exec /TIMEOUT=120000 '"$0" /s "$Module"'
    Pop $0
    ${If} $0 != 0
        ${Log} "The registration tool ended with: $0"
    ${EndIf}
    ${If} $View = ${VIEW_64}
        ${ForEachValue64} 0 ${VALUE_APPROVED} CheckValue
    ${Else}
        ${ForEachValue} 0 ${VALUE_APPROVED} CheckValue
    ${EndIf}
    ${If} $Failure == ""
        ${Log} "Registered: $Module"
    ${EndIf}
FunctionEnd

Function CheckValue
    Call ReadText
    ${If} $Value != $Expected
        StrCpy $0 HKCR
        ${If} $Root = ${HKEY_MACHINE}
            StrCpy $0 HKLM
        ${EndIf}
        ${Fail} '$Module could not be registered: $0\$Key, value "$ValueName" is "$Value" instead of "$Expected".'
    ${EndIf}
FunctionEnd

Function WriteEntry
    StrCpy $8 0
    StrCpy $0 "$INSTDIR\${MODULE32}"
    Call AddFileSize
    StrCpy $0 "$INSTDIR\${MODULE64}"
    Call AddFileSize
    StrCpy $0 "$INSTDIR\${NOTICES}"
    Call AddFileSize
    StrCpy $0 "$INSTDIR\${UNINSTALLER}"
    Call AddFileSize
    ${UseNativeView}
    ClearErrors
    WriteRegStr HKLM "${UNINSTALL_KEY}" "DisplayName" "${PRODUCT}"
    WriteRegStr HKLM "${UNINSTALL_KEY}" "DisplayVersion" "${VERSION}"
    WriteRegStr HKLM "${UNINSTALL_KEY}" "Publisher" "${PUBLISHER}"
    WriteRegStr HKLM "${UNINSTALL_KEY}" "DisplayIcon" "$INSTDIR\${UNINSTALLER}"
    WriteRegStr HKLM "${UNINSTALL_KEY}" "InstallLocation" "$INSTDIR"
    WriteRegStr HKLM "${UNINSTALL_KEY}" "UninstallString" '"$INSTDIR\${UNINSTALLER}"'
    WriteRegStr HKLM "${UNINSTALL_KEY}" "QuietUninstallString" '"$INSTDIR\${UNINSTALLER}" /S'
    WriteRegDWORD HKLM "${UNINSTALL_KEY}" "EstimatedSize" $8
    WriteRegDWORD HKLM "${UNINSTALL_KEY}" "NoModify" 1
    WriteRegDWORD HKLM "${UNINSTALL_KEY}" "NoRepair" 1
    ${If} ${Errors}
        ${Fail} "The entry in the list of programs cannot be written: HKLM\${UNINSTALL_KEY}."
    ${Else}
        ${Log} "Written: the entry in the list of programs"
    ${EndIf}
FunctionEnd

# Adds the size of the file $0, in KB, to $8.
Function AddFileSize
    ClearErrors
    FileOpen $1 $0 r
    ${IfNot} ${Errors}
        FileSeek $1 0 END $2
        FileClose $1
        IntOp $2 $2 + 1023
        IntOp $2 $2 / 1024
        IntOp $8 $8 + $2
    ${EndIf}
    ClearErrors
FunctionEnd

# --- the end

# From here on nothing fails: the new version is in place. What is left of an old one does no harm.
Function RemoveOldFiles
    StrCpy $Folder $INSTDIR
    StrCpy $Scheduled 0
    Call SweepFolder64
    Call SweepFolder
    StrCpy $FinishNote "The command appears in all windows of the file manager that you open from now on."
    ${If} $Is64BitWindows != ""
    ${AndIf} $HasModule64 == ""
        StrCpy $FinishNote "On this computer, the command appears in 32-bit file managers only."
    ${EndIf}
    ${If} $Scheduled > 0
        StrCpy $FinishNote "A program still uses the old version. The file manager will use the new one when it starts the next time,"
        StrCpy $FinishNote "$FinishNote for example after you have signed out and in again. There is no need to restart the computer."
    ${EndIf}
    ${If} $OldFolder != ""
    ${AndIf} $OldFolder != $INSTDIR
        ${Log} "Deleting the files in the folder of the old version: $OldFolder"
        StrCpy $Folder $OldFolder
        Call SetFilesAside
        Call ClearFolder
    ${EndIf}
FunctionEnd

Function SetFilesAside
    StrCpy $0 "$Folder\${MODULE32}"
    Call SetOldFileAside
    StrCpy $0 "$Folder\${MODULE64}"
    Call SetOldFileAside
    StrCpy $0 "$Folder\${NOTICES}"
    Call SetOldFileAside
    StrCpy $0 "$Folder\${UNINSTALLER}"
    Call SetOldFileAside
FunctionEnd

Function SetOldFileAside
    Call GetKind
    ${If} $1 != file
        Return
    ${EndIf}
    # One of the folders can be the other's folder x64.
    Call Identify
    StrCpy $8 $0
    StrCpy $9 $1
    StrCpy $0 "$INSTDIR\${MODULE32}"
    Call Identify
    ${If} $1 == $9
        Return
    ${EndIf}
    StrCpy $0 "$INSTDIR\${MODULE64}"
    Call Identify
    ${If} $1 == $9
        Return
    ${EndIf}
    StrCpy $0 $8
    Call SetAside
    ${If} $AsidePath == ""
        Call DescribeError
        ${Log} "Stays, since it is in use: $0: $ErrorText"
    ${EndIf}
FunctionEnd

Section
    AddSize ${INSTALLED_KB}
    Call ChooseFolder
    Call DescribeRun
    ${Try} SaveRegistry unchanged
    ${Try} UnpackFiles unchanged
    ${BeginUndo}
    ${Try} CreateFolders failed
    ${Try} CopyFiles failed
    ${Try} SwapFiles failed
    ${Try} RegisterModules failed
    ${Try} WriteEntry failed
    Call RemoveOldFiles
    Return

    failed:
    ${BeginRollback}
    Call UndoFiles
    Call RestoreRegistry
    unchanged:
    ${EndFailedRun} "installed"
SectionEnd
