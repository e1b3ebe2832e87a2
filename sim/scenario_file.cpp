#include "sim/scenario_file.h"

#include <algorithm>
#include <span>

#include "addin/api_members.h"
#include "automation/vb_strings.h"
#include "sim/windows_path.h"

namespace kpx::sim {

std::optional<std::filesystem::path> ScenarioModelPath(const JsonSource& scenario) {
  std::optional<Node> model = Node::Root(scenario).Find("model");
  if (!model) return std::nullopt;
  const std::string name = model->String();
  if (name.empty()) model->Fail("empty model path");
  return std::filesystem::path(scenario.name()).parent_path() / name;
}

namespace {

constexpr std::string_view kActionKeys[] = {"call",   "select",      "answer",  "clock",   "release",
                                            "create", "setRegistry", "setFile", "scanner", "dictionary"};

// What a scenario can make besides the add-in object, and the members it can
// call on each: the add-in's token scanner and a keyed collection of the
// kind the scanner takes as its delimiters.
constexpr std::string_view kTokenScanner = "kpxAddIn.TokenScanner";
constexpr std::string_view kDictionary = "Scripting.Dictionary";
struct UsableMember {
  std::string_view name;
  bool property;
};
constexpr UsableMember kScannerMembers[] = {{"Init", false},         {"NextToken", false},  {"ReplaceCurrentToken", false},
                                            {"ScanString", true},    {"CurrentToken", true}, {"Delimitors", true}};
constexpr UsableMember kDictionaryMembers[] = {{"Add", false},    {"Exists", false},   {"Remove", false},
                                               {"RemoveAll", false}, {"Count", true}, {"Item", true},
                                               {"CompareMode", true}};

// A call's "kind": "method" or "get"; "put" and "putref" too where writes are allowed.
CallKind ReadKind(const Node& k, bool writes) {
  const std::string kind = k.String();
  if (kind == "method") return CallKind::Method;
  if (kind == "get") return CallKind::PropertyGet;
  if (writes && kind == "put") return CallKind::PropertyPut;
  if (writes && kind == "putref") return CallKind::PropertyPutRef;
  k.Fail(writes ? "a kind is \"method\", \"get\", \"put\" or \"putref\"" : "a call's kind is \"method\" or \"get\"");
}

// {"scanner": "Member", "args": [...], "kind": "..."}: a property is read
// without arguments and written with them (put; putref for an object).
void ReadUse(const Node& n, const ModelDef& model, Action& a) {
  n.ExpectKeys({"comment", std::string_view(a.object), "args", "kind"});
  const Node name = n.Member(a.object);
  const std::span<const UsableMember> members =
      a.object == "scanner" ? std::span<const UsableMember>(kScannerMembers) : std::span<const UsableMember>(kDictionaryMembers);
  const UsableMember* member = nullptr;
  std::string known;
  for (const UsableMember& m : members) {
    if (EqualsNoCase(m.name, name.String())) member = &m;
    known += (known.empty() ? "" : ", ") + std::string(m.name);
  }
  if (!member) name.Fail("the " + a.object + " has no member \"" + name.String() + "\" (it has " + known + ")");
  a.member = member->name;
  std::vector<Node> args;
  if (auto list = n.Find("args")) args = list->Elements();
  for (const Node& arg : args) {
    if (!(arg.IsString() && arg.String() == "$dictionary")) CheckValue(arg, model, nullptr, false);
    a.args.push_back(arg.json());
  }
  a.kind = CallKind::Method;
  if (member->property && !args.empty())
    a.kind = args.back().IsString() && args.back().String() == "$dictionary" ? CallKind::PropertyPutRef
                                                                            : CallKind::PropertyPut;
  else if (member->property)
    a.kind = CallKind::PropertyGet;
  if (auto k = n.Find("kind")) a.kind = ReadKind(*k, true);
}

const ApiMember* FindMember(std::string_view name) {
  for (const ApiMember& m : ApiMembers())
    if (EqualsNoCase(m.name, name)) return &m;
  return nullptr;
}

void ReadCall(const Node& n, const ModelDef& model, Action& a) {
  n.ExpectKeys({"comment", "call", "args", "kind"});
  const Node name = n.Member("call");
  const ApiMember* member = FindMember(name.String());
  if (!member) name.Fail("the add-in has no member \"" + name.String() + "\"");
  a.member = member->name;
  a.kind = member->kind;
  if (auto k = n.Find("kind")) {
    a.kindGiven = true;
    a.kind = ReadKind(*k, false);
  }
  size_t required = 0;
  for (size_t i = 0; i < member->paramCount; ++i)
    if (!member->params[i].optional) required = i + 1;
  std::vector<Node> args;
  if (auto list = n.Find("args")) args = list->Elements();
  if (args.size() < required || args.size() > member->paramCount) {
    std::string expected = std::to_string(required);
    if (member->paramCount != required) expected += " to " + std::to_string(member->paramCount);
    const Node where = n.Find("args") ? n.Member("args") : name;
    where.Fail(a.member + " takes " + expected + " argument" + (member->paramCount == 1 ? "" : "s") + ", not " +
               std::to_string(args.size()));
  }
  for (const Node& arg : args) {
    CheckValue(arg, model, nullptr, true);
    a.args.push_back(arg.json());
  }
}

}  // namespace

namespace {

// [{"tick": "row"}, {"click": "row"}, {"compare": true}, ..., "ok"]
RestoreAnswer ReadRestoreAnswer(const Node& n) {
  n.ExpectArray("a list of steps ending in \"ok\" or \"cancel\"");
  RestoreAnswer answer;
  answer.line = n.line();
  const std::vector<Node> steps = n.Elements();
  if (steps.empty()) n.Fail("the dialog needs a last step, \"ok\" or \"cancel\"");
  for (size_t i = 0; i < steps.size(); ++i) {
    const Node& step = steps[i];
    RestoreStep s;
    s.line = step.line();
    const bool last = i + 1 == steps.size();
    if (step.IsString()) {
      const std::string button = step.String();
      if (button != "ok" && button != "cancel") step.Fail("a button step is \"ok\" or \"cancel\"");
      if (!last) step.Fail("\"" + button + "\" closes the dialog: it is the last step");
      s.kind = button == "ok" ? RestoreStep::Kind::Ok : RestoreStep::Kind::Cancel;
      answer.steps.push_back(std::move(s));
      continue;
    }
    step.ExpectObject("a step: {\"tick\": row}, {\"untick\": row}, {\"select\": row}, {\"click\": row}, "
                      "{\"compare\": true}, {\"timer\": true}, {\"help\": true}, \"ok\" or \"cancel\"");
    const auto members = step.Members();
    if (members.size() != 1) step.Fail("a step does one thing");
    const auto& [what, value] = members.front();
    static constexpr std::pair<std::string_view, RestoreStep::Kind> kRowSteps[] = {
        {"tick", RestoreStep::Kind::Tick},
        {"untick", RestoreStep::Kind::Untick},
        {"select", RestoreStep::Kind::Select},
        {"click", RestoreStep::Kind::Click}};
    static constexpr std::pair<std::string_view, RestoreStep::Kind> kFlagSteps[] = {
        {"compare", RestoreStep::Kind::Compare}, {"timer", RestoreStep::Kind::Timer}, {"help", RestoreStep::Kind::Help}};
    bool known = false;
    for (const auto& [name, kind] : kRowSteps)
      if (what == name) {
        s.kind = kind;
        s.row = value.String();
        if (s.row.empty()) value.Fail("a row is named by its project or its file's full path");
        known = true;
      }
    for (const auto& [name, kind] : kFlagSteps)
      if (what == name) {
        if (!value.Bool()) value.Fail("write {\"" + what + "\": true}");
        s.kind = kind;
        known = true;
      }
    if (!known)
      step.FailKey(what, "unknown step \"" + what + "\" (expected tick, untick, select, click, compare, timer, help)");
    if (last) step.Fail("the last step closes the dialog: \"ok\" or \"cancel\"");
    answer.steps.push_back(std::move(s));
  }
  return answer;
}

// {"text": "new text", "button": "ok"}
DependencyAnswer ReadDependencyAnswer(const Node& n) {
  n.ExpectObject("{\"text\": \"...\", \"button\": \"ok\" or \"cancel\"}");
  n.ExpectKeys({"text", "button"});
  DependencyAnswer answer;
  answer.line = n.line();
  if (auto t = n.Find("text")) answer.text = t->String();
  const Node button = n.Member("button");
  const std::string b = button.String();
  if (b != "ok" && b != "cancel") button.Fail("the dialog closes with \"ok\" or \"cancel\"");
  answer.ok = b == "ok";
  return answer;
}

}  // namespace

Scenario LoadScenario(const JsonSource& source, const ModelDef& model) {
  const Node root = Node::Root(source);
  root.ExpectKeys({"comment", "model", "actions"});
  Scenario s;
  const Node list = root.Member("actions");
  std::vector<Node> actions = list.Elements();
  s.implicitCreate = actions.empty() || !actions.front().IsObject() || !actions.front().json().contains("create") ||
                     actions.front().json().at("create").is_string();
  bool alive = s.implicitCreate;
  bool scanner = false, dictionary = false;  // the scenario's own objects made so far
  const std::vector<int> lines = source.ElementLines(list.json());
  // The files and folders as the steps meet them, after the model's.
  PathPlan plan;
  for (const std::string& folder : model.folders) plan.MakeFolder(folder);
  for (const auto& [path, content] : model.files) plan.WriteFile(path);

  for (size_t i = 0; i < actions.size(); ++i) {
    const Node& n = actions[i];
    n.ExpectObject("an action");
    Action a;
    a.line = i < lines.size() ? lines[i] : 0;
    std::string which;
    for (const auto& [key, value] : n.Members()) {
      if (key == "comment" || key == "args" || key == "kind") continue;
      if (std::find(std::begin(kActionKeys), std::end(kActionKeys), key) == std::end(kActionKeys))
        n.FailKey(key, "unknown action \"" + key +
                           "\" (expected call, select, answer, clock, release, create, setRegistry, setFile, "
                           "scanner or dictionary)");
      if (!which.empty()) n.FailKey(key, "one action per entry: \"" + which + "\" and \"" + key + "\"");
      which = key;
    }
    if (which.empty())
      n.Fail("an action needs one of call, select, answer, clock, release, create, setRegistry, setFile, scanner, "
             "dictionary");
    const Node body = n.Member(which);

    if (which == "call") {
      a.type = Action::Type::Call;
      ReadCall(n, model, a);
      if (!alive) body.Fail("the add-in object was released: add {\"create\": true} before calling it again");
    } else if (which == "scanner" || which == "dictionary") {
      a.type = Action::Type::Use;
      a.object = which;
      ReadUse(n, model, a);
      const bool made = which == "scanner" ? scanner : dictionary;
      if (!made)
        body.Fail("no " + which + " yet: add {\"create\": \"" +
                  std::string(which == "scanner" ? kTokenScanner : kDictionary) + "\"} first");
      for (const Node& arg : n.Find("args") ? n.Member("args").Elements() : std::vector<Node>{})
        if (arg.IsString() && arg.String() == "$dictionary" && !dictionary)
          arg.Fail("no dictionary yet: add {\"create\": \"Scripting.Dictionary\"} first");
    } else if (which == "create" && body.IsString()) {
      n.ExpectKeys({"comment", "create"});
      a.type = Action::Type::Create;
      a.object = body.String();
      if (EqualsNoCase(a.object, kTokenScanner)) {
        a.object = kTokenScanner;
        scanner = true;
      } else if (EqualsNoCase(a.object, kDictionary)) {
        a.object = kDictionary;
        dictionary = true;
      } else {
        body.Fail("a scenario creates the add-in ({\"create\": true}), \"kpxAddIn.TokenScanner\" or "
                  "\"Scripting.Dictionary\", not \"" + a.object + "\"");
      }
    } else {
      n.ExpectKeys({"comment", std::string_view(which)});
      a.raw = n.json();
      if (which == "select") {
        a.type = Action::Type::Select;
        for (const Node& item : body.Elements()) {
          if (!model.FindElement(item.String())) item.Fail("no element \"" + item.String() + "\" in the model");
          a.select.push_back(item.String());
        }
      } else if (which == "answer") {
        a.type = Action::Type::Answer;
        if (auto pressed = body.Find("prompt")) {
          // The add-in's prompt: which button closes it, whether the box is
          // ticked and whether Help is pressed first.
          body.ExpectKeys({"prompt", "dontShow", "help"});
          const std::string button = pressed->String();
          if (button != "ok" && button != "cancel") pressed->Fail("the prompt closes with \"ok\" or \"cancel\"");
          a.prompt = platform::PromptOutcome{button == "cancel", false};
          if (auto tick = body.Find("dontShow")) a.prompt->dontShow = tick->Bool();
          if (auto help = body.Find("help")) a.promptHelp = help->Bool();
        } else if (auto steps = body.Find("restore")) {
          body.ExpectKeys({"restore"});
          a.restore = ReadRestoreAnswer(*steps);
        } else if (auto dependency = body.Find("dependency")) {
          body.ExpectKeys({"dependency"});
          a.dependency = ReadDependencyAnswer(*dependency);
        } else {
          body.ExpectKeys({"button"});
          a.answer = body.Member("button").Int32();
        }
      } else if (which == "clock") {
        a.type = Action::Type::Clock;
        a.clock = ParseClock(body);
      } else if (which == "release" || which == "create") {
        if (!body.Bool()) body.Fail("write {\"" + which + "\": true}");
        const bool create = which == "create";
        a.type = create ? Action::Type::Create : Action::Type::Release;
        if (create && alive) body.Fail("the add-in object exists already: release it first");
        if (!create && !alive) body.Fail("there is no add-in object to release");
        alive = create;
      } else if (which == "setRegistry") {
        a.type = Action::Type::SetRegistry;
        a.registry = ParseRegistry(body);
      } else {
        a.type = Action::Type::SetFile;
        for (const auto& [path, content] : body.Members()) {
          std::string fault = PathFault(path, true);
          if (fault.empty()) fault = content.IsNull() ? plan.RemoveFile(path) : plan.WriteFile(path);
          if (!fault.empty()) body.FailKey(path, fault);
          a.files.emplace_back(path, content.IsNull() ? std::nullopt : std::optional<std::string>(content.String()));
        }
      }
    }
    s.actions.push_back(std::move(a));
  }
  return s;
}

}  // namespace kpx::sim
