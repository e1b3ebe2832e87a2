# kpxdoctor under Wine, sourced by wintest/run.sh once both builds have run:
# with the x86 and the x64 DLLs registered, as a 64-bit machine serving the
# 32-bit host and 64-bit hosts has them, the rest of a working Quarn
# installation is laid out in the prefix; both doctors must find it intact.
# Then it is broken one way at a time, and both doctors must name the fault
# with the right verdict and exit code. Needs run.sh's loader, register and
# winpath; counts into doctor_checks and doctor_fails.

doctor_checks=0
doctor_fails=0
doctor_dir="C:\\kpxdoctor"

doctor_note() {  # what: a check failed
  doctor_fails=$((doctor_fails + 1))
  echo "wintest: doctor: FAILED: $*"
}

# Registry edits in the 32-bit view, the one the host and the add-in read.
reg32() { "$WINE32" reg "$@" /f >/dev/null 2>&1; }

doctor_world() {
  local drive="$WINEPREFIX/drive_c/kpxdoctor" i=0 progid
  mkdir -p "$drive/Quarn/vc/dlls" "$drive/VS/Common/Tools" "$drive/logs"
  # Any 32-bit Windows file serves where only existence is checked.
  for f in Quarn/vc/dlls/kpxideaddin.dll VS/Common/Tools/windiff.exe companion.dll; do
    cp "$BUILD/win-x86/src/com/kpxres.dll" "$drive/$f"
  done
  printf 'Item=Component\r\nStereotype=exe\r\nItem=Class\r\nStereotype=atlobject\r\n' >"$drive/Quarn/vc/kpxvc.cfg"
  reg32 add "HKLM\\SOFTWARE\\Microsoft\\VisualStudio\\6.0\\Setup\\Microsoft Visual C++" /v ProductDir /d "$doctor_dir\\VS\\VC98"
  reg32 add "HKLM\\SOFTWARE\\Microsoft\\VisualStudio\\6.0\\Setup\\Microsoft Visual Studio" /v ProductDir /d "$doctor_dir\\VS"
  reg32 add "HKCU\\Software\\Microsoft\\DevStudio\\6.0\\AddIns\\kpxIDEAddin.DSAddIn" /v Filename /d "$doctor_dir\\Quarn\\vc\\dlls\\kpxideaddin.dll"
  reg32 add "HKLM\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio" /v Debug /t REG_DWORD /d 2130706560
  reg32 add "HKLM\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio" /v DebugOutputFile /d "$doctor_dir\\logs\\kpx.log"
  reg32 add "HKCU\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio" /v Active /d Yes
  reg32 add "HKLM\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VC++" /v InstallDir /d "$doctor_dir\\Quarn\\vc"
  reg32 add "HKLM\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VC++" /v StereotypeCfgFile /d kpxvc.cfg
  for progid in kpxModelAssist.API kpxmdcnv.API tznclwiz.api kpxImportMFC.API kpxLangSupport.kpxStatementGenerator \
      kpxCodeView.kpxCodeViewAPI kpxatltools.kpxatlGUI kpxatlassist.kpxatlAPI; do
    i=$((i + 1))
    reg32 add "HKCR\\$progid\\CLSID" /ve /d "{6B3C0A11-0D5E-4F6A-9C1B-2A7D8E9F0A$(printf %02d $i)}"
    reg32 add "HKCR\\CLSID\\{6B3C0A11-0D5E-4F6A-9C1B-2A7D8E9F0A$(printf %02d $i)}\\InprocServer32" /ve /d "$doctor_dir\\companion.dll"
  done
  for clsid in "{05D99488-AB9F-11D2-B9EB-006008BF3ACB}" "{CFD996E3-1393-11D3-B9F3-006008BF3ACB}" \
      "{B025E5DB-4064-11D3-B9F7-006008BF3ACB}"; do
    reg32 add "HKCR\\CLSID\\$clsid\\InprocServer32" /ve /d "$doctor_dir\\companion.dll"
  done
}

doctor_world_gone() {
  reg32 delete "HKLM\\SOFTWARE\\Microsoft\\VisualStudio"
  reg32 delete "HKCU\\Software\\Microsoft\\DevStudio"
  reg32 delete "HKLM\\SOFTWARE\\Tolvek Software"
  reg32 delete "HKCU\\SOFTWARE\\Tolvek Software"
  local progid i=0
  for progid in kpxModelAssist.API kpxmdcnv.API tznclwiz.api kpxImportMFC.API kpxLangSupport.kpxStatementGenerator \
      kpxCodeView.kpxCodeViewAPI kpxatltools.kpxatlGUI kpxatlassist.kpxatlAPI; do
    i=$((i + 1))
    reg32 delete "HKCR\\$progid"
    reg32 delete "HKCR\\CLSID\\{6B3C0A11-0D5E-4F6A-9C1B-2A7D8E9F0A$(printf %02d $i)}"
  done
  for clsid in "{05D99488-AB9F-11D2-B9EB-006008BF3ACB}" "{CFD996E3-1393-11D3-B9F3-006008BF3ACB}" \
      "{B025E5DB-4064-11D3-B9F7-006008BF3ACB}"; do
    reg32 delete "HKCR\\CLSID\\$clsid"
  done
  rm -rf "$WINEPREFIX/drive_c/kpxdoctor"
}

# doctor_expect CASE EXIT [ID VERDICT]...: both doctors exit with EXIT and
# give each ID its VERDICT; with no ID given, every check must be OK.
doctor_expect() {
  local case=$1 want_rc=$2 arch out rc
  shift 2
  for arch in x86 x64; do
    out="$BUILD/doctor/$case-$arch.json"
    rc=0
    timeout 120 "$(loader "$arch")" "$BUILD/win-$arch/kpxdoctor.exe" --json >"$out.raw" 2>&1 || rc=$?
    tr -d '\r' <"$out.raw" >"$out"
    rm -f "$out.raw"
    doctor_checks=$((doctor_checks + 1))
    [ "$rc" -eq "$want_rc" ] || doctor_note "$case, $arch: exit $rc, expected $want_rc ($out)"
    if [ $# -eq 0 ]; then
      if grep -q '"verdict":"\(WARN\|FAIL\|SKIP\)"' "$out"; then
        doctor_note "$case, $arch: not every check OK:"
        grep '"verdict":"\(WARN\|FAIL\|SKIP\)"' "$out" | sed 's/^/wintest: doctor:   /'
      fi
    fi
    local pair=("$@")
    for ((i = 0; i < ${#pair[@]}; i += 2)); do
      doctor_checks=$((doctor_checks + 1))
      grep -qF "{\"id\":\"${pair[i]}\",\"verdict\":\"${pair[i + 1]}\"" "$out" ||
        doctor_note "$case, $arch: ${pair[i]} is not ${pair[i + 1]}: $(grep -F "\"id\":\"${pair[i]}\"" "$out")"
      # WARN and FAIL say what to do.
      if [ "${pair[i + 1]}" != OK ] && ! grep -F "\"id\":\"${pair[i]}\"" "$out" | grep -q '"fix":"[^"]'; then
        doctor_note "$case, $arch: ${pair[i]} gives no fix"
      fi
    done
  done
}

doctor_phase() {
  local wine32_dll res32
  mkdir -p "$BUILD/doctor"
  echo "wintest: doctor: both builds registered, an installation laid out, broken one way at a time"
  register x86 on && register x64 on || { doctor_note "regsvr32 failed"; return; }
  doctor_world

  doctor_expect intact 0

  res32=$(winpath "$BUILD/win-x86/src/com/kpxres.dll")
  "$WINE32" regsvr32 /s /u "$res32"
  doctor_expect resource-unregistered 1 resource-registered-32 FAIL
  "$WINE32" regsvr32 /s "$res32"

  register x86 off
  doctor_expect only-x64-registered 1 addin-registered-32 FAIL resource-registered-32 FAIL addin-registered-64 OK
  register x86 on

  reg32 delete "HKLM\\SOFTWARE\\Microsoft\\VisualStudio\\6.0\\Setup\\Microsoft Visual C++" /v ProductDir
  doctor_expect no-product-dir 1 visual-cpp FAIL
  reg32 add "HKLM\\SOFTWARE\\Microsoft\\VisualStudio\\6.0\\Setup\\Microsoft Visual C++" /v ProductDir /d "$doctor_dir\\VS\\VC98"

  mv "$WINEPREFIX/drive_c/kpxdoctor/Quarn/vc/dlls/kpxideaddin.dll" "$WINEPREFIX/drive_c/kpxdoctor/ide.dll"
  doctor_expect no-ide-addin-file 1 ide-addin FAIL
  mv "$WINEPREFIX/drive_c/kpxdoctor/ide.dll" "$WINEPREFIX/drive_c/kpxdoctor/Quarn/vc/dlls/kpxideaddin.dll"

  reg32 add "HKCU\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio" /v Active /d No
  doctor_expect visualstudio-off 0 visualstudio-addin WARN
  reg32 add "HKCU\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio" /v Active /d Yes

  reg32 delete "HKCR\\kpxatlassist.kpxatlAPI"
  doctor_expect companion-missing 0 companion:kpxatlassist.kpxatlAPI WARN
  reg32 add "HKCR\\kpxatlassist.kpxatlAPI\\CLSID" /ve /d "{6B3C0A11-0D5E-4F6A-9C1B-2A7D8E9F0A08}"

  reg32 add "HKLM\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio" /v DebugOutputFile /d "$doctor_dir\\missing\\kpx.log"
  doctor_expect log-folder-missing 0 debug-log WARN
  reg32 add "HKLM\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio" /v DebugOutputFile /d "$doctor_dir\\logs\\kpx.log"

  doctor_expect intact-again 0

  # The mask the doctor computes and writes is the one the registry holds.
  local got
  "$WINE32" "$BUILD/win-x86/kpxdoctor.exe" mask --ids ADDIN --levels ERROR,TRACE --set >/dev/null 2>&1
  got=$("$WINE32" reg query "HKLM\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio" /v Debug 2>/dev/null | tr -d '\r' | awk '/Debug/ {print $3}')
  doctor_checks=$((doctor_checks + 1))
  [ "$got" = "0x12000080" ] || doctor_note "mask --set wrote '$got', expected 0x12000080"

  doctor_world_gone
  register x64 off
  register x86 off
}
