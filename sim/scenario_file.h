// The scenario file: what the host and the user do, in order. Checked
// against the model before anything runs, so a typo never shows up halfway
// through a run.
#pragma once

#include <filesystem>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "automation/object.h"
#include "sim/json_source.h"
#include "sim/model_file.h"

namespace kpx::sim {

// How the user works the Restore dialog: steps in order, the last one
// closing it. Rows are named by their project or their file's full path.
struct RestoreStep {
  enum class Kind { Tick, Untick, Select, Click, Compare, Timer, Help, Ok, Cancel };
  Kind kind = Kind::Cancel;
  std::string row;  // Tick, Untick, Select, Click
  int line = 0;
};

struct RestoreAnswer {
  std::vector<RestoreStep> steps;
  int line = 0;
};

// How the user closes the module dependency dialog; `text` set: the user
// edited the text to it.
struct DependencyAnswer {
  std::optional<std::string> text;
  bool ok = false;
  int line = 0;
};

struct Action {
  enum class Type { Call, Select, Answer, Clock, Release, Create, SetRegistry, SetFile, Use };
  Type type = Type::Call;
  int line = 0;
  InputJson raw;  // a change of the world as written, for the log; not kept for calls

  // Call: the member's name as the add-in spells it, how it is called
  // (and whether the scenario said so), and the arguments (checked values,
  // possibly {"byref": ...}).
  std::string member;
  CallKind kind = CallKind::Method;
  bool kindGiven = false;
  std::vector<InputJson> args;

  // Create: what is made ("" the add-in object). Use: which of the
  // scenario's own objects is called ("scanner" or "dictionary"), with
  // `member`, `kind` and `args` as for Call; "$dictionary" in `args` is the
  // scenario's dictionary.
  std::string object;

  std::vector<std::string> select;
  int answer = 0;
  // An answer for the prompt dialog rather than a message box.
  std::optional<platform::PromptOutcome> prompt;
  bool promptHelp = false;  // Help pressed before closing it
  // An answer for the Restore dialog or the module dependency dialog.
  std::optional<RestoreAnswer> restore;
  std::optional<DependencyAnswer> dependency;
  ClockSetting clock;
  std::vector<RegistryEntry> registry;
  std::vector<std::pair<std::string, std::optional<std::string>>> files;  // no content: delete
};

struct Scenario {
  std::vector<Action> actions;
  // The run creates the add-in object itself unless the first action does.
  bool implicitCreate = true;
};

// The model file the scenario names, relative to the scenario's folder.
std::optional<std::filesystem::path> ScenarioModelPath(const JsonSource& scenario);

Scenario LoadScenario(const JsonSource& source, const ModelDef& model);

}  // namespace kpx::sim
