// Objects outside the host that the add-in creates: companion components as
// the model file describes them, and the resource component. Neither counts
// as a host call. Companion calls are recorded one by one; resource calls
// are not (there are dozens per run and they say nothing new), only the
// creation of resource objects is.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "platform/platform.h"
#include "sim/event_log.h"
#include "sim/model_file.h"

namespace kpx::sim {

class World;

// A scripted companion: its members answer, raise and write back arguments
// as the model file describes it; a member it does not list raises 438.
class CompanionObject final : public SimObject, public std::enable_shared_from_this<CompanionObject> {
 public:
  CompanionObject(World& world, std::shared_ptr<const CompanionDef> def, std::string label);
  std::string label() const override { return label_; }

  DispId IdOfName(std::string_view name) override;
  DispId IdOfOwnOperation(int position) override;
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override;
  // One of the interfaces the model file lists for it; 13 for any other.
  ObjectPtr QueryInterface(std::string_view iid) override;

  // A call through one of its other interfaces: recorded with that interface.
  Variant InvokeThrough(const std::string* iid, DispId id, CallKind kind, std::span<Variant> args);
  const CompanionDef& def() const { return *def_; }

  // One of its named sub-objects, made on first use and kept.
  ObjectPtr SubObject(const std::string& name);

 private:
  const AnswerDef* FindAnswer(const MemberDef& member, std::span<const Variant> args);
  ObjectPtr ReturnedObject(const std::string& member, const std::shared_ptr<const CompanionDef>& def);
  void RecordFailure(EventJson call, const AutomationError& error);

  World& world_;
  std::shared_ptr<const CompanionDef> def_;
  std::string label_;
  std::vector<std::string> names_;  // DISPID = position + 1: own operations first
  std::map<std::string, ObjectPtr> objects_;
};

// The resource component: texts by string id, from the model file's
// overrides first, then from the add-in's own resource table. Its first own
// operation is LoadResString (the id by value), its second GetString (the id
// by reference). An id the model takes away raises 326 and is recorded.
class ResourceObject final : public SimObject {
 public:
  ResourceObject(std::string label, const ModelDef& model, EventLog& log)
      : label_(std::move(label)), model_(model), log_(log) {}
  std::string label() const override { return label_; }

  DispId IdOfName(std::string_view name) override;
  DispId IdOfOwnOperation(int position) override;
  Variant Invoke(DispId id, CallKind kind, std::span<Variant> args) override;

  std::string Text(int32_t id) const;

 private:
  std::string label_;
  const ModelDef& model_;
  EventLog& log_;
};

// Creates companions and resource objects by ProgID or class id, as the
// model file lists them. Anything unknown fails with 429.
class SimObjectFactory final : public platform::ObjectFactory {
 public:
  explicit SimObjectFactory(World& world) : world_(world) {}
  ObjectPtr CreateObject(std::string_view progId) override;
  ObjectPtr CreateInstance(std::string_view clsid, std::string_view iid) override;

 private:
  ObjectPtr MakeResource();
  ObjectPtr MakeCompanion(const std::shared_ptr<const CompanionDef>& def);
  World& world_;
};

}  // namespace kpx::sim
