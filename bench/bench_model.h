// The world the host-call benchmarks run in, natively and through COM.
#pragma once

namespace kpx::bench {

// One plain class assigned to a VC++ component that passes the component
// check: the longest way through the class menu's rules (components, then
// stereotype, then class kind). The IDE add-in is registered already and
// logging is off, as on a user's machine after the first start.
inline constexpr const char* kHostCallsModel = R"({
  "registry": {
    "HKLM\\SOFTWARE\\Tolvek Software\\Quarn\\AddIns\\VisualStudio": {"Debug": 0},
    "HKLM\\SOFTWARE\\Microsoft\\VisualStudio\\6.0\\Setup\\Microsoft Visual C++": {"ProductDir": "C:\\VC98"},
    "HKCU\\Software\\Microsoft\\DevStudio\\6.0\\AddIns\\kpxIDEAddin.DSAddIn": {
      "@": "1", "Filename": "C:\\Program Files\\Quarn\\vc\\dlls\\kpxideaddin.dll"}
  },
  "files": {"C:\\Program Files\\Quarn\\vc\\dlls\\kpxideaddin.dll": ""},
  "addins": [{"name": "VC++", "settings": {"Events": {"OnUser1": "C|Generate docs|Tools.DocGen"}}},
             {"name": "VisualStudio"}],
  "companions": [{"clsid": "{CFD996E3-1393-11D3-B9F3-006008BF3ACB}",
                  "operations": ["Init", "Terminate", "ShowComponentOptions", "CheckComponent"],
                  "members": {"Terminate": {}, "CheckComponent": {"returns": true}}}],
  "model": {
    "elements": [{"kind": "Module", "name": "Shapes", "language": "VC++"},
                 {"kind": "Class", "name": "CShape", "language": "VC++", "components": ["Shapes"]}],
    "selection": ["CShape"]
  }
})";

}  // namespace kpx::bench
