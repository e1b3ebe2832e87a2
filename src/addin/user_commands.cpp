// Up to five context-menu commands the user defines in the add-in's "Events"
// settings, as "types|caption|ProgID": choosing one creates that automation
// object and calls its method named after the slot.
#include "addin/user_commands.h"

#include <string>

#include "addin/api.h"
#include "automation/error_styles.h"
#include "automation/vb_strings.h"
#include "shared/host_ids.h"

namespace kpx {

namespace {

constexpr int kSlots = 5;

struct UserMenuType {
  char letter;
  int16_t itemType;
  const char* prefix;
};
// Tested in this order, so each slot's entries are added class first.
constexpr UserMenuType kUserMenuTypes[] = {
    {'C', hostid::kItemClass, "UClass_"},         {'M', hostid::kItemComponent, "UComponent_"},
    {'A', hostid::kItemAttribute, "UAttribute_"}, {'R', hostid::kItemRole, "URole_"},
    {'O', hostid::kItemOperation, "UOperation_"},
};

}  // namespace

UserCommandDefinition SplitUserCommandDefinition(std::string_view slot, std::string_view text) {
  const size_t first = InStr(text, "|");
  if (first == 0) return {std::string(text), std::string(slot), ""};
  UserCommandDefinition d{Left(text, first - 1), {}, std::string(kPlaceholderProgId)};
  const std::string rest = Mid(text, first + 1);
  const size_t second = InStr(rest, "|");
  if (second == 0) {
    d.caption = Trim(rest);
  } else {
    d.caption = Trim(Left(rest, second - 1));
    d.progId = Trim(Mid(rest, second + 1));  // later "|" belong to the identifier
    if (d.progId.empty()) d.progId = kPlaceholderProgId;
  }
  return d;
}

bool API::BuildUserCommandMenus(const ObjectPtr&, const ObjectPtr& addIn) {
  bool separatorAdded[std::size(kUserMenuTypes)] = {};
  UserCommands_.clear();
  return CatchAll(
      [&] {
        for (int n = 1; n <= kSlots; ++n) {
          const std::string slot = "OnUser" + std::to_string(n);
          const std::string text =
              Trim(CallMethod(addIn, hostid::kReadSetting, {Variant("Events"), Variant(slot), Variant("")}).toString());
          if (text.empty()) continue;
          const UserCommandDefinition d = SplitUserCommandDefinition(slot, text);
          UserCommands_[slot] = d.progId;
          const std::string types = UCase(d.types);
          for (size_t t = 0; t < std::size(kUserMenuTypes); ++t) {
            const UserMenuType& type = kUserMenuTypes[t];
            if (types.find(type.letter) == std::string::npos) continue;
            if (!separatorAdded[t]) {
              CallMethod(addIn, hostid::kAddContextMenuItem,
                         {Variant(type.itemType), Variant("Separator"), Variant("Separator")});
              separatorAdded[t] = true;
            }
            CallMethod(addIn, hostid::kAddContextMenuItem,
                       {Variant(type.itemType), Variant(d.caption), Variant(type.prefix + slot)});
          }
        }
        return true;
      },
      [](const AutomationError&) { return false; });
}

bool API::DispatchUserCommand(ObjectPtr& QuarnApp, const std::string& internalName) {
  const size_t underscore = InStr(internalName, "_");
  if (underscore == 0) return true;  // separators and the like: nothing to do
  const std::string slot = Mid(internalName, underscore + 1);
  for (int n = 1; n <= kSlots; ++n)
    if (slot == "OnUser" + std::to_string(n)) {
      OnUser(n, QuarnApp);
      return true;
    }
  return false;
}

bool API::CreateUserCommandObject(const std::string& slot, const ObjectPtr& QuarnApp, ObjectPtr& object) {
  module_.DebugLog("BEGIN kpxAddin." + slot, logid::ADDIN, loglevel::TRACE);
  auto found = UserCommands_.find(slot);
  const std::string progId = found == UserCommands_.end() ? std::string() : found->second;
  std::string message;
  if (!progId.empty()) {
    ResumeNext onError;
    onError([&] { object = module_.platform().objects.CreateObject(progId); });
    if (onError.failed()) message = "  " + slot + "() CreateObject(" + progId + ") FAILED: " + onError.description();
  } else {
    message = "  " + slot + "() FAILED: No ActiveX object name in registry";
  }
  if (object) return true;
  module_.DebugLog(message, logid::ADDIN, loglevel::ERROR);
  CallMethod(QuarnApp, hostid::kWriteErrorLog, {Variant(message)});
  return false;
}

int32_t API::OnUser(int n, ObjectPtr& QuarnApp) {
  ResumeNext onError;
  const std::string slot = "OnUser" + std::to_string(n);
  ObjectPtr object;
  bool created = false;
  onError([&] { created = CreateUserCommandObject(slot, QuarnApp, object); });
  if (!created) return 0;

  std::string message = "  END " + slot + "() ";
  onError.Clear();
  Variant app(QuarnApp);
  const bool ran = onError([&] { CallByName(object, slot, CallKind::Method, {Variant::Ref(&app)}); });
  const std::string failure = onError.description();
  onError([&] { QuarnApp = app.toObject(); });
  if (ran) {
    module_.DebugLog(message + " OK", logid::ADDIN, loglevel::TRACE);
  } else {
    message += "FAILED: " + failure;
    module_.DebugLog(message, logid::ADDIN, loglevel::ERROR);
    onError([&] { CallMethod(QuarnApp, hostid::kWriteErrorLog, {Variant(message)}); });
  }
  return 0;
}

}  // namespace kpx
