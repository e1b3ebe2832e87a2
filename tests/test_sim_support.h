// Helpers for the simulator's tests: a world built from model text, over an
// in-memory registry and a throw-away sandbox folder.
#pragma once

#include <gtest/gtest.h>

#include <atomic>
#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include "platform/posix/posix_platform.h"
#include "sim/json_source.h"
#include "sim/model_file.h"
#include "sim/scenario_file.h"
#include "sim/simulation.h"

namespace kpx::sim::test {

class TempDir {
 public:
  TempDir() {
    static std::atomic<int> counter{0};
    path_ = std::filesystem::temp_directory_path() /
            ("kpx-sim-test-" + std::to_string(::testing::UnitTest::GetInstance()->random_seed()) + "-" +
             std::to_string(reinterpret_cast<uintptr_t>(this)) + "-" + std::to_string(counter++));
    std::filesystem::create_directories(path_);
  }
  ~TempDir() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;
  const std::filesystem::path& path() const { return path_; }

 private:
  std::filesystem::path path_;
};

inline ModelDef ParseModel(const std::string& text) { return LoadModel(JsonSource("model.json", text)); }

// The line an input error names; -1 when nothing was raised.
inline int FaultLine(const std::function<void()>& load, std::string* message = nullptr) {
  try {
    load();
  } catch (const InputError& e) {
    if (message) *message = e.message();
    return e.line();
  }
  return -1;
}

// A prepared simulation of a model.
class SimWorld {
 public:
  explicit SimWorld(const std::string& modelText)
      : model_(ParseModel(modelText)),
        files_(dir_.path(), posix::SandboxFileSystem::Zone::Utc),
        seeder_([this](std::string_view p) { return files_.HostPath(p); }),
        sim_(model_, Environment{registry_, files_, seeder_}) {
    sim_.Prepare();
  }

  Simulation& sim() { return sim_; }
  World& world() { return sim_.world(); }
  EventLog& log() { return sim_.log(); }
  posix::FileRegistry& registry() { return registry_; }
  posix::SandboxFileSystem& files() { return files_; }
  const ModelDef& model() const { return model_; }

  // Runs a scenario given as text against this world.
  void Run(const std::string& scenarioText) {
    const JsonSource source("scenario.json", scenarioText);
    sim_.Run(LoadScenario(source, model_));
  }

  // The events of one kind, in order.
  std::vector<EventJson> Events(const std::string& kind) const {
    std::vector<EventJson> out;
    for (const EventJson& e : sim_.log().events())
      if (e.value("ev", "") == kind) out.push_back(e);
    return out;
  }

 private:
  ModelDef model_;
  TempDir dir_;
  posix::FileRegistry registry_;
  posix::SandboxFileSystem files_;
  FileSeeder seeder_;
  Simulation sim_;
};

}  // namespace kpx::sim::test
