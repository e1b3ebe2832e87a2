// Errors as automation reports them: a VB error number and its description.
#pragma once

#include <cstdint>
#include <stdexcept>
#include <string>

namespace kpx {

// VB error numbers the add-in meets or raises.
namespace vberr {
inline constexpr int32_t kInvalidCall = 5;          // Invalid procedure call or argument
inline constexpr int32_t kOverflow = 6;             // Overflow
inline constexpr int32_t kSubscript = 9;            // Subscript out of range
inline constexpr int32_t kTypeMismatch = 13;        // Type mismatch
inline constexpr int32_t kInternal = 51;            // Internal error
inline constexpr int32_t kFileNotFound = 53;        // File not found
inline constexpr int32_t kFileAlreadyExists = 58;   // File already exists
inline constexpr int32_t kDiskFull = 61;            // Disk full
inline constexpr int32_t kPermissionDenied = 70;    // Permission denied
inline constexpr int32_t kPathFileAccess = 75;      // Path/File access error
inline constexpr int32_t kPathNotFound = 76;        // Path not found
inline constexpr int32_t kObjectNotSet = 91;        // Object variable or With block variable not set
inline constexpr int32_t kInvalidUseOfNull = 94;    // Invalid use of Null
inline constexpr int32_t kCantCreateObject = 429;   // ActiveX component can't create object
inline constexpr int32_t kObjectRequired = 424;     // Object required
inline constexpr int32_t kNoSuchMember = 438;       // Object doesn't support this property or method
inline constexpr int32_t kDuplicateKey = 457;       // This key is already associated with an element of this collection
inline constexpr int32_t kArgNotOptional = 449;     // Argument not optional
inline constexpr int32_t kWrongArgCount = 450;      // Wrong number of arguments or invalid property assignment
// A member whose behaviour is not there yet. Crosses COM as E_NOTIMPL.
inline constexpr int32_t kNotImplemented = static_cast<int32_t>(0x80004001u);
}  // namespace vberr

// The standard description of a VB error number ("" for numbers it does not know).
std::string VbErrorDescription(int32_t number);

class AutomationError : public std::runtime_error {
 public:
  // With no description, the standard one for the number is used.
  explicit AutomationError(int32_t number, std::string description = {}, std::string source = {});

  int32_t number() const noexcept { return number_; }
  const std::string& description() const noexcept { return description_; }
  const std::string& source() const noexcept { return source_; }

 private:
  int32_t number_;
  std::string description_;
  std::string source_;
};

[[noreturn]] void RaiseNotImplemented(const std::string& member);

}  // namespace kpx
