# The registration and the entry in the list of programs. All their values are in one table, by number: 0 to 8 the registration in the
# 32-bit view of the registry, 9 to 17 in the 64-bit view, 18 to 27 the entry. A run saves them before it changes any, as raw bytes with
# their type, so that a failed run puts back exactly what was there. Included for the setup and for the uninstaller.

!ifndef FIRST_VALUE_64
    !define FIRST_VALUE_64 9
    !define FIRST_ENTRY_VALUE 18
    !define LAST_VALUE 27
    # The values within one view.
    !define VALUE_THREADING 0
    !define VALUE_PATH 1
    !define VALUE_CLASS 2
    !define VALUE_FIRST_HANDLER 3
    !define VALUE_LAST_HANDLER 7
    !define VALUE_APPROVED 8
    !define /math VALUE_PATH_64 ${FIRST_VALUE_64} + ${VALUE_PATH}

    !define ENTRY_TEXTS "DisplayName,DisplayVersion,Publisher,DisplayIcon,InstallLocation,UninstallString,QuietUninstallString"
    !define ENTRY_VALUES "${ENTRY_TEXTS},EstimatedSize,NoModify,NoRepair"

    !define HKEY_CLASSES 0x80000000
    !define HKEY_MACHINE 0x80000002
    !define VIEW_64 0x100
    !define VIEW_32 0x200
    !define READ_ACCESS 0x20019
    !define READ_WRITE_ACCESS 0x2001f

    # The number of the value, and what SelectValue finds for it: its key's root, view, path, whether the key is ours alone, its name,
    # and what a registration must contain ($Module: the path of the module).
    Var Index
    Var Root
    Var View
    Var Key
    Var KeyIsOurs
    Var ValueName
    Var Expected
    Var Module
    # The saved values, 16 bytes each: a state (0 no key, 1 no value, 2 a value), type, length, address.
    Var SavedValues
    # The text of a value.
    Var Value

    # ${ForEachValue} FIRST LAST FUNCTION: selects each value that this Windows has and calls the function for it.
    !macro ForEachValue FIRST LAST FUNCTION
        StrCpy $Index ${FIRST}
        ${DoWhile} $Index <= ${LAST}
            ${CallShared} SelectValue
            ${If} $Is64BitWindows != ""
            ${OrIf} $Index < ${FIRST_VALUE_64}
            ${OrIf} $Index >= ${FIRST_ENTRY_VALUE}
                Call ${FUNCTION}
            ${EndIf}
            IntOp $Index $Index + 1
        ${Loop}
    !macroend
    !define ForEachValue "!insertmacro ForEachValue"

    # ${ForEachValue64} FIRST LAST FUNCTION: the same for the 64-bit view, by the numbers within a view.
    !macro ForEachValue64 FIRST LAST FUNCTION
        !define /redef /math FIRST_64 ${FIRST_VALUE_64} + ${FIRST}
        !define /redef /math LAST_64 ${FIRST_VALUE_64} + ${LAST}
        ${ForEachValue} ${FIRST_64} ${LAST_64} ${FUNCTION}
    !macroend
    !define ForEachValue64 "!insertmacro ForEachValue64"
!endif

Function ${UN}SelectValue
    StrCpy $KeyIsOurs yes
    StrCpy $ValueName ""
    StrCpy $Expected ""
    ${If} $Index >= ${FIRST_ENTRY_VALUE}
        StrCpy $Root ${HKEY_MACHINE}
        StrCpy $View ${VIEW_32}
        ${If} $Is64BitWindows != ""
            StrCpy $View ${VIEW_64}
        ${EndIf}
        StrCpy $Key "${UNINSTALL_KEY}"
        IntOp $0 $Index - ${FIRST_ENTRY_VALUE}
        IntOp $0 $0 + 1
        ${WordFind} "${ENTRY_VALUES}" "," "+$0" $ValueName
        Return
    ${EndIf}

    StrCpy $Root ${HKEY_CLASSES}
    StrCpy $View ${VIEW_32}
    StrCpy $0 $Index
    ${If} $0 >= ${FIRST_VALUE_64}
        StrCpy $View ${VIEW_64}
        IntOp $0 $0 - ${FIRST_VALUE_64}
    ${EndIf}
    ${Switch} $0
        ${Case} ${VALUE_THREADING}
            StrCpy $Key "CLSID\${CLASS_ID}\InProcServer32"
            StrCpy $ValueName "ThreadingModel"
            StrCpy $Expected "Apartment"
            ${Break}
        ${Case} ${VALUE_PATH}
            StrCpy $Key "CLSID\${CLASS_ID}\InProcServer32"
            StrCpy $Expected $Module
            ${Break}
        ${Case} ${VALUE_CLASS}
            StrCpy $Key "CLSID\${CLASS_ID}"
            StrCpy $Expected "${PRODUCT}"
            ${Break}
        ${Case} ${VALUE_APPROVED}
            StrCpy $Root ${HKEY_MACHINE}
            StrCpy $Key "Software\Microsoft\Windows\CurrentVersion\Shell Extensions\Approved"
            StrCpy $KeyIsOurs ""
            StrCpy $ValueName "${CLASS_ID}"
            StrCpy $Expected "${PRODUCT}"
            ${Break}
        ${Default}
            IntOp $0 $0 - ${VALUE_FIRST_HANDLER}
            IntOp $0 $0 + 1
            ${WordFind} "AllFilesystemObjects,Drive,Directory,Directory\Background,Folder" "," "+$0" $Key
            StrCpy $Key "$Key\shellex\ContextMenuHandlers\Tavi"
            StrCpy $Expected "${CLASS_ID}"
            ${Break}
    ${EndSwitch}
FunctionEnd

# Opens the key of the selected value with the access $2: its handle to $1, the code to $0.
Function ${UN}OpenKey
    IntOp $2 $2 | $View
    System::Call 'advapi32::RegOpenKeyExW(p $Root, w "$Key", i 0, i r2, *p.r1)i.r0'
FunctionEnd

# The text of the selected value, to $Value; empty if there is none.
Function ${UN}ReadText
    StrCpy $Value ""
    StrCpy $2 ${READ_ACCESS}
    Call ${UN}OpenKey
    ${If} $0 = 0
        # One character less than the buffer has: a text may come without its terminator.
        IntOp $2 ${NSIS_MAX_STRLEN} - 1
        IntOp $2 $2 * 2
        System::Call 'advapi32::RegQueryValueExW(p r1, w "$ValueName", p 0, *i.r3, w.r4, *i r2)i.r0'
        ${If} $0 = 0
            StrCpy $Value $4
        ${EndIf}
        System::Call 'advapi32::RegCloseKey(p r1)'
    ${EndIf}
FunctionEnd

Function ${UN}SaveRegistry
    System::Alloc 448
    Pop $SavedValues
    ${ForEachValue} 0 ${LAST_VALUE} ${UN}SaveValue
FunctionEnd

# The address of the saved value, to $9.
Function ${UN}FindSaved
    IntOp $9 $Index * 16
    IntOp $9 $9 + $SavedValues
FunctionEnd

Function ${UN}SaveValue
    Call ${UN}FindSaved
    System::Call '*$9(i 0, i 0, i 0, p 0)'
    StrCpy $2 ${READ_ACCESS}
    Call ${UN}OpenKey
    ${If} $0 <> 0
        ${If} $0 <> ${ERROR_FILE_NOT_FOUND}
            StrCpy $WinError $0
            ${FailWithError} "The registry key $Key cannot be read"
        ${EndIf}
        Return
    ${EndIf}
    System::Call 'advapi32::RegQueryValueExW(p r1, w "$ValueName", p 0, *i.r3, p 0, *i 0r4)i.r0'
    ${If} $0 = 0
        IntOp $5 $4 + 2
        System::Alloc $5
        Pop $5
        System::Call 'advapi32::RegQueryValueExW(p r1, w "$ValueName", p 0, p 0, p r5, *i r4)i.r0'
        System::Call '*$9(i 2, i r3, i r4, p r5)'
    ${ElseIf} $0 = ${ERROR_FILE_NOT_FOUND}
        System::Call '*$9(i 1, i 0, i 0, p 0)'
        StrCpy $0 0
    ${EndIf}
    System::Call 'advapi32::RegCloseKey(p r1)'
    ${If} $0 <> 0
        StrCpy $WinError $0
        ${FailWithError} "The registry value $Key $ValueName cannot be read"
    ${EndIf}
FunctionEnd

Function ${UN}RestoreRegistry
    ${ForEachValue} 0 ${LAST_VALUE} ${UN}RestoreValue
    Call ${UN}AnnounceChange
FunctionEnd

Function ${UN}RestoreValue
    Call ${UN}FindSaved
    System::Call '*$9(i.r6, i.r3, i.r4, p.r5)'
    ${If} $6 = 0
        Call ${UN}DeleteValue
        Return
    ${EndIf}
    IntOp $2 ${READ_WRITE_ACCESS} | $View
    System::Call 'advapi32::RegCreateKeyExW(p $Root, w "$Key", i 0, p 0, i 0, i r2, p 0, *p.r1, p 0)i.r0'
    ${If} $0 = 0
        ${If} $6 = 2
            System::Call 'advapi32::RegSetValueExW(p r1, w "$ValueName", i 0, i r3, p r5, i r4)i.r0'
        ${Else}
            System::Call 'advapi32::RegDeleteValueW(p r1, w "$ValueName")i.r0'
            ${If} $0 = ${ERROR_FILE_NOT_FOUND}
                StrCpy $0 0
            ${EndIf}
        ${EndIf}
        System::Call 'advapi32::RegCloseKey(p r1)'
    ${EndIf}
    ${If} $0 <> 0
        StrCpy $WinError $0
        ${FailWithError} "The registry value $Key $ValueName cannot be put back"
    ${EndIf}
FunctionEnd

# Deletes the selected value, and its key if the key is ours alone and empty then.
Function ${UN}DeleteValue
    StrCpy $2 ${READ_WRITE_ACCESS}
    Call ${UN}OpenKey
    ${If} $0 = ${ERROR_FILE_NOT_FOUND}
        Return
    ${EndIf}
    ${If} $0 = 0
        System::Call 'advapi32::RegDeleteValueW(p r1, w "$ValueName")i.r0'
        System::Call 'advapi32::RegQueryInfoKeyW(p r1, p 0, p 0, p 0, *i.r3, p 0, p 0, *i.r4, p 0, p 0, p 0, p 0)'
        System::Call 'advapi32::RegCloseKey(p r1)'
        ${If} $0 = ${ERROR_FILE_NOT_FOUND}
            StrCpy $0 0
        ${EndIf}
        ${If} $0 = 0
        ${AndIf} $KeyIsOurs != ""
        ${AndIf} $3 = 0
        ${AndIf} $4 = 0
            System::Call 'advapi32::RegDeleteKeyExW(p $Root, w "$Key", i $View, i 0)i.r0'
        ${EndIf}
    ${EndIf}
    ${If} $0 <> 0
        StrCpy $WinError $0
        ${FailWithError} "The registry value $Key $ValueName cannot be deleted"
    ${EndIf}
FunctionEnd

# Reads the version and the folder from the list of programs.
Function ${UN}ReadEntry
    ${UseNativeView}
    ReadRegStr $OldVersion HKLM "${UNINSTALL_KEY}" "DisplayVersion"
    ReadRegStr $OldFolder HKLM "${UNINSTALL_KEY}" "InstallLocation"
    ClearErrors
    ${If} $OldFolder != ""
        StrCpy $0 $OldFolder
        Call ${UN}FullPath
        StrCpy $OldFolder $0
    ${EndIf}
FunctionEnd

# One folder can have two spellings, such as a short name. $INSTDIR takes that of the list of programs; otherwise the setup would delete
# the old files as another folder's, and the uninstaller would not recognize its registration.
Function ${UN}UseInstalledSpelling
    System::Call 'kernel32::GetLongPathNameW(w "$INSTDIR", w.r0, i ${NSIS_MAX_STRLEN})i.r1'
    ${If} $1 > 0
    ${AndIf} $1 < ${NSIS_MAX_STRLEN}
        StrCpy $INSTDIR $0
    ${EndIf}
    ${If} $OldFolder == ""
    ${OrIf} $OldFolder == $INSTDIR
        Return
    ${EndIf}
    StrCpy $0 $OldFolder
    Call ${UN}Identify
    StrCpy $9 $1
    StrCpy $0 $INSTDIR
    Call ${UN}Identify
    ${If} $1 == $9
        ${Log} "$INSTDIR is the same folder as $OldFolder"
        StrCpy $INSTDIR $OldFolder
    ${EndIf}
FunctionEnd

# Tells the file manager to read the registration anew.
Function ${UN}AnnounceChange
    System::Call 'shell32::SHChangeNotify(i 0x08000000, i 0, p 0, p 0)'
FunctionEnd
