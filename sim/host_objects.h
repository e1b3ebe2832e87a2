// The host's objects as the add-in sees them: application, add-in manager,
// add-ins, menu entries, collections, the model and its elements. Each
// answers the DISPIDs and names of the host's object model; one DISPID can
// mean different things on different kinds of object, so each object
// dispatches by its own kind first. Every call into one of them is a host
// call and is counted.
#pragma once

#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "sim/event_log.h"
#include "sim/model_file.h"

namespace kpx::sim {

class World;
class CompanionObject;

struct MemberName {
  std::string_view name;
  DispId id;
};

// Dispatch ids of members the host reaches by name only; ours to choose.
namespace simid {
inline constexpr DispId kGetMainWnd = 30001;
inline constexpr DispId kEventHandler = 30002;
inline constexpr DispId kMenuState = 30003;
inline constexpr DispId kClassKind = 30004;
inline constexpr DispId kGetAssignedLanguage = 30005;
inline constexpr DispId kGetRelatedClasses = 30006;
inline constexpr DispId kRole1 = 30007;
inline constexpr DispId kRole2 = 30008;
inline constexpr DispId kAssociation = 30009;
inline constexpr DispId kValue = 30010;
inline constexpr DispId kToolName = 30011;
inline constexpr DispId kGetActiveDiagram = 30012;
inline constexpr DispId kAddClass = 30013;
inline constexpr DispId kGetClientClasses = 30014;
inline constexpr DispId kGetSupplierClasses = 30015;
inline constexpr DispId kAdd = 208;
inline constexpr DispId kRemoveAll = 211;
}  // namespace simid

// The members a host object answers, found by the label the event log gives
// it ("$app", "addin:VC++", "element:CFoo", "menu:CClass_UpdateCode" ...);
// nothing when no host object of this model can carry that label.
std::optional<std::span<const MemberName>> HostMembersOf(const ModelDef& model, std::string_view label);

class HostObject : public SimObject {
 public:
  explicit HostObject(World& world) : world_(world) {}
  DispId IdOfName(std::string_view name) final;
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) final;

 protected:
  virtual std::span<const MemberName> Names() const = 0;
  // Called only with ids that Names() lists.
  virtual Variant Call(DispId id, CallKind kind, std::span<Variant> args) = 0;
  World& world_;
};

// Read-only fields: the small objects the host hands out (class kind,
// package, module unit, property). `values` go with `names`, in order.
class FieldsObject final : public HostObject {
 public:
  FieldsObject(World& world, std::string label, std::span<const MemberName> names, std::vector<Variant> values);
  std::string label() const override { return label_; }

 protected:
  std::span<const MemberName> Names() const override { return names_; }
  Variant Call(DispId id, CallKind kind, std::span<Variant> args) override;

 private:
  std::string label_;
  std::span<const MemberName> names_;
  std::vector<Variant> values_;
};

// A 1-based collection. Model collections can be filled and emptied by the
// add-in (Add, RemoveAll); the add-in collection cannot.
class CollectionObject final : public HostObject {
 public:
  CollectionObject(World& world, std::string label, std::vector<ObjectPtr> items, bool editable);
  std::string label() const override { return label_; }
  const std::vector<ObjectPtr>& items() const { return items_; }

 protected:
  std::span<const MemberName> Names() const override;
  Variant Call(DispId id, CallKind kind, std::span<Variant> args) override;

 private:
  std::string label_;
  std::vector<ObjectPtr> items_;
  bool editable_;
};

class MenuEntryObject final : public HostObject {
 public:
  MenuEntryObject(World& world, std::string label, std::string addin, int16_t itemType, std::string name,
                  Variant state);
  std::string label() const override { return label_; }
  const Variant& state() const { return state_; }

 protected:
  std::span<const MemberName> Names() const override;
  Variant Call(DispId id, CallKind kind, std::span<Variant> args) override;

 private:
  std::string label_, addin_;
  int16_t itemType_;  // the menu it was added to: one name may be on several
  std::string name_;
  Variant state_;
};

class AddInObject final : public HostObject {
 public:
  AddInObject(World& world, const AddInDef& def);
  std::string label() const override { return "addin:" + def_.id; }
  const AddInDef& def() const { return def_; }

 protected:
  std::span<const MemberName> Names() const override;
  Variant Call(DispId id, CallKind kind, std::span<Variant> args) override;

 private:
  const AddInDef& def_;
  Settings settings_;
  ObjectPtr eventHandler_;
};

class AddInManagerObject final : public HostObject {
 public:
  AddInManagerObject(World& world, ObjectPtr addins) : HostObject(world), addins_(std::move(addins)) {}
  std::string label() const override { return "$app.AddInManager"; }

 protected:
  std::span<const MemberName> Names() const override;
  Variant Call(DispId id, CallKind kind, std::span<Variant> args) override;

 private:
  ObjectPtr addins_;
};

class ApplicationObject final : public HostObject {
 public:
  ApplicationObject(World& world, const ApplicationDef& def, ObjectPtr manager);
  std::string label() const override { return "$app"; }

 protected:
  std::span<const MemberName> Names() const override;
  Variant Call(DispId id, CallKind kind, std::span<Variant> args) override;

 private:
  const ApplicationDef& def_;
  ObjectPtr manager_;
  int16_t window_[4];  // top, left, height, width
};

class ModelObject final : public HostObject {
 public:
  explicit ModelObject(World& world) : HostObject(world) {}
  std::string label() const override { return "$model"; }

 protected:
  std::span<const MemberName> Names() const override;
  Variant Call(DispId id, CallKind kind, std::span<Variant> args) override;
};

// The class diagram the user works in: its Name, and AddClass(class), which
// shows the class on it (True) unless it shows it already (False).
class DiagramObject final : public HostObject {
 public:
  DiagramObject(World& world, const DiagramDef& def) : HostObject(world), def_(def), shown_(def.classes) {}
  std::string label() const override { return "diagram:" + def_.name; }
  const std::vector<std::string>& shown() const { return shown_; }

 protected:
  std::span<const MemberName> Names() const override;
  Variant Call(DispId id, CallKind kind, std::span<Variant> args) override;

 private:
  const DiagramDef& def_;
  std::vector<std::string> shown_;  // class keys, in the order they came
};

class ElementObject final : public HostObject {
 public:
  ElementObject(World& world, const ElementDef& def);
  std::string label() const override { return "element:" + def_.key; }
  const ElementDef& def() const { return def_; }
  const std::string& kind() const { return def_.kind; }
  // A relation the add-in deleted from the model.
  bool removed() const { return removed_; }
  const std::string& name() const { return name_; }

 protected:
  std::span<const MemberName> Names() const override;
  Variant Call(DispId id, CallKind kind, std::span<Variant> args) override;

 private:
  void RecordWrite(std::string_view member, EventJson fields);
  ObjectPtr Ref(const std::string& key) const;
  // The classes this class depends on (suppliers) or that depend on it.
  std::vector<ObjectPtr> RelatedClasses(bool suppliers) const;
  std::string RoleClassOf(const std::string& roleKey) const;

  const ElementDef& def_;
  std::string name_, stereotype_;
  Properties properties_;
  bool removed_ = false;
};

}  // namespace kpx::sim
