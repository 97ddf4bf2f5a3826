# The setup of the file-manager extension: one program for 32-bit and 64-bit Windows. scripts/package compiles it in a folder that
# holds its input: tavishell32.dll, tavishell64.dll, third-party-notices.txt, setup.ico and wizard.bmp.
#
# Conventions of these files: an upper-case variable belongs to the program; $0 to $9 are scratch and are undefined after a call.
# Functions report an error in $Failure, never in the error flag of NSIS.

Unicode true
SetCompressor /SOLID lzma
# The times of the input would make each build different.
SetDateSave off
CRCCheck force
RequestExecutionLevel admin
ManifestSupportedOS all
ManifestDPIAware true
XPStyle on

!getdllversion "tavishell32.dll" MODULE32_
!getdllversion "tavishell64.dll" MODULE64_
!define VERSION "${MODULE32_1}.${MODULE32_2}.${MODULE32_3}"
!if "${VERSION}.${MODULE32_4}" != "${MODULE64_1}.${MODULE64_2}.${MODULE64_3}.${MODULE64_4}"
    !error "the modules have different versions"
!endif
# For scripts/package.
!appendfile "version.txt" "${VERSION}"

!define PRODUCT "Tavi Remote Backup Shell Extension"
!define PUBLISHER "Tavi"

Name "${PRODUCT}"
Caption "${PRODUCT} ${VERSION} Setup"
UninstallCaption "${PRODUCT} ${VERSION} Uninstall"
BrandingText "${PRODUCT} ${VERSION}"
OutFile "tavishell-setup.exe"
ShowInstDetails hide
ShowUninstDetails hide

VIProductVersion "${VERSION}.${MODULE32_4}"
VIFileVersion "${VERSION}.${MODULE32_4}"
VIAddVersionKey CompanyName "${PUBLISHER}"
VIAddVersionKey FileDescription "${PRODUCT} Setup"
VIAddVersionKey FileVersion "${VERSION}"
VIAddVersionKey LegalCopyright ""
VIAddVersionKey ProductName "${PRODUCT}"
VIAddVersionKey ProductVersion "${VERSION}"

!ifdef SIGN
    !uninstfinalize '"${SIGN}" "%1"' = 0
!endif

!include LogicLib.nsh
!include FileFunc.nsh
!include WordFunc.nsh
!include WinVer.nsh
!include x64.nsh
!include MUI2.nsh

!include "${SOURCE}/common.nsh"

!define UN ""
!include "${SOURCE}/start.nsh"
!include "${SOURCE}/files.nsh"
!include "${SOURCE}/registry.nsh"
!undef UN
!define UN "un."
!include "${SOURCE}/start.nsh"
!include "${SOURCE}/files.nsh"
!include "${SOURCE}/registry.nsh"
!undef UN

!include "${SOURCE}/pages.nsh"
!include "${SOURCE}/install.nsh"
!include "${SOURCE}/uninstall.nsh"
