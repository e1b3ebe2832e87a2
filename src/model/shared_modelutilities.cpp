#include "model/shared_modelutilities.h"

#include <memory>
#include <optional>

#include "automation/collection.h"
#include "automation/error_styles.h"
#include "automation/vb_strings.h"
#include "shared/host_ids.h"
#include "shared/token_scanner.h"

namespace kpx {

namespace {

// The relation kinds of the host's related-classes query: with 6 an
// interface gives the classes that realize it, with 5 a coclass the classes
// linked to it that implement it.
constexpr int32_t kRealizingClasses = 6;
constexpr int32_t kImplementingClasses = 5;

constexpr DispId kRemoveAll = 211;
constexpr DispId kAdd = 208;
constexpr DispId kRole1Navigable = 616;

// Members the host reaches only by name. Every class is the same kind of
// host object, so one look-up serves all the classes of one query: each
// look-up is a round trip to the host.
class ClassNames {
 public:
  DispId Of(const ObjectPtr& cls, std::string_view name, std::optional<DispId>& cached) {
    if (!cached) {
      if (!cls) throw AutomationError(vberr::kObjectNotSet);
      cached = cls->IdOfName(name);
    }
    return *cached;
  }
  std::optional<DispId> related, language;
};

// Loop counters are 16-bit, as the host's collections count: more than
// 32,767 members overflow.
int16_t CountOf(const ObjectPtr& collection) { return GetProperty(collection, hostid::kCount).toInt16(); }

ObjectPtr ItemOf(const ObjectPtr& collection, int16_t i) {
  return CallMethod(collection, hostid::kGetAt, {Variant(i)}).toObject();
}

ObjectPtr RelatedClasses(ClassNames& names, const ObjectPtr& cls, int32_t kind) {
  const DispId id = names.Of(cls, "GetRelatedClasses", names.related);
  return CallMethod(cls, id, {Variant(int32_t{0}), Variant(kind)}).toObject();
}

bool IsVcClass(ClassNames& names, const ObjectPtr& cls, std::string_view stereotype) {
  if (!HasStereotype(stereotype, cls)) return false;
  const DispId id = names.Of(cls, "GetAssignedLanguage", names.language);
  return CallMethod(cls, id).toString() == "VC++";
}

// Adds the ATL object classes among `coclass`'s implementing classes.
void AddAtlObjectsOf(ClassNames& names, const ObjectPtr& coclass, const ObjectPtr& result) {
  const ObjectPtr related = RelatedClasses(names, coclass, kImplementingClasses);
  const int16_t count = CountOf(related);
  for (int16_t i = 1; i <= count; ++i) {
    ObjectPtr cls = ItemOf(related, i);
    if (IsVcClass(names, cls, "atlobject")) CallMethod(result, kAdd, {Variant(cls)});
  }
}

}  // namespace

void FindAtlObjectClasses(const ObjectPtr& interfaceClass, const ObjectPtr& result) {
  CallMethod(result, kRemoveAll);
  auto coclasses = std::make_shared<Collection>();
  ClassNames names;
  const ObjectPtr related = RelatedClasses(names, interfaceClass, kRealizingClasses);
  const int16_t count = CountOf(related);
  for (int16_t i = 1; i <= count; ++i) {
    ObjectPtr cls = ItemOf(related, i);
    if (IsVcClass(names, cls, "coclass")) coclasses->Add(Variant(cls));
  }
  for (size_t i = 1; i <= coclasses->size(); ++i)
    AddAtlObjectsOf(names, coclasses->At(static_cast<int64_t>(i)).toObject(), result);
}

void FindCoclassAtlObjects(const ObjectPtr& coclass, const ObjectPtr& result) {
  CallMethod(result, kRemoveAll);
  ClassNames names;
  AddAtlObjectsOf(names, coclass, result);
}

ObjectPtr FindOtherRole(const ObjectPtr& association, const ObjectPtr& cls) {
  ObjectPtr result;
  return CatchAll(
      [&] {
        result = CallMethod(association, hostid::kGetOtherRole, {Variant(cls)}).toObject();
        const ObjectPtr role1 = CallByName(association, "Role1", CallKind::PropertyGet).toObject();
        const ObjectPtr role2 = CallByName(association, "Role2", CallKind::PropertyGet).toObject();
        const std::string name1 = GetProperty(GetObject(role1, hostid::kGetRoleClass), hostid::kDisplayName).toString();
        const std::string name2 = GetProperty(GetObject(role2, hostid::kGetRoleClass), hostid::kDisplayName).toString();
        if (EqualsNoCase(name1, name2))
          result = GetProperty(role1, kRole1Navigable).toBool() ? role1 : role2;
        return result;
      },
      [&](const AutomationError&) { return result; });
}

}  // namespace kpx
