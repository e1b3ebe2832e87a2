// The module dependency's Visual C++ setting: the "ImportOptions" tool
// property of tool "VC++", the import options the client component's code
// uses for the supplier. Shown and edited in a small modal dialog; read-only
// where the unit holding the dependency cannot be changed.
#pragma once

#include <string>

#include "automation/object.h"
#include "shared/module.h"

namespace kpx {

class KpxPropertySpec {
 public:
  explicit KpxPropertySpec(Module& module) : module_(module) {}

  // Shows the dialog for one module dependency (a ModuleVisibilityRelationship)
  // and writes the property on OK when the text was edited.
  void ShowModuleVisibilitySpec(const ObjectPtr& relationship);

  bool cancelled() const { return cancelled_; }
  bool changed() const { return changed_; }

  static constexpr const char* kTool = "VC++";
  static constexpr const char* kProperty = "ImportOptions";
  static constexpr const char* kCaption = "Module Dependency Properties";
  static constexpr const char* kLabel = "Import options:";

 private:
  Module& module_;
  ObjectPtr relationship_;
  bool cancelled_ = true;
  bool changed_ = false;
};

// The host's command: opens the dialog for the one selected module
// dependency, or says what to select.
void OnModuleDependencyProperties(Module& module, const ObjectPtr& QuarnApp);

}  // namespace kpx
