#include "sim/companions.h"

#include "automation/vb_strings.h"
#include "shared/resource_strings.h"
#include "shared/resource_texts.h"
#include "sim/world.h"

namespace kpx::sim {

namespace {

const char* KindName(CallKind kind) {
  switch (kind) {
    case CallKind::Method:
      return "method";
    case CallKind::PropertyGet:
      return "get";
    case CallKind::PropertyPut:
      return "put";
    case CallKind::PropertyPutRef:
      return "putref";
  }
  return "?";
}

bool IsKeep(const InputJson& j) { return j.is_object() && j.size() == 1 && j.contains("keep"); }

}  // namespace

// ----------------------------------------------------------- CompanionObject

CompanionObject::CompanionObject(World& world, std::shared_ptr<const CompanionDef> def, std::string label)
    : world_(world), def_(std::move(def)), label_(std::move(label)) {
  auto add = [&](const std::string& name) {
    for (const std::string& n : names_)
      if (EqualsNoCase(n, name)) return;
    names_.push_back(name);
  };
  for (const std::string& op : def_->operations) add(op);
  for (const auto& [iid, members] : def_->interfaces)
    for (const std::string& m : members) add(m);
  for (const auto& [name, member] : def_->members) add(name);
}

void CompanionObject::RecordFailure(EventJson call, const AutomationError& error) {
  call["error"] = ErrorJson(error);
  world_.log().Add(std::move(call));
}

DispId CompanionObject::IdOfName(std::string_view name) {
  ObservedCall observed(world_.log().observer());
  for (size_t i = 0; i < names_.size(); ++i)
    if (EqualsNoCase(names_[i], name)) return static_cast<DispId>(i + 1);
  const AutomationError error(vberr::kNoSuchMember);
  RecordFailure({{"ev", "companion-call"}, {"instance", label_}, {"member", std::string(name)}}, error);
  throw error;
}

DispId CompanionObject::IdOfOwnOperation(int position) {
  ObservedCall observed(world_.log().observer());
  if (position >= 1 && static_cast<size_t>(position) <= def_->operations.size())
    return IdOfName(def_->operations[static_cast<size_t>(position - 1)]);
  const AutomationError error(vberr::kNoSuchMember);
  RecordFailure({{"ev", "companion-call"}, {"instance", label_}, {"operation", position}}, error);
  throw error;
}

namespace {

// A companion seen through another of its interfaces: that interface's
// members only, with the companion's own dispatch ids and answers.
class CompanionInterface final : public SimObject {
 public:
  CompanionInterface(std::shared_ptr<CompanionObject> owner, std::string iid, const std::vector<std::string>& members)
      : owner_(std::move(owner)), iid_(std::move(iid)), members_(members) {}
  std::string label() const override { return owner_->label(); }

  DispId IdOfName(std::string_view name) override {
    for (const std::string& m : members_)
      if (EqualsNoCase(m, name)) return owner_->IdOfName(m);
    throw AutomationError(vberr::kNoSuchMember);
  }
  DispId IdOfOwnOperation(int position) override {
    if (position < 1 || static_cast<size_t>(position) > members_.size()) throw AutomationError(vberr::kNoSuchMember);
    return owner_->IdOfName(members_[static_cast<size_t>(position - 1)]);
  }
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override {
    return owner_->InvokeThrough(&iid_, id, kind, args);
  }

 private:
  std::shared_ptr<CompanionObject> owner_;
  std::string iid_;
  const std::vector<std::string>& members_;
};

}  // namespace

ObjectPtr CompanionObject::QueryInterface(std::string_view iid) {
  auto it = def_->interfaces.find(iid);
  if (it == def_->interfaces.end()) throw AutomationError(vberr::kTypeMismatch);
  return std::make_shared<CompanionInterface>(shared_from_this(), it->first, it->second);
}

Variant CompanionObject::Invoke(DispId dispId, CallKind kind, std::span<Variant> args) {
  return InvokeThrough(nullptr, dispId, kind, args);
}

Variant CompanionObject::InvokeThrough(const std::string* iid, DispId dispId, CallKind kind, std::span<Variant> args) {
  ObservedCall observed(world_.log().observer());
  if (dispId < 1 || static_cast<size_t>(dispId) > names_.size()) throw AutomationError(vberr::kNoSuchMember);
  const std::string& name = names_[static_cast<size_t>(dispId - 1)];
  EventLog& log = world_.log();

  EventJson call{{"ev", "companion-call"}, {"instance", label_}, {"member", name}, {"kind", KindName(kind)}};
  if (iid) call["interface"] = *iid;
  for (size_t i = 0; !iid && i < def_->operations.size(); ++i)
    if (EqualsNoCase(def_->operations[i], name)) {
      call["operation"] = i + 1;
      break;
    }
  EventJson shown = EventJson::array();
  for (const Variant& a : args) shown.push_back(a.isByRef() ? EventJson{{"byref", log.Value(a)}} : log.Value(a));
  call["args"] = std::move(shown);

  const MemberDef* member = def_->FindMember(name);
  if (!member) {
    const AutomationError error(vberr::kNoSuchMember);
    RecordFailure(std::move(call), error);
    throw error;
  }
  const AnswerDef* answer = FindAnswer(*member, args);
  const std::optional<ErrorDef>& raise = answer ? answer->raise : member->raise;
  if (raise) {
    const AutomationError error(raise->number, raise->description);
    RecordFailure(std::move(call), error);
    throw error;
  }
  EventJson written = EventJson::object();
  for (size_t i = 0; i < member->setArgs.size() && i < args.size(); ++i) {
    if (!args[i].isByRef() || IsKeep(member->setArgs[i])) continue;  // a value argument cannot be written back
    args[i].assign(world_.ToVariant(member->setArgs[i], this));
    written[std::to_string(i + 1)] = log.Value(args[i]);
  }
  Variant result;
  if (answer) {
    if (answer->returns) result = world_.ToVariant(*answer->returns, this);
  } else if (member->returnsObject) {
    result = ReturnedObject(name, member->returnsObject);
  } else if (member->returns) {
    result = world_.ToVariant(*member->returns, this);
  }
  call["result"] = log.Value(result);
  if (!written.empty()) call["byref"] = std::move(written);
  log.Add(std::move(call));
  return result;
}

// The first answer whose arguments all equal the call's leading arguments,
// compared as the log writes them (so objects compare by identity, numbers
// by type and value, and a by-reference argument by what it refers to).
const AnswerDef* CompanionObject::FindAnswer(const MemberDef& member, std::span<const Variant> args) {
  const EventLog& log = world_.log();
  for (const AnswerDef& answer : member.answers) {
    if (answer.args.size() > args.size()) continue;
    bool same = true;
    for (size_t i = 0; same && i < answer.args.size(); ++i)
      same = log.Value(args[i]) == log.Value(world_.ToVariant(answer.args[i], this));
    if (same) return &answer;
  }
  return nullptr;
}

ObjectPtr CompanionObject::SubObject(const std::string& name) {
  ObjectPtr& slot = objects_[name];
  if (!slot) slot = std::make_shared<CompanionObject>(world_, def_->objects.at(name), label_ + "." + name);
  return slot;
}

ObjectPtr CompanionObject::ReturnedObject(const std::string& member, const std::shared_ptr<const CompanionDef>& def) {
  ObjectPtr& slot = objects_["()" + member];  // apart from the named objects
  if (!slot) slot = std::make_shared<CompanionObject>(world_, def, label_ + "." + member);
  return slot;
}

// ------------------------------------------------------------ ResourceObject

namespace {
constexpr DispId kLoadResString = 1;
constexpr DispId kGetString = 2;
}  // namespace

DispId ResourceObject::IdOfName(std::string_view name) {
  if (EqualsNoCase(name, "LoadResString")) return kLoadResString;
  if (EqualsNoCase(name, "GetString")) return kGetString;
  throw AutomationError(vberr::kNoSuchMember);
}

DispId ResourceObject::IdOfOwnOperation(int position) {
  if (position == 1 || position == 2) return position;
  throw AutomationError(vberr::kNoSuchMember);
}

Variant ResourceObject::Invoke(DispId dispId, CallKind kind, std::span<Variant> args) {
  if ((dispId != kLoadResString && dispId != kGetString) || (kind != CallKind::Method && kind != CallKind::PropertyGet))
    throw AutomationError(vberr::kNoSuchMember);
  if (args.size() != 1) throw AutomationError(vberr::kWrongArgCount);
  const int32_t id = args[0].toInt32();
  if (model_.faults.missingResources.count(id)) {
    const AutomationError error(326, "Resource with identifier '" + std::to_string(id) + "' not found");
    log_.Add({{"ev", "fault"},
              {"object", label_},
              {"member", dispId == kLoadResString ? "LoadResString" : "GetString"},
              {"args", EventJson::array({id})},
              {"error", ErrorJson(error)}});
    throw error;
  }
  return Text(id);
}

std::string ResourceObject::Text(int32_t id) const {
  if (auto it = model_.resources.find(id); it != model_.resources.end()) return it->second;
  if (const char* text = FindResourceText(id)) return text;
  // As the resource component answers an id it has no text for.
  throw AutomationError(326, "Resource with identifier '" + std::to_string(id) + "' not found");
}

// ---------------------------------------------------------- SimObjectFactory

ObjectPtr SimObjectFactory::MakeResource() {
  if (!world_.def().resourceRegistered) throw AutomationError(vberr::kCantCreateObject);
  const std::string base(kResourceProgId);
  return std::make_shared<ResourceObject>(base + "#" + std::to_string(world_.NextInstance(base)), world_.def(),
                                          world_.log());
}

ObjectPtr SimObjectFactory::MakeCompanion(const std::shared_ptr<const CompanionDef>& def) {
  if (def->createError) throw AutomationError(def->createError->number, def->createError->description);
  const std::string base = def->progid.empty() ? def->clsid : def->progid;
  return std::make_shared<CompanionObject>(world_, def, base + "#" + std::to_string(world_.NextInstance(base)));
}

ObjectPtr SimObjectFactory::CreateObject(std::string_view progId) {
  if (EqualsNoCase(progId, kResourceProgId)) return MakeResource();
  for (const auto& def : world_.def().companions)
    if (!def->progid.empty() && EqualsNoCase(def->progid, progId)) return MakeCompanion(def);
  throw AutomationError(vberr::kCantCreateObject);
}

ObjectPtr SimObjectFactory::CreateInstance(std::string_view clsid, std::string_view) {
  if (EqualsNoCase(clsid, kResourceClassId)) return MakeResource();
  for (const auto& def : world_.def().companions)
    if (!def->clsid.empty() && EqualsNoCase(def->clsid, clsid)) return MakeCompanion(def);
  throw AutomationError(vberr::kCantCreateObject);
}

}  // namespace kpx::sim
