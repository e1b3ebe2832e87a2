// The simulator's model and scenario files, as a user might mistype them.
// The input is a model file, optionally followed by a line "---" and a
// scenario file. Each file is either loaded or refused with an InputError
// that names the file and a line inside it; no other exception, crash or
// hang. What loads is indexed completely: every value the parser found has
// a line in the file, and a member's key never stands below its value.
#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "sim/json_source.h"
#include "sim/model_file.h"
#include "sim/scenario_file.h"

namespace {

using kpx::sim::InputError;
using kpx::sim::InputJson;
using kpx::sim::JsonSource;

// Names the failed check before stopping, so a finding reads at once.
void Require(bool condition, int line = __builtin_LINE()) {
  if (condition) return;
  std::fprintf(stderr, "%s:%d: check failed\n", __FILE__, line);
  std::abort();
}

int LineCount(std::string_view text) { return 1 + static_cast<int>(std::count(text.begin(), text.end(), '\n')); }

void RequireNamed(const InputError& e, const std::string& file, std::string_view text) {
  Require(e.file() == file);
  Require(e.line() >= 1 && e.line() <= LineCount(text));
  Require(std::string_view(e.what()).starts_with(file + ":" + std::to_string(e.line()) + ": "));
}

// Every value has a line, lines never go back in document order, and a
// member's key never stands below its value. The lines found one by one
// agree with the walk for a few values (each costs a walk of its own).
void CheckIndex(const JsonSource& source, int lines) {
  int previous = 1;
  size_t count = 0;
  std::vector<std::pair<const InputJson*, int>> sample;
  source.ForEachLine([&](const InputJson& value, int line, int keyLine) {
    Require(line >= 1 && line <= lines);
    Require(keyLine >= previous && keyLine <= line);
    previous = line;
    if (count++ % 97 == 0) sample.emplace_back(&value, line);
  });
  for (const auto& [value, line] : sample) Require(source.LineOfValue(*value) == line);
}

// Parses one file; nothing when it is refused (correctly).
std::optional<JsonSource> Parse(const std::string& name, std::string_view text) {
  try {
    JsonSource source(name, std::string(text));
    CheckIndex(source, LineCount(text));
    return source;
  } catch (const InputError& e) {
    RequireNamed(e, name, text);
    return std::nullopt;
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string_view input(reinterpret_cast<const char*>(data), size);
  const size_t split = input.find("\n---\n");
  const std::string_view modelText = input.substr(0, split);
  const std::optional<std::string_view> scenarioText =
      split == std::string_view::npos ? std::nullopt : std::optional(input.substr(split + 5));

  const std::optional<JsonSource> model = Parse("model.json", modelText);
  if (!model) return 0;
  kpx::sim::ModelDef def;
  try {
    def = kpx::sim::LoadModel(*model);
  } catch (const InputError& e) {
    RequireNamed(e, "model.json", modelText);
    return 0;
  }
  if (!scenarioText) return 0;

  const std::optional<JsonSource> scenario = Parse("scenario.json", *scenarioText);
  if (!scenario) return 0;
  try {
    kpx::sim::ScenarioModelPath(*scenario);
    const kpx::sim::Scenario s = kpx::sim::LoadScenario(*scenario, def);
    // One action per entry, each at its own line, in file order.
    Require(s.actions.size() == scenario->root().at("actions").size());
    int previous = 1;
    for (const kpx::sim::Action& a : s.actions) {
      Require(a.line >= previous && a.line <= LineCount(*scenarioText));
      previous = a.line;
    }
  } catch (const InputError& e) {
    RequireNamed(e, "scenario.json", *scenarioText);
  }
  return 0;
}
