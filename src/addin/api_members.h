// The members of the API class in the order of its dispatch interface. The
// dispatch id of a member is its position (1-based). The COM server's type
// library and the simulated host both follow this table.
#pragma once

#include <array>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>

#include "automation/object.h"

namespace kpx {

class API;

// The automation type of a parameter or result.
enum class ApiType : uint8_t { None, Object, String, Int16, Int32, Bool, Variant };

struct ApiParam {
  const char* name;
  ApiType type;
  bool byRef;
  bool optional;
};

struct ApiMember {
  const char* name;
  CallKind kind;  // Method or PropertyGet
  ApiType result;
  std::array<ApiParam, 4> params;
  uint8_t paramCount;
  // Runs the member; arguments are already checked for count.
  Variant (*call)(API& api, std::span<Variant> args);
};

std::span<const ApiMember> ApiMembers();
// "kpxAddin.<member>(<parameter names>)": the trace line a member without a
// first line of its own begins with.
std::string EntryTraceLine(std::string_view member);
inline constexpr int kApiMemberCount = 69;

}  // namespace kpx
