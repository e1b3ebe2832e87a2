// Code generation, model update and component assignment belong to the
// sibling "VisualStudio" add-in; browsing to the component-properties
// companion. These members only find the right object and pass the call on.
#include <string>

#include "addin/api.h"
#include "addin/app_calls.h"
#include "addin/find_addin.h"
#include "automation/error_styles.h"
#include "shared/host_ids.h"

namespace kpx {

namespace {

// Calls `event` on the add-in's "EventHandler" with the host application.
void CallEventHandler(const ObjectPtr& addIn, const char* event, ObjectPtr& QuarnApp) {
  CallWithApp(CallByName(addIn, hostid::kEventHandler, CallKind::PropertyGet).toObject(), event, QuarnApp);
}

int32_t Swallow(const AutomationError&) { return 0; }

}  // namespace

int32_t API::ForwardToVisualStudio(ObjectPtr& QuarnApp, const char* event) {
  TraceEntry(event);
  return CatchAll(
      [&] {
        ObjectPtr addIn = FindAddIn(QuarnApp, "VisualStudio");
        const std::string name = std::string("kpxAddin.") + event + "(QuarnApp)";
        if (!addIn) {
          module_.DebugLog(name + " failed to get VisualStudio addin.", logid::ADDIN, loglevel::ERROR);
          return 0;
        }
        module_.DebugLog(name + ".", logid::ADDIN, loglevel::TRACE);
        CallEventHandler(addIn, event, QuarnApp);
        return 0;
      },
      Swallow);
}

int32_t API::OnGenerateCode(ObjectPtr& QuarnApp) { return ForwardToVisualStudio(QuarnApp, "OnGenerateCode"); }

int32_t API::OnComponentAssignment(ObjectPtr& QuarnApp) {
  return ForwardToVisualStudio(QuarnApp, "OnComponentAssignment");
}

int32_t API::OnModelUpdate(ObjectPtr& QuarnApp) {
  module_.DebugLog("kpxAddin.OnModelUpdate(QuarnApp).", logid::ADDIN, loglevel::TRACE);
  StartModelUpdate(QuarnApp, false);
  return 0;
}

int32_t API::OnModelUpdateSelection(ObjectPtr& QuarnApp) {
  module_.DebugLog("kpxAddin.OnModelUpdateSelection(QuarnApp).", logid::ADDIN, loglevel::TRACE);
  StartModelUpdate(QuarnApp, true);
  return 0;
}

// Assigning classes to components is the sibling's component assignment. A
// sibling without an event of this name is shown its assignment dialog,
// where the user assigns the classes just the same.
int32_t API::OnAssignClasses(ObjectPtr& QuarnApp) {
  TraceEntry("OnAssignClasses");
  return CatchAll(
      [&] {
        ObjectPtr addIn = FindAddIn(QuarnApp, "VisualStudio");
        if (!addIn) {
          module_.DebugLog("kpxAddin.OnAssignClasses(QuarnApp) failed to get VisualStudio addin.", logid::ADDIN,
                           loglevel::ERROR);
          return 0;
        }
        module_.DebugLog("kpxAddin.OnAssignClasses(QuarnApp).", logid::ADDIN, loglevel::TRACE);
        const ObjectPtr handler = CallByName(addIn, hostid::kEventHandler, CallKind::PropertyGet).toObject();
        ResumeNext onError;
        onError([&] { CallWithApp(handler, "OnAssignClasses", QuarnApp); });
        if (onError.number() == vberr::kNoSuchMember)
          CallWithApp(handler, "OnComponentAssignment", QuarnApp);
        else if (onError.failed())
          throw AutomationError(onError.number(), onError.description());
        return 0;
      },
      [&](const AutomationError& e) {
        module_.DebugLog("kpxAddin.OnAssignClasses(QuarnApp) failed: " + e.description(), logid::ADDIN,
                         loglevel::ERROR);
        return 0;
      });
}

void API::StartModelUpdate(ObjectPtr& QuarnApp, bool selectionOnly) {
  CatchAll(
      [&] {
        ObjectPtr addIn = FindAddIn(QuarnApp, "VisualStudio");
        if (!addIn) {
          module_.DebugLog("kpxAddin.StartModelUpdate(QuarnApp) failed to get VisualStudio addin.", logid::ADDIN,
                           loglevel::ERROR);
          return 0;
        }
        module_.DebugLog("kpxAddin.StartModelUpdate(QuarnApp).", logid::ADDIN, loglevel::TRACE);
        if (!selectionOnly) {
          CallEventHandler(addIn, "OnModelUpdate", QuarnApp);
          return 0;
        }
        ResumeNext onError;
        onError([&] { CallEventHandler(addIn, "OnModelUpdateSelection", QuarnApp); });
        // A sibling that knows no selection update updates the whole model.
        if (onError.number() == vberr::kNoSuchMember) CallEventHandler(addIn, "OnModelUpdate", QuarnApp);
        return 0;
      },
      Swallow);
}

// Browsing needs exactly one selected item that has source code of its own:
// a class, one of its attributes, operations or roles, or a component.
bool API::IsBrowsableSelection(const ObjectPtr& QuarnApp) {
  ObjectPtr selection = CallMethod(GetObject(QuarnApp, hostid::kCurrentModel), hostid::kGetSelectedItems).toObject();
  if (GetProperty(selection, hostid::kCount).toInt32() != 1) return false;
  ObjectPtr item = CallMethod(selection, hostid::kGetAt, {Variant(int16_t{1})}).toObject();
  const std::string kind = CallMethod(item, hostid::kIdentifyClass).toString();
  for (const char* browsable : {"Class", "Attribute", "Operation", "Role", "Module"})
    if (kind == browsable) return true;
  return false;
}

int32_t API::Browse(ObjectPtr& QuarnApp, const char* trace, int operation) {
  module_.DebugLog(trace, logid::ADDIN, loglevel::TRACE);
  return CatchAll(
      [&] {
        if (!IsBrowsableSelection(QuarnApp)) return 0;
        ObjectPtr service = CallOwnOperation(CompPropertiesAPI(), 12, CallKind::PropertyGet).toObject();
        CallOwnOperation(service, operation, CallKind::Method, {Variant(QuarnApp)});
        return 0;
      },
      Swallow);
}

int32_t API::OnBrowseComponent(ObjectPtr& QuarnApp) {
  return Browse(QuarnApp, "kpxAddin.OnBrowseComponent(QuarnApp)", 5);
}
int32_t API::OnBrowseBody(ObjectPtr& QuarnApp) { return Browse(QuarnApp, "kpxAddin.OnBrowseBody(QuarnApp).", 4); }
int32_t API::OnBrowseHeader(ObjectPtr& QuarnApp) {
  return Browse(QuarnApp, "kpxAddin.OnBrowseHeader(QuarnApp).", 3);
}

}  // namespace kpx
