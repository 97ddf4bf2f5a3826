# The uninstallation. The old files are renamed first: if one cannot be, nothing has changed yet.

# Whether a registration in the 32-bit or 64-bit view stays, because it is not of this folder.
Var IsForeign32
Var IsForeign64

Function un.onInit
    StrCpy $0 "Uninstallation of ${PRODUCT} ${VERSION}"
    Call un.Start
    StrCpy $0 $INSTDIR
    Call un.FullPath
    StrCpy $INSTDIR $0
    Call un.ReadEntry
    Call un.UseInstalledSpelling
    # The current folder, as for the setup.
    SetOutPath $WINDIR
FunctionEnd

Function un.OnCancel
    StrCpy $0 ${EXIT_CANCELLED}
    Call un.EndLog
FunctionEnd

Function un.onUninstSuccess
    StrCpy $0 0
    Call un.EndLog
FunctionEnd

# --- files

Function un.SetFilesAside
    StrCpy $9 "$INSTDIR\${MODULE32}"
    ${Try} un.SetFileAside done
    StrCpy $9 "$INSTDIR\${MODULE64}"
    ${Try} un.SetFileAside done
    StrCpy $9 "$INSTDIR\${NOTICES}"
    ${Try} un.SetFileAside done
    Call un.IsRunningInPlace
    ${If} $0 != ""
        # NSIS keeps its file open in a way that prevents renaming.
        ${Log} "Stays, since it is running: $EXEPATH"
        Return
    ${EndIf}
    StrCpy $9 "$INSTDIR\${UNINSTALLER}"
    ${Try} un.SetFileAside done
    done:
FunctionEnd

# Whether this program is the installed uninstaller, which _?= runs in place, and not its copy in the temporary folder, to $0.
Function un.IsRunningInPlace
    StrCpy $0 $EXEPATH
    Call un.Identify
    StrCpy $9 $1
    StrCpy $0 "$INSTDIR\${UNINSTALLER}"
    Call un.Identify
    StrCpy $0 ""
    ${If} $1 == $9
        StrCpy $0 yes
    ${EndIf}
FunctionEnd

# Renames the file $9, if there is one.
Function un.SetFileAside
    StrCpy $0 $9
    Call un.GetKind
    ${If} $1 != file
        Return
    ${EndIf}
    Call un.SetAside
    ${If} $WinError <> 0
        ${FailWithError} "$9 is in use and cannot be removed"
        Return
    ${EndIf}
    ${Undo} move $AsidePath $9
FunctionEnd

# --- registration

# Whether the registration in a view is of another folder: $Index is the path's value, $Module our path, the answer goes to $0.
Function un.IsRegistrationForeign
    Call un.SelectValue
    Call un.ReadText
    StrCpy $0 ""
    ${If} $Value == ""
    ${OrIf} $Value == $Module
        Return
    ${EndIf}
    # Our file may be registered under another spelling of its path.
    StrCpy $0 $Value
    Call un.Identify
    StrCpy $9 $1
    StrCpy $0 $Module
    Call un.Identify
    StrCpy $0 ""
    ${If} $1 != $9
        ${Log} "Stays registered, since it is not in the folder of this version: $Value"
        StrCpy $0 yes
    ${EndIf}
FunctionEnd

Function un.FindForeignRegistrations
    StrCpy $Index ${VALUE_PATH}
    StrCpy $Module "$INSTDIR\${MODULE32}"
    Call un.IsRegistrationForeign
    StrCpy $IsForeign32 $0
    StrCpy $IsForeign64 ""
    ${If} $Is64BitWindows != ""
        StrCpy $Index ${VALUE_PATH_64}
        StrCpy $Module "$INSTDIR\${MODULE64}"
        Call un.IsRegistrationForeign
        StrCpy $IsForeign64 $0
    ${EndIf}
FunctionEnd

Function un.UnregisterModules
    ${If} $IsForeign32 == ""
        ${ForEachValue} ${VALUE_THREADING} ${VALUE_CLASS} un.DeleteValue
        ${ForEachValue} ${VALUE_APPROVED} ${VALUE_APPROVED} un.DeleteValue
    ${EndIf}
    ${If} $IsForeign64 == ""
        ${ForEachValue64} ${VALUE_THREADING} ${VALUE_CLASS} un.DeleteValue
        ${ForEachValue64} ${VALUE_APPROVED} ${VALUE_APPROVED} un.DeleteValue
    ${EndIf}
    # Both word sizes share the handler keys.
    ${If} $IsForeign32 == ""
    ${AndIf} $IsForeign64 == ""
        ${ForEachValue} ${VALUE_FIRST_HANDLER} ${VALUE_LAST_HANDLER} un.DeleteHandler
        ${ForEachValue64} ${VALUE_FIRST_HANDLER} ${VALUE_LAST_HANDLER} un.DeleteHandler
    ${EndIf}
    ${If} $Failure == ""
        ${If} $IsForeign32 == ""
        ${OrIf} $IsForeign64 == ""
            ${Log} "Deleted: the registration"
        ${EndIf}
    ${EndIf}
FunctionEnd

# Deletes the handler key that is selected, unless it is another program's.
Function un.DeleteHandler
    Call un.ReadText
    ${If} $Value == $Expected
        Call un.DeleteValue
    ${EndIf}
FunctionEnd

# --- the entry in the list of programs

Function un.DeleteEntry
    ${If} $OldFolder == ""
    ${OrIf} $OldFolder != $INSTDIR
        ${Log} "The list of programs has no entry of this folder"
        Return
    ${EndIf}
    ${ForEachValue} ${FIRST_ENTRY_VALUE} ${LAST_VALUE} un.DeleteValue
    ${If} $Failure == ""
        ${Log} "Deleted: the entry in the list of programs"
    ${EndIf}
FunctionEnd

Section Uninstall
    ${Log} "Folder: $INSTDIR"
    Call un.FindForeignRegistrations
    ${Try} un.SaveRegistry unchanged
    ${BeginUndo}
    ${Try} un.SetFilesAside failed
    ${Try} un.UnregisterModules failed
    ${Try} un.DeleteEntry failed
    Call un.AnnounceChange
    StrCpy $Folder $INSTDIR
    Call un.ClearFolder
    Return

    failed:
    ${BeginRollback}
    Call un.RestoreRegistry
    Call un.UndoFiles
    unchanged:
    ${EndFailedRun} "uninstalled"
SectionEnd
