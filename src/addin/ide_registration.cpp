// Round-trip engineering needs the add-in's partner inside Developer Studio.
// Each activation makes sure Developer Studio knows it, switching it back on
// when the user turned it off there.
#include <string>

#include "addin/ide_registration.h"

#include "addin/api.h"
#include "automation/error_styles.h"
#include "automation/vb_strings.h"
#include "shared/host_ids.h"
#include "shared/shared_registryapi2.h"

namespace kpx {

namespace {

constexpr int32_t kMsgNoVisualCpp = 5031;
constexpr int32_t kMsgCannotRegister = 1218;
constexpr int32_t kMsgNoIdeAddInFile = 1219;

}  // namespace

std::string AddInLocation(std::string_view path, bool useDefault) {
  std::string location = Trim(path);
  while (!location.empty() && location.back() == '\\') location.pop_back();
  if (location.empty() && useDefault) location = kDefaultLocation;
  return location;
}

std::string API::GetLocation(const std::string& path, bool useDefault) {
  module_.DebugLog("kpxAddin.GetLocation(Path, UseDefault)", logid::ADDIN, loglevel::TRACE);
  return AddInLocation(path, useDefault);
}

bool API::RegisterIDEAddIn(const ObjectPtr& QuarnApp) {
  ResumeNext onError;
  platform::Registry& registry = module_.platform().registry;
  auto report = [&](int32_t messageId) {
    onError([&] {
      CallMethod(QuarnApp, hostid::kWriteErrorLog, {Variant(module_.resources().LoadResString(messageId))});
    });
    return false;
  };

  std::string productDir;
  onError([&] {
    productDir = RegistryQueryValue(registry, RootKey::LocalMachine, kVisualCppSetupKey, "ProductDir").toString();
  });
  if (productDir.empty()) return report(kMsgNoVisualCpp);

  std::string applicationPath;
  onError([&] { applicationPath = GetProperty(QuarnApp, hostid::kApplicationPath).toString(); });
  const std::string file = GetLocation(applicationPath, false) + std::string(kIdeAddInFile);
  if (!module_.platform().files.Exists(file)) return report(kMsgNoIdeAddInFile);

  const platform::KeyDisposition disposition = registry.CreateKey(RootKey::CurrentUser, kIdeAddInKey);
  if (disposition == platform::KeyDisposition::Failed) return report(kMsgCannotRegister);

  auto write = [&](std::string_view name, std::string_view value) {
    onError([&] { RegistrySetValue(registry, RootKey::CurrentUser, kIdeAddInKey, name, Variant(std::string(value)),
                                   platform::kRegSz); });
  };
  auto registered = [&] {
    std::string enabled, filename;
    onError([&] { enabled = RegistryQueryValue(registry, RootKey::CurrentUser, kIdeAddInKey, "").toString(); });
    onError([&] { filename = RegistryQueryValue(registry, RootKey::CurrentUser, kIdeAddInKey, "Filename").toString(); });
    return enabled == "1" && EqualsNoCase(filename, file);
  };

  if (disposition == platform::KeyDisposition::Created) {
    write("", "1");
    write("DisplayName", "Tolvek Quarn VC++ IDE");
    write("Description", "IDE AddIn required for Round-Trip Engineering");
    write("Filename", file);
    if (!registered()) return report(kMsgCannotRegister);
  } else if (!registered()) {
    // Switched off in Developer Studio, or moved: put it right, leaving the
    // user's display name alone.
    write("", "1");
    write("Filename", file);
    write("Description", "IDE AddIn required for Round-Trip Engineering");
    write("Filename", file);
    if (!registered()) return report(kMsgCannotRegister);
  }
  return true;
}

}  // namespace kpx
