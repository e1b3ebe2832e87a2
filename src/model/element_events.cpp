#include "model/element_events.h"

#include "addin/find_addin.h"
#include "automation/vb_strings.h"
#include "model/shared_modelutilities.h"
#include "shared/host_ids.h"
#include "shared/token_scanner.h"

namespace kpx {

namespace {

constexpr DispId kRemoveAll = 211;

std::string KindOf(const ObjectPtr& element) { return GetProperty(element, hostid::kIdentifyClass).toString(); }

// The model's property of tool "VC++".
std::string ModelProperty(const ObjectPtr& model, const char* name) {
  return CallMethod(model, hostid::kGetPropertyValue, {Variant("VC++"), Variant(name)}).toString();
}

}  // namespace

void ElementEvents::Trace(const char* text) {
  module_.DebugLog(std::string("kpxAddin") + text, logid::ADDIN, loglevel::TRACE);
}

void ElementEvents::InitEventSettings(const ObjectPtr& app) {
  const ObjectPtr model = GetObject(app, hostid::kCurrentModel);
  // Read, and then not consulted: the property exists in the property set
  // but does not switch the handling off.
  (void)(ModelProperty(model, "ExtendedEventsEnabled") == "True");
  ExtendedEventsEnabled = true;
  ScriptingActive = ModelProperty(model, "Scripting") == "True";
}

bool ElementEvents::Enabled(const ObjectPtr& app) {
  if (!ExtendedEventsEnabled) InitEventSettings(app);
  return !ScriptingActive && ExtendedEventsEnabled;
}

void ElementEvents::Warn(KpxPrompt& prompt, const std::string& message, const std::string& title, int32_t kind,
                         bool flag) {
  prompt.Initialize(message, title, kind, false, 0, "", flag);
}

void ElementEvents::EnsureAtlAssistant() {
  if (!AtlAssistant) AtlAssistant = module_.platform().objects.CreateObject(kAtlAssistantProgId);
}

const std::shared_ptr<Collection>& ElementEvents::AtlClasses() {
  if (!AtlObjectClasses) AtlObjectClasses = std::make_shared<Collection>();
  return AtlObjectClasses;
}

// ------------------------------------------------------------ new element

void ElementEvents::OnNewModelElement(const ObjectPtr& app, const ObjectPtr& item) {
  if (!Enabled(app)) return;
  Trace(":OnNewModelElement(armiQuarnApp, armiQuarnItem):");
  const std::string kind = KindOf(item);
  if (kind == "RealizeRelation")
    CheckRealize(item);
  else if (kind == "InheritRelation")
    KeepSingleBaseInterface(app, item);
}

// An interface has one base interface: the newest inherit relation stays,
// the older ones go.
void ElementEvents::KeepSingleBaseInterface(const ObjectPtr& app, const ObjectPtr& relation) {
  if (!SuppressMultiIntfBaseCk) {
    const ObjectPtr addIn = FindAddIn(app, "VC++");
    SuppressMultiIntfBaseCk = CallMethod(addIn, hostid::kReadSetting,
                                         {Variant("Extended Event Support"), Variant("SuppressMultiIntfBaseCk"),
                                          Variant("False")})
                                  .toString() == "True";
  }
  // Both ends are asked, as a plain And asks them.
  const bool hasClient = CallMethod(relation, hostid::kHasClient).toBool();
  const bool hasSupplier = CallMethod(relation, hostid::kHasSupplier).toBool();
  if (!(hasClient && hasSupplier && !SuppressMultiIntfBaseCk)) return;

  const ObjectPtr client = CallMethod(relation, hostid::kGetClient).toObject();
  const ObjectPtr supplier = CallMethod(relation, hostid::kGetSupplier).toObject();
  const bool clientIsClass = KindOf(client) == "Class";
  const bool supplierIsClass = KindOf(supplier) == "Class";
  if (!(clientIsClass && supplierIsClass)) return;
  const bool clientIsInterface = HasStereotype("interface", client);
  const bool supplierIsInterface = HasStereotype("interface", supplier);
  if (!(clientIsInterface && supplierIsInterface)) return;

  const ObjectPtr relations = CallMethod(client, hostid::kGetInheritRelations).toObject();
  const int16_t count = GetProperty(relations, hostid::kCount).toInt16();
  if (count < 2) return;
  ResourceStrings& res = module_.resources();
  // From the newest but one down to the oldest. The collection was taken
  // before the first deletion and the walk goes down, so each position
  // still names the relation it named.
  for (int16_t i = static_cast<int16_t>(count - 1); i >= 1; --i) {
    const ObjectPtr older = CallMethod(relations, hostid::kGetAt, {Variant(i)}).toObject();
    if (WarnMultipleInterfaceBase) {
      const std::string text = GetProperty(older, hostid::kRelationText).toString();
      KpxPrompt prompt(module_.platform().ui, res);
      Warn(prompt, res.GetResourceString(5046, text, "", "", "", "", ""), res.LoadResString(5047),
           KpxPrompt::kInformation, true);
      CallMethod(client, hostid::kDeleteInheritRel, {Variant(older)});
      if (prompt.dontShowValue() == 1) WarnMultipleInterfaceBase = false;
    } else {
      CallMethod(client, hostid::kDeleteInheritRel, {Variant(older)});
    }
  }
}

// A realize relation goes from a coclass to an interface; drawn that way it
// makes the ATL assistant implement the interface.
void ElementEvents::CheckRealize(const ObjectPtr& relation) {
  const bool hasClient = CallMethod(relation, hostid::kHasClient).toBool();
  const bool hasSupplier = CallMethod(relation, hostid::kHasSupplier).toBool();
  if (!(hasClient && hasSupplier)) return;
  const ObjectPtr supplier = CallMethod(relation, hostid::kGetSupplier).toObject();
  const bool supplierIsClass = KindOf(supplier) == "Class";
  const ObjectPtr client = CallMethod(relation, hostid::kGetClient).toObject();
  const bool clientIsClass = KindOf(client) == "Class";
  if (!(supplierIsClass && clientIsClass)) return;

  ResourceStrings& res = module_.resources();
  if (!HasStereotype("coclass", client)) {
    if (!HasStereotype("interface", client)) return;
    if (!HasStereotype("coclass", supplier)) return;
    // Drawn from the interface to the coclass.
    if (ScriptingActive || !WarnReversedRealize) return;
    KpxPrompt prompt(module_.platform().ui, res);
    Warn(prompt, res.GetResourceString(5048), res.GetResourceString(5049), KpxPrompt::kCritical, false);
    if (prompt.dontShowValue() == 1) WarnReversedRealize = false;
    return;
  }
  if (!HasStereotype("interface", supplier)) {
    if (!WarnRealizeNonInterface) return;
    KpxPrompt prompt(module_.platform().ui, res);
    Warn(prompt, res.GetResourceString(5050), res.GetResourceString(5049), KpxPrompt::kCritical, false);
    if (prompt.dontShowValue() == 1) WarnRealizeNonInterface = false;
    return;
  }
  EnsureAtlAssistant();
  const std::shared_ptr<Collection>& classes = AtlClasses();
  FindAtlObjectClasses(supplier, classes);
  for (size_t i = 1; i <= classes->size(); ++i)
    CallByName(AtlAssistant, "ImplementInterface", CallKind::Method,
               {classes->At(static_cast<int64_t>(i)), Variant(supplier)});
  CallMethod(classes, kRemoveAll);
}

// ------------------------------------------------------- modified element

void ElementEvents::OnModifiedModelElement(const ObjectPtr& app, const ObjectPtr& item, int32_t) {
  if (!Enabled(app)) return;
  Trace(":OnModifiedModelElement(armiQuarnApp, armiQuarnItem, aintReason):");
  EnsureAtlAssistant();
  const std::string kind = KindOf(item);
  if (kind == "Class")
    ClassModified(app, item);
  else if (kind == "Operation")
    OperationModified(item);
}

void ElementEvents::ClassModified(const ObjectPtr& app, const ObjectPtr& cls) {
  if (HasStereotype("interface", cls)) {
    const std::shared_ptr<Collection>& classes = AtlClasses();
    FindAtlObjectClasses(cls, classes);
    for (size_t i = 1; i <= classes->size(); ++i)
      CallByName(AtlAssistant, "ImplementInterface", CallKind::Method,
                 {classes->At(static_cast<int64_t>(i)), Variant(cls)});
    CallMethod(classes, kRemoveAll);
    return;
  }
  if (!HasStereotype("coclass", cls)) return;
  // Once the user ticked the box, later changes rewrite without asking and
  // so without the chance to cancel.
  if (WarnCoclassModified) {
    ResourceStrings& res = module_.resources();
    KpxPrompt prompt(module_.platform().ui, res);
    Warn(prompt, res.GetResourceString(5059), res.GetResourceString(5060), KpxPrompt::kInformation, true);
    if (prompt.dontShowValue() == 1) WarnCoclassModified = false;
    if (prompt.cancelled()) return;
  }
  RewriteCoClassBases(app, cls);
}

// Points the CLSID argument of each ATL object class's CComCoClass base at
// the coclass: CComCoClass<CFoo, &CLSID_Old> becomes
// CComCoClass<CFoo, &CLSID_<coclass>>. Anything after the old CLSID
// argument, a third template argument included, is dropped.
void ElementEvents::RewriteCoClassBases(const ObjectPtr& app, const ObjectPtr& coclass) {
  const std::shared_ptr<Collection>& classes = AtlClasses();
  FindCoclassAtlObjects(coclass, classes);
  ResourceStrings& res = module_.resources();
  for (size_t i = 1; i <= classes->size(); ++i) {
    const ObjectPtr atlObject = classes->At(static_cast<int64_t>(i)).toObject();
    const ObjectPtr relations = CallMethod(atlObject, hostid::kGetInheritRelations).toObject();
    const int16_t count = GetProperty(relations, hostid::kCount).toInt16();
    int bases = 0;
    ObjectPtr base;
    for (int16_t j = 1; j <= count; ++j) {
      const ObjectPtr relation = CallMethod(relations, hostid::kGetAt, {Variant(j)}).toObject();
      if (!CallMethod(relation, hostid::kHasSupplier).toBool()) continue;
      ObjectPtr supplier = CallMethod(relation, hostid::kGetSupplierClass).toObject();
      if (InStr(GetProperty(supplier, hostid::kName).toString(), "CComCoClass") > 0) {
        ++bases;
        base = std::move(supplier);
      }
    }
    if (bases != 1) continue;
    const ObjectPtr classKind = CallMethod(base, hostid::kGetClassKind).toObject();
    if (!CallMethod(classKind, hostid::kKindTest).toBool()) continue;

    const std::string oldName = GetProperty(base, hostid::kName).toString();
    const size_t open = InStr(oldName, "<");
    if (open == 0) continue;
    const size_t comma = InStr(open, oldName, ",");
    if (comma == 0) continue;
    const size_t clsid = InStr(comma, oldName, "&CLSID_");
    if (clsid == 0) continue;
    const std::string newName = oldName.substr(0, static_cast<size_t>(clsid)) + "CLSID_" +
                                GetProperty(coclass, hostid::kName).toString() + ">";
    const std::string line = res.GetResourceString(1176, oldName) + res.GetResourceString(1132, oldName, newName);
    CallMethod(app, hostid::kWriteErrorLog, {Variant(line)});
    PutProperty(base, hostid::kName, Variant(newName));
  }
  CallMethod(classes, kRemoveAll);
}

void ElementEvents::OperationModified(const ObjectPtr& operation) {
  const ObjectPtr parent = CallByName(operation, "ParentClass", CallKind::PropertyGet).toObject();
  if (!HasStereotype("interface", parent)) return;
  const std::shared_ptr<Collection>& classes = AtlClasses();
  FindAtlObjectClasses(parent, classes);
  for (size_t i = 1; i <= classes->size(); ++i)
    CallByName(AtlAssistant, "ImplementInterfaceMethod", CallKind::Method,
               {classes->At(static_cast<int64_t>(i)), Variant(operation), Variant::Nothing()});
  CallMethod(classes, kRemoveAll);
}

}  // namespace kpx
