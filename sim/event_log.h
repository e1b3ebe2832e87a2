// The record of everything the add-in did to the simulated world: one JSON
// object per event, in order. Keys are sorted when written, so a log is a
// stable text that goldens can compare. A log keeps its events in memory,
// or hands each to a sink as it happens, so that a long run's memory does
// not grow with its events and what happened is written out even when the
// run fails.
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

// Takes events as they happen.
class EventSink {
 public:
  virtual ~EventSink() = default;
  virtual void Write(const EventJson& event) = 0;
  // Called after each step of a scenario: a sink writing to a file lets
  // the steps done so far reach it.
  virtual void Flush() {}
  // True once the sink can no longer write: the run stops.
  virtual bool broken() const { return false; }
};

class EventLog {
 public:
  // Appends an event; it must have its kind in "ev". Kept in memory, or
  // handed to the sink when there is one.
  void Add(EventJson event);
  // From now on events go to `sink` and are not kept; nullptr keeps them
  // again. The sink must outlive the log's use of it.
  void StreamTo(EventSink* sink) { sink_ = sink; }
  void Flush() {
    if (sink_) sink_->Flush();
  }
  bool broken() const { return sink_ && sink_->broken(); }
  // The events kept in memory.
  const std::vector<EventJson>& events() const { return events_; }
  // Drops the events kept so far; the host-call count and the objects'
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

  // One line per event kept.
  std::string Jsonl() const;

 private:
  EventSink* sink_ = nullptr;
  std::vector<EventJson> events_;
  uint64_t hostCalls_ = 0;
  CallObserver* observer_ = nullptr;
  std::map<const Object*, std::string> names_;
};

// One event as a line of the JSONL log, with its line break.
std::string JsonlLine(const EventJson& event);

// An automation error as event fields: {"number": n, "description": "..."}.
EventJson ErrorJson(const AutomationError& e);

// A float in its shortest decimal form, so that 0.1f logs as 0.1.
double ShortestDouble(float f);

}  // namespace kpx::sim
