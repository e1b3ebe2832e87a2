// Commands carried out by separate companion components: create (or reuse)
// the component, call one member with the host application, log.
#include <string>

#include "addin/api.h"
#include "addin/app_calls.h"
#include "automation/error_styles.h"
#include "shared/host_ids.h"

namespace kpx {

namespace {

constexpr const char* kAtlTools = "kpxatltools.kpxatlGUI";
// Texts of the message shown when the model assistant has no class to work on.
constexpr int32_t kMsgNoClassSelected = 5055;
constexpr int32_t kMsgNoClassSelectedTitle = 5056;

}  // namespace

ObjectPtr API::ModelAssistantAPI(std::string* failure) {
  TraceEntry("ModelAssistantAPI");
  ResumeNext onError;
  if (!theModelAssistantAPI_) {
    onError([&] { theModelAssistantAPI_ = module_.platform().objects.CreateObject("kpxModelAssist.API"); });
    if (!theModelAssistantAPI_) {
      module_.DebugLog("kpxAddin.ModelAssistant: CreateObject(kpxModelAssist.API) failed.", logid::ADDIN,
                       loglevel::ERROR);
      if (failure) *failure = onError.description();
    }
  }
  return theModelAssistantAPI_;
}

int32_t API::OnModelAssistant(ObjectPtr& QuarnApp) {
  TraceEntry("OnModelAssistant");
  const std::string prefix = "kpxAddin:OnModelAssistant(QuarnApp):";
  return CatchAll(
      [&] {
        ObjectPtr selection =
            CallMethod(GetObject(QuarnApp, hostid::kCurrentModel), hostid::kGetSelectedItems).toObject();
        if (GetProperty(selection, hostid::kCount).toInt32() >= 1) {
          module_.DebugLog(prefix + ".OnModelAssistant: StartModelAssistant.", logid::ADDIN, loglevel::TRACE);
          ObjectPtr selectedClass = CallMethod(selection, hostid::kGetAt, {Variant(int16_t{1})}).toObject();
          CallWithApp(ModelAssistantAPI(), "StartModelAssistant", QuarnApp, {Variant(selectedClass)});
        } else {
          ResourceStrings& res = module_.resources();
          module_.platform().ui.MessageBox(res.LoadResString(kMsgNoClassSelected),
                                           res.LoadResString(kMsgNoClassSelectedTitle), platform::kMbOk);
          module_.DebugLog(prefix + " No class selected.", logid::ADDIN, loglevel::INFO);
        }
        return 0;
      },
      [&](const AutomationError& e) {
        module_.DebugLog(prefix + " " + e.description(), logid::ADDIN, loglevel::ERROR);
        return 0;
      });
}

// A component made anew for each call; a failing member is not passed on.
int32_t API::LaunchCompanion(ObjectPtr& QuarnApp, const char* progId, const char* member, const char* traceName,
                             const char* prefix) {
  TraceEntry(traceName);
  ResumeNext onError;
  ObjectPtr component;
  onError([&] { component = module_.platform().objects.CreateObject(progId); });
  if (!component) {
    module_.DebugLog(std::string(prefix) + "." + traceName + ": CreateObject(" + progId + ") failed.", logid::ADDIN,
                     loglevel::ERROR);
    return 0;
  }
  module_.DebugLog(std::string("kpxAddin.") + traceName, logid::ADDIN, loglevel::TRACE);
  onError([&] { CallWithApp(component, member, QuarnApp); });
  return 0;
}

int32_t API::OnModelConverter(ObjectPtr& QuarnApp) {
  return LaunchCompanion(QuarnApp, "kpxmdcnv.API", "StartModelConverter", "OnModelConverter", "kpxAddin");
}

int32_t API::OnImportMFC(ObjectPtr& QuarnApp) {
  return LaunchCompanion(QuarnApp, "kpxImportMFC.API", "ImportMFC", "OnImportMFC", "kpxAddin:OnImportMFC(QuarnApp):");
}

int32_t API::OnClassWizard(ObjectPtr& QuarnApp) {
  module_.DebugLog("BEGIN kpxAddin:OnClassWizard", logid::ADDIN, loglevel::TRACE);
  CatchAll(
      [&] {
        ObjectPtr wizard = module_.platform().objects.CreateObject("tznclwiz.api");
        CallWithApp(wizard, "StartClassWizard", QuarnApp, {Variant("VC++")});
        return 0;
      },
      [&](const AutomationError& e) {
        module_.DebugLog("ERROR kpxAddin:OnClassWizard: Call to CW failed: " + e.description(), logid::ADDIN,
                         loglevel::CRITICAL);
        return 0;
      });
  // Written with log id 0, which is never logged: the text names the id
  // and level it was meant to have. Left as it is.
  module_.DebugLog("  END kpxAddin:OnClassWizard, LOGID_ADDIN, LOGLEVEL_TRACE", logid::UNKNOWN, loglevel::DEBUG);
  return 0;
}

ObjectPtr API::StatementGenerator() {
  TraceEntry("StatementGenerator");
  ResumeNext onError;
  if (!theStatementGenerator_) {
    onError([&] {
      theStatementGenerator_ = module_.platform().objects.CreateObject("kpxLangSupport.kpxStatementGenerator");
    });
    if (!theStatementGenerator_) {
      module_.DebugLog("kpxAddin.StatementGenerator():CreateObject(kpxLangSupport.kpxStatementGenerator) failed.",
                       logid::ADDIN, loglevel::ERROR);
      return nullptr;
    }
  }
  // The generator's host-application setter; its interface names it "QuarnApp".
  onError([&] {
    CallByName(theStatementGenerator_, "QuarnApp", CallKind::PropertyPutRef, {Variant(theQuarnApp_)});
  });
  module_.DebugLog("kpxAddin.StatementGenerator():StatementGenerator retrieved.", logid::ADDIN, loglevel::TRACE);
  return theStatementGenerator_;
}

// The code view works on the host's current project: a fresh view object,
// handed the host application.
ObjectPtr API::CodeViewProject() {
  module_.DebugLog("kpxAddin.CodeViewProject()", logid::ADDIN, loglevel::TRACE);
  return CatchAll(
      [&] {
        ObjectPtr view = module_.platform().objects.CreateObject("kpxCodeView.kpxCodeViewAPI");
        CallByName(view, "QuarnApp", CallKind::PropertyPutRef, {Variant(theQuarnApp_)});
        return view;
      },
      [&](const AutomationError& e) -> ObjectPtr {
        module_.DebugLog("kpxAddin.CodeViewProject: OnError: " + e.description(), logid::ADDIN, loglevel::ERROR);
        return nullptr;
      });
}

// The language property pages; `lPage` picks the page. Answers what the
// pages answer (True when the user confirmed changes), False on failure.
Variant API::OnLangProperties(ObjectPtr& QuarnApp, const Variant& lPage) {
  return CatchAll(
      [&] {
        module_.DebugLog("kpxAddin.OnModelUpdateOptions: Calling kpxLangProps.", logid::ADDIN, loglevel::TRACE);
        Variant page(lPage.isEmpty() ? Variant(0) : lPage.deref());
        return CallWithApp(LangPropertiesAPI(), "ShowProperties", QuarnApp, {}, {page});
      },
      [&](const AutomationError& e) {
        module_.DebugLog("kpxAddin.OnModelUpdateOptions: Call failed. " + e.description(), logid::ADDIN,
                         loglevel::ERROR);
        return Variant(false);
      });
}

// Importing an ATL project into the model is the ATL tools' work too.
int32_t API::OnImportATL(ObjectPtr& QuarnApp) { return LaunchAtlTool(QuarnApp, "OnImportATL", "OnImportATL"); }

// The ATL tools: one dialog component, one member per command.
int32_t API::LaunchAtlTool(ObjectPtr& QuarnApp, const char* member, const char* trace) {
  return LaunchCompanion(QuarnApp, kAtlTools, member, trace, "kpxAddin");
}

// Expanding a class to an ATL object is the ATL tools' new-object dialog.
int32_t API::OnExpand2ATLObject(ObjectPtr& QuarnApp) {
  return LaunchAtlTool(QuarnApp, "OnNewATLObject", "OnExpand2ATLObject");
}
int32_t API::OnNewATLObject(ObjectPtr& QuarnApp) { return LaunchAtlTool(QuarnApp, "OnNewATLObject", "OnNewATLObject"); }
int32_t API::OnAddMethod(ObjectPtr& QuarnApp) { return LaunchAtlTool(QuarnApp, "OnAddMethod", "OnAddMethod"); }
int32_t API::OnAddProperty(ObjectPtr& QuarnApp) { return LaunchAtlTool(QuarnApp, "OnAddProperty", "OnAddProperty"); }
int32_t API::OnImplementInterfaces(ObjectPtr& QuarnApp) {
  return LaunchAtlTool(QuarnApp, "OnImplementInterfaces", "OnImplementInterfaces");
}
int32_t API::OnExposeProperty(ObjectPtr& QuarnApp) {
  return LaunchAtlTool(QuarnApp, "OnExposeProperty", "OnExposeProperty");
}

}  // namespace kpx
