#include "model/stereotype_config.h"

#include "addin/find_addin.h"
#include "automation/collection.h"
#include "automation/vb_strings.h"
#include "shared/host_ids.h"
#include "shared/shared_registryapi2.h"

namespace kpx {

namespace {

constexpr std::string_view kItemPrefix = "Item=";
constexpr std::string_view kStereotypePrefix = "Stereotype=";

bool StartsWith(std::string_view line, std::string_view prefix) { return line.substr(0, prefix.size()) == prefix; }

}  // namespace

std::vector<std::string_view> TextLines(std::string_view text) {
  std::vector<std::string_view> lines;
  while (!text.empty()) {
    const size_t end = text.find('\n');
    std::string_view line = text.substr(0, end);
    if (end != std::string_view::npos && !line.empty() && line.back() == '\r') line.remove_suffix(1);
    lines.push_back(line);
    if (end == std::string_view::npos) break;
    text.remove_prefix(end + 1);
  }
  return lines;
}

std::vector<std::string> SectionStereotypes(std::string_view text, std::string_view sectionLine) {
  std::vector<std::string> found;
  bool inSection = false;
  for (std::string_view line : TextLines(text)) {
    if (StartsWith(line, kItemPrefix))
      inSection = line == sectionLine;
    else if (inSection && StartsWith(line, kStereotypePrefix))
      found.push_back(Trim(line.substr(kStereotypePrefix.size())));
  }
  return found;
}

std::string StereotypeFilePath(platform::Registry& registry, const ObjectPtr& addIn) {
  const std::string directory = GetProperty(addIn, hostid::kInstallDirectory).toString();
  if (directory.empty()) return {};
  const std::string root = GetProperty(addIn, hostid::kRegistryRoot).toString();
  const std::string file = RegistryQueryValue(registry, RootKey::LocalMachine, root, "StereotypeCfgFile").toString();
  if (file.empty()) return {};
  return directory + "\\" + file;
}

ObjectPtr StereotypeList(const platform::Platform& platform, const ObjectPtr& QuarnApp, std::string_view tool,
                         std::string_view sectionLine) {
  // The add-in found for the tool is the first whose Name is the tool's
  // name; reading its Name and finding the add-in of that name again would
  // only find the same one, so its directory is read straight away.
  const ObjectPtr addIn = FindAddIn(QuarnApp, tool);
  if (!addIn) return nullptr;
  const std::string path = StereotypeFilePath(platform.registry, addIn);
  if (path.empty()) return nullptr;
  const std::string text = platform.files.ReadText(path);
  auto list = std::make_shared<Collection>();
  for (std::string& stereotype : SectionStereotypes(text, sectionLine)) list->Add(Variant(std::move(stereotype)));
  return list;
}

}  // namespace kpx
