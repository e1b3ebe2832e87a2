// The add-in's answer to the user drawing and changing the model: it keeps
// the COM/ATL meaning of the model consistent. An interface keeps one base
// interface; a realize relation must go from a coclass to an interface and
// makes the ATL assistant implement the interface in the coclasses' ATL
// object classes; changed interfaces, interface operations and coclasses
// are carried into those classes.
//
// None of these events traps a failure: a failing host, assistant,
// resource or dialog call ends the event and goes back to the host, and
// what was already changed (a cleared warning, a deleted relation, a
// renamed base) stays changed.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "automation/collection.h"
#include "automation/object.h"
#include "dialogs/kpx_prompt.h"
#include "shared/module.h"

namespace kpx {

class ElementEvents {
 public:
  static constexpr const char* kAtlAssistantProgId = "kpxatlassist.kpxatlAPI";

  explicit ElementEvents(Module& module) : module_(module) {}

  void OnNewModelElement(const ObjectPtr& app, const ObjectPtr& item);
  void OnModifiedModelElement(const ObjectPtr& app, const ObjectPtr& item, int32_t reason);

  // Gate of all element-event handling. The model property of that name is
  // read but does not switch the handling off: only "Scripting" does.
  bool ExtendedEventsEnabled = false;
  // True while the model's "Scripting" property is "True".
  bool ScriptingActive = false;
  // The add-in setting, read until it is found "True", then kept.
  bool SuppressMultiIntfBaseCk = false;
  // Each cleared by ticking "do not show again" in its warning; cleared
  // for the life of the add-in object.
  bool WarnReversedRealize = true;
  bool WarnRealizeNonInterface = true;
  bool WarnMultipleInterfaceBase = true;
  bool WarnCoclassModified = true;
  // Created on first need and kept while the add-in object lives.
  ObjectPtr AtlAssistant;
  std::shared_ptr<Collection> AtlObjectClasses;

 private:
  void InitEventSettings(const ObjectPtr& app);
  // Runs the settings check of both events; false when the event is to be
  // ignored.
  bool Enabled(const ObjectPtr& app);
  void KeepSingleBaseInterface(const ObjectPtr& app, const ObjectPtr& relation);
  void CheckRealize(const ObjectPtr& relation);
  void ClassModified(const ObjectPtr& app, const ObjectPtr& cls);
  void OperationModified(const ObjectPtr& operation);
  void RewriteCoClassBases(const ObjectPtr& app, const ObjectPtr& coclass);
  // Opens the prompt with a warning; the caller reads what the user did.
  void Warn(KpxPrompt& prompt, const std::string& message, const std::string& title, int32_t kind, bool flag);
  void EnsureAtlAssistant();
  const std::shared_ptr<Collection>& AtlClasses();
  void Trace(const char* text);

  Module& module_;
};

}  // namespace kpx
