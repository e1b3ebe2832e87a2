// One run of the simulated host: the world of a model file, the add-in
// object made and called as a scenario says, and the event log of it all.
#pragma once

#include <functional>
#include <memory>

#include "addin/api.h"
#include "platform/platform.h"
#include "shared/module.h"
#include "sim/companions.h"
#include "sim/event_log.h"
#include "sim/faults.h"
#include "sim/model_file.h"
#include "sim/scenario_file.h"
#include "sim/sim_platform.h"
#include "sim/world.h"

namespace kpx::sim {

// Runs `seed`, which puts many registry values in place, so that the
// registry may write them out once: one that writes itself to a file after
// every change would write the whole file once per value.
using RegistryBatch = std::function<void(const std::function<void()>& seed)>;

// What a run is given from outside: the native build hands in a registry
// file and a sandbox; a Windows test host would hand in the real ones.
struct Environment {
  platform::Registry& registry;
  platform::FileSystem& files;
  FileSeeder& seeder;
  RegistryBatch batchRegistry = {};  // none: values are set one by one
};

// How the add-in object is made. The default makes it in this process on
// the simulation's own module; a COM test host makes the real DLL's object
// instead. Throws AutomationError when the object cannot be made.
using AddInFactory = std::function<ObjectPtr()>;

// How the scenario's own objects are made: the add-in's token scanner and a
// keyed collection. Left empty, in this process (the scanner on the
// simulation's own module); a COM test host makes the real DLL's scanner and
// the system's dictionary instead.
struct ScenarioObjectFactories {
  std::function<ObjectPtr()> scanner;
  std::function<ObjectPtr()> dictionary;
};

class Simulation {
 public:
  // `model` must outlive the simulation.
  Simulation(const ModelDef& model, Environment environment, AddInFactory makeAddIn = {},
             ScenarioObjectFactories makeObjects = {});
  ~Simulation();
  Simulation(const Simulation&) = delete;
  Simulation& operator=(const Simulation&) = delete;

  // Puts the model's registry, folders, files and clock in place, once.
  // Run() does it first; tests that drive the world by hand call it.
  void Prepare();
  // Prepares, then plays the scenario. Releases the add-in object at the
  // end if the scenario left it alive. Once per simulation. The log is
  // flushed after each step; a log whose sink broke stops the run
  // (std::runtime_error).
  void Run(const Scenario& scenario);

  const EventLog& log() const { return log_; }
  EventLog& log() { return log_; }
  World& world() { return world_; }
  const platform::Platform& platform() const { return platform_; }
  // The add-in object while it lives; null when it is not one of this
  // process's own (made by another factory).
  std::shared_ptr<API> api() const { return std::dynamic_pointer_cast<API>(api_); }

  // The single steps of a scenario. A change of the world that fails (a
  // file where a scenario writes a folder's file, after the add-in made
  // it) is logged as "world-failed" with the step's line, and the run
  // goes on.
  void Create();
  void Release(bool implicit);
  void Apply(const Action& action);

 private:
  void Call(const Action& action);
  // A member's result as the log shows it; an object the add-in made
  // itself is shown by its contents where it is a collection.
  EventJson ResultValue(const Variant& result);
  void SeedRegistry(const std::vector<RegistryEntry>& entries);
  // Sets a laid-out file's times and attributes. Raises WorldError.
  void StampFile(const std::string& path, const FileDetailDef& detail, platform::FileTime now);
  void MakeObject(const Action& action);
  void Use(const Action& action);

  const ModelDef& model_;
  Environment env_;
  EventLog log_;
  World world_;
  VirtualClock clock_;
  SimUserInterface ui_;
  SimProcesses processes_;
  SimObjectFactory factory_;
  FaultyRegistry faultyRegistry_;  // unrecorded: for finding the debug log
  DebugLogLocator debugLog_;
  RecordingRegistry registry_;
  RecordingFileSystem files_;
  RecordingClock recordingClock_;
  RecordingObjectFactory objects_;
  platform::Platform platform_;
  Module module_;
  AddInFactory makeAddIn_;
  ScenarioObjectFactories makeObjects_;
  ObjectPtr api_;
  ObjectPtr scanner_, dictionary_;
  bool prepared_ = false;
};

}  // namespace kpx::sim
