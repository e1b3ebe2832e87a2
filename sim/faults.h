// Failures a model injects into the add-in's world: host members that raise
// at a given call, registry keys that cannot be created, registry values
// that read back other than written, resource texts that are missing. The
// model file lists them under "faults"; this reads them, checked against the
// rest of the model, and decides at run time which call a fault hits.
#pragma once

#include <map>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "sim/event_log.h"
#include "sim/json_source.h"
#include "sim/model_file.h"

namespace kpx::sim {

// Reads the model's "faults" into `model.faults`. The rest of the model must
// be read already: faults name its add-ins, elements and registry keys.
// Raises InputError.
void ReadFaults(const Node& node, ModelDef& model);

// The fault of a registry key: the one listed for it, or for a key above it
// that cannot be created (nothing below such a key can exist). Nothing when
// the key has no fault.
const RegistryFaultDef* FindRegistryFault(const FaultsDef& faults, platform::RootKey root, std::string_view key);

// What the model's faults make of a registry call; nothing when no fault
// applies. A read answers the value a fault gives (itself nothing when the
// value reads as missing).
std::optional<std::optional<platform::RegistryValue>> InjectedRead(const FaultsDef& faults, platform::RootKey root,
                                                                   std::string_view key, std::string_view name);
bool InjectedCreateFailure(const FaultsDef& faults, platform::RootKey root, std::string_view key);

// The registry as the add-in meets it under the model's faults, unrecorded:
// what finds the debug log must read what the add-in reads.
class FaultyRegistry final : public platform::Registry {
 public:
  FaultyRegistry(platform::Registry& inner, const FaultsDef& faults) : inner_(inner), faults_(faults) {}
  std::optional<platform::RegistryValue> QueryValue(platform::RootKey root, std::string_view key,
                                                    std::string_view name) override;
  bool SetValue(platform::RootKey root, std::string_view key, std::string_view name,
                const platform::RegistryValue& value) override {
    return inner_.SetValue(root, key, name, value);
  }
  platform::KeyDisposition CreateKey(platform::RootKey root, std::string_view key) override;
  std::string ToAnsi(std::string_view utf8) override { return inner_.ToAnsi(utf8); }
  std::string FromAnsi(std::string_view ansi) override { return inner_.FromAnsi(ansi); }

 private:
  platform::Registry& inner_;
  const FaultsDef& faults_;
};

// Host calls made to fail, as the run meets them. Calls are counted per
// object label and member, for the members some fault names only.
class CallFaults {
 public:
  explicit CallFaults(const std::vector<CallFaultDef>& defs);

  // Before `member` of `object` runs: when a fault hits this call, records
  // it (event "fault") and raises its error.
  void Check(EventLog& log, const SimObject& object, std::string_view member, std::span<const Variant> args);

 private:
  struct Watch {
    int64_t calls = 0;
    std::vector<const CallFaultDef*> faults;
  };
  std::map<std::pair<std::string, std::string>, Watch> watches_;  // (label, member)
  std::vector<std::string> members_;                              // every member some fault names
};

}  // namespace kpx::sim
