// The simulated Quarn host as a whole: the application object with its
// add-ins, the UML model with its elements, the companions' instance
// counters, and the conversion of file values into live variants.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "automation/variant.h"
#include "sim/event_log.h"
#include "sim/faults.h"
#include "sim/model_file.h"

namespace kpx::sim {

class ApplicationObject;
class AddInObject;
class CompanionObject;
class ElementObject;

class World {
 public:
  World(const ModelDef& def, EventLog& log);
  ~World();
  World(const World&) = delete;
  World& operator=(const World&) = delete;

  EventLog& log() { return log_; }
  const ModelDef& def() const { return def_; }
  // The host calls the model makes fail.
  CallFaults& faults() { return faults_; }

  ObjectPtr application() const;
  ObjectPtr model() const { return model_; }
  // By key ("CFoo", "CFoo.m_x"); nullptr when there is none.
  std::shared_ptr<ElementObject> FindElement(std::string_view key) const;
  const std::vector<std::shared_ptr<ElementObject>>& elements() const { return elements_; }
  // By id ("VC++", "VisualStudio#2"); nullptr when there is none.
  std::shared_ptr<AddInObject> FindAddIn(std::string_view id) const;
  const std::vector<std::shared_ptr<AddInObject>>& addins() const { return addins_; }

  // Relations by their client and by their supplier, associations by their
  // roles: places in elements(), in model order. A class's menu asks for
  // them on every right click; a large model cannot be searched each time.
  const std::vector<size_t>& RelationsFrom(std::string_view client) const { return Listed(relationsFrom_, client); }
  const std::vector<size_t>& RelationsTo(std::string_view supplier) const { return Listed(relationsTo_, supplier); }
  const std::vector<size_t>& AssociationsOf(std::string_view role) const { return Listed(associationsOf_, role); }
  // Roles by the class at their end.
  const std::vector<size_t>& RolesAt(std::string_view cls) const { return Listed(rolesAt_, cls); }
  // The class diagram the user works in; nullptr when none is open.
  ObjectPtr diagram() const { return diagram_; }

  // The model's selection, as element keys (checked by the caller).
  void Select(std::vector<std::string> keys) { selection_ = std::move(keys); }
  std::vector<ObjectPtr> SelectedItems() const;

  // A checked value of the files as a variant; `owner` resolves a
  // companion's {"object": name}.
  Variant ToVariant(const InputJson& value, CompanionObject* owner = nullptr) const;

  // Numbers instances per kind of thing: 1, 2, 3 ...
  int NextInstance(const std::string& base) { return ++instances_[base]; }
  // "base" for the first instance, "base#k" for the k-th.
  std::string NextLabel(const std::string& base);

 private:
  using Places = std::unordered_map<std::string_view, std::vector<size_t>>;
  static const std::vector<size_t>& Listed(const Places& places, std::string_view key);

  const ModelDef& def_;
  EventLog& log_;
  CallFaults faults_;
  std::shared_ptr<ApplicationObject> application_;
  ObjectPtr model_;
  std::vector<std::shared_ptr<ElementObject>> elements_;
  std::vector<std::shared_ptr<AddInObject>> addins_;
  std::vector<std::string> selection_;
  std::map<std::string, int> instances_;
  Places relationsFrom_, relationsTo_, associationsOf_, rolesAt_;  // keys are views of def_'s names
  ObjectPtr diagram_;
};

}  // namespace kpx::sim
