#include "sim/event_log.h"

#include <charconv>
#include <cstdlib>

namespace kpx::sim {

void EventLog::Add(EventJson event) {
  if (sink_)
    sink_->Write(event);
  else
    events_.push_back(std::move(event));
}

void EventLog::NameObject(const Object* object, std::string label) { names_[object] = std::move(label); }

void EventLog::ForgetObject(const Object* object) { names_.erase(object); }

std::string EventLog::Label(const Object* object) const {
  if (auto* sim = dynamic_cast<const SimObject*>(object)) return sim->label();
  auto it = names_.find(object);
  return it == names_.end() ? "?" : it->second;
}

double ShortestDouble(float f) {
  char buf[32];
  auto [end, ec] = std::to_chars(buf, buf + sizeof buf - 1, f);
  if (ec != std::errc()) return f;
  *end = '\0';
  return std::strtod(buf, nullptr);
}

EventJson EventLog::Value(const Variant& value) const {
  const Variant& v = value.deref();
  switch (v.type()) {
    case VarType::Empty:
      return nullptr;
    case VarType::Null:
      return {{"null", true}};
    case VarType::Boolean:
      return v.toBool();
    case VarType::Integer:
      return {{"i2", v.toInt16()}};
    case VarType::Long:
      return v.toInt32();
    case VarType::Single:
      return {{"r4", ShortestDouble(v.toSingle())}};
    case VarType::Double:
      return {{"r8", v.toDouble()}};
    case VarType::String:
      return v.stringRef();
    case VarType::Date:
      return {{"date", v.toDate()}};
    case VarType::Object: {
      ObjectPtr o = v.objectOrNull();
      return {{"object", o ? EventJson(Label(o.get())) : EventJson(nullptr)}};
    }
    case VarType::ByRef:
      break;  // deref() never stops at a reference
  }
  return nullptr;
}

std::string JsonlLine(const EventJson& event) {
  return event.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace) + '\n';
}

std::string EventLog::Jsonl() const {
  std::string out;
  for (const EventJson& e : events_) out += JsonlLine(e);
  return out;
}

EventJson ErrorJson(const AutomationError& e) { return {{"number", e.number()}, {"description", e.description()}}; }

}  // namespace kpx::sim
