// kpx-sim stopped by a signal halfway through a run: the temporary sandbox
// goes with it, a sandbox the user named stays, and the output keeps the
// steps done so far.
#include <gtest/gtest.h>

#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

#include "test_sim_support.h"

extern char** environ;

namespace kpx::sim::test {
namespace {

namespace fs = std::filesystem;

// Starts kpx-sim with its temporary folders in `tmp`.
pid_t Start(const fs::path& tmp, std::vector<std::string> args) {
  std::vector<std::string> env;
  for (char** e = environ; *e; ++e)
    if (std::strncmp(*e, "TMPDIR=", 7) != 0) env.emplace_back(*e);
  env.push_back("TMPDIR=" + tmp.string());
  args.insert(args.begin(), KPX_SIM_PATH);
  std::vector<char*> argv, envp;
  for (std::string& a : args) argv.push_back(a.data());
  argv.push_back(nullptr);
  for (std::string& e : env) envp.push_back(e.data());
  envp.push_back(nullptr);
  pid_t pid = 0;
  if (posix_spawn(&pid, KPX_SIM_PATH, nullptr, nullptr, argv.data(), envp.data()) != 0) return -1;
  return pid;
}

bool HasSandbox(const fs::path& tmp) {
  for (const fs::directory_entry& e : fs::directory_iterator(tmp))
    if (e.path().filename().string().rfind("kpx-sim-", 0) == 0) return true;
  return false;
}

// Waits until the run is under way: events have reached its output.
bool UnderWay(const fs::path& out) {
  for (int i = 0; i < 1200; ++i) {
    std::error_code ec;
    if (fs::file_size(out, ec) > 0 && !ec) return true;
    std::this_thread::sleep_for(std::chrono::milliseconds(50));
  }
  return false;
}

// The signal that ended the process; 0 when it exited.
int StopWith(pid_t pid, int signal) {
  kill(pid, signal);
  int status = 0;
  waitpid(pid, &status, 0);
  return WIFSIGNALED(status) ? WTERMSIG(status) : 0;
}

TEST(SimSignals, AStoppedRunRemovesItsTemporarySandboxButNotOneTheUserNamed) {
  TempDir dir;
  std::ofstream(dir.path() / "model.json") << R"({"addins": [{"name": "VC++"}, {"name": "VisualStudio"}]})";
  {
    // Far more than a test waits for.
    std::ofstream scenario(dir.path() / "long.scenario.json");
    scenario << R"({"model": "model.json", "actions": [)";
    for (int i = 0; i < 5000; ++i) scenario << (i ? "," : "") << R"({"call": "OnActivate", "args": ["$app"]})";
    scenario << "]}";
  }
  const std::string scenario = (dir.path() / "long.scenario.json").string();

  for (int signal : {SIGTERM, SIGINT}) {
    SCOPED_TRACE(strsignal(signal));
    const fs::path tmp = dir.path() / ("tmp-" + std::to_string(signal));
    const fs::path out = dir.path() / ("out-" + std::to_string(signal) + ".jsonl");
    fs::create_directories(tmp);
    const pid_t pid = Start(tmp, {scenario, "--jsonl", "--out", out.string()});
    ASSERT_GT(pid, 0);
    ASSERT_TRUE(UnderWay(out));
    EXPECT_TRUE(HasSandbox(tmp));
    EXPECT_EQ(signal, StopWith(pid, signal));
    EXPECT_FALSE(HasSandbox(tmp));
    std::ifstream log(out);
    std::string first;
    std::getline(log, first);
    EXPECT_NO_THROW(EventJson::parse(first)) << first;
  }

  const fs::path kept = dir.path() / "kept";
  const fs::path out = dir.path() / "kept.jsonl";
  const pid_t pid = Start(dir.path(), {scenario, "--jsonl", "--out", out.string(), "--sandbox", kept.string()});
  ASSERT_GT(pid, 0);
  ASSERT_TRUE(UnderWay(out));
  EXPECT_EQ(SIGTERM, StopWith(pid, SIGTERM));
  EXPECT_TRUE(fs::exists(kept / "registry.reg"));
}

}  // namespace
}  // namespace kpx::sim::test
