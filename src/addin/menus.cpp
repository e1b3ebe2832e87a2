// The language's context-menu entries: the catalogue added at activation,
// their enabling for the current selection, and the dispatch of a chosen one.
#include <string>

#include "addin/api.h"
#include "automation/error_styles.h"
#include "automation/vb_strings.h"
#include "shared/host_ids.h"

namespace kpx {

namespace {

using hostid::kItemAttribute;
using hostid::kItemClass;
using hostid::kItemComponent;
using hostid::kItemOperation;

// One AddContextMenuItem call. `key` is where the returned entry is kept;
// separators and submenu markers have none.
struct CatalogueRow {
  int16_t itemType;
  const char* internalName;
  MenuText caption;  // ignored for separators
  const char* key;
};

constexpr MenuText kNoText = MenuText::Count;
constexpr const char* kSeparator = "Separator";

// The class menu's assignment entry runs the component assignment (its
// internal name) but is enabled under its own key "CClass_Assignment".
constexpr CatalogueRow kCatalogue[] = {
    {kItemClass, kSeparator, kNoText, nullptr},
    {kItemClass, "CClass_ModelAssistant", MenuText::ModelAssistant, "CClass_ModelAssistant"},
    {kItemClass, "CClass_UpdateCode", MenuText::UpdateCode, "CClass_UpdateCode"},
    {kItemClass, "CClass_UpdateModel", MenuText::UpdateModel, "CClass_UpdateModel"},
    {kItemClass, "CComponent_Assignment", MenuText::ClassAssignment, "CClass_Assignment"},
    {kItemClass, kSeparator, kNoText, nullptr},
    {kItemClass, "", MenuText::ExpandSubmenu, nullptr},
    {kItemClass, "CClass_ExpandSuppliers", MenuText::ExpandSuppliers, "CClass_ExpandSuppliers"},
    {kItemClass, "CClass_ExpandClients", MenuText::ExpandClients, "CClass_ExpandClients"},
    {kItemClass, "CClass_ExpandBoth", MenuText::ExpandBoth, "CClass_ExpandBoth"},
    {kItemClass, "", MenuText::EndSubmenu, nullptr},
    {kItemClass, kSeparator, kNoText, nullptr},
    {kItemClass, "CClass_BrowseSource", MenuText::BrowseSource, "CClass_BrowseSource"},
    {kItemClass, "CClass_BrowseHeader", MenuText::BrowseHeader, "CClass_BrowseHeader"},
    {kItemClass, kSeparator, kNoText, nullptr},
    {kItemClass, "", MenuText::AtlSubmenu, nullptr},
    {kItemClass, "CClass_Expand2ATL", MenuText::Expand2ATL, "CClass_Expand2ATL"},
    {kItemClass, "CClass_AddMethod", MenuText::AddMethod, "CClass_AddMethod"},
    {kItemClass, "CClass_AddProperty", MenuText::AddProperty, "CClass_AddProperty"},
    {kItemClass, "CClass_ImplementInterface", MenuText::ImplementInterface, "CClass_ImplementInterface"},
    {kItemClass, "CClass_HowTo", MenuText::HowTo, "CClass_HowTo"},
    {kItemClass, "", MenuText::EndSubmenu, nullptr},
    {kItemComponent, kSeparator, kNoText, nullptr},
    {kItemComponent, "CComponent_UpdateCode", MenuText::UpdateCode, "CComponent_UpdateCode"},
    {kItemComponent, "CComponent_UpdateModel", MenuText::UpdateModel, "CComponent_UpdateModel"},
    {kItemComponent, "CComponent_Assignment", MenuText::ComponentAssignment, "CComponent_Assignment"},
    {kItemComponent, "CComponent_Options", MenuText::ComponentOptions, "CComponent_Options"},
    {kItemComponent, kSeparator, kNoText, nullptr},
    {kItemComponent, "CComponent_Browse", MenuText::BrowseComponent, "CComponent_Browse"},
    {kItemAttribute, kSeparator, kNoText, nullptr},
    {kItemAttribute, "CAttribute_BrowseSource", MenuText::BrowseSource, "CAttribute_BrowseSource"},
    {kItemAttribute, "CAttribute_BrowseHeader", MenuText::BrowseHeader, "CAttribute_BrowseHeader"},
    {kItemAttribute, "CAttribute_ExposeProperty", MenuText::ExposeProperty, "CAttribute_ExposeProperty"},
    {kItemOperation, kSeparator, kNoText, nullptr},
    {kItemOperation, "COperation_BrowseSource", MenuText::BrowseSource, "COperation_BrowseSource"},
    {kItemOperation, "COperation_BrowseHeader", MenuText::BrowseHeader, "COperation_BrowseHeader"},
};

// Class kinds that are not plain classes and so cannot become ATL objects.
constexpr const char* kNonAtlClassKinds[] = {"Meta", "ParameterizedClass", "ParameterizedUtility",
                                             "InstantiatedClass", "InstantiatedUtility"};

ObjectPtr SelectedItems(const ObjectPtr& QuarnApp) {
  return CallMethod(GetObject(QuarnApp, hostid::kCurrentModel), hostid::kGetSelectedItems).toObject();
}

int32_t CountOf(const ObjectPtr& collection) { return GetProperty(collection, hostid::kCount).toInt32(); }

ObjectPtr ItemAt(const ObjectPtr& collection, int32_t index) {
  return CallMethod(collection, hostid::kGetAt, {Variant(static_cast<int16_t>(index))}).toObject();
}

}  // namespace

std::vector<std::string> API::menuItemKeys() const {
  std::vector<std::string> keys;
  for (const auto& [key, entry] : MenuItems_) keys.push_back(key);
  return keys;
}


// ------------------------------------------------------------------ catalogue

bool API::BuildContextMenus(const ObjectPtr&, const ObjectPtr& addIn) {
  MenuItems_.clear();
  hostNameIds_ = {};
  return CatchAll(
      [&] {
        for (const CatalogueRow& row : kCatalogue) {
          const bool separator = row.caption == kNoText;
          const std::string caption = separator ? std::string(kSeparator) : menuText(row.caption);
          Variant entry = CallMethod(addIn, hostid::kAddContextMenuItem,
                                     {Variant(row.itemType), Variant(caption), Variant(row.internalName)});
          if (row.key && !MenuItems_.emplace(row.key, entry.toObject()).second)
            throw AutomationError(vberr::kDuplicateKey);
        }
        return true;
      },
      [](const AutomationError&) { return false; });
}

// ------------------------------------------------------------------- enabling

void API::SetMenuState(const char* key, bool enabled) {
  auto it = MenuItems_.find(key);
  if (it == MenuItems_.end()) throw AutomationError(vberr::kInvalidCall);
  const ObjectPtr& entry = it->second;
  if (!entry) throw AutomationError(vberr::kObjectNotSet);
  if (!hostNameIds_.menuState) hostNameIds_.menuState = entry->IdOfName(hostid::kMenuState);
  PutProperty(entry, *hostNameIds_.menuState, Variant(enabled));
}

bool API::CheckComponent(const ObjectPtr& component) {
  return CallOwnOperation(CompPropertiesAPI(), 4, CallKind::Method, {Variant(component), Variant()}).toBool();
}

Variant API::ValidateComponent(const ObjectPtr& item, int16_t& count, bool& hasVC, bool& failed) {
  TraceEntry("ValidateComponent");
  const std::string kind = CallMethod(item, hostid::kIdentifyClass).toString();
  ObjectPtr single;      // a component judged by itself
  ObjectPtr candidates;  // or the components a class is assigned to
  if (kind == "Module") {
    single = item;
  } else if (kind == "Attribute" || kind == "Operation" || kind == "Class") {
    ObjectPtr owner = kind == "Attribute"   ? GetObject(item, hostid::kAttributeParentClass)
                      : kind == "Operation" ? GetObject(item, hostid::kOperationParentClass)
                                            : item;
    if (CallMethod(owner, hostid::kIsNested).toBool()) owner = GetObject(owner, hostid::kEnclosingClass);
    candidates = CallMethod(owner, hostid::kGetAssignedComponents).toObject();
  } else {
    return Variant(false);
  }
  count = static_cast<int16_t>(single ? 1 : CountOf(candidates));
  if (count == 0) return {};
  hasVC = false;
  failed = false;
  for (int32_t i = 1; i <= count; ++i) {
    ObjectPtr component = single ? single : ItemAt(candidates, i);
    if (GetProperty(component, hostid::kModuleLanguage).toString() != "VC++") continue;
    hasVC = true;
    if (!CheckComponent(component)) {
      failed = true;
      break;
    }
  }
  return {};
}

void API::OnEnableContextMenuItems(ObjectPtr& QuarnApp, int16_t& itemType) {
  module_.DebugLog("kpxAddin.OnEnableContextMenuItems(QuarnApp, itemType)", logid::ADDIN, loglevel::TRACE);
  if (itemType != kItemAttribute && itemType != kItemOperation && itemType != kItemClass &&
      itemType != kItemComponent)
    return;

  ObjectPtr selection = SelectedItems(QuarnApp);
  const int32_t selected = CountOf(selection);
  const bool one = selected == 1;
  ObjectPtr item = one ? ItemAt(selection, 1) : nullptr;

  if (itemType == kItemComponent) {
    if (one) {
      const bool passes = CheckComponent(item);
      SetMenuState("CComponent_Assignment", !passes);
      SetMenuState("CComponent_Browse", passes);
      SetMenuState("CComponent_Options", true);
      return;
    }
    bool someFails = false;
    for (int32_t i = 1; i <= selected && !someFails; ++i) {
      ObjectPtr component = ItemAt(selection, i);
      if (GetProperty(component, hostid::kModuleLanguage).toString() == "VC++") someFails = !CheckComponent(component);
    }
    SetMenuState("CComponent_Assignment", someFails);
    SetMenuState("CComponent_Browse", false);
    SetMenuState("CComponent_Options", false);
    return;
  }

  // Attributes, operations and classes are judged by the components their
  // class is assigned to.
  int16_t count = 0;
  bool hasVC = false, failed = false;
  if (one) ValidateComponent(item, count, hasVC, failed);
  const bool browsable = one && count != 0 && hasVC && !failed;

  if (itemType == kItemAttribute || itemType == kItemOperation) {
    const bool attribute = itemType == kItemAttribute;
    SetMenuState(attribute ? "CAttribute_BrowseHeader" : "COperation_BrowseHeader", browsable);
    SetMenuState(attribute ? "CAttribute_BrowseSource" : "COperation_BrowseSource", browsable);
    if (attribute) SetMenuState("CAttribute_ExposeProperty", one);
    return;
  }

  SetMenuState("CClass_ModelAssistant", one);
  SetMenuState("CClass_Assignment", !browsable);
  SetMenuState("CClass_BrowseHeader", browsable);
  SetMenuState("CClass_BrowseSource", false);  // deliberately never offered from the class menu

  if (!one) {
    // Add method and add property keep whatever the last single class gave them.
    SetMenuState("CClass_Expand2ATL", false);
    SetMenuState("CClass_ImplementInterface", false);
    return;
  }
  const std::string stereotype = GetProperty(item, hostid::kStereotype).toString();
  auto atl = [&](bool expand, bool implement, bool method, bool property) {
    SetMenuState("CClass_Expand2ATL", expand);
    SetMenuState("CClass_ImplementInterface", implement);
    SetMenuState("CClass_AddMethod", method);
    SetMenuState("CClass_AddProperty", property);
  };
  if (EqualsNoCase(stereotype, "atlobject")) {
    atl(false, true, false, false);
  } else if (EqualsNoCase(stereotype, "coclass")) {
    atl(false, false, false, false);
  } else if (EqualsNoCase(stereotype, "interface")) {
    SetMenuState("CClass_Expand2ATL", true);
    SetMenuState("CClass_AddMethod", true);
    SetMenuState("CClass_AddProperty", true);
    SetMenuState("CClass_ImplementInterface", false);
  } else {
    if (!item) throw AutomationError(vberr::kObjectNotSet);
    if (!hostNameIds_.classKind) hostNameIds_.classKind = item->IdOfName(hostid::kClassKind);
    ObjectPtr kind = GetObject(item, *hostNameIds_.classKind);
    if (!kind) throw AutomationError(vberr::kObjectNotSet);
    if (!hostNameIds_.kindName) hostNameIds_.kindName = kind->IdOfName("Name");
    const std::string kindName = GetProperty(kind, *hostNameIds_.kindName).toString();
    bool special = false;
    for (const char* k : kNonAtlClassKinds) special = special || kindName == k;
    atl(!special, false, false, false);
  }
}

// ------------------------------------------------------------------- dispatch

bool API::OnSelectedContextMenuItem(ObjectPtr& QuarnApp, std::string& internalName) {
  module_.DebugLog("kpxAddin.OnSelectedContextMenuItem(QuarnApp, internalName)", logid::ADDIN, loglevel::TRACE);
  const std::string& n = internalName;
  auto is = [&](std::initializer_list<const char*> names) {
    for (const char* name : names)
      if (n == name) return true;
    return false;
  };
  if (is({"CComponent_Browse"})) {
    OnBrowseComponent(QuarnApp);
  } else if (is({"CClass_BrowseHeader", "CAttribute_BrowseHeader", "CRole_BrowseHeader", "COperation_BrowseHeader"})) {
    OnBrowseHeader(QuarnApp);
  } else if (is({"CClass_BrowseSource", "CAttribute_BrowseSource", "CRole_BrowseSource", "COperation_BrowseSource"})) {
    OnBrowseBody(QuarnApp);
  } else if (is({"CComponent_Options"})) {
    ObjectPtr component = ItemAt(SelectedItems(QuarnApp), 1);
    CallOwnOperation(CompPropertiesAPI(), 3, CallKind::Method, {Variant(component)});  // ShowComponentOptions
  } else if (is({"CClass_ModelAssistant", "CClass_Assignment"})) {
    OnModelAssistant(QuarnApp);
  } else if (is({"CComponent_UpdateCode", "CClass_UpdateCode"})) {
    OnGenerateCode(QuarnApp);
  } else if (is({"CComponent_UpdateModel", "CClass_UpdateModel"})) {
    OnModelUpdateSelection(QuarnApp);
  } else if (is({"CComponent_Assignment"})) {
    OnComponentAssignment(QuarnApp);
  } else if (is({"CClass_ExpandSuppliers"})) {
    ExpandClassDiagram(QuarnApp, Expansion::Suppliers);
  } else if (is({"CClass_ExpandClients"})) {
    ExpandClassDiagram(QuarnApp, Expansion::Clients);
  } else if (is({"CClass_ExpandBoth"})) {
    // One look at the selection and the diagram serves both: clients first.
    ExpandClassDiagram(QuarnApp, Expansion::Both);
  } else if (is({"CClass_Expand2ATL"})) {
    OnExpand2ATLObject(QuarnApp);
  } else if (is({"CClass_ImplementInterface"})) {
    OnImplementInterfaces(QuarnApp);
  } else if (is({"CClass_AddProperty"})) {
    OnAddProperty(QuarnApp);
  } else if (is({"CClass_AddMethod"})) {
    OnAddMethod(QuarnApp);
  } else if (is({"CAttribute_ExposeProperty"})) {
    OnExposeProperty(QuarnApp);
  } else if (is({"CClass_HowTo"})) {
    OnHowTo(QuarnApp);
  } else {
    DispatchUserCommand(QuarnApp, internalName);
  }
  return false;
}

}  // namespace kpx
