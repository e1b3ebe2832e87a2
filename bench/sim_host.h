// The simulated host of the benchmarks: a model loaded through the library,
// the drives in a throw-away sandbox, the add-in object made as the host
// makes it.
#pragma once

#include <atomic>
#include <cstdint>
#include <filesystem>
#include <string>

#include "platform/posix/posix_platform.h"
#include "sim/host_objects.h"
#include "sim/json_source.h"
#include "sim/model_file.h"
#include "sim/simulation.h"

namespace kpx::bench {

class Sandbox {
 public:
  Sandbox() {
    static std::atomic<int> counter{0};
    path_ = std::filesystem::temp_directory_path() /
            ("kpx-bench-" + std::to_string(reinterpret_cast<uintptr_t>(this)) + "-" + std::to_string(counter++));
    std::filesystem::create_directories(path_);
  }
  ~Sandbox() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  Sandbox(const Sandbox&) = delete;
  Sandbox& operator=(const Sandbox&) = delete;
  const std::filesystem::path& path() const { return path_; }

 private:
  std::filesystem::path path_;
};

class SimHost {
 public:
  explicit SimHost(std::string modelText)
      : source_("bench-model.json", std::move(modelText)),
        model_(sim::LoadModel(source_)),
        files_(sandbox_.path()),
        seeder_([this](std::string_view p) { return files_.HostPath(p); }),
        sim_(model_, sim::Environment{registry_, files_, seeder_}) {
    sim_.Prepare();
    sim_.Create();
  }

  API& api() { return *sim_.api(); }
  ObjectPtr app() { return sim_.world().application(); }
  ObjectPtr element(const std::string& key) { return sim_.world().FindElement(key); }
  uint64_t hostCalls() const { return sim_.log().hostCalls(); }
  void Observe(CallObserver* observer) { sim_.log().Observe(observer); }
  // The events are not read; keep memory flat over millions of calls.
  void DropEvents() {
    if (sim_.log().events().size() > 4096) sim_.log().Clear();
  }

 private:
  Sandbox sandbox_;
  sim::JsonSource source_;
  sim::ModelDef model_;
  posix::FileRegistry registry_;  // in memory: no file behind it
  posix::SandboxFileSystem files_;
  sim::FileSeeder seeder_;
  sim::Simulation sim_;
};

}  // namespace kpx::bench
