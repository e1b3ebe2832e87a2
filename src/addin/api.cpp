#include "addin/api.h"

#include <cstdio>

#include "addin/api_members.h"
#include "addin/find_addin.h"
#include "automation/error_styles.h"
#include "automation/vb_strings.h"
#include "dialogs/code_icons.h"
#include "shared/host_ids.h"
#include "shared/shared_addinmanager.h"

namespace kpx {

namespace {

// The menu texts by resource id, in the order they are loaded.
constexpr std::array<int32_t, 18> kPlainMenuTextIds = {5001, 5002, 5003, 5004, 5005, 5006, 5007, 5008, 5009,
                                                       5038, 5041, 5042, 5039, 5043, 5044, 5052, 5053, 5054};

constexpr std::string_view kLangPropertiesClassId = "{05D99488-AB9F-11D2-B9EB-006008BF3ACB}";
constexpr std::string_view kLangPropertiesInterfaceId = "{D002DF13-8707-11D3-91A9-00104B217705}";
constexpr std::string_view kCompPropertiesClassId = "{CFD996E3-1393-11D3-B9F3-006008BF3ACB}";
constexpr std::string_view kCompPropertiesInterfaceId = "{12116B22-E8D1-11D3-91B1-00104B217705}";
constexpr std::string_view kTypeLibImporterClassId = "{B025E5DB-4064-11D3-B9F7-006008BF3ACB}";
constexpr std::string_view kTypeLibImporterInterfaceId = "{BC821C51-9E3C-11D3-8159-00A0C938B875}";
constexpr std::string_view kHostApplicationHolderInterfaceId = "{DDA8932A-8C47-11D3-813D-00A0C938B875}";

}  // namespace

API::API(Module& module) : module_(module), elementEvents_(module) {
  ResourceStrings& res = module_.resources();
  res.InitResourceStrings();
  theFirstObject_ = nullptr;
  theQuarnApp_ = nullptr;
  for (size_t i = 0; i < kPlainMenuTextIds.size(); ++i) menuTexts_[i] = res.LoadResString(kPlainMenuTextIds[i]);
  menuTexts_[static_cast<size_t>(MenuText::AtlSubmenu)] = "Submenu " + res.LoadResString(5040);
  menuTexts_[static_cast<size_t>(MenuText::ExpandSubmenu)] = "Submenu " + res.LoadResString(5051);
  menuTexts_[static_cast<size_t>(MenuText::EndSubmenu)] = "endsubmenu";
  elementEvents_.WarnReversedRealize = true;
  elementEvents_.WarnRealizeNonInterface = true;
  elementEvents_.WarnCoclassModified = true;
  elementEvents_.WarnMultipleInterfaceBase = true;
}

API::~API() {
  module_.DebugLog("kpxAddin.Class_Terminate", logid::ADDIN, loglevel::TRACE);
  ReleaseObjects();
  module_.resources().SetResourceObject(nullptr);
}

std::shared_ptr<API> CreateApi(Module& module) { return std::make_shared<API>(module); }

// ------------------------------------------------------------- automation

DispId API::IdOfName(std::string_view name) {
  std::span<const ApiMember> members = ApiMembers();
  for (size_t i = 0; i < members.size(); ++i)
    if (EqualsNoCase(members[i].name, name)) return static_cast<DispId>(i + 1);
  throw AutomationError(vberr::kNoSuchMember);
}

Variant API::Invoke(DispId id, CallKind kind, std::span<Variant> args) {
  std::span<const ApiMember> members = ApiMembers();
  if (id < 1 || static_cast<size_t>(id) > members.size()) throw AutomationError(vberr::kNoSuchMember);
  const ApiMember& m = members[static_cast<size_t>(id - 1)];
  // A property may be read as a method call and the other way round, as
  // automation clients do; nothing here can be written.
  if (kind == CallKind::PropertyPut || kind == CallKind::PropertyPutRef) throw AutomationError(vberr::kNoSuchMember);
  if (args.size() > m.paramCount) throw AutomationError(vberr::kWrongArgCount);
  for (size_t i = args.size(); i < m.paramCount; ++i)
    if (!m.params[i].optional) throw AutomationError(vberr::kArgNotOptional);
  if (!m.call) RaiseNotImplemented(m.name);
  // Optional arguments the caller left out are passed as Empty.
  if (args.size() < m.paramCount) {
    std::vector<Variant> full;
    for (Variant& a : args) full.push_back(Variant::Ref(&a));
    full.resize(m.paramCount);
    return m.call(*this, full);
  }
  return m.call(*this, args);
}

// --------------------------------------------------------- identity, factories

void API::TraceEntry(std::string_view member) {
  // The line is built only when it will be written.
  if (module_.logger().DebugLogEnabled(logid::ADDIN, loglevel::TRACE))
    module_.DebugLog(EntryTraceLine(member), logid::ADDIN, loglevel::TRACE);
}

std::string API::Name() {
  TraceEntry("Name");
  return "VC++";
}

ObjectPtr API::QuarnApp() {
  TraceEntry("QuarnApp");
  return theQuarnApp_;
}

int32_t API::OnDefaultLangProperties(ObjectPtr&) {
  TraceEntry("OnDefaultLangProperties");
  return 0;
}

// Dropped files are not accepted.
int32_t API::CanDropFileOnDiagram() {
  TraceEntry("CanDropFileOnDiagram");
  return 0;
}
int32_t API::CanDropFileOnItem() {
  TraceEntry("CanDropFileOnItem");
  return 0;
}
int32_t API::DropFileOnDiagram() {
  TraceEntry("DropFileOnDiagram");
  return 0;
}
int32_t API::DropFileOnItem() {
  TraceEntry("DropFileOnItem");
  return 0;
}

bool API::IsLanguageOperational() {
  TraceEntry("IsLanguageOperational");
  return true;
}
std::string API::LanguageName() {
  TraceEntry("LanguageName");
  return "VC++";
}
std::string API::LanguageInfo() {
  TraceEntry("LanguageInfo");
  return "Microsoft Visual C++";
}
int32_t API::LanguageId() {
  TraceEntry("LanguageId");
  return 0;
}

ObjectPtr API::LangPropertiesAPI() {
  TraceEntry("LangPropertiesAPI");
  ResumeNext onError;
  if (!theLangPropertiesAPI_) {
    onError([&] {
      theLangPropertiesAPI_ =
          module_.platform().objects.CreateInstance(kLangPropertiesClassId, kLangPropertiesInterfaceId);
    });
    if (!theLangPropertiesAPI_)
      module_.DebugLog("kpxAddin.Get LangPropertiesAPI(): " + onError.description(), logid::ADDIN, loglevel::ERROR);
  }
  return theLangPropertiesAPI_;
}

ObjectPtr API::CompPropertiesAPI() {
  TraceEntry("CompPropertiesAPI");
  ResumeNext onError;
  if (!theCompPropertiesAPI_)
    onError([&] {
      theCompPropertiesAPI_ =
          module_.platform().objects.CreateInstance(kCompPropertiesClassId, kCompPropertiesInterfaceId);
    });
  return theCompPropertiesAPI_;
}

ObjectPtr API::TypeLibImporter() {
  TraceEntry("TypeLibImporter");
  ResumeNext onError;
  if (!theTypeLibImporter_) {
    onError([&] {
      theTypeLibImporter_ =
          module_.platform().objects.CreateInstance(kTypeLibImporterClassId, kTypeLibImporterInterfaceId);
    });
    // The importer is handed the host application through an interface of
    // its own, not its default one: its "QuarnApp" property there.
    if (theTypeLibImporter_) {
      onError([&] {
        ObjectPtr holder = theTypeLibImporter_->QueryInterface(kHostApplicationHolderInterfaceId);
        CallByName(holder, "QuarnApp", CallKind::PropertyPutRef, {Variant(theQuarnApp_)});
      });
    }
    if (onError.failed())
      module_.DebugLog("kpxAddin.Get TypeLibImporter(): " + onError.description(), logid::ADDIN, loglevel::ERROR);
  }
  return theTypeLibImporter_;
}

// ------------------------------------------------------------- code icons

CodeIconsHolder& API::TheCodeIconsHolder() {
  if (!codeIconsHolder_) codeIconsHolder_ = std::make_unique<CodeIconsHolder>(module_.platform().ui);
  return *codeIconsHolder_;
}

ObjectPtr API::CodeIcons() {
  TraceEntry("CodeIcons");
  return TheCodeIconsHolder().GetCodeIcons();
}

ObjectPtr API::LargeCodeIcons() {
  TraceEntry("LargeCodeIcons");
  return TheCodeIconsHolder().GetLargeCodeIcons();
}

// ------------------------------------------------------------- activation

int32_t API::OnActivate(ObjectPtr& QuarnApp) {
  ResumeNext onError;
  const platform::Platform& world = module_.platform();
  const float startTime = world.clock.Timer();

  DebugLogger& logger = module_.logger();
  if (logger.DebugMask() != 0 && !logger.DebugOutputPath().empty())
    onError([&] { world.files.DeleteFile(logger.DebugOutputPath()); });  // each activation's log starts empty
  module_.DebugLog("kpxAddin.OnActivate(QuarnApp)", logid::ADDIN, loglevel::TRACE);

  theQuarnApp_ = QuarnApp;
  ObjectPtr ownAddIn = FindAddIn(QuarnApp, "VC++");
  onError.Clear();

  // Without its partner inside Developer Studio the add-in does not stay active.
  bool registered = false;
  onError([&] { registered = RegisterIDEAddIn(QuarnApp); });
  if (!registered) onError([&] { CallMethod(ownAddIn, hostid::kDeactivate); });

  if (!IsAddInActive(world.registry, QuarnApp, "VisualStudio")) {
    onError([&] {
      std::string text = module_.resources().LoadResString(5030);
      CallMethod(QuarnApp, hostid::kWriteErrorLog, {Variant(text)});
    });
    onError([&] { CallMethod(GetVisualStudioAddIn(QuarnApp), hostid::kActivate); });
  }

  bool menus = false;
  onError([&] {
    menus = BuildContextMenus(QuarnApp, ownAddIn);
    if (menus) menus = BuildUserCommandMenus(QuarnApp, ownAddIn);
  });
  if (!menus) module_.DebugLog("kpxAddin.OnActivate : Context menus not supported", logid::ADDIN, loglevel::ERROR);

  const float endTime = world.clock.Timer();
  if (endTime > startTime) {
    const double seconds = RoundHalfEven(static_cast<double>(endTime - startTime));
    char line[96];
    std::snprintf(line, sizeof line, "kpxAddin.OnActivate: Init time=%.0f Seconds.", seconds);
    module_.DebugLog(line, logid::ADDIN, loglevel::TRACE);
  }
  return 0;
}

int32_t API::OnDeactivate(ObjectPtr&) {
  module_.DebugLog("kpxAddin.OnDeactivate(QuarnApp)", logid::ADDIN, loglevel::TRACE);
  ReleaseObjects();
  return 0;
}

int32_t API::OnAppInit(ObjectPtr&) {
  module_.DebugLog("kpxAddin.OnAppInit(QuarnApp)", logid::ADDIN, loglevel::TRACE);
  return 0;
}

// ------------------------------------------------------- element events

void API::OnNewModelElement(const ObjectPtr& armiQuarnApp, const ObjectPtr& armiQuarnItem) {
  elementEvents_.OnNewModelElement(armiQuarnApp, armiQuarnItem);
}

void API::OnModifiedModelElement(const ObjectPtr& armiQuarnApp, const ObjectPtr& armiQuarnItem,
                                 int32_t aintReason) {
  elementEvents_.OnModifiedModelElement(armiQuarnApp, armiQuarnItem, aintReason);
}

// A deleted element needs nothing: the ATL object classes keep their code
// until the user changes them.
void API::OnDeletedModelElement(const ObjectPtr&, const ObjectPtr&) {}

int32_t API::OnNewModel(ObjectPtr&) {
  TraceEntry("OnNewModel");
  return 0;
}

// The host brackets every code generation and model update with these. The
// project settings of the model's components are not refreshed here yet:
// that belongs with the component set-up the add-in does not offer so far.
int32_t API::OnCodeUpdateStart(ObjectPtr&) {
  TraceEntry("OnCodeUpdateStart");
  module_.error().Clear();
  return 0;
}

int32_t API::OnCodeUpdateEnd(ObjectPtr&) {
  TraceEntry("OnCodeUpdateEnd");
  module_.error().Clear();
  return 0;
}

int32_t API::OnModelUpdateStart(ObjectPtr&) {
  TraceEntry("OnModelUpdateStart");
  return 0;
}

int32_t API::OnModelUpdateEnd(ObjectPtr&) {
  TraceEntry("OnModelUpdateEnd");
  return 0;
}

void API::ReleaseObjects() {
  ResumeNext onError;
  theFirstObject_ = nullptr;
  theQuarnApp_ = nullptr;
  theStatementGenerator_ = nullptr;
  theTypeLibImporter_ = nullptr;
  if (theLangPropertiesAPI_) {
    onError([&] { CallOwnOperation(theLangPropertiesAPI_, 3, CallKind::Method); });  // the companion's termination
    theLangPropertiesAPI_ = nullptr;
  }
  if (theCompPropertiesAPI_) {
    onError([&] { CallOwnOperation(theCompPropertiesAPI_, 2, CallKind::Method); });  // the companion's termination
    theCompPropertiesAPI_ = nullptr;
  }
  if (theModelAssistantAPI_) {
    onError([&] { CallByName(theModelAssistantAPI_, "Finalize", CallKind::Method); });
    theModelAssistantAPI_ = nullptr;
  }
  onError([&] { module_.platform().ui.DoEvents(); });
}

}  // namespace kpx
