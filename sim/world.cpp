#include "sim/world.h"

#include <stdexcept>

#include "sim/companions.h"
#include "sim/host_objects.h"
#include "sim/values.h"

namespace kpx::sim {

World::World(const ModelDef& def, EventLog& log)
    : def_(def), log_(log), faults_(def.faults.calls), selection_(def.selection) {
  for (const AddInDef& a : def.addins) addins_.push_back(std::make_shared<AddInObject>(*this, a));
  auto collection = std::make_shared<CollectionObject>(*this, "$app.AddIns",
                                                       std::vector<ObjectPtr>(addins_.begin(), addins_.end()), false);
  application_ = std::make_shared<ApplicationObject>(*this, def.application,
                                                     std::make_shared<AddInManagerObject>(*this, collection));
  model_ = std::make_shared<ModelObject>(*this);
  elements_.reserve(def.elements.size());
  for (size_t i = 0; i < def.elements.size(); ++i) {
    const ElementDef& e = def.elements[i];
    elements_.push_back(std::make_shared<ElementObject>(*this, e));
    if (IsRelationKind(e.kind)) {
      relationsFrom_[e.client].push_back(i);
      relationsTo_[e.supplier].push_back(i);
    } else if (e.kind == "Association") {
      associationsOf_[e.role1].push_back(i);
      if (e.role2 != e.role1) associationsOf_[e.role2].push_back(i);
    } else if (e.kind == "Role") {
      rolesAt_[e.roleClass].push_back(i);
    }
  }
  if (def.diagram) diagram_ = std::make_shared<DiagramObject>(*this, *def.diagram);
}

const std::vector<size_t>& World::Listed(const Places& places, std::string_view key) {
  static const std::vector<size_t> kNone;
  auto it = places.find(key);
  return it == places.end() ? kNone : it->second;
}

World::~World() = default;

ObjectPtr World::application() const { return application_; }

std::shared_ptr<ElementObject> World::FindElement(std::string_view key) const {
  const std::optional<size_t> place = def_.PlaceOf(key);
  return place ? elements_[*place] : nullptr;
}

std::shared_ptr<AddInObject> World::FindAddIn(std::string_view id) const {
  const AddInDef* a = def_.FindAddIn(id);
  return a ? addins_[static_cast<size_t>(a - def_.addins.data())] : nullptr;
}

std::vector<ObjectPtr> World::SelectedItems() const {
  std::vector<ObjectPtr> items;
  for (const std::string& key : selection_) items.push_back(FindElement(key));
  return items;
}

std::string World::NextLabel(const std::string& base) {
  const int k = NextInstance(base);
  return k == 1 ? base : base + "#" + std::to_string(k);
}

Variant World::ToVariant(const InputJson& value, CompanionObject* owner) const {
  if (std::optional<Variant> plain = PlainValue(value)) return *plain;
  if (value.is_string()) return value.get_ref<const std::string&>() == "$app" ? application() : model();
  const std::string& form = value.begin().key();
  const std::string name = value.begin().value().get<std::string>();
  if (form == "element") return ObjectPtr(FindElement(name));
  if (form == "addin") return ObjectPtr(FindAddIn(name));
  if (form == "object" && owner) return owner->SubObject(name);
  // Values are checked when the files are read; this is a fault of the sim.
  throw std::logic_error("unchecked value " + value.dump());
}

}  // namespace kpx::sim
