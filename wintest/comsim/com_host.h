// The simulated Quarn host as a COM host: what kpx-comsim and the COM
// benchmark share. The simulated world's companions and resource component
// are served as COM classes of this process, the add-in is the real DLL's
// object made through COM, and the model's registry keys and files are put
// on the real machine (the Wine prefix) and taken away again.
#pragma once

#include "platform/win32/win32_api.h"

#include <filesystem>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "automation/automation_error.h"
#include "automation/object.h"
#include "platform/platform.h"
#include "platform/win32/com_bridge.h"
#include "sim/model_file.h"
#include "sim/scenario_file.h"

namespace wintest {

extern const char* const kResourceClsid;
extern const char* const kResourceProgId;

// ------------------------------------------------------------ the machine

// Registry trees a run may leave behind: the model's keys and what the
// add-in writes. Removed before and after each run, so runs do not meet.
std::vector<std::pair<HKEY, std::string>> TreesOf(const kpx::sim::ModelDef& model,
                                                  const kpx::sim::Scenario& scenario);
void RemoveTrees(const std::vector<std::pair<HKEY, std::string>>& trees);

// The paths a run may create on drive C: the model's files and folders, the
// scenario's files and the debug log. For each, the outermost part that does
// not exist yet is what the run adds, and what is removed after it; nothing
// that was there before is touched.
std::vector<std::filesystem::path> NewPaths(const std::vector<std::string>& windowsPaths);
void RemovePaths(const std::vector<std::filesystem::path>& paths);

// What a run is about to add is noted on drive C first (Journal), so that
// the next run removes it (RemoveJournaled) even when this one is stopped
// before it cleans up.
void Journal(const std::vector<std::filesystem::path>& paths);
void RemoveJournaled();

// --------------------------------------------------------------- the host

class SimClass;

// The COM classes of the simulated world, served from this process while
// registered.
struct Host {
  const kpx::sim::ModelDef& model;
  kpx::platform::ObjectFactory& objects;  // the simulation's, recording each creation
  kpx::win32::ServerLocks locks;
  std::map<const kpx::Object*, std::unique_ptr<kpx::win32::ExposedType>> types;
  std::map<const kpx::Object*, IID> requested;  // the interface a creation asked for
  kpx::win32::ComBridge bridge;
  std::vector<std::unique_ptr<SimClass>> classes;
  std::vector<DWORD> cookies;
  std::vector<std::string> progIdKeys;  // ProgID keys this run wrote

  Host(const kpx::sim::ModelDef& m, kpx::platform::ObjectFactory& o);
  ~Host();
  Host(const Host&) = delete;
  Host& operator=(const Host&) = delete;

  // Companions describe their own operations; host objects need nothing.
  const kpx::win32::ExposedType* Describe(const kpx::Object& o);
  void Register(const std::string& progId, const std::string& clsidText, bool resource);
  // The resource component and every companion of the model.
  void RegisterAll();
  void RevokeAll();
};

// ------------------------------------------------------------- creation

// The description a failed call left in the thread's IErrorInfo (taken
// from it), or "".
std::string PendingErrorDescription();
kpx::AutomationError ErrorOfCreation(HRESULT hr);

// An in-process object by ProgID: its IDispatch (the caller's reference),
// or as an Object of this host. Raise the creation's error.
IDispatch* CreateDispatchByProgId(const wchar_t* progId);
kpx::ObjectPtr CreateByProgId(kpx::win32::ComBridge& bridge, const wchar_t* progId);

// The add-in as the Quarn host makes it: by its ProgID, through COM; a
// failure the DLL answers with a bare HRESULT (E_NOTIMPL) and describes
// through IErrorInfo is read with that description, as the host reads it.
kpx::ObjectPtr AddInView(kpx::win32::ComBridge& bridge, IDispatch* addIn);
kpx::ObjectPtr CreateAddIn(kpx::win32::ComBridge& bridge);

}  // namespace wintest
