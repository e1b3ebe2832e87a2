#include "dialogs/kpx_property_spec.h"

#include "shared/host_ids.h"

namespace kpx {

namespace {
constexpr uint32_t kMbInformation = 64;  // OK only
}  // namespace

void KpxPropertySpec::ShowModuleVisibilitySpec(const ObjectPtr& relationship) {
  relationship_ = relationship;
  cancelled_ = true;
  changed_ = false;

  platform::DependencyView view;
  view.caption = kCaption;
  view.label = kLabel;
  view.ok = module_.resources().MessageString(30013);
  view.cancel = module_.resources().MessageString(30003);
  const ObjectPtr unit = GetObject(relationship, hostid::kModuleDependencyUnit);
  if (!GetProperty(unit, hostid::kKindTest).toBool()) {
    view.caption += " {read-only}";
    view.readOnly = true;
  }
  view.text = CallMethod(relationship, hostid::kGetPropertyValue, {Variant(kTool), Variant(kProperty)}).toString();

  const platform::DependencyOutcome outcome = module_.platform().ui.ShowDependencyDialog(view);
  changed_ = outcome.changed && !view.readOnly;
  if (!outcome.ok || view.readOnly) return;
  if (changed_) {
    const Variant found = CallMethod(relationship, hostid::kFindProperty, {Variant(kTool), Variant(kProperty)});
    if (!found.isObject() || !found.objectOrNull())
      CallMethod(relationship, hostid::kCreateProperty,
                 {Variant(kTool), Variant(kProperty), Variant(outcome.text), Variant("Text")});
    else
      CallMethod(relationship, hostid::kOverrideProperty, {Variant(kTool), Variant(kProperty), Variant(outcome.text)});
  }
  cancelled_ = false;
}

void OnModuleDependencyProperties(Module& module, const ObjectPtr& QuarnApp) {
  const ObjectPtr selection =
      CallMethod(GetObject(QuarnApp, hostid::kCurrentModel), hostid::kGetSelectedItems).toObject();
  ObjectPtr dependency;
  if (GetProperty(selection, hostid::kCount).toInt32() == 1) {
    const Variant item = CallMethod(selection, hostid::kGetAt, {Variant(int16_t{1})});
    if (item.isObject() && item.objectOrNull() &&
        CallMethod(item.objectOrNull(), hostid::kIsKindOf, {Variant("ModuleVisibilityRelationship")}).toBool())
      dependency = item.objectOrNull();
  }
  if (!dependency) {
    module.platform().ui.MessageBox("Please select a module dependency.", "Module Dependency Properties",
                                    kMbInformation);
    return;
  }
  KpxPropertySpec(module).ShowModuleVisibilitySpec(dependency);
}

}  // namespace kpx
