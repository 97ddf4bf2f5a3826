# The cases of setup_test; sourced by it, never run. Each begins at the clean start.

approved() { echo "HKLM\\Software\\$1Microsoft\\Windows\\CurrentVersion\\Shell Extensions\\Approved"; } # WOW
# The list of approved extensions is lost, so that a registration in this view fails.
without_approved() { # WOW
    local key
    key=$(approved "$1")
    gone="$key"$'\n'"$key: \"{11111111-2222-3333-4444-555555555555}\"=\"Foreign\""
}
delete_approved() { echo "reg delete \"$(approved "$1")\" /f"; } # WOW
restore_keys='regedit /S C:\setup-test\baseline64.reg'

case_fresh() {
    local kilobytes found default_log
    default_log=$(echo "$c"/users/*/Temp)/tavishell-setup.log
    rm -f "$default_log"
    (cd "$shared" && sha256sum -c --quiet current.exe.sha256)
    check "the version of the setup" "$version" "$(file_version "$shared/current.exe")"
    expect "a fresh installation" "$(installed "$version")" 0 'C:\setup-test\current.exe /S'
    kilobytes=$((($(find "$c/Program Files/Tavi" -type f -printf '%s+')0) / 1024))
    found=$(grep -a '^"EstimatedSize"=dword:' "$shared/machine.hive")
    found=$((16#${found#*:}))
    [ $((found - kilobytes)) -le 16 ] && [ $((kilobytes - found)) -le 16 ] || die "the estimated size is $found KB, not $kilobytes"
    cp "$default_log" "$shared/setup.log"
    logged "$version" "$tavi" "exit code 0"
    ! grep -qi warning "$shared/setup.log" || die "the log has a warning"
    run 0 "\"$tavi\\uninstall.exe\" /S"
    await_uninstaller
    expect "an uninstallation that returned at once"
    check "the uninstaller's part of the log" 2 "$(grep -c 'exit code 0' "$default_log")"
}

# The same input gives the same bytes, wherever and whenever.
case_reproducible() {
    (
        umask 077
        export TZ=NZST-12
        touch -d '2001-02-03' "$work/modules/$version-32.dll"
        package "$version" again
    )
    cmp "$shared/current.exe" "$shared/again.exe"
}

case_again() {
    expect "an older version" "$(installed $old_version)" 0 "$old"
    expect "an upgrade" "$(installed "$version")" 0 "$current"
    rm "$c/Program Files/Tavi/x64/tavishell.dll" "$c/Program Files/Tavi/third-party-notices.txt"
    echo damaged >"$c/Program Files/Tavi/tavishell.dll"
    run 0 'reg delete HKCR\Drive\shellex\ContextMenuHandlers\Tavi /f' 0 "reg add HKCR\\CLSID\\$id\\InProcServer32 /ve /d C:\\nothing /f" \
        0 "reg delete \"$(approved "$wow")\" /v $id /f" 0 "$current"
    expect "a repair" "$(installed "$version")"
    run 0 "$old"
    logged $old_version "$version"
    expect "an older version over a newer one" "$(installed $old_version)"
    expect "an uninstallation" "" 0 "$(uninstall)"
}

# File managers hold the modules: only the old files stay, under other names, until the next start.
case_held() {
    local first
    run 0 "$old"
    hold first32 32
    hold first64 64
    run 0 "$current"
    first=$(held 32 $old_version; held 64 $old_version)
    expect "an upgrade of modules in use" "$(installed "$version"; echo "$first")"
    hold second64 64
    expect "an older version over them" "$(installed $old_version; echo "$first"; held 64 "$version" 2)" 0 "$old"
    release first32 first64 second64
    expect "the next run deletes what is free" "$(installed "$version"; { echo "$first"; held 64 "$version" 2; } | grep '^pending')" 0 "$current"
    restart
    expect "the next start leaves the new files alone" "$(installed "$version")"
    run 0 "$(uninstall)"
}

case_restart() {
    local left
    run 0 "$current"
    hold first32 32
    hold first64 64
    left=$(held 32 "$version"; held 64 "$version"; printf 'pending %s>\n' "$tavi" "$tavi\\x64")
    expect "an uninstallation of modules in use" "$left" 0 "$(uninstall)"
    expect "an installation before the next start" "$(installed "$version"; echo "$left")" 0 "$current"
    restart
    expect "the next start leaves it alone" "$(installed "$version")"
    hold second64 64
    expect "an uninstallation of one module in use" "$(held 64 "$version"; printf 'pending %s>\n' "$tavi" "$tavi\\x64")" 0 "$(uninstall)"
    restart
    expect "the next start deletes the rest"
}

# Where a file or folder must be, there is one of the other kind.
case_unwritable() {
    local commands=() folder lines
    printf x >"$c/o1"
    mkdir -p "$c"/o2/{tavishell.dll,foreign} "$c/o3" "$c"/o4/x64/tavishell.dll "$c"/o5/uninstall.exe "$c"/o6/third-party-notices.txt
    printf x >"$c/o3/x64"
    lines=$(file_lines | grep -E '^[a-z]+ o[1-6]')
    for folder in 'C:\o1' 'C:\o2' 'C:\o3' 'C:\o4' 'C:\o5' 'C:\o6' 'Q:\no such drive'; do
        commands+=(1603 "$current /D=$folder")
    done
    run "${commands[@]}"
    expect "failed fresh installations leave nothing" "$lines"
    logged 'C:\o1' 'C:\o2\tavishell.dll' 'C:\o3\x64' 'C:\o4\x64\tavishell.dll' 'C:\o5\uninstall.exe' 'C:\o6\third-party-notices.txt' 1603

    run 0 "$old"
    # A file that is a program's input can be neither deleted nor renamed.
    run 1603 "$current <\"$tavi\\x64\\tavishell.dll\"" 1603 "$(uninstall) <\"$tavi\\x64\\tavishell.dll\""
    expect "a failed upgrade and a failed uninstallation change nothing" "$lines"$'\n'"$(installed $old_version)"
    run 0 "$(uninstall)"
    rm -r "$c"/o[1-6]
}

# The registration of one module fails, so that nothing of either may stay: after none, and after an older version, in use or not.
case_registration() {
    local view before
    for view in "$wow" ''; do
        without_approved "$view"
        run 0 "$(delete_approved "$view")" 1603 "$current"
        logged Approved
        expect "a failed fresh installation"
        run 0 "$restore_keys" 0 "$old"
        before=$(installed $old_version | grep -vF "$(approved "$view")")
        hold first32 32
        hold first64 64
        expect "a failed upgrade of modules in use" "$before" 0 "$(delete_approved "$view")" 1603 "$current"
        release first32 first64
        expect "a failed upgrade" "$before" 1603 "$current"
        run 0 "$(uninstall)" 0 "$restore_keys"
    done
}

case_folder() {
    local foreign
    expect "an installation in another folder" "$(installed "$version" 'C:\Other Folder')" 0 "$current /D=C:\\Other Folder"
    expect "a further run stays in its folder" "$(installed $old_version 'C:\Other Folder')" 0 "$old"
    printf foreign >"$c/Other Folder/foreign.txt"
    mkdir "$c/obstacle"
    printf x >"$c/obstacle/x64"
    run 1603 "$current /D=C:\\obstacle"
    rm -r "$c/obstacle"
    foreign=$(lines_of_file 'C:\Other Folder\foreign.txt' "$(printf foreign | sum)")
    expect "a failed move" "$(installed $old_version 'C:\Other Folder'; echo "$foreign")"
    hold first64 64
    run 0 "$current /D=$tavi"
    expect "a move" "$(installed "$version"; echo "$foreign"; held 64 $old_version 1 'C:\Other Folder'; echo 'pending C:\Other Folder\x64>')"
    restart
    expect "the next start leaves a foreign file only" "$(installed "$version"; echo "$foreign")"
    run 0 "$(uninstall)"
    rm -r "$c/Other Folder"
}

# Modules that regsvr32 has registered, without an entry in the list of programs.
case_by_hand() {
    local here there foreign
    foreign=$(lines_of_file "$tavi\\taviservice.exe" "$(printf foreign | sum)")
    place "$work/modules/$old_version-32.dll" "$tavi\\tavishell.dll"
    place "$work/modules/$old_version-64.dll" "$tavi\\x64\\tavishell.dll"
    printf foreign >"$c/Program Files/Tavi/taviservice.exe"
    mkdir "$c/Program Files/Tavi/uninstall.exe"
    here=$(module_lines 32 $old_version "$tavi"; module_lines 64 $old_version "$tavi"
        registered "$tavi\\tavishell.dll" "$tavi\\x64\\tavishell.dll"; echo "$foreign")
    run 0 "$(regsvr 32) \"$tavi\\tavishell.dll\"" 0 "$(regsvr 64) \"$tavi\\x64\\tavishell.dll\"" 1603 "$current"
    expect "a failed installation over modules in the same folder" "$here"$'\n''folder Program Files/Tavi/uninstall.exe'
    rmdir "$c/Program Files/Tavi/uninstall.exe"
    expect "an installation over modules in the same folder" "$(installed "$version"; echo "$foreign")" 0 "$current"
    expect "its uninstallation" "$foreign" 0 "$(uninstall)"

    place "$work/modules/$old_version-32.dll" 'C:\By Hand\tavishell.dll'
    there=$(module_lines 32 $old_version 'C:\By Hand'; echo "$foreign")
    without_approved ''
    run 0 "$(regsvr 32) \"C:\\By Hand\\tavishell.dll\"" 0 "$(delete_approved '')" 1603 "$current"
    expect "a failed installation beside a 32-bit module" "$there"$'\n'"$(registered 'C:\By Hand\tavishell.dll' '')"
    run 0 "$restore_keys" 0 "$current"
    gone=''
    expect "an installation beside it" "$there"$'\n'"$(installed "$version")"
    expect "its uninstallation" "$there" 0 "$(uninstall)"
    rm -r "$c/By Hand" "$c/Program Files/Tavi"
}
regsvr() { [ "$1" = 64 ] && echo 'C:\windows\system32\regsvr32.exe /s' || echo 'C:\windows\syswow64\regsvr32.exe /s'; } # BITS

case_damaged() {
    expect "damaged setups do nothing" "" 2 'C:\setup-test\damaged.exe /S' 2 'C:\setup-test\short.exe /S'
}

# Presses buttons of the dialogs by their numbers: 1 is Next, Install or Finish, 2 Cancel, 7 No. Prints the texts.
press() { windows 'C:\setup-test\probe.exe' pages "$product" "$@" >"$out/pages.txt" || die "the dialogs are not as expected"; }
shown() { grep -qF -- "$1" "$out/pages.txt" || { cat "$out/pages.txt" >&2; die "no dialog shows: $1"; }; }
start_dialogs() { start dialogs /dev/null cmd /c "$@"; }
end_dialogs() { await_end dialogs 60; check "the exit code of the dialogs" "$1" "$ended"; }

# The dialogs, with a second setup at the same time.
case_pages() {
    local own
    start_dialogs 'C:\setup-test\current.exe'
    press
    shown "You need not close any window"
    run 1618 "$current" 1618 'C:\setup-test\old.exe /S'
    own=$(file_lines | grep '/Temp/ns')
    expect "a second setup does nothing" "$own"
    press 1 1 1
    shown "$tavi"
    end_dialogs 0
    expect "an installation by dialogs" "$(installed "$version")"
    start_dialogs "$tavi\\uninstall.exe"
    press
    run 1618 "$current" 1618 "$(uninstall)"
    press 1 1
    await_uninstaller
    expect "an uninstallation by dialogs"
    start_dialogs 'C:\setup-test\current.exe'
    press 1 2
    end_dialogs 1
    expect "a cancelled installation"
}

# Without the service the setup warns, since the file manager waits for it at each load of the module.
case_service() {
    local key="HKLM\\Software\\${wow}Tavi"
    gone=$(grep -F "$key" "$base/state")
    run 0 "reg delete \"$key\" /f"
    start_dialogs 'C:\setup-test\current.exe'
    press 1 7
    shown "service is not installed"
    end_dialogs 1
    expect "the question about the service, answered with no"
    run 0 "$current"
    logged Warning
    expect "an installation without the service" "$(installed "$version")"
    # It cannot delete itself; its caller does.
    expect "an uninstallation in place" "$(lines_of_file "$tavi\\uninstall.exe" "$version")" 0 "\"$tavi\\uninstall.exe\" $logging _?=$tavi"
    rm -r "$c/Program Files/Tavi"
    run 0 "$restore_keys"
}

case_windows32() {
    use 32
    begin
    expect "an installation on a 32-bit Windows" "$(installed "$version")" 0 "$current"
    expect "an uninstallation" "" 0 "$(uninstall)"
}
