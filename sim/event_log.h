// The record of everything the add-in did to the simulated world: one JSON
// object per event, in order. Keys are sorted when written, so a log is a
// stable text that goldens can compare.
#pragma once

#include <cstdint>
#include <map>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "automation/automation_error.h"
#include "automation/call_observer.h"
#include "automation/object.h"

namespace kpx::sim {

using EventJson = nlohmann::json;

// Every object of the simulated world carries a label by which the event
// log names it ("$app", "element:CFoo", "kpxModelAssist.API#1" ...).
class SimObject : public Object {
 public:
  virtual std::string label() const = 0;
};

class EventLog {
 public:
  // Appends an event; it must have its kind in "ev".
  void Add(EventJson event);
  const std::vector<EventJson>& events() const { return events_; }
  // Drops the events recorded so far; the host-call count and the objects'
  // labels stay. For long runs that read only the counts.
  void Clear() { events_.clear(); }

  // Calls into host objects, counted so that each member's result can say
  // how many it made.
  void CountHostCall() { ++hostCalls_; }
  uint64_t hostCalls() const { return hostCalls_; }
  // Told of every call into a host object or a companion (nullptr: none).
  void Observe(CallObserver* observer) { observer_ = observer; }
  CallObserver* observer() const { return observer_; }

  // Objects that are not the sim's own (the add-in object) get a label here.
  void NameObject(const Object* object, std::string label);
  void ForgetObject(const Object* object);
  std::string Label(const Object* object) const;

  // A value as the log writes it: null = Empty, {"null":true} = Null,
  // true/false = Boolean, 12 = Long, {"i2":n}, {"r4":x}, {"r8":x},
  // {"date":x}, "text" = String, {"object":"label"} or {"object":null}.
  EventJson Value(const Variant& v) const;

  // One line per event.
  std::string Jsonl() const;

 private:
  std::vector<EventJson> events_;
  uint64_t hostCalls_ = 0;
  CallObserver* observer_ = nullptr;
  std::map<const Object*, std::string> names_;
};

// An automation error as event fields: {"number": n, "description": "..."}.
EventJson ErrorJson(const AutomationError& e);

// A float in its shortest decimal form, so that 0.1f logs as 0.1.
double ShortestDouble(float f);

}  // namespace kpx::sim
