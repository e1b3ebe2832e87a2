// Class-diagram expansion: the classes related to the selected ones join
// them on the class diagram the user works in. Clients are the classes that
// depend on a selected class (its subclasses, the classes realizing or
// using it), suppliers the classes it depends on; the host answers both for
// a class, as GetClientClasses and GetSupplierClasses, and adds a class to
// a diagram with the diagram's AddClass. A host without these members
// cannot have its diagrams expanded: the user is told so in the host's log.
#include <algorithm>
#include <string>
#include <vector>

#include "addin/api.h"
#include "automation/error_styles.h"
#include "shared/host_ids.h"

namespace kpx {

namespace {

// Host log texts: the host lacks the members expansion needs; no class
// diagram is open to expand.
constexpr int32_t kMsgCannotExpand = 5080;
constexpr int32_t kMsgNoDiagram = 5081;

int32_t CountOf(const ObjectPtr& collection) { return GetProperty(collection, hostid::kCount).toInt32(); }

ObjectPtr ItemAt(const ObjectPtr& collection, int32_t index) {
  return CallMethod(collection, hostid::kGetAt, {Variant(static_cast<int16_t>(index))}).toObject();
}

}  // namespace

// Failures go back to the host, as for every menu command, except a host
// that lacks a member expansion needs (438): that is logged and told to
// the user, and the command ends quietly.
void API::ExpandClassDiagram(const ObjectPtr& QuarnApp, Expansion which) {
  const std::string prefix = "kpxAddin.ExpandClassDiagram: ";
  HostNameIds& ids = hostNameIds_;
  auto tellUser = [&](int32_t message) {
    ResumeNext onError;
    onError([&] {
      CallMethod(QuarnApp, hostid::kWriteErrorLog, {Variant(module_.resources().LoadResString(message))});
    });
  };
  try {
    const ObjectPtr model = GetObject(QuarnApp, hostid::kCurrentModel);
    const ObjectPtr selection = CallMethod(model, hostid::kGetSelectedItems).toObject();
    std::vector<ObjectPtr> selected;
    const int32_t count = CountOf(selection);
    for (int32_t i = 1; i <= count; ++i) {
      ObjectPtr item = ItemAt(selection, i);
      if (CallMethod(item, hostid::kIdentifyClass).toString() == "Class") selected.push_back(std::move(item));
    }
    if (selected.empty()) return;

    const ObjectPtr diagram = CallNamed(model, "GetActiveDiagram", ids.activeDiagram, CallKind::Method).toObject();
    if (!diagram) {
      module_.DebugLog(prefix + "no class diagram is open.", logid::ADDIN, loglevel::INFO);
      tellUser(kMsgNoDiagram);
      return;
    }
    // The selected classes are on the diagram; a class related to several
    // of them is added once.
    std::vector<ObjectPtr> placed = selected;
    int added = 0;
    auto expand = [&](std::string_view member, std::optional<DispId>& id) {
      for (const ObjectPtr& cls : selected) {
        const ObjectPtr related = CallNamed(cls, member, id, CallKind::Method).toObject();
        const int32_t n = CountOf(related);
        for (int32_t j = 1; j <= n; ++j) {
          ObjectPtr other = ItemAt(related, j);
          if (std::any_of(placed.begin(), placed.end(), [&](const ObjectPtr& p) { return SameObject(p, other); }))
            continue;
          placed.push_back(other);
          // False: the diagram showed it already.
          if (CallNamed(diagram, "AddClass", ids.addClass, CallKind::Method, {Variant(other)}).toBool()) ++added;
        }
      }
    };
    if (which != Expansion::Suppliers) expand("GetClientClasses", ids.clientClasses);
    if (which != Expansion::Clients) expand("GetSupplierClasses", ids.supplierClasses);
    module_.DebugLog(prefix + std::to_string(added) + (added == 1 ? " class added." : " classes added."),
                     logid::ADDIN, loglevel::TRACE);
  } catch (...) {
    const AutomationError e = CurrentError();
    module_.DebugLog(prefix + e.description(), logid::ADDIN, loglevel::ERROR);
    if (e.number() != vberr::kNoSuchMember) throw;
    tellUser(kMsgCannotExpand);
  }
}

}  // namespace kpx
