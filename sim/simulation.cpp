#include "sim/simulation.h"

#include <stdexcept>

#include "automation/error_styles.h"

namespace kpx::sim {

Simulation::Simulation(const ModelDef& model, Environment environment, AddInFactory makeAddIn)
    : model_(model),
      env_(environment),
      world_(model, log_),
      ui_(log_),
      factory_(world_),
      debugLog_(platform::Platform{env_.registry, env_.files, clock_, factory_, ui_}),
      registry_(env_.registry, log_),
      files_(env_.files, log_, debugLog_),
      recordingClock_(clock_, log_),
      objects_(factory_, log_),
      platform_{registry_, files_, recordingClock_, objects_, ui_},
      module_(platform_),
      makeAddIn_(std::move(makeAddIn)) {
  if (!makeAddIn_) makeAddIn_ = [this]() -> ObjectPtr { return CreateApi(module_); };
}

Simulation::~Simulation() {
  // The add-in object goes first: its destructor still talks to the world.
  if (api_) Release(true);
}

void Simulation::Prepare() {
  if (prepared_) return;
  prepared_ = true;
  SeedRegistry(model_.registry);
  for (const std::string& folder : model_.folders) env_.seeder.MakeFolder(folder);
  for (const auto& [path, content] : model_.files) env_.seeder.WriteFile(path, content);
  clock_.Set(model_.clock);
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
      Create();
      break;
    case Action::Type::Release:
      Release(false);
      break;
    case Action::Type::Select:
      world_.Select(a.select);
      logWorld("select");
      break;
    case Action::Type::Answer:
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
          if (content)
            env_.seeder.WriteFile(path, *content);
          else
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
    EventJson ev{{"ev", "result"},
                 {"member", a.member},
                 {"value", log_.Value(result)},
                 {"hostCalls", log_.hostCalls() - before}};
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

}  // namespace kpx::sim
