#include "automation/automation_error.h"

namespace kpx {

std::string VbErrorDescription(int32_t number) {
  switch (number) {
    case vberr::kInvalidCall: return "Invalid procedure call or argument";
    case vberr::kOverflow: return "Overflow";
    case vberr::kSubscript: return "Subscript out of range";
    case vberr::kTypeMismatch: return "Type mismatch";
    case vberr::kInternal: return "Internal error";
    case vberr::kFileNotFound: return "File not found";
    case vberr::kFileAlreadyExists: return "File already exists";
    case vberr::kDiskFull: return "Disk full";
    case vberr::kPermissionDenied: return "Permission denied";
    case vberr::kPathFileAccess: return "Path/File access error";
    case vberr::kPathNotFound: return "Path not found";
    case vberr::kObjectNotSet: return "Object variable or With block variable not set";
    case vberr::kInvalidUseOfNull: return "Invalid use of Null";
    case vberr::kCantCreateObject: return "ActiveX component can't create object";
    case vberr::kObjectRequired: return "Object required";
    case vberr::kNoSuchMember: return "Object doesn't support this property or method";
    case vberr::kDuplicateKey: return "This key is already associated with an element of this collection";
    case vberr::kArgNotOptional: return "Argument not optional";
    case vberr::kWrongArgCount: return "Wrong number of arguments or invalid property assignment";
    case vberr::kNotImplemented: return "Not implemented";
    default: return {};
  }
}

AutomationError::AutomationError(int32_t number, std::string description, std::string source)
    : std::runtime_error(description.empty() ? VbErrorDescription(number) : description),
      number_(number),
      description_(description.empty() ? VbErrorDescription(number) : std::move(description)),
      source_(std::move(source)) {}

void RaiseNotImplemented(const std::string& member) {
  throw AutomationError(vberr::kNotImplemented, member + " is not implemented");
}

}  // namespace kpx
