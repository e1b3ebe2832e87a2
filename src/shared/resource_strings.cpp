#include "shared/resource_strings.h"

#include "automation/error_styles.h"
#include "automation/vb_strings.h"

namespace kpx {

ObjectPtr ResourceStrings::GetResourceObject() {
  if (!resourceObject_) resourceObject_ = objects_.CreateInstance(kResourceClassId, kResourceInterfaceId);
  return resourceObject_;
}

std::string ResourceStrings::LoadResString(int32_t id) {
  return CallOwnOperation(GetResourceObject(), 1, CallKind::Method, {Variant(id)}).toString();
}

void ResourceStrings::InitResourceStrings() {
  SetResourceObject(objects_.CreateInstance(kResourceClassId, kResourceInterfaceId));
  for (size_t i = 0; i < kMessageIds.size(); ++i) messages_[i] = LoadResString(kMessageIds[i]);
}

const std::string& ResourceStrings::MessageString(int32_t id) const {
  static const std::string kNone;
  for (size_t i = 0; i < kMessageIds.size(); ++i)
    if (kMessageIds[i] == id) return messages_[i];
  return kNone;
}

std::string ResourceStrings::GetResourceString(int32_t id, std::string_view arg1, std::string_view arg2,
                                               std::string_view arg3, std::string_view arg4,
                                               std::string_view arg5, std::string_view arg6) {
  return CatchAll(
      [&] {
        if (!interfaceObject_) interfaceObject_ = objects_.CreateObject(kResourceProgId);
        Variant idArg(id);
        std::string text =
            CallByName(interfaceObject_, "GetString", CallKind::Method, {Variant::Ref(&idArg)}).toString();
        const std::string_view args[] = {arg1, arg2, arg3, arg4, arg5, arg6};
        const char* placeholders[] = {"%1", "%2", "%3", "%4", "%5", "%6"};
        for (int i = 0; i < 6; ++i) text = ReplacePlaceholder(placeholders[i], args[i], std::move(text));
        return text;
      },
      [](const AutomationError&) { return std::string(); });
}

std::string ResourceStrings::ReplacePlaceholder(std::string_view placeholder, std::string_view value,
                                                std::string text) {
  if (value.empty()) value = "<blank>";
  // Each search starts again at the beginning, as the texts' authors expect.
  for (size_t p = text.find(placeholder); p != std::string::npos; p = text.find(placeholder))
    text.replace(p, placeholder.size(), value);
  return text;
}

}  // namespace kpx
