// The add-in's one public class: the host creates it, activates it and calls
// its events and commands. It is itself an automation object, so the COM
// server and the simulated host reach it the same way.
#pragma once

#include <array>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <span>
#include <vector>
#include <string>
#include <string_view>

#include "automation/object.h"
#include "automation/vb_strings.h"
#include "model/element_events.h"
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

class CodeIconsHolder;

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
  std::string Name();
  ObjectPtr QuarnApp();
  ObjectPtr LangPropertiesAPI();
  ObjectPtr CompPropertiesAPI();
  ObjectPtr TypeLibImporter();
  int32_t OnDefaultLangProperties(ObjectPtr& QuarnApp);
  // Dropped files are not accepted.
  int32_t CanDropFileOnDiagram();
  int32_t CanDropFileOnItem();
  int32_t DropFileOnDiagram();
  int32_t DropFileOnItem();

  // Activation.
  int32_t OnActivate(ObjectPtr& QuarnApp);
  int32_t OnDeactivate(ObjectPtr& QuarnApp);
  int32_t OnAppInit(ObjectPtr& QuarnApp);

  // Round-trip commands, forwarded to the "VisualStudio" add-in or the
  // component-properties companion.
  int32_t OnBrowseComponent(ObjectPtr& QuarnApp);
  int32_t OnBrowseBody(ObjectPtr& QuarnApp);
  int32_t OnBrowseHeader(ObjectPtr& QuarnApp);
  int32_t OnGenerateCode(ObjectPtr& QuarnApp);
  int32_t OnModelUpdate(ObjectPtr& QuarnApp);
  int32_t OnModelUpdateSelection(ObjectPtr& QuarnApp);
  int32_t OnComponentAssignment(ObjectPtr& QuarnApp);

  // Companion launchers. A model assistant that cannot be made leaves the
  // creation's error text in `failure`, when given.
  ObjectPtr ModelAssistantAPI(std::string* failure = nullptr);
  ObjectPtr StatementGenerator();
  ObjectPtr CodeViewProject();
  int32_t OnModelAssistant(ObjectPtr& QuarnApp);
  int32_t OnModelConverter(ObjectPtr& QuarnApp);
  int32_t OnClassWizard(ObjectPtr& QuarnApp);
  int32_t OnImportMFC(ObjectPtr& QuarnApp);
  Variant OnLangProperties(ObjectPtr& QuarnApp, const Variant& lPage);
  int32_t OnExpand2ATLObject(ObjectPtr& QuarnApp);
  int32_t OnNewATLObject(ObjectPtr& QuarnApp);
  int32_t OnAddMethod(ObjectPtr& QuarnApp);
  int32_t OnAddProperty(ObjectPtr& QuarnApp);
  int32_t OnImplementInterfaces(ObjectPtr& QuarnApp);
  int32_t OnExposeProperty(ObjectPtr& QuarnApp);
  int32_t OnRestoreSource(ObjectPtr& QuarnApp);
  int32_t OnModuleDependencyProperties(ObjectPtr& QuarnApp);

  // Context menus.
  bool OnSelectedContextMenuItem(ObjectPtr& QuarnApp, std::string& internalName);
  void OnEnableContextMenuItems(ObjectPtr& QuarnApp, int16_t& itemType);
  Variant ValidateComponent(const ObjectPtr& item, int16_t& count, bool& hasVC, bool& failed);
  int32_t OnUser(int slot, ObjectPtr& QuarnApp);  // OnUser1 .. OnUser5
  int32_t OnHowTo(ObjectPtr& QuarnApp);
  int32_t OnFAQ(ObjectPtr& QuarnApp);

  // Language identity.
  bool IsLanguageOperational();
  std::string LanguageName();
  std::string LanguageInfo();
  int32_t LanguageId();
  std::string GetLocation(const std::string& path, bool useDefault);

  // The property page of an item, and the stereotype lists the host offers.
  bool OnProperties(const Variant& anItem, const Variant& aContext);
  Variant ComponentStereotypes();
  Variant ClassStereotypes();

  // Components, class assignment, ATL import and drawing.
  std::string ComponentInfo();
  int32_t OnNewComponent(ObjectPtr& QuarnApp, ObjectPtr& Component);
  int32_t OnAssignClasses(ObjectPtr& QuarnApp);
  int32_t OnImportATL(ObjectPtr& QuarnApp);
  int32_t RenderClass(ObjectPtr& QuarnApp, ObjectPtr& aClass);

  // The code icons, small and large: a keyed collection of pictures each.
  ObjectPtr CodeIcons();
  ObjectPtr LargeCodeIcons();

  // The user drawing and changing the model.
  void OnNewModelElement(const ObjectPtr& armiQuarnApp, const ObjectPtr& armiQuarnItem);
  void OnModifiedModelElement(const ObjectPtr& armiQuarnApp, const ObjectPtr& armiQuarnItem, int32_t aintReason);
  void OnDeletedModelElement(const ObjectPtr& armiQuarnApp, const ObjectPtr& armiQuarnItem);
  ElementEvents& elementEvents() { return elementEvents_; }

  // Host events around code generation and model update, and a new model.
  int32_t OnNewModel(ObjectPtr& QuarnApp);
  int32_t OnCodeUpdateStart(ObjectPtr& QuarnApp);
  int32_t OnCodeUpdateEnd(ObjectPtr& QuarnApp);
  int32_t OnModelUpdateStart(ObjectPtr& QuarnApp);
  int32_t OnModelUpdateEnd(ObjectPtr& QuarnApp);

  const std::string& menuText(MenuText which) const { return menuTexts_[static_cast<size_t>(which)]; }
  // The menu entries the host returned, by key, as the last build left them.
  std::vector<std::string> menuItemKeys() const;
  // The user commands' automation object names, by slot ("OnUser1" ..).
  const std::map<std::string, std::string, NoCaseLess>& userCommands() const { return UserCommands_; }

 private:
  // The first line of a public member that has no first line of its own:
  // "kpxAddin.<member>(<parameter names>)" at TRACE.
  void TraceEntry(std::string_view member);
  void ReleaseObjects();
  bool RegisterIDEAddIn(const ObjectPtr& QuarnApp);
  bool BuildContextMenus(const ObjectPtr& QuarnApp, const ObjectPtr& addIn);
  bool BuildUserCommandMenus(const ObjectPtr& QuarnApp, const ObjectPtr& addIn);
  bool DispatchUserCommand(ObjectPtr& QuarnApp, const std::string& internalName);
  bool CreateUserCommandObject(const std::string& slot, const ObjectPtr& QuarnApp, ObjectPtr& object);
  void StartModelUpdate(ObjectPtr& QuarnApp, bool selectionOnly);
  int32_t ForwardToVisualStudio(ObjectPtr& QuarnApp, const char* event);
  bool IsBrowsableSelection(const ObjectPtr& QuarnApp);
  int32_t Browse(ObjectPtr& QuarnApp, const char* trace, int operation);
  int32_t LaunchAtlTool(ObjectPtr& QuarnApp, const char* member, const char* trace);
  int32_t LaunchCompanion(ObjectPtr& QuarnApp, const char* progId, const char* member, const char* traceName,
                          const char* prefix);
  bool CheckComponent(const ObjectPtr& component);
  void SetMenuState(const char* key, bool enabled);
  // Class-diagram expansion: the classes related to the selected ones are
  // added to the diagram the user works in.
  enum class Expansion : uint8_t { Clients, Suppliers, Both };
  void ExpandClassDiagram(const ObjectPtr& QuarnApp, Expansion which);
  // The class at the end of the association's other role from `role`.
  ObjectPtr ClassAcross(const ObjectPtr& role);
  // A member the host offers by name only, its id looked up once per
  // activation (every object of one kind answers a name with one id).
  Variant CallNamed(const ObjectPtr& object, std::string_view name, std::optional<DispId>& id, CallKind kind,
                    std::initializer_list<Variant> args = {});
  CodeIconsHolder& TheCodeIconsHolder();

  Module& module_;
  ObjectPtr theFirstObject_;  // a companion cache the host never fills; cleared with the rest
  ObjectPtr theCompPropertiesAPI_;
  ObjectPtr theQuarnApp_;
  ObjectPtr theStatementGenerator_;
  ObjectPtr theLangPropertiesAPI_;
  ObjectPtr theModelAssistantAPI_;
  ObjectPtr theTypeLibImporter_;
  std::array<std::string, static_cast<size_t>(MenuText::Count)> menuTexts_;
  // Keyed collections; the host's keys compare without regard to case, as
  // the host's own collections do.
  std::map<std::string, ObjectPtr, NoCaseLess> MenuItems_;
  // Ids of host members the menus reach by name. Every menu entry, and every
  // class kind, is the same kind of host object, so one look-up per
  // activation serves them all: each look-up is a round trip to the host.
  struct HostNameIds {
    std::optional<DispId> menuState, classKind, kindName;
    std::optional<DispId> association, role1, role2;
    std::optional<DispId> activeDiagram, addClass, clientClasses, supplierClasses;
  } hostNameIds_;
  std::map<std::string, std::string, NoCaseLess> UserCommands_;
  std::unique_ptr<CodeIconsHolder> codeIconsHolder_;  // made on first use
  // The element events' state: their warning flags, cached settings and
  // the ATL assistant.
  ElementEvents elementEvents_;
};

// Creates the add-in object as the host does.
std::shared_ptr<API> CreateApi(Module& module);

}  // namespace kpx
