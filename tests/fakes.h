// Small stand-ins for the outside world, for unit tests of the core. They
// keep one shared journal so a test can check the order of effects across
// objects.
#pragma once

#include <functional>
#include <optional>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "automation/automation_error.h"
#include "automation/object.h"
#include "automation/vb_strings.h"
#include "platform/platform.h"
#include "platform/posix/posix_platform.h"

namespace kpx::test {

using Journal = std::vector<std::string>;

// The VB error number `f` raises, 0 when it raises none.
inline int32_t ErrorNumberOf(const std::function<void()>& f) {
  try {
    f();
  } catch (const AutomationError& e) {
    return e.number();
  }
  return 0;
}

// An automation object whose members are lambdas, journaling every call as
// "label.member".
class FakeObject : public Object {
 public:
  using Handler = std::function<Variant(std::span<Variant>)>;

  FakeObject(std::string label, Journal* journal) : label_(std::move(label)), journal_(journal) {}

  FakeObject& On(DispId id, std::string name, Handler handler) {
    members_[id] = {std::move(name), std::move(handler)};
    return *this;
  }
  // Offers `view` as the object seen through interface `iid`.
  FakeObject& Interface(std::string iid, ObjectPtr view) {
    interfaces_[std::move(iid)] = std::move(view);
    return *this;
  }
  // Makes `id` the n-th operation of the object's own interface.
  FakeObject& Operation(int position, DispId id) {
    operations_[position] = id;
    return *this;
  }

  const std::string& label() const { return label_; }

  DispId IdOfName(std::string_view name) override {
    for (auto& [id, m] : members_)
      if (EqualsNoCase(m.name, name)) return id;
    if (journal_) journal_->push_back(label_ + ".?" + std::string(name));
    throw AutomationError(vberr::kNoSuchMember);
  }
  DispId IdOfOwnOperation(int position) override {
    auto it = operations_.find(position);
    if (it == operations_.end()) throw AutomationError(vberr::kNoSuchMember);
    return it->second;
  }
  ObjectPtr QueryInterface(std::string_view iid) override {
    auto it = interfaces_.find(std::string(iid));
    if (it == interfaces_.end()) throw AutomationError(vberr::kTypeMismatch);
    return it->second;
  }
  Variant Invoke(DispId id, CallKind, std::span<Variant> args) override {
    auto it = members_.find(id);
    if (it == members_.end()) {
      if (journal_) journal_->push_back(label_ + ".?" + std::to_string(id));
      throw AutomationError(vberr::kNoSuchMember);
    }
    if (journal_) {
      std::string entry = label_ + "." + it->second.name;
      for (const Variant& a : args)
        entry += (a.isObject() ? std::string(" <obj>") : " " + (a.isEmpty() ? std::string("-") : a.toString()));
      journal_->push_back(entry);
    }
    ++calls;
    return it->second.handler ? it->second.handler(args) : Variant();
  }

  int calls = 0;

 private:
  struct Member {
    std::string name;
    Handler handler;
  };
  std::string label_;
  Journal* journal_;
  std::map<DispId, Member> members_;
  std::map<int, DispId> operations_;
  std::map<std::string, ObjectPtr> interfaces_;
};

// Files in memory. Paths in `failing` refuse every write.
class MemoryFiles : public platform::FileSystem {
 public:
  bool Exists(std::string_view path) override { return files.count(LCase(path)) != 0; }
  bool DeleteFile(std::string_view path) override {
    if (journal) journal->push_back("delete " + std::string(path));
    return files.erase(LCase(path)) != 0;
  }
  bool AppendComposed(std::string_view path, const std::function<std::string()>& compose) override {
    ++appendAttempts;
    if (failing.count(LCase(path))) return false;
    if (failNext > 0) {
      --failNext;
      return false;
    }
    files[LCase(path)] += compose();
    return true;
  }
  // Paths in `folders` are folders: reading one is refused as Windows
  // refuses it.
  std::string ReadText(std::string_view path) override {
    if (journal) journal->push_back("read " + std::string(path));
    if (folders.count(LCase(path))) throw AutomationError(vberr::kPathFileAccess);
    auto it = files.find(LCase(path));
    if (it == files.end()) throw AutomationError(vberr::kFileNotFound);
    return it->second;
  }
  std::string& at(std::string_view path) { return files[LCase(path)]; }

  // What the restore routines use. Attributes, dates and times are kept
  // per lower-case path beside the text; a missing entry reads as archive,
  // the date 2026-11-01 10:00:00, times all zero.
  std::optional<uint32_t> GetAttributes(std::string_view path) override {
    if (!Exists(path)) return Fail(vberr::kFileNotFound), std::nullopt;
    auto it = attributes.find(LCase(path));
    return it == attributes.end() ? platform::kAttributeArchive : it->second;
  }
  bool SetAttributes(std::string_view path, uint32_t value) override {
    if (!Exists(path)) return Fail(vberr::kFileNotFound);
    attributes[LCase(path)] = value;
    return true;
  }
  bool RemoveFile(std::string_view path) override {
    if (journal) journal->push_back("kill " + std::string(path));
    const std::string key = LCase(path);
    if (!files.count(key)) return Fail(vberr::kFileNotFound);
    if (undeletable.count(key) || (attributes[key] & platform::kAttributeReadOnly)) return Fail(kPermissionDenied);
    Forget(key);
    return true;
  }
  bool MoveFile(std::string_view from, std::string_view to) override {
    if (journal) journal->push_back("move " + std::string(from) + " > " + std::string(to));
    const std::string a = LCase(from), b = LCase(to);
    if (!files.count(a)) return Fail(vberr::kFileNotFound);
    if (files.count(b)) return Fail(kFileExists);
    if (unmovable.count(a)) return Fail(kPermissionDenied);
    files[b] = files[a];
    if (attributes.count(a)) attributes[b] = attributes[a];
    if (times.count(a)) times[b] = times[a];
    if (dates.count(a)) dates[b] = dates[a];
    Forget(a);
    return true;
  }
  std::optional<platform::DateTime> FileDateTime(std::string_view path) override {
    if (!Exists(path)) return Fail(vberr::kFileNotFound), std::nullopt;
    auto it = dates.find(LCase(path));
    return it == dates.end() ? platform::DateTime{2026, 11, 1, 10, 0, 0} : it->second;
  }
  bool ReplaceText(std::string_view path, std::string_view text) override {
    if (journal) journal->push_back("replace " + std::string(path));
    if (failing.count(LCase(path))) return Fail(vberr::kPathFileAccess);
    files[LCase(path)] = std::string(text);
    return true;
  }
  platform::FileHandle OpenForTimes(std::string_view path) override {
    const std::string key = LCase(path);
    if (!files.count(key) || locked.count(key)) return Fail(kPermissionDenied), platform::kNoFile;
    open.push_back(key);
    return static_cast<platform::FileHandle>(open.size() - 1);
  }
  bool GetFileTimes(platform::FileHandle h, platform::FileTimes& t) override {
    t = times[open.at(h)];
    return true;
  }
  bool SetFileTimes(platform::FileHandle h, const platform::FileTimes& t) override {
    times[open.at(h)] = t;
    return true;
  }
  void CloseFile(platform::FileHandle h) override { open.at(h).clear(); }
  const platform::FileError& LastError() override { return lastError; }

  static constexpr int32_t kFileExists = vberr::kFileAlreadyExists, kPermissionDenied = vberr::kPermissionDenied;
  bool Fail(int32_t number) {
    lastError = {number, VbErrorDescription(number)};
    return false;
  }
  void Forget(const std::string& key) {
    files.erase(key);
    attributes.erase(key);
    times.erase(key);
    dates.erase(key);
  }
  bool AllClosed() const {
    for (const std::string& h : open)
      if (!h.empty()) return false;
    return true;
  }
  std::map<std::string, uint32_t> attributes;
  std::map<std::string, platform::FileTimes> times;
  std::map<std::string, platform::DateTime> dates;
  std::set<std::string> undeletable, unmovable, locked;  // lower-case paths
  std::vector<std::string> open;                         // by handle; "" once closed
  platform::FileError lastError;

  std::map<std::string, std::string> files;  // by lower-case path
  std::set<std::string> failing;             // lower-case paths
  std::set<std::string> folders;             // lower-case paths
  int failNext = 0;                          // appends to refuse, whatever the path
  int appendAttempts = 0;
  Journal* journal = nullptr;
};

class FakeClock : public platform::Clock {
 public:
  float Timer() override {
    float t = seconds;
    seconds += step;
    return t;
  }
  platform::DateTime Now() override { return now; }
  void Sleep(uint32_t ms) override { sleeps.push_back(ms); }
  std::optional<platform::FileTime> SystemFileTime() override { return fileTime; }

  std::optional<platform::FileTime> fileTime = 134080000000000000ull;

  float seconds = 11232.5f;
  float step = 0;
  platform::DateTime now{2026, 11, 15, 3, 7, 12};
  std::vector<uint32_t> sleeps;
};

class FakeUi : public platform::UserInterface {
 public:
  // Message boxes are answered from `boxAnswers` in order, then with
  // `defaultAnswer`.
  int MessageBox(std::string_view text, std::string_view, uint32_t) override {
    boxes.emplace_back(text);
    if (boxAnswers.empty()) return defaultAnswer;
    const int answer = boxAnswers.front();
    boxAnswers.erase(boxAnswers.begin());
    return answer;
  }
  std::vector<int> boxAnswers;
  int defaultAnswer = platform::kIdOk;
  bool WinHelp(int64_t, std::string_view file, uint32_t, uint64_t) override {
    help.emplace_back(file);
    return true;
  }
  void DoEvents() override {
    if (journal) journal->push_back("DoEvents");
  }
  // Prompts are answered from `promptAnswers` in order, OK otherwise; Help
  // is pressed first when `pressHelp` is set.
  platform::PromptOutcome ShowPrompt(const platform::PromptView& view, platform::PromptHelp& h) override {
    prompts.push_back(view);
    if (pressHelp) h.ShowHelp(77);
    if (promptAnswers.empty()) return {};
    platform::PromptOutcome o = promptAnswers.front();
    promptAnswers.erase(promptAnswers.begin());
    return o;
  }
  // Icons are FakeObjects labelled "icon:<id>/<pixels>"; ids in
  // `missingIcons` raise 326.
  ObjectPtr LoadIconPicture(int32_t resourceId, int32_t pixels) override {
    iconLoads.push_back({resourceId, pixels});
    if (missingIcons.count(resourceId)) throw AutomationError(326);
    auto picture = std::make_shared<FakeObject>("icon:" + std::to_string(resourceId) + "/" + std::to_string(pixels),
                                                nullptr);
    pictures[resourceId] = picture;
    return picture;
  }
  // The Restore dialog is played by `playRestore`, which acts on the form
  // as a user would; without it the dialog is closed at once with OK.
  void ShowRestoreDialog(platform::RestoreForm& form, const platform::HostPlacement& where) override {
    if (journal) journal->push_back("ShowRestoreDialog");
    placements.push_back(where);
    if (playRestore) playRestore(form);
    else form.Ok();
  }
  platform::DependencyOutcome ShowDependencyDialog(const platform::DependencyView& view) override {
    dependencyViews.push_back(view);
    return dependencyAnswer;
  }
  std::function<void(platform::RestoreForm&)> playRestore;
  std::vector<platform::HostPlacement> placements;
  std::vector<platform::DependencyView> dependencyViews;
  platform::DependencyOutcome dependencyAnswer;
  std::vector<std::pair<int32_t, int32_t>> iconLoads;  // resource id, pixels
  std::set<int32_t> missingIcons;
  std::map<int32_t, ObjectPtr> pictures;  // the last made of each id
  std::vector<platform::PromptView> prompts;
  std::vector<platform::PromptOutcome> promptAnswers;
  bool pressHelp = false;
  std::vector<std::string> boxes, help;
  Journal* journal = nullptr;
};

// Child processes by program name: each starts (or fails with
// `startError`), waits with `waitResult` and exits with `exitCode`. The
// journal shows the calls.
class FakeProcesses : public platform::Processes {
 public:
  struct Program {
    uint32_t startError = 0;  // non-zero: creation fails with it
    uint32_t waitResult = platform::kWaitObject0;
    uint32_t exitCode = 0;
    uint32_t errorAfterWait = 0;  // the last error the wait leaves
  };
  bool CreateProcess(std::string_view app, std::string_view commandLine, platform::ProcessRecord& r) override {
    calls.push_back("CreateProcess " + std::string(app) + " [" + std::string(commandLine) + "]");
    auto it = programs.find(std::string(app));
    running = it == programs.end() ? Program{2} : it->second;
    if (running.startError) {
      lastError = running.startError;
      return false;
    }
    r = {100, 101, 7, 8};
    return true;
  }
  uint32_t WaitForInputIdle(int64_t h, uint32_t ms) override {
    calls.push_back("WaitForInputIdle " + std::to_string(h) + " " + std::to_string(ms));
    return 0;
  }
  uint32_t WaitForSingleObject(int64_t h, uint32_t ms) override {
    calls.push_back("WaitForSingleObject " + std::to_string(h) + " " + std::to_string(ms));
    lastError = running.errorAfterWait;
    return running.waitResult;
  }
  bool GetExitCodeProcess(int64_t h, uint32_t& code) override {
    calls.push_back("GetExitCodeProcess " + std::to_string(h));
    code = running.exitCode;
    return true;
  }
  bool CloseHandle(int64_t h) override {
    calls.push_back("CloseHandle " + std::to_string(h));
    return true;
  }
  uint32_t LastError() override { return lastError; }

  std::map<std::string, Program> programs;
  std::vector<std::string> calls;
  Program running;
  uint32_t lastError = 0;
};

// Creates objects from registered makers; anything else fails with 429.
class FakeFactory : public platform::ObjectFactory {
 public:
  using Maker = std::function<ObjectPtr()>;
  ObjectPtr CreateObject(std::string_view progId) override { return Make(std::string(progId)); }
  ObjectPtr CreateInstance(std::string_view clsid, std::string_view) override { return Make(std::string(clsid)); }
  ObjectPtr Make(const std::string& key) {
    created.push_back(key);
    auto it = makers.find(key);
    if (it == makers.end() || !it->second) throw AutomationError(vberr::kCantCreateObject);
    return it->second();
  }
  std::map<std::string, Maker> makers;  // by ProgID or class id
  std::vector<std::string> created;
};

// A world of fakes, with a resource component whose text for id N is "T<N>"
// and that journals each id it was asked for.
struct World {
  World() {
    files.journal = &journal;
    ui.journal = &journal;
    factory.makers["{87694CC1-5110-11D3-B9F8-006008BF3ACB}"] = [this] { return MakeResources(); };
    factory.makers["kpxres.KPXResourceInterface"] = [this] { return MakeResources(); };
  }
  ObjectPtr MakeResources() {
    auto res = std::make_shared<FakeObject>("res", nullptr);
    auto text = [this](std::span<Variant> a) -> Variant {
      int32_t id = a[0].toInt32();
      resourceIds.push_back(id);
      auto it = texts.find(id);
      return it != texts.end() ? it->second : "T" + std::to_string(id);
    };
    res->On(1, "LoadResString", text).On(2, "GetString", text).Operation(1, 1);
    return res;
  }
  platform::Platform platform() { return {registry, files, clock, factory, ui, processes}; }

  Journal journal;
  posix::FileRegistry registry;  // in memory
  MemoryFiles files;
  FakeClock clock;
  FakeUi ui;
  FakeFactory factory;
  FakeProcesses processes;
  std::map<int32_t, std::string> texts;
  std::vector<int32_t> resourceIds;
};

}  // namespace kpx::test
