#include "sim/simulation.h"

#include <stdexcept>

#include "automation/dictionary.h"
#include "automation/error_styles.h"
#include "automation/vb_strings.h"
#include "dialogs/code_icons.h"
#include "shared/token_scanner_object.h"

namespace kpx::sim {

namespace {

bool IsCodeIconsMember(std::string_view member) {
  return EqualsNoCase(member, "CodeIcons") || EqualsNoCase(member, "LargeCodeIcons");
}

// A collection of code icons as the log shows it, read through automation
// alone, so that the add-in's collection of the sim's pictures and the
// DLL's collection of real pictures read the same: its Count, then each
// item in order with its picture's type and size in pixels, and the key it
// is found under. Keys cannot be read from a collection, so each key of the
// add-in's artwork is looked up and its picture matched to an item by its
// Handle; an item no such key finds has key null, and the keys that find
// nothing are listed as "missing".
EventJson DescribeCodeIcons(const ObjectPtr& icons) {
  EventJson out{{"object", "codeicons"}};
  try {
    std::map<int32_t, std::string> keyOfHandle;
    EventJson missing = EventJson::array();
    for (const CodeIconArt& art : CodeIconArtwork()) {
      try {
        ObjectPtr picture = CallByName(icons, "Item", CallKind::Method, {Variant(art.key)}).toObject();
        keyOfHandle[GetProperty(picture, platform::kPictureHandle).toInt32()] = art.key;
      } catch (...) {
        missing.push_back(art.key);
      }
    }
    const int32_t count = CallByName(icons, "Count", CallKind::PropertyGet).toInt32();
    out["count"] = count;
    EventJson items = EventJson::array();
    for (int32_t i = 1; i <= count; ++i) {
      ObjectPtr picture = CallByName(icons, "Item", CallKind::Method, {Variant(i)}).toObject();
      auto key = keyOfHandle.find(GetProperty(picture, platform::kPictureHandle).toInt32());
      items.push_back({{"key", key == keyOfHandle.end() ? EventJson() : EventJson(key->second)},
                       {"type", GetProperty(picture, platform::kPictureType).toInt32()},
                       {"width", platform::HimetricToPixels(GetProperty(picture, platform::kPictureWidth).toInt32())},
                       {"height", platform::HimetricToPixels(GetProperty(picture, platform::kPictureHeight).toInt32())}});
    }
    out["items"] = std::move(items);
    if (!missing.empty()) out["missing"] = std::move(missing);
  } catch (...) {
    out["error"] = ErrorJson(CurrentError());
  }
  return out;
}

}  // namespace

Simulation::Simulation(const ModelDef& model, Environment environment, AddInFactory makeAddIn,
                       ScenarioObjectFactories makeObjects)
    : model_(model),
      env_(environment),
      world_(model, log_),
      ui_(log_),
      processes_(log_, model.processes),
      factory_(world_),
      faultyRegistry_(env_.registry, model.faults),
      debugLog_(platform::Platform{faultyRegistry_, env_.files, clock_, factory_, ui_, processes_}),
      registry_(env_.registry, log_, model.faults),
      files_(env_.files, log_, debugLog_, model.faults),
      recordingClock_(clock_, log_),
      objects_(factory_, log_),
      platform_{registry_, files_, recordingClock_, objects_, ui_, processes_},
      module_(platform_),
      makeAddIn_(std::move(makeAddIn)),
      makeObjects_(std::move(makeObjects)) {
  if (!makeAddIn_) makeAddIn_ = [this]() -> ObjectPtr { return CreateApi(module_); };
  if (!makeObjects_.scanner)
    makeObjects_.scanner = [this]() -> ObjectPtr { return std::make_shared<TokenScannerObject>(module_.platform().objects); };
  if (!makeObjects_.dictionary) makeObjects_.dictionary = []() -> ObjectPtr { return std::make_shared<Dictionary>(); };
}

Simulation::~Simulation() {
  // The add-in object goes first: its destructor still talks to the world.
  if (api_) Release(true);
}

void Simulation::Prepare() {
  if (prepared_) return;
  prepared_ = true;
  SeedRegistry(model_.registry);
  // Every Windows machine has a drive C, files or not: a debug log at its
  // root ("C:\tzndebuglog.txt", the logger's default) can be written.
  env_.seeder.MakeFolder("C:\\");
  for (const std::string& folder : model_.folders) env_.seeder.MakeFolder(folder);
  clock_.Set(model_.clock);
  const platform::FileTime start = *clock_.SystemFileTime();
  for (const auto& [path, content] : model_.files) {
    env_.seeder.WriteFile(path, content);
    auto detail = model_.fileDetails.find(path);
    StampFile(path, detail == model_.fileDetails.end() ? FileDetailDef{} : detail->second, start);
  }
}

// A file the world lays out has the times the model gives it, the others
// the clock's present time, so that a run is the same wherever and
// whenever it runs; a read-only file is made read-only last, once its times
// are set.
void Simulation::StampFile(const std::string& path, const FileDetailDef& detail, platform::FileTime now) {
  platform::FileSystem& files = env_.files;
  const platform::FileHandle handle = files.OpenForTimes(path);
  if (handle == platform::kNoFile)
    throw WorldError("cannot set the times of " + path + ": " + files.LastError().description);
  const platform::FileTimes times{detail.creation.value_or(now), detail.lastAccess.value_or(now),
                                  detail.lastWrite.value_or(now)};
  const bool set = files.SetFileTimes(handle, times);
  files.CloseFile(handle);
  if (!set) throw WorldError("cannot set the times of " + path + ": " + files.LastError().description);
  if (detail.readOnly &&
      !files.SetAttributes(path, platform::kAttributeReadOnly | platform::kAttributeArchive))
    throw WorldError("cannot make " + path + " read-only: " + files.LastError().description);
}

void Simulation::SeedRegistry(const std::vector<RegistryEntry>& entries) {
  if (env_.batchRegistry)
    env_.batchRegistry([&] { kpx::sim::SeedRegistry(env_.registry, entries); });
  else
    kpx::sim::SeedRegistry(env_.registry, entries);
}

void Simulation::Run(const Scenario& scenario) {
  auto stepDone = [this] {
    log_.Flush();
    if (log_.broken()) throw std::runtime_error("the output cannot be written");
  };
  Prepare();
  if (scenario.implicitCreate) Create();
  stepDone();
  for (const Action& action : scenario.actions) {
    Apply(action);
    stepDone();
  }
  if (api_) Release(true);
  if (!ui_.pendingAnswers().empty())
    log_.Add({{"ev", "unused-answers"},
              {"buttons", EventJson(std::vector<int>(ui_.pendingAnswers().begin(), ui_.pendingAnswers().end()))}});
  if (!ui_.pendingPromptAnswers().empty())
    log_.Add({{"ev", "unused-answers"}, {"prompts", ui_.pendingPromptAnswers().size()}});
  if (!ui_.pendingRestoreAnswers().empty())
    log_.Add({{"ev", "unused-answers"}, {"restoreDialogs", ui_.pendingRestoreAnswers().size()}});
  if (!ui_.pendingDependencyAnswers().empty())
    log_.Add({{"ev", "unused-answers"}, {"dependencyDialogs", ui_.pendingDependencyAnswers().size()}});
}

void Simulation::Create() {
  try {
    api_ = makeAddIn_();
    log_.NameObject(api_.get(), "API");
    log_.Add({{"ev", "create"}, {"ok", true}});
  } catch (...) {
    log_.Add({{"ev", "create"}, {"ok", false}, {"error", ErrorJson(CurrentError())}});
  }
}

void Simulation::Release(bool implicit) {
  if (!api_) {
    log_.Add({{"ev", "release"}, {"implicit", implicit}, {"skipped", "no add-in object"}});
    return;
  }
  log_.Add({{"ev", "release"}, {"implicit", implicit}});
  const Object* gone = api_.get();
  api_.reset();
  log_.ForgetObject(gone);
}

void Simulation::Apply(const Action& a) {
  // World changes are logged as written, so a log reads on its own.
  auto logWorld = [&](const char* key) {
    EventJson ev{{"ev", "world"}};
    ev[key] = EventJson::parse(a.raw.at(key).dump());
    log_.Add(std::move(ev));
  };
  // What the world refused, after the step as written.
  std::vector<std::string> refused;
  auto logFailures = [&](const char* action) {
    for (const std::string& reason : refused)
      log_.Add({{"ev", "world-failed"}, {"action", action}, {"line", a.line}, {"reason", reason}});
  };
  switch (a.type) {
    case Action::Type::Call:
      Call(a);
      break;
    case Action::Type::Create:
      if (a.object.empty())
        Create();
      else
        MakeObject(a);
      break;
    case Action::Type::Use:
      Use(a);
      break;
    case Action::Type::Release:
      Release(false);
      break;
    case Action::Type::Select:
      world_.Select(a.select);
      logWorld("select");
      break;
    case Action::Type::Answer:
      if (a.prompt)
        ui_.QueuePromptAnswer({*a.prompt, a.promptHelp});
      else if (a.restore)
        ui_.QueueRestoreAnswer(*a.restore);
      else if (a.dependency)
        ui_.QueueDependencyAnswer(*a.dependency);
      else
        ui_.QueueAnswer(a.answer);
      logWorld("answer");
      break;
    case Action::Type::Clock:
      clock_.Set(a.clock);
      logWorld("clock");
      break;
    case Action::Type::SetRegistry:
      try {
        SeedRegistry(a.registry);
      } catch (const WorldError& e) {
        refused.push_back(e.what());
      }
      logWorld("setRegistry");
      logFailures("setRegistry");
      break;
    case Action::Type::SetFile:
      for (const auto& [path, content] : a.files) {
        try {
          if (content) {
            env_.seeder.WriteFile(path, *content);
            StampFile(path, {}, *clock_.SystemFileTime());
          } else
            env_.seeder.RemoveFile(path);
        } catch (const WorldError& e) {
          refused.push_back(e.what());
        }
      }
      logWorld("setFile");
      logFailures("setFile");
      break;
  }
}

void Simulation::Call(const Action& a) {
  if (!api_) {
    // The host cannot call an object it failed to create.
    log_.Add({{"ev", "skip"}, {"member", a.member}, {"reason", "no add-in object"}});
    return;
  }
  std::vector<Variant> slots(a.args.size());  // by-reference arguments live here
  std::vector<Variant> args;
  std::vector<size_t> byRef;
  EventJson shown = EventJson::array();
  for (size_t i = 0; i < a.args.size(); ++i) {
    const InputJson& arg = a.args[i];
    if (arg.is_object() && arg.size() == 1 && arg.contains("byref")) {
      slots[i] = world_.ToVariant(arg.at("byref"));
      args.push_back(Variant::Ref(&slots[i]));
      byRef.push_back(i);
      shown.push_back({{"byref", log_.Value(slots[i])}});
    } else {
      args.push_back(world_.ToVariant(arg));
      shown.push_back(log_.Value(args.back()));
    }
  }
  EventJson call{{"ev", "call"}, {"member", a.member}, {"args", std::move(shown)}};
  if (a.kindGiven) call["kind"] = a.kind == CallKind::PropertyGet ? "get" : "method";
  log_.Add(std::move(call));

  const uint64_t before = log_.hostCalls();
  try {
    const Variant result = api_->Invoke(api_->IdOfName(a.member), a.kind, args);
    EventJson ev{{"ev", "result"}, {"member", a.member}, {"hostCalls", log_.hostCalls() - before}};
    ev["value"] = IsCodeIconsMember(a.member) && result.isObject() && !result.isNothing()
                      ? DescribeCodeIcons(result.toObject())
                      : ResultValue(result);
    if (!byRef.empty()) {
      EventJson written = EventJson::object();
      for (size_t i : byRef) written[std::to_string(i + 1)] = log_.Value(slots[i]);
      ev["byref"] = std::move(written);
    }
    log_.Add(std::move(ev));
  } catch (...) {
    const AutomationError e = CurrentError();
    log_.Add({{"ev", "error"},
              {"member", a.member},
              {"number", e.number()},
              {"description", e.description()},
              {"hostCalls", log_.hostCalls() - before}});
  }
}

// The host reads a collection the add-in hands it (the stereotype lists)
// by Count and Item; the log shows what it reads, {"collection": [items]}.
// Any other object of the add-in's own shows as it is, {"object": "?"}.
EventJson Simulation::ResultValue(const Variant& result) {
  EventJson shown = log_.Value(result);
  const ObjectPtr object = result.isObject() ? result.deref().objectOrNull() : nullptr;
  if (!object || log_.Label(object.get()) != "?") return shown;
  try {
    const int32_t count = object->Invoke(object->IdOfName("Count"), CallKind::PropertyGet, {}).toInt32();
    const DispId item = object->IdOfName("Item");
    EventJson items = EventJson::array();
    for (int32_t i = 1; i <= count; ++i) {
      Variant index(i);
      items.push_back(log_.Value(object->Invoke(item, CallKind::PropertyGet, std::span<Variant>(&index, 1))));
    }
    return {{"collection", std::move(items)}};
  } catch (...) {
    return shown;
  }
}

// The scenario's own objects are not the host's: their calls are no host
// calls, and an object they answer is shown only as there or not (the same
// dictionary is a different wrapper each time it crosses COM).
namespace {

EventJson ShownValue(const EventLog& log, const Variant& v) {
  if (v.isObject()) return {{"object", v.isNothing() ? EventJson() : EventJson(true)}};
  return log.Value(v);
}

const char* KindText(CallKind kind) {
  switch (kind) {
    case CallKind::PropertyGet: return "get";
    case CallKind::PropertyPut: return "put";
    case CallKind::PropertyPutRef: return "putref";
    default: return "method";
  }
}

}  // namespace

void Simulation::MakeObject(const Action& a) {
  const bool scanner = a.object == "kpxAddIn.TokenScanner";
  EventJson ev{{"ev", "create"}, {"object", a.object}};
  try {
    (scanner ? scanner_ : dictionary_) = (scanner ? makeObjects_.scanner : makeObjects_.dictionary)();
    ev["ok"] = true;
  } catch (...) {
    (scanner ? scanner_ : dictionary_) = nullptr;
    ev["ok"] = false;
    ev["error"] = ErrorJson(CurrentError());
  }
  log_.Add(std::move(ev));
}

void Simulation::Use(const Action& a) {
  const ObjectPtr& target = a.object == "scanner" ? scanner_ : dictionary_;
  EventJson ev{{"ev", a.object + "-call"}, {"member", a.member}, {"kind", KindText(a.kind)}};
  std::vector<Variant> args;
  EventJson shown = EventJson::array();
  for (const InputJson& arg : a.args) {
    args.push_back(arg.is_string() && arg.get<std::string>() == "$dictionary" ? Variant(dictionary_)
                                                                               : world_.ToVariant(arg));
    shown.push_back(ShownValue(log_, args.back()));
  }
  ev["args"] = std::move(shown);
  if (!target) {
    ev["skipped"] = "its creation failed";
    log_.Add(std::move(ev));
    return;
  }
  try {
    ev["result"] = ShownValue(log_, target->Invoke(target->IdOfName(a.member), a.kind, args));
  } catch (...) {
    ev["error"] = ErrorJson(CurrentError());
  }
  log_.Add(std::move(ev));
}

}  // namespace kpx::sim
