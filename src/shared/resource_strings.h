// User-visible texts come from a companion resource component by number, so
// that replacing that component localises the add-in.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>

#include "automation/object.h"
#include "platform/platform.h"

namespace kpx {

inline constexpr std::string_view kResourceClassId = "{87694CC1-5110-11D3-B9F8-006008BF3ACB}";
inline constexpr std::string_view kResourceInterfaceId = "{87694CC2-5110-11D3-B9F8-006008BF3ACB}";
inline constexpr std::string_view kResourceProgId = "kpxres.KPXResourceInterface";

class ResourceStrings {
 public:
  explicit ResourceStrings(platform::ObjectFactory& objects) : objects_(objects) {}

  // The shared resource object, created on demand.
  ObjectPtr GetResourceObject();
  void SetResourceObject(ObjectPtr object) { resourceObject_ = std::move(object); }
  // One text by id through the shared resource object (its first own
  // operation). Raises when the component fails.
  std::string LoadResString(int32_t id);

  // Creates a fresh shared resource object and loads the message strings the
  // restore routines read. Raises when the component fails.
  void InitResourceStrings();
  // A message string loaded by InitResourceStrings, by its id ("" for an id
  // that is not among them).
  const std::string& MessageString(int32_t id) const;

  // A text with "%1".."%6" replaced; "" when the component fails.
  std::string GetResourceString(int32_t id, std::string_view arg1 = {}, std::string_view arg2 = {},
                                std::string_view arg3 = {}, std::string_view arg4 = {},
                                std::string_view arg5 = {}, std::string_view arg6 = {});

  // Replaces every occurrence of `placeholder`; an empty value shows as
  // "<blank>". A value containing the placeholder never ends: callers never
  // pass one.
  static std::string ReplacePlaceholder(std::string_view placeholder, std::string_view value, std::string text);

  // The ids InitResourceStrings loads, in loading order.
  static constexpr std::array<int32_t, 23> kMessageIds = {5018, 5019, 5020, 5021, 5022, 5023,  5024,  5020,
                                                          5011, 5027, 30013, 30003, 30000, 5028, 5029, 5010,
                                                          5011, 5012, 5013, 5014, 5015, 5016, 5017};

 private:
  platform::ObjectFactory& objects_;
  ObjectPtr resourceObject_;   // the shared one, released with the API object
  ObjectPtr interfaceObject_;  // GetResourceString's own, kept for the process
  std::array<std::string, kMessageIds.size()> messages_;
};

}  // namespace kpx
