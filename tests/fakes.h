// Small stand-ins for the outside world, for unit tests of the core. They
// keep one shared journal so a test can check the order of effects across
// objects.
#pragma once

#include <functional>
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

  float seconds = 11232.5f;
  float step = 0;
  platform::DateTime now{2026, 11, 15, 3, 7, 12};
  std::vector<uint32_t> sleeps;
};

class FakeUi : public platform::UserInterface {
 public:
  int MessageBox(std::string_view text, std::string_view, uint32_t) override {
    boxes.emplace_back(text);
    return platform::kIdOk;
  }
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
  std::vector<std::pair<int32_t, int32_t>> iconLoads;  // resource id, pixels
  std::set<int32_t> missingIcons;
  std::map<int32_t, ObjectPtr> pictures;  // the last made of each id
  std::vector<platform::PromptView> prompts;
  std::vector<platform::PromptOutcome> promptAnswers;
  bool pressHelp = false;
  std::vector<std::string> boxes, help;
  Journal* journal = nullptr;
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
  platform::Platform platform() { return {registry, files, clock, factory, ui}; }

  Journal journal;
  posix::FileRegistry registry;  // in memory
  MemoryFiles files;
  FakeClock clock;
  FakeUi ui;
  FakeFactory factory;
  std::map<int32_t, std::string> texts;
  std::vector<int32_t> resourceIds;
};

}  // namespace kpx::test
