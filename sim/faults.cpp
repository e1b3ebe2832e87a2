#include "sim/faults.h"

#include <algorithm>

#include "automation/vb_strings.h"
#include "shared/resource_texts.h"
#include "sim/host_objects.h"
#include "sim/windows_path.h"

namespace kpx::sim {

namespace {

// Whether the key `inner` is `outer` or lies below it (letter case ignored).
bool AtOrBelow(std::string_view inner, std::string_view outer) {
  if (inner.size() < outer.size() || !EqualsNoCase(inner.substr(0, outer.size()), outer)) return false;
  return inner.size() == outer.size() || inner[outer.size()] == '\\';
}

class FaultsReader {
 public:
  explicit FaultsReader(ModelDef& model) : m_(model), f_(model.faults) {}

  void Read(const Node& n) {
    n.ExpectObject("an object of faults");
    n.ExpectKeys({"comment", "registry", "missingResources", "readSetting", "writeSetting", "addContextMenuItem",
                  "calls", "files"});
    if (auto r = n.Find("registry")) ReadRegistry(*r);
    if (auto r = n.Find("files")) ReadFiles(*r);
    if (auto r = n.Find("missingResources"))
      for (const Node& id : r->Elements()) ReadMissingResource(id);
    if (auto s = n.Find("readSetting")) ReadSettings(*s, "ReadSetting");
    if (auto s = n.Find("writeSetting")) ReadSettings(*s, "WriteSetting");
    if (auto c = n.Find("addContextMenuItem"))
      for (const auto& [addin, fault] : c->Members()) {
        CallFaultDef d = ReadCall(fault, false);
        d.object = AddInLabel(*c, addin);
        d.member = "AddContextMenuItem";
        CheckMember(fault, d);
        f_.calls.push_back(std::move(d));
      }
    if (auto c = n.Find("calls"))
      for (const Node& fault : c->Elements()) {
        CallFaultDef d = ReadCall(fault, true);
        CheckMember(fault, d);
        f_.calls.push_back(std::move(d));
      }
  }

 private:
  // ------------------------------------------------------------- files

  // Path to the calls that fail on it: {"remove": {"number": 70}, ...}.
  void ReadFiles(const Node& n) {
    n.ExpectObject("an object: file path to the calls that fail on it");
    for (const auto& [path, def] : n.Members()) {
      if (const std::string fault = PathFault(path, true); !fault.empty()) n.FailKey(path, fault);
      def.ExpectObject("an object of failing calls: remove, move, replace, times");
      def.ExpectKeys({"comment", "remove", "move", "replace", "times"});
      FileFaultDef f;
      if (auto e = def.Find("remove")) f.remove = ParseError(*e);
      if (auto e = def.Find("move")) f.move = ParseError(*e);
      if (auto e = def.Find("replace")) f.replace = ParseError(*e);
      if (auto e = def.Find("times")) f.times = ParseError(*e);
      if (!f.remove && !f.move && !f.replace && !f.times) def.Fail("a file fault names at least one failing call");
      if (!f_.files.emplace(path, f).second) n.FailKey(path, "a second fault for the file " + path + " (paths ignore case)");
    }
  }

  // ---------------------------------------------------------- registry

  void ReadRegistry(const Node& n) {
    for (const auto& [fullKey, def] : n.Members()) {
      def.ExpectObject("an object: {\"create\": false} or {\"reads\": {...}}");
      def.ExpectKeys({"comment", "create", "reads"});
      RegistryFaultDef r;
      std::tie(r.root, r.key) = ParseRegistryKey(n, fullKey);
      for (const RegistryFaultDef& earlier : f_.registry)
        if (earlier.root == r.root && EqualsNoCase(earlier.key, r.key))
          n.FailKey(fullKey, "a second fault for the key " + fullKey + " (keys ignore case)");
      if (auto c = def.Find("create")) {
        if (c->Bool()) c->Fail("a key is created as usual: write \"create\": false for one that cannot be, or leave it out");
        r.cannotCreate = true;
        // The model's registry would make the key exist: it would be opened, not created.
        for (const RegistryEntry& e : m_.registry)
          if (e.root == r.root && AtOrBelow(e.key, r.key))
            c->Fail("the model's \"registry\" holds this key or one below it, so it exists and is opened, not "
                    "created");
      }
      if (auto reads = def.Find("reads")) {
        if (r.cannotCreate) reads->Fail("a key that cannot be created has no values to read");
        reads->ExpectObject("an object of value names (\"@\" the default value) to what they read as");
        for (const auto& [name, value] : reads->Members())
          r.reads[name == "@" ? "" : name] =
              value.IsNull() ? std::nullopt : std::optional<platform::RegistryValue>(ParseRegistryValue(value));
      }
      if (!r.cannotCreate && r.reads.empty()) def.Fail("a registry fault needs \"create\": false or \"reads\"");
      f_.registry.push_back(std::move(r));
    }
  }

  // ---------------------------------------------------------- resources

  void ReadMissingResource(const Node& n) {
    const int32_t id = n.Int32();
    if (m_.resources.count(id)) n.Fail("resource " + std::to_string(id) + " is given a text in \"resources\"");
    if (!FindResourceText(id))
      n.Fail("the resource component has no text " + std::to_string(id) +
             " to take away (an id without a text raises 326 anyway)");
    f_.missingResources.insert(id);
  }

  // ------------------------------------------------------- host calls

  std::string AddInLabel(const Node& parent, const std::string& id) const {
    if (!m_.FindAddIn(id)) parent.FailKey(id, "no add-in \"" + id + "\" in the model");
    return "addin:" + id;
  }

  // add-in -> section -> entry -> error: every call of the setting member
  // with that section and entry raises.
  void ReadSettings(const Node& n, const char* member) {
    for (const auto& [addin, sections] : n.Members()) {
      const std::string label = AddInLabel(n, addin);
      sections.ExpectObject("an object of sections");
      for (const auto& [section, entries] : sections.Members()) {
        entries.ExpectObject("an object of entries to errors");
        for (const auto& [entry, error] : entries.Members()) {
          CallFaultDef d;
          d.object = label;
          d.member = member;
          d.args = {section, entry};
          d.error = ParseError(error);
          f_.calls.push_back(std::move(d));
        }
      }
    }
  }

  // {"object": ..., "member": ..., "call": n, "raise": {...}}; the first two
  // only in the general form.
  CallFaultDef ReadCall(const Node& n, bool general) {
    n.ExpectObject(general ? "a fault {\"object\": ..., \"member\": ..., \"call\": n, \"raise\": {...}}"
                           : "a fault {\"call\": n, \"raise\": {...}}");
    if (general)
      n.ExpectKeys({"comment", "object", "member", "call", "raise"});
    else
      n.ExpectKeys({"comment", "call", "raise"});
    CallFaultDef d;
    if (general) {
      d.object = n.Member("object").String();
      d.member = n.Member("member").String();
    }
    if (auto c = n.Find("call")) {
      d.call = c->Integer();
      if (d.call < 1) c->Fail("calls are counted from 1");
    }
    d.error = ParseError(n.Member("raise"));
    return d;
  }

  // The object must be a host object the model can have, the member one it
  // answers; the member is kept as the object spells it.
  void CheckMember(const Node& n, CallFaultDef& d) const {
    const Node where = n.Find("object") ? n.Member("object") : n;
    std::optional<std::span<const MemberName>> members = HostMembersOf(m_, d.object);
    if (!members) {
      if (d.object.find(".EventHandler") != std::string::npos || d.object.find('#') != std::string::npos)
        where.Fail("\"" + d.object + "\" is no host object; a companion's members raise with \"raise\" or \"answers\"");
      where.Fail("no host object \"" + d.object +
                 "\" (name it as the event log does: $app, $app.AddInManager, $app.AddIns, $model, addin:NAME, "
                 "element:KEY, menu:NAME, collection:..., classkind:KEY, package:NAME, unit:KEY, property:...)");
    }
    auto found = std::find_if(members->begin(), members->end(),
                              [&](const MemberName& m) { return EqualsNoCase(m.name, d.member); });
    if (found == members->end()) {
      std::string list;
      for (const MemberName& m : *members) list += (list.empty() ? "" : ", ") + std::string(m.name);
      (n.Find("member") ? n.Member("member") : n)
          .Fail(d.object + " has no member \"" + d.member + "\" (it has: " + list + ")");
    }
    d.member = std::string(found->name);
  }

  ModelDef& m_;
  FaultsDef& f_;
};

}  // namespace

void ReadFaults(const Node& node, ModelDef& model) { FaultsReader(model).Read(node); }

const RegistryFaultDef* FindRegistryFault(const FaultsDef& faults, platform::RootKey root, std::string_view key) {
  for (const RegistryFaultDef& f : faults.registry)
    if (f.root == root && (f.cannotCreate ? AtOrBelow(key, f.key) : EqualsNoCase(key, f.key))) return &f;
  return nullptr;
}

std::optional<std::optional<platform::RegistryValue>> InjectedRead(const FaultsDef& faults, platform::RootKey root,
                                                                   std::string_view key, std::string_view name) {
  const RegistryFaultDef* f = FindRegistryFault(faults, root, key);
  if (!f) return std::nullopt;
  auto read = f->reads.find(name);
  if (read == f->reads.end()) return std::nullopt;
  return read->second;
}

bool InjectedCreateFailure(const FaultsDef& faults, platform::RootKey root, std::string_view key) {
  const RegistryFaultDef* f = FindRegistryFault(faults, root, key);
  return f && f->cannotCreate;
}

std::optional<platform::RegistryValue> FaultyRegistry::QueryValue(platform::RootKey root, std::string_view key,
                                                                  std::string_view name) {
  if (auto injected = InjectedRead(faults_, root, key, name)) return *injected;
  return inner_.QueryValue(root, key, name);
}

platform::KeyDisposition FaultyRegistry::CreateKey(platform::RootKey root, std::string_view key) {
  if (InjectedCreateFailure(faults_, root, key)) return platform::KeyDisposition::Failed;
  return inner_.CreateKey(root, key);
}

// ---------------------------------------------------------------- CallFaults

CallFaults::CallFaults(const std::vector<CallFaultDef>& defs) {
  for (const CallFaultDef& d : defs) {
    watches_[{d.object, d.member}].faults.push_back(&d);
    if (std::find(members_.begin(), members_.end(), d.member) == members_.end()) members_.push_back(d.member);
  }
}

void CallFaults::Check(EventLog& log, const SimObject& object, std::string_view member,
                       std::span<const Variant> args) {
  // Most runs inject nothing, and most members are never named.
  if (std::find(members_.begin(), members_.end(), member) == members_.end()) return;
  auto watch = watches_.find({object.label(), std::string(member)});
  if (watch == watches_.end()) return;
  const int64_t call = ++watch->second.calls;
  for (const CallFaultDef* f : watch->second.faults) {
    if (f->call != 0 && f->call != call) continue;
    bool same = f->args.size() <= args.size();
    for (size_t i = 0; same && i < f->args.size(); ++i) {
      try {
        same = EqualsNoCase(args[i].toString(), f->args[i]);
      } catch (const AutomationError&) {
        same = false;  // not text: no section or entry name
      }
    }
    if (!same) continue;
    const AutomationError error(f->error.number, f->error.description);
    EventJson shown = EventJson::array();
    for (const Variant& a : args) shown.push_back(log.Value(a.deref()));
    log.Add({{"ev", "fault"},
             {"object", object.label()},
             {"member", member},
             {"call", call},
             {"args", std::move(shown)},
             {"error", ErrorJson(error)}});
    throw error;
  }
}

}  // namespace kpx::sim
