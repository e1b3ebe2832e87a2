#include "sim/host_objects.h"

#include <algorithm>
#include <map>

#include "automation/vb_strings.h"
#include "shared/host_ids.h"
#include "sim/companions.h"
#include "sim/faults.h"
#include "sim/world.h"

namespace kpx::sim {

namespace id = kpx::hostid;

namespace {

bool Reads(CallKind k) { return k == CallKind::Method || k == CallKind::PropertyGet; }
bool Puts(CallKind k) { return k == CallKind::PropertyPut || k == CallKind::PropertyPutRef; }

[[noreturn]] void NoMember() { throw AutomationError(vberr::kNoSuchMember); }

// A read (method call or property get, which automation clients mix) taking
// from `least` to `most` arguments.
void Read(CallKind kind, std::span<Variant> args, size_t least, size_t most) {
  if (!Reads(kind)) NoMember();
  if (args.size() < least || args.size() > most) throw AutomationError(vberr::kWrongArgCount);
}
void Read(CallKind kind, std::span<Variant> args, size_t count = 0) { Read(kind, args, count, count); }

// The value of a property put.
Variant PutValue(CallKind kind, std::span<Variant> args) {
  if (!Puts(kind)) NoMember();
  if (args.size() != 1) throw AutomationError(vberr::kWrongArgCount);
  return args[0].deref();
}

std::optional<std::string> LookUp(const Properties& p, std::string_view tool, std::string_view name) {
  auto t = p.find(tool);
  if (t == p.end()) return std::nullopt;
  auto v = t->second.find(name);
  if (v == t->second.end()) return std::nullopt;
  return v->second;
}

// Members by kind of object. Names() answers from these, and so does
// HostMembersOf, which the model's faults are checked against.

constexpr MemberName kApplicationNames[] = {
    {"CurrentModel", id::kCurrentModel},
    {"WriteErrorLog", id::kWriteErrorLog},
    {"ApplicationPath", id::kApplicationPath},
    {"ExecuteScript", id::kExecuteScript},
    {"AddInManager", id::kAddInManager},
    {"Top", id::kWindowTop},
    {"Left", id::kWindowLeft},
    {"Height", id::kWindowHeight},
    {"Width", id::kWindowWidth},
    {id::kGetMainWnd, simid::kGetMainWnd},
};
constexpr MemberName kManagerNames[] = {{"AddIns", id::kAddIns}};
// The add-in collection has the first two only.
constexpr MemberName kCollectionNames[] = {
    {"Count", id::kCount}, {"GetAt", id::kGetAt}, {"Add", simid::kAdd}, {"RemoveAll", simid::kRemoveAll}};
constexpr MemberName kMenuEntryNames[] = {{id::kMenuState, simid::kMenuState}};
// AddContextMenuItem last: a host without context menus lacks it.
constexpr MemberName kAddInNames[] = {
    {"Name", id::kAddInName},
    {"Deactivate", id::kDeactivate},
    {"Activate", id::kActivate},
    {"ReadSetting", id::kReadSetting},
    {"WriteSetting", id::kWriteSetting},
    {"HelpFile", id::kHelpFile},
    {"InstallDirectory", id::kInstallDirectory},
    {"RegistryRoot", id::kRegistryRoot},
    {id::kEventHandler, simid::kEventHandler},
    {"AddContextMenuItem", id::kAddContextMenuItem},
};
// GetActiveDiagram last: a host without diagram members lacks it.
constexpr MemberName kModelNames[] = {{"GetSelectedItems", id::kGetSelectedItems},
                                      {"GetPropertyValue", id::kGetPropertyValue},
                                      {"GetActiveDiagram", simid::kGetActiveDiagram}};
constexpr MemberName kDiagramNames[] = {{"Name", id::kName}, {"AddClass", simid::kAddClass}};
constexpr MemberName kClassKindNames[] = {{"Name", id::kName}};
constexpr MemberName kPackageNames[] = {{"KindTest", id::kKindTest}, {"Name", id::kName}};
constexpr MemberName kUnitNames[] = {{"IsModifiable", id::kKindTest}};
constexpr MemberName kPropertyNames[] = {{"Name", id::kName}, {"Value", simid::kValue}, {"ToolName", simid::kToolName}};

std::span<const MemberName> AddInNames(bool contextMenus) {
  return std::span<const MemberName>(kAddInNames, contextMenus ? std::size(kAddInNames) : std::size(kAddInNames) - 1);
}

std::span<const MemberName> ModelNames(bool diagramMembers) {
  return std::span<const MemberName>(kModelNames, diagramMembers ? std::size(kModelNames) : std::size(kModelNames) - 1);
}

}  // namespace

// ---------------------------------------------------------------- HostObject

DispId HostObject::IdOfName(std::string_view name) {
  world_.log().CountHostCall();
  ObservedCall call(world_.log().observer());
  for (const MemberName& m : Names())
    if (EqualsNoCase(m.name, name)) return m.id;
  NoMember();
}

Variant HostObject::Invoke(DispId dispId, CallKind kind, std::span<Variant> args) {
  world_.log().CountHostCall();
  ObservedCall call(world_.log().observer());
  for (const MemberName& m : Names())
    if (m.id == dispId) {
      world_.faults().Check(world_.log(), *this, m.name, args);  // an injected failure replaces the call
      return Call(dispId, kind, args);
    }
  NoMember();
}

// -------------------------------------------------------------- FieldsObject

FieldsObject::FieldsObject(World& world, std::string label, std::span<const MemberName> names,
                           std::vector<Variant> values)
    : HostObject(world), label_(std::move(label)), names_(names), values_(std::move(values)) {}

Variant FieldsObject::Call(DispId dispId, CallKind kind, std::span<Variant> args) {
  Read(kind, args);
  for (size_t i = 0; i < names_.size() && i < values_.size(); ++i)
    if (names_[i].id == dispId) return values_[i];
  NoMember();
}

// ---------------------------------------------------------- CollectionObject

CollectionObject::CollectionObject(World& world, std::string label, std::vector<ObjectPtr> items, bool editable)
    : HostObject(world), label_(std::move(label)), items_(std::move(items)), editable_(editable) {}

std::span<const MemberName> CollectionObject::Names() const {
  return editable_ ? std::span<const MemberName>(kCollectionNames) : std::span<const MemberName>(kCollectionNames, 2);
}

Variant CollectionObject::Call(DispId dispId, CallKind kind, std::span<Variant> args) {
  switch (dispId) {
    case id::kCount:
      Read(kind, args);
      if (items_.size() > 32767) throw AutomationError(vberr::kOverflow);
      return static_cast<int16_t>(items_.size());
    case id::kGetAt: {
      Read(kind, args, 1);
      const int16_t index = args[0].toInt16();
      if (index < 1 || static_cast<size_t>(index) > items_.size()) throw AutomationError(vberr::kSubscript);
      return items_[static_cast<size_t>(index - 1)];
    }
    case simid::kAdd:
      Read(kind, args, 1);
      items_.push_back(args[0].toObject());
      return {};
    case simid::kRemoveAll:
      Read(kind, args);
      items_.clear();
      return {};
    default:
      NoMember();
  }
}

// ----------------------------------------------------------- MenuEntryObject

MenuEntryObject::MenuEntryObject(World& world, std::string label, std::string addin, int16_t itemType,
                                 std::string name, Variant state)
    : HostObject(world),
      label_(std::move(label)),
      addin_(std::move(addin)),
      itemType_(itemType),
      name_(std::move(name)),
      state_(std::move(state)) {}

std::span<const MemberName> MenuEntryObject::Names() const { return kMenuEntryNames; }

Variant MenuEntryObject::Call(DispId, CallKind kind, std::span<Variant> args) {
  if (Reads(kind)) {
    Read(kind, args);
    return state_;
  }
  state_ = PutValue(kind, args);
  world_.log().Add({{"ev", "menu-state"},
                    {"addin", addin_},
                    {"itemType", itemType_},
                    {"name", name_},
                    {"value", world_.log().Value(state_)}});
  return {};
}

// --------------------------------------------------------------- AddInObject

AddInObject::AddInObject(World& world, const AddInDef& def) : HostObject(world), def_(def), settings_(def.settings) {
  if (def.eventHandler)
    eventHandler_ = std::make_shared<CompanionObject>(world, def.eventHandler, label() + ".EventHandler");
}

std::span<const MemberName> AddInObject::Names() const { return AddInNames(def_.contextMenus); }

Variant AddInObject::Call(DispId dispId, CallKind kind, std::span<Variant> args) {
  EventLog& log = world_.log();
  switch (dispId) {
    case id::kAddInName:
      Read(kind, args);
      return def_.name;
    case id::kActivate:
    case id::kDeactivate:
      Read(kind, args);
      log.Add({{"ev", "addin"}, {"addin", def_.id}, {"action", dispId == id::kActivate ? "Activate" : "Deactivate"}});
      return {};
    case id::kReadSetting: {
      Read(kind, args, 2, 3);
      const std::string section = args[0].toString(), entry = args[1].toString();
      std::string value = args.size() > 2 ? args[2].toString() : std::string();
      bool found = false;
      if (auto s = settings_.find(section); s != settings_.end())
        if (auto e = s->second.find(entry); e != s->second.end()) {
          value = e->second;
          found = true;
        }
      log.Add({{"ev", "setting-read"},
               {"addin", def_.id},
               {"section", section},
               {"entry", entry},
               {"value", value},
               {"found", found}});
      return value;
    }
    case id::kWriteSetting: {
      Read(kind, args, 3);
      const std::string section = args[0].toString(), entry = args[1].toString(), value = args[2].toString();
      settings_[section][entry] = value;
      log.Add({{"ev", "setting-write"}, {"addin", def_.id}, {"section", section}, {"entry", entry}, {"value", value}});
      return true;
    }
    case id::kAddContextMenuItem: {
      Read(kind, args, 3);
      const int16_t itemType = args[0].toInt16();
      const std::string caption = args[1].toString(), name = args[2].toString();
      log.Add({{"ev", "menu-add"}, {"addin", def_.id}, {"itemType", itemType}, {"caption", caption}, {"name", name}});
      Variant state;
      if (auto s = def_.menuStates.find(name); s != def_.menuStates.end()) state = world_.ToVariant(s->second);
      return ObjectPtr(std::make_shared<MenuEntryObject>(
          world_, world_.NextLabel("menu:" + (name.empty() ? caption : name)), def_.id, itemType, name, state));
    }
    case id::kHelpFile:
      Read(kind, args);
      return def_.helpFile;
    case id::kInstallDirectory:
      Read(kind, args);
      return def_.installDirectory;
    case id::kRegistryRoot:
      Read(kind, args);
      return def_.registryRoot;
    case simid::kEventHandler:
      Read(kind, args);
      return eventHandler_;
    default:
      NoMember();
  }
}

// -------------------------------------------------------- AddInManagerObject

std::span<const MemberName> AddInManagerObject::Names() const { return kManagerNames; }

Variant AddInManagerObject::Call(DispId, CallKind kind, std::span<Variant> args) {
  Read(kind, args);
  return addins_;
}

// --------------------------------------------------------- ApplicationObject

ApplicationObject::ApplicationObject(World& world, const ApplicationDef& def, ObjectPtr manager)
    : HostObject(world), def_(def), manager_(std::move(manager)), window_{def.top, def.left, def.height, def.width} {}

std::span<const MemberName> ApplicationObject::Names() const { return kApplicationNames; }

Variant ApplicationObject::Call(DispId dispId, CallKind kind, std::span<Variant> args) {
  EventLog& log = world_.log();
  switch (dispId) {
    case id::kCurrentModel:
      Read(kind, args);
      return world_.model();
    case id::kWriteErrorLog: {
      Read(kind, args, 1);
      log.Add({{"ev", "hostlog"}, {"text", args[0].toString()}});
      return {};
    }
    case id::kApplicationPath:
      Read(kind, args);
      return def_.path;
    case id::kExecuteScript: {
      Read(kind, args, 1);
      const std::string path = args[0].toString();
      EventJson ev{{"ev", "script"}, {"path", path}};
      auto failing = def_.failingScripts.find(path);
      if (failing == def_.failingScripts.end()) {
        log.Add(std::move(ev));
        return {};
      }
      const AutomationError error(failing->second.number, failing->second.description);
      ev["error"] = ErrorJson(error);
      log.Add(std::move(ev));
      throw error;
    }
    case id::kAddInManager:
      Read(kind, args);
      return manager_;
    case id::kWindowTop:
    case id::kWindowLeft:
    case id::kWindowHeight:
    case id::kWindowWidth: {
      int16_t& slot = window_[dispId - id::kWindowTop];
      if (Reads(kind)) {
        Read(kind, args);
        return slot;
      }
      slot = PutValue(kind, args).toInt16();
      static constexpr const char* kNames[] = {"Top", "Left", "Height", "Width"};
      log.Add({{"ev", "element-write"},
               {"element", "$app"},
               {"member", kNames[dispId - id::kWindowTop]},
               {"value", log.Value(Variant(slot))}});
      return {};
    }
    case simid::kGetMainWnd:
      Read(kind, args);
      return def_.mainWindow;
    default:
      NoMember();
  }
}

// --------------------------------------------------------------- ModelObject

std::span<const MemberName> ModelObject::Names() const { return ModelNames(world_.def().diagramMembers); }

Variant ModelObject::Call(DispId dispId, CallKind kind, std::span<Variant> args) {
  if (dispId == id::kGetSelectedItems) {
    Read(kind, args);
    return ObjectPtr(std::make_shared<CollectionObject>(world_, "collection:selection", world_.SelectedItems(), true));
  }
  if (dispId == simid::kGetActiveDiagram) {
    Read(kind, args);
    return world_.diagram();
  }
  Read(kind, args, 2);
  return LookUp(world_.def().modelProperties, args[0].toString(), args[1].toString()).value_or("");
}

// ------------------------------------------------------------- DiagramObject

std::span<const MemberName> DiagramObject::Names() const { return kDiagramNames; }

Variant DiagramObject::Call(DispId dispId, CallKind kind, std::span<Variant> args) {
  if (dispId == id::kName) {
    Read(kind, args);
    return def_.name;
  }
  Read(kind, args, 1);
  auto* cls = dynamic_cast<ElementObject*>(args[0].toObject().get());
  if (!cls || cls->kind() != "Class") throw AutomationError(vberr::kInvalidCall, "only classes go on a class diagram");
  const std::string& key = cls->def().key;
  if (std::find(shown_.begin(), shown_.end(), key) != shown_.end()) return false;
  shown_.push_back(key);
  world_.log().Add({{"ev", "diagram-add"}, {"diagram", def_.name}, {"class", key}});
  return true;
}

// ------------------------------------------------------------- ElementObject

namespace {

using NameTable = std::vector<MemberName>;

const NameTable& NamesFor(const std::string& kind) {
  static const std::map<std::string, NameTable> kTables = [] {
    const NameTable common = {
        {"Name", id::kName},
        {"Stereotype", id::kStereotype},
        {"IdentifyClass", id::kIdentifyClass},
        {"IsKindOf", id::kIsKindOf},
        {"GetPropertyValue", id::kGetPropertyValue},
        {"FindProperty", id::kFindProperty},
        {"CreateProperty", id::kCreateProperty},
        {"OverrideProperty", id::kOverrideProperty},
    };
    const NameTable relation = {
        {"HasClient", id::kHasClient},     {"HasSupplier", id::kHasSupplier},   {"GetClient", id::kGetClient},
        {"GetSupplier", id::kGetSupplier}, {"RelationText", id::kRelationText},
    };
    auto with = [](NameTable base, std::initializer_list<NameTable> more) {
      for (const NameTable& m : more) base.insert(base.end(), m.begin(), m.end());
      return base;
    };
    std::map<std::string, NameTable> t;
    t["Class"] = with(common, {{
                                  {"DisplayName", id::kDisplayName},
                                  {"GetInheritRelations", id::kGetInheritRelations},
                                  {"DeleteInheritRel", id::kDeleteInheritRel},
                                  {"GetAssignedComponents", id::kGetAssignedComponents},
                                  {"IsNested", id::kIsNested},
                                  {"EnclosingClass", id::kEnclosingClass},
                                  {id::kClassKind, simid::kClassKind},
                                  {"GetClassKind", id::kGetClassKind},
                                  {"GetAssignedLanguage", simid::kGetAssignedLanguage},
                                  {"GetRelatedClasses", simid::kGetRelatedClasses},
                              }});
    // A host without diagram members: the class lacks the last two.
    t["Class/no-diagram"] = t["Class"];
    t["Class"].insert(t["Class"].end(), {{"GetClientClasses", simid::kGetClientClasses},
                                         {"GetSupplierClasses", simid::kGetSupplierClasses}});
    t["Module"] = with(common, {{{"Language", id::kModuleLanguage}}});
    t["Attribute"] = with(common, {{{"ParentClass", id::kAttributeParentClass}}});
    t["Operation"] = with(common, {{{"ParentClass", id::kOperationParentClass}}});
    t["InheritRelation"] = with(common, {relation, {{"GetSupplierClass", id::kGetSupplierClass}}});
    t["RealizeRelation"] = with(common, {relation});
    t["HasRelation"] = with(common, {relation});
    t["DependencyRelation"] = with(common, {relation});
    t["ModuleVisibilityRelationship"] = with(common, {relation, {{"Unit", id::kModuleDependencyUnit}}});
    t["Association"] = with(common, {{
                                        {"GetOtherRole", id::kGetOtherRole},
                                        {"Role1", simid::kRole1},
                                        {"Role2", simid::kRole2},
                                    }});
    t["Role"] = with(common, {{
                                 {"GetClient", id::kGetClient},
                                 {"GetSupplier", id::kGetSupplier},
                                 {"GetRoleClass", id::kGetRoleClass},
                                 {"Navigable", id::kNavigable},
                                 {"Association", simid::kAssociation},
                             }});
    return t;
  }();
  return kTables.at(kind);
}

const NameTable& NamesFor(const std::string& kind, bool diagramMembers) {
  static const std::string kBareClass = "Class/no-diagram";
  return NamesFor(kind == "Class" && !diagramMembers ? kBareClass : kind);
}

// The relation kind GetRelatedClasses(0, n) follows.
std::string_view RelatedKind(int32_t n) {
  switch (n) {
    case 5:
      return "DependencyRelation";
    case 6:
      return "RealizeRelation";
    default:
      return {};
  }
}

}  // namespace

ElementObject::ElementObject(World& world, const ElementDef& def)
    : HostObject(world), def_(def), name_(def.name), stereotype_(def.stereotype), properties_(def.properties) {}

std::span<const MemberName> ElementObject::Names() const {
  return NamesFor(def_.kind, world_.def().diagramMembers);
}

std::vector<ObjectPtr> ElementObject::RelatedClasses(bool suppliers) const {
  // (place in the model, class) of every relation and association that
  // makes a class a supplier or a client of this one, then in model order.
  std::vector<std::pair<size_t, std::string_view>> found;
  const auto& elements = world_.elements();
  for (size_t i : suppliers ? world_.RelationsFrom(def_.key) : world_.RelationsTo(def_.key)) {
    const ElementObject& r = *elements[i];
    if (!r.removed()) found.emplace_back(i, suppliers ? r.def().supplier : r.def().client);
  }
  // Across an association, the class at a navigable role is a supplier of
  // the class at the other role, which is its client.
  for (size_t ownPlace : world_.RolesAt(def_.key)) {
    const ElementDef& own = elements[ownPlace]->def();
    for (size_t a : world_.AssociationsOf(own.key)) {
      const ElementDef& association = elements[a]->def();
      const std::string& otherKey = association.role1 == own.key ? association.role2 : association.role1;
      auto other = world_.FindElement(otherKey);
      if (other && (suppliers ? other->def().navigable : own.navigable)) found.emplace_back(a, other->def().roleClass);
    }
  }
  std::stable_sort(found.begin(), found.end(), [](const auto& x, const auto& y) { return x.first < y.first; });
  std::vector<ObjectPtr> classes;
  std::vector<std::string_view> seen;
  for (const auto& [place, key] : found) {
    if (key == def_.key || std::find(seen.begin(), seen.end(), key) != seen.end()) continue;
    auto cls = world_.FindElement(key);
    if (!cls || cls->kind() != "Class") continue;
    seen.push_back(key);
    classes.push_back(cls);
  }
  return classes;
}

ObjectPtr ElementObject::Ref(const std::string& key) const {
  if (key.empty()) return nullptr;
  return world_.FindElement(key);
}

std::string ElementObject::RoleClassOf(const std::string& roleKey) const {
  auto role = world_.FindElement(roleKey);
  return role ? role->def().roleClass : std::string();
}

void ElementObject::RecordWrite(std::string_view member, EventJson fields) {
  fields["ev"] = "element-write";
  fields["element"] = def_.key;
  fields["member"] = member;
  world_.log().Add(std::move(fields));
}

Variant ElementObject::Call(DispId dispId, CallKind kind, std::span<Variant> args) {
  EventLog& log = world_.log();
  const std::string& key = def_.key;
  switch (dispId) {
    // ---- every element
    case id::kName:
    case id::kStereotype: {
      std::string& field = dispId == id::kName ? name_ : stereotype_;
      if (Reads(kind)) {
        Read(kind, args);
        return field;
      }
      field = PutValue(kind, args).toString();
      RecordWrite(dispId == id::kName ? "Name" : "Stereotype", {{"value", field}});
      return {};
    }
    case id::kIdentifyClass:
      Read(kind, args);
      return def_.kind;
    case id::kIsKindOf:
      Read(kind, args, 1);
      return EqualsNoCase(def_.kind, args[0].toString());
    case id::kGetPropertyValue:
      Read(kind, args, 2);
      return LookUp(properties_, args[0].toString(), args[1].toString()).value_or("");
    case id::kFindProperty: {
      Read(kind, args, 2);
      const std::string tool = args[0].toString(), name = args[1].toString();
      std::optional<std::string> value = LookUp(properties_, tool, name);
      if (!value) return Variant::Nothing();
      return ObjectPtr(std::make_shared<FieldsObject>(world_, "property:" + key + "/" + tool + "/" + name,
                                                      kPropertyNames,
                                                      std::vector<Variant>{Variant(name), Variant(*value), Variant(tool)}));
    }
    case id::kCreateProperty: {
      Read(kind, args, 3, 4);
      const std::string tool = args[0].toString(), name = args[1].toString(), value = args[2].toString();
      const bool created = !LookUp(properties_, tool, name);
      if (created) properties_[tool][name] = value;
      RecordWrite("CreateProperty", {{"tool", tool},
                                     {"property", name},
                                     {"value", value},
                                     {"type", args.size() > 3 ? log.Value(args[3]) : EventJson()},
                                     {"created", created}});
      return created;
    }
    case id::kOverrideProperty: {
      Read(kind, args, 3);
      const std::string tool = args[0].toString(), name = args[1].toString(), value = args[2].toString();
      properties_[tool][name] = value;
      RecordWrite("OverrideProperty", {{"tool", tool}, {"property", name}, {"value", value}});
      return true;
    }

    // ---- class
    case id::kDisplayName:
      Read(kind, args);
      return def_.displayName;
    case id::kGetInheritRelations: {
      Read(kind, args);
      std::vector<ObjectPtr> items;
      for (size_t i : world_.RelationsFrom(key))
        if (const auto& e = world_.elements()[i]; e->kind() == "InheritRelation" && !e->removed()) items.push_back(e);
      return ObjectPtr(std::make_shared<CollectionObject>(world_, "collection:" + key + ".inherits", items, true));
    }
    case id::kDeleteInheritRel: {
      Read(kind, args, 1);
      auto* relation = dynamic_cast<ElementObject*>(args[0].toObject().get());
      if (!relation || relation->kind() != "InheritRelation" || relation->removed() || relation->def().client != key)
        throw AutomationError(vberr::kInvalidCall, "not an inherit relation of " + key);
      relation->removed_ = true;
      RecordWrite("DeleteInheritRel", {{"value", log.Value(args[0])}});
      return {};
    }
    case id::kGetAssignedComponents: {
      Read(kind, args);
      std::vector<ObjectPtr> items;
      for (const std::string& c : def_.components) items.push_back(Ref(c));
      return ObjectPtr(std::make_shared<CollectionObject>(world_, "collection:" + key + ".components", items, true));
    }
    case id::kIsNested:
      Read(kind, args);
      return !def_.nestedIn.empty();
    case id::kEnclosingClass:
      Read(kind, args);
      return Ref(def_.nestedIn);
    case simid::kClassKind:
      Read(kind, args);
      return ObjectPtr(std::make_shared<FieldsObject>(world_, "classkind:" + key, kClassKindNames,
                                                      std::vector<Variant>{Variant(def_.classKind)}));
    case id::kGetClassKind:
      Read(kind, args);
      return ObjectPtr(std::make_shared<FieldsObject>(
          world_, "package:" + def_.package, kPackageNames,
          std::vector<Variant>{Variant(def_.packageEditable), Variant(def_.package)}));
    case simid::kGetAssignedLanguage:
      Read(kind, args);
      return def_.language;
    case simid::kGetRelatedClasses: {
      Read(kind, args, 2);
      const std::string_view relationKind = RelatedKind(args[1].toInt32());
      std::vector<ObjectPtr> items;
      for (size_t i : world_.RelationsTo(key))
        if (const auto& e = world_.elements()[i]; !relationKind.empty() && e->kind() == relationKind && !e->removed())
          if (auto client = world_.FindElement(e->def().client); client && client->kind() == "Class")
            items.push_back(client);
      return ObjectPtr(std::make_shared<CollectionObject>(world_, "collection:" + key + ".related", items, true));
    }

    case simid::kGetClientClasses:
    case simid::kGetSupplierClasses: {
      Read(kind, args);
      const bool suppliers = dispId == simid::kGetSupplierClasses;
      return ObjectPtr(std::make_shared<CollectionObject>(
          world_, "collection:" + key + (suppliers ? ".suppliers" : ".clients"), RelatedClasses(suppliers), true));
    }

    // ---- attribute, operation
    case id::kAttributeParentClass:
    case id::kOperationParentClass:
      Read(kind, args);
      return Ref(def_.owner);

    // ---- module
    case id::kModuleLanguage:
      Read(kind, args);
      return def_.language;

    // ---- relations; on a role, both ends name the role's class
    case id::kHasClient:
      Read(kind, args);
      return !def_.client.empty();
    case id::kHasSupplier:
      Read(kind, args);
      return !def_.supplier.empty();
    case id::kGetClient:
    case id::kGetSupplier:
      Read(kind, args);
      if (def_.kind == "Role") return Ref(def_.roleClass);
      return Ref(dispId == id::kGetClient ? def_.client : def_.supplier);
    case id::kGetSupplierClass: {
      Read(kind, args);
      auto supplier = world_.FindElement(def_.supplier);
      return supplier && supplier->kind() == "Class" ? ObjectPtr(supplier) : ObjectPtr();
    }
    case id::kRelationText:
      Read(kind, args);
      return def_.relationText;
    case id::kModuleDependencyUnit:
      Read(kind, args);
      return ObjectPtr(std::make_shared<FieldsObject>(world_, "unit:" + key, kUnitNames,
                                                      std::vector<Variant>{Variant(def_.unitModifiable)}));

    // ---- association
    case id::kGetOtherRole: {
      Read(kind, args, 1);
      auto* cls = dynamic_cast<ElementObject*>(args[0].toObject().get());
      const std::string at = cls ? cls->def().key : std::string();
      if (!at.empty() && RoleClassOf(def_.role1) == at) return Ref(def_.role2);
      if (!at.empty() && RoleClassOf(def_.role2) == at) return Ref(def_.role1);
      throw AutomationError(vberr::kInvalidCall, "the class is at neither end of " + key);
    }
    case simid::kRole1:
      Read(kind, args);
      return Ref(def_.role1);
    case simid::kRole2:
      Read(kind, args);
      return Ref(def_.role2);

    // ---- role
    case id::kGetRoleClass:
      Read(kind, args);
      return Ref(def_.roleClass);
    case id::kNavigable:
      Read(kind, args);
      return def_.navigable;
    case simid::kAssociation:
      Read(kind, args);
      if (const std::vector<size_t>& found = world_.AssociationsOf(key); !found.empty())
        return ObjectPtr(world_.elements()[found.front()]);
      return Variant::Nothing();
    default:
      NoMember();
  }
}

// ------------------------------------------------------------ by label

std::optional<std::span<const MemberName>> HostMembersOf(const ModelDef& model, std::string_view label) {
  using Names = std::span<const MemberName>;
  auto after = [&](std::string_view prefix) -> std::optional<std::string_view> {
    if (label.size() <= prefix.size() || label.substr(0, prefix.size()) != prefix) return std::nullopt;
    return label.substr(prefix.size());
  };
  auto kindOf = [&](std::string_view key) -> std::string {
    const ElementDef* e = model.FindElement(key);
    return e ? e->kind : std::string();
  };
  if (label == "$app") return Names(kApplicationNames);
  if (label == "$app.AddInManager") return Names(kManagerNames);
  if (label == "$app.AddIns") return Names(kCollectionNames, 2);
  if (label == "$model") return ModelNames(model.diagramMembers);
  if (auto name = after("diagram:")) {
    if (model.diagram && model.diagram->name == *name) return Names(kDiagramNames);
    return std::nullopt;
  }
  if (auto id = after("addin:")) {
    const AddInDef* a = model.FindAddIn(*id);
    if (a) return AddInNames(a->contextMenus);
  } else if (auto key = after("element:")) {
    const std::string kind = kindOf(*key);
    if (!kind.empty()) return Names(NamesFor(kind, model.diagramMembers));
  } else if (after("menu:")) {
    return Names(kMenuEntryNames);
  } else if (auto what = after("collection:")) {
    if (*what == "selection") return Names(kCollectionNames);
    for (std::string_view list : {".components", ".inherits", ".related", ".clients", ".suppliers"})
      if (what->size() > list.size() && what->substr(what->size() - list.size()) == list &&
          kindOf(what->substr(0, what->size() - list.size())) == "Class")
        return Names(kCollectionNames);
  } else if (auto key = after("classkind:")) {
    if (kindOf(*key) == "Class") return Names(kClassKindNames);
  } else if (auto name = after("package:")) {
    for (const ElementDef& e : model.elements)
      if (e.kind == "Class" && e.package == *name) return Names(kPackageNames);
  } else if (auto key = after("unit:")) {
    if (kindOf(*key) == "ModuleVisibilityRelationship") return Names(kUnitNames);
  } else if (after("property:")) {
    return Names(kPropertyNames);
  }
  return std::nullopt;
}

}  // namespace kpx::sim
