// The model file: the world the add-in meets. Registry, files, clock, the
// host application with its add-ins, companion components, the resource
// component and the UML model. Read once, checked completely before the run:
// every fault names its line.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "platform/platform.h"
#include "sim/json_source.h"

namespace kpx::sim {

// Orders text without regard to ASCII letter case: add-in settings,
// properties, member names and ProgIDs are looked up that way.
struct NoCaseLess {
  bool operator()(std::string_view a, std::string_view b) const;
  using is_transparent = void;
};

struct ErrorDef {
  int32_t number = 0;
  std::string description;
};

// One registry value to put in place (or only a key, when `name` is unset).
struct RegistryEntry {
  platform::RootKey root = platform::RootKey::LocalMachine;
  std::string key;
  std::optional<std::string> name;  // "" is the key's default value
  platform::RegistryValue value;
};

struct ClockSetting {
  std::optional<platform::DateTime> date;  // only year, month, day used
  std::optional<double> seconds;           // since midnight
  std::optional<double> step;              // added after each Timer read
};

// What a member answers when a call's leading arguments are these values.
struct AnswerDef {
  std::vector<InputJson> args;       // compared with the call's first arguments (checked)
  std::optional<InputJson> returns;  // a value (checked); Empty when neither is given
  std::optional<ErrorDef> raise;
};

// A companion member: what a call answers.
struct CompanionDef;
struct MemberDef {
  std::optional<InputJson> returns;                   // a value (checked)
  std::shared_ptr<const CompanionDef> returnsObject;  // or a companion of its own
  std::optional<ErrorDef> raise;
  std::vector<InputJson> setArgs;  // written back to by-reference arguments, by position
  std::vector<AnswerDef> answers;  // tried in order before `returns` and `raise`
};

struct CompanionDef {
  std::string progid;  // one of progid and clsid names how it is created
  std::string clsid;
  std::optional<ErrorDef> createError;
  std::vector<std::string> operations;  // its own interface, in order
  // Its other interfaces, by interface id: each one's members, in order.
  std::map<std::string, std::vector<std::string>, NoCaseLess> interfaces;
  std::map<std::string, MemberDef, NoCaseLess> members;
  std::map<std::string, std::shared_ptr<const CompanionDef>> objects;

  const MemberDef* FindMember(std::string_view name) const;
};

using Settings = std::map<std::string, std::map<std::string, std::string, NoCaseLess>, NoCaseLess>;

struct AddInDef {
  std::string name;
  std::string id;  // name, or "name#k" for the k-th add-in of that name
  Settings settings;
  std::string installDirectory, registryRoot, helpFile;
  bool contextMenus = true;
  std::shared_ptr<const CompanionDef> eventHandler;
  std::map<std::string, InputJson> menuStates;  // initial "MenuState" by internal name
};

struct ApplicationDef {
  std::string path = "C:\\Program Files\\Quarn";
  int32_t mainWindow = 4242;
  int16_t top = 0, left = 0, height = 600, width = 800;
  std::map<std::string, ErrorDef, NoCaseLess> failingScripts;
};

using Properties = std::map<std::string, std::map<std::string, std::string, NoCaseLess>, NoCaseLess>;

// One model element. `key` is how files and scenarios name it: the name for
// top-level elements, "Class.member" for attributes and operations.
struct ElementDef {
  std::string key, name, kind, stereotype, displayName;
  Properties properties;
  // Class and module.
  std::string language;
  // Class.
  std::vector<std::string> components, attributes, operations;
  std::string nestedIn;
  std::string classKind = "Normal";
  std::string package = "Logical View";
  bool packageEditable = true;
  // Attribute and operation.
  std::string owner;
  // Relations.
  std::string client, supplier, relationText;
  bool unitModifiable = true;
  // Association and role.
  std::string role1, role2, roleClass;
  bool navigable = false;
};

// The class diagram the user works in, as GetActiveDiagram hands it out:
// its name and the classes it shows, in order.
struct DiagramDef {
  std::string name;
  std::vector<std::string> classes;
};

// ------------------------------------------------------------------ faults
// Failures the model injects into the add-in's world, so that every failure
// path of the add-in can be played. Read from the model's "faults".

// A call of a host object's member that raises: the `call`-th call of
// `member` on the objects labelled `object` (every call when `call` is 0)
// whose leading arguments, as text, equal `args` without regard to letter
// case (any arguments when `args` is empty).
struct CallFaultDef {
  std::string object;  // the label, as the event log names the object
  std::string member;  // as the object spells it
  int64_t call = 0;
  std::vector<std::string> args;
  ErrorDef error;
};

// A registry key the add-in cannot create, or values that read back other
// than the registry holds them.
struct RegistryFaultDef {
  platform::RootKey root = platform::RootKey::LocalMachine;
  std::string key;
  bool cannotCreate = false;
  // Value name ("" the default value) to what every read gives; nothing:
  // the value reads as missing.
  std::map<std::string, std::optional<platform::RegistryValue>, NoCaseLess> reads;
};

// A file the add-in cannot remove, move (as the file moved), replace or
// open for its times: each call fails with its error.
struct FileFaultDef {
  std::optional<ErrorDef> remove, move, replace, times;
};

struct FaultsDef {
  std::vector<CallFaultDef> calls;
  std::vector<RegistryFaultDef> registry;
  std::set<int32_t> missingResources;
  std::map<std::string, FileFaultDef, NoCaseLess> files;  // by Windows path

  bool empty() const { return calls.empty() && registry.empty() && missingResources.empty() && files.empty(); }
};

// What a file of the model is besides its text: read-only or not, and its
// three times (UTC). Times left out are the clock's start.
struct FileDetailDef {
  bool readOnly = false;
  std::optional<platform::FileTime> creation, lastAccess, lastWrite;
};

// A program the add-in may start, and how the run answers it.
struct ProcessDef {
  enum class Kind { Exits, StartFails, TimesOut, WaitFails };
  Kind kind = Kind::Exits;
  uint32_t exitCode = 0;  // Exits
  uint32_t error = 0;     // StartFails, WaitFails: the system error
};

struct ModelDef {
  std::vector<RegistryEntry> registry;  // keys and value names as REGEDIT4 can write them
  std::vector<std::pair<std::string, std::string>> files;
  std::map<std::string, FileDetailDef> fileDetails;  // by the path as "files" writes it
  // By the program's Windows path, letter case ignored.
  std::map<std::string, ProcessDef, NoCaseLess> processes;
  std::vector<std::string> folders;
  ClockSetting clock;
  ApplicationDef application;
  std::vector<AddInDef> addins;
  std::vector<std::shared_ptr<const CompanionDef>> companions;
  std::map<int32_t, std::string> resources;
  bool resourceRegistered = true;
  Properties modelProperties;
  std::vector<ElementDef> elements;  // added through AddElement, which keeps them findable
  std::vector<std::string> selection;
  std::optional<DiagramDef> diagram;  // none: no class diagram is open
  // False: the host lacks the members class-diagram expansion uses (the
  // model's GetActiveDiagram, a class's GetClientClasses and
  // GetSupplierClasses).
  bool diagramMembers = true;
  FaultsDef faults;

  const ElementDef* FindElement(std::string_view key) const;
  // Where the element is in `elements`.
  std::optional<size_t> PlaceOf(std::string_view key) const;
  const AddInDef* FindAddIn(std::string_view id) const;
  // Appends an element under its key; false, and nothing added, when the
  // key is taken.
  bool AddElement(ElementDef&& element);
  void ReserveElements(size_t count);
  // Appends an add-in under its id; false, and nothing added, when the id
  // is taken.
  bool AddAddIn(AddInDef&& addin);

 private:
  struct Hash {
    using is_transparent = void;
    size_t operator()(std::string_view s) const { return std::hash<std::string_view>{}(s); }
  };
  using Index = std::unordered_map<std::string, size_t, Hash, std::equal_to<>>;
  Index elementIndex_;
  Index addinIndex_;
};

// The element kinds the simulated host knows, as IdentifyClass names them.
const std::vector<std::string_view>& ElementKinds();
bool IsRelationKind(std::string_view kind);

// Reads a model file. Raises InputError.
ModelDef LoadModel(const JsonSource& source);

// Pieces the scenario file shares with the model file.
std::vector<RegistryEntry> ParseRegistry(const Node& node);
// One key of a "registry" object, "HKLM\\..." or the like: its root and path.
std::pair<platform::RootKey, std::string> ParseRegistryKey(const Node& registry, const std::string& fullKey);
// A registry value in any of the forms of a model's "registry".
platform::RegistryValue ParseRegistryValue(const Node& node);
ClockSetting ParseClock(const Node& node);
// "YYYY-MM-DD HH:MM:SS", UTC, as a file time.
platform::FileTime ParseFileTime(const Node& node);
// A file time as the log writes it: "YYYY-MM-DD HH:MM:SS", and the
// fraction of the second (seven digits) when there is one.
std::string FileTimeText(platform::FileTime time);
// The date and seconds since midnight, taken as UTC, as a file time.
platform::FileTime ToFileTime(const platform::DateTime& date, double seconds);
// {"number": n, "description": "..."}
ErrorDef ParseError(const Node& node);

// Checks a value of the files (the forms are in values.h) against the model.
// `owner` is the companion whose sub-objects a value may name (none outside
// companions); `byRef` allows one {"byref": ...} wrapper at the top.
void CheckValue(const Node& value, const ModelDef& model, const CompanionDef* owner, bool byRef);

}  // namespace kpx::sim
