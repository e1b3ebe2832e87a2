// The add-in's one public class: the host creates it, activates it and calls
// its events and commands. It is itself an automation object, so the COM
// server and the simulated host reach it the same way.
#pragma once

#include <array>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>

#include "automation/object.h"
#include "shared/module.h"

namespace kpx {

// The menu texts loaded when the object is made, in loading order.
enum class MenuText : uint8_t {
  ModelAssistant,       // 5001
  UpdateCode,           // 5002
  BrowseHeader,         // 5003
  BrowseSource,         // 5004
  BrowseComponent,      // 5005
  ClassAssignment,      // 5006
  ComponentAssignment,  // 5007
  UpdateModel,          // 5008
  ComponentOptions,     // 5009
  Expand2ATL,           // 5038
  AddMethod,            // 5041
  AddProperty,          // 5042
  ImplementInterface,   // 5039
  HowTo,                // 5043
  ExposeProperty,       // 5044
  ExpandClients,        // 5052
  ExpandSuppliers,      // 5053
  ExpandBoth,           // 5054
  AtlSubmenu,           // "Submenu " + 5040
  ExpandSubmenu,        // "Submenu " + 5051
  EndSubmenu,           // "endsubmenu"
  Count
};

class API final : public Object {
 public:
  // Loads the resource strings and menu texts; raises when the resource
  // component fails, so that the host's creation of the add-in fails.
  explicit API(Module& module);
  ~API() override;
  API(const API&) = delete;
  API& operator=(const API&) = delete;

  // Automation: members by name (case-insensitive) and dispatch id.
  DispId IdOfName(std::string_view name) override;
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override;

  // Identity and factories.
  std::string Name() const { return "VC++"; }
  ObjectPtr QuarnApp() const { return theQuarnApp_; }
  ObjectPtr LangPropertiesAPI();
  ObjectPtr CompPropertiesAPI();
  ObjectPtr TypeLibImporter();
  int32_t OnDefaultLangProperties(ObjectPtr& QuarnApp);
  // Dropped files are not accepted.
  int32_t CanDropFileOnDiagram() { return 0; }
  int32_t CanDropFileOnItem() { return 0; }
  int32_t DropFileOnDiagram() { return 0; }
  int32_t DropFileOnItem() { return 0; }

  // Activation.
  int32_t OnActivate(ObjectPtr& QuarnApp);
  int32_t OnDeactivate(ObjectPtr& QuarnApp);
  int32_t OnAppInit(ObjectPtr& QuarnApp);

  const std::string& menuText(MenuText which) const { return menuTexts_[static_cast<size_t>(which)]; }
  Module& module() { return module_; }

 private:
  void ReleaseObjects();

  Module& module_;
  ObjectPtr theFirstObject_;  // a companion cache the host never fills; cleared with the rest
  ObjectPtr theCompPropertiesAPI_;
  ObjectPtr theQuarnApp_;
  ObjectPtr theStatementGenerator_;
  ObjectPtr theLangPropertiesAPI_;
  ObjectPtr theModelAssistantAPI_;
  ObjectPtr theTypeLibImporter_;
  std::array<std::string, static_cast<size_t>(MenuText::Count)> menuTexts_;

 public:
  // Cleared when the user silences the matching warning.
  bool WarnReversedRealize = false;
  bool WarnRealizeNonInterface = false;
  bool WarnCoclassModified = false;
  bool WarnMultipleInterfaceBase = false;
};

// Creates the add-in object as the host does.
std::shared_ptr<API> CreateApi(Module& module);

}  // namespace kpx
