#include "sim/windows_path.h"

#include <algorithm>

namespace kpx::sim {

namespace {

// Windows refuses longer paths in its plain calls, and longer names anywhere.
constexpr size_t kMaxPath = 259;
constexpr size_t kMaxName = 255;

bool IsSeparator(char c) { return c == '\\' || c == '/'; }
char Lower(char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; }
bool IsLetter(char c) { return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z'); }

std::string Folded(std::string_view s) {
  std::string out(s);
  std::transform(out.begin(), out.end(), out.begin(), Lower);
  return out;
}

// How many leading parts name the drive or the share.
size_t RootParts(const std::vector<std::string>& parts) { return !parts.empty() && parts[0] == "unc" ? 3 : 1; }

std::string Joined(const std::vector<std::string>& parts, size_t count) {
  std::string out;
  for (size_t i = 0; i < count; ++i) {
    if (i) out += '\\';
    out += parts[i];
  }
  return out;
}

// Names Windows keeps for devices, with or without an extension.
bool IsDeviceName(std::string_view name) {
  const std::string base = Folded(name.substr(0, name.find('.')));
  static constexpr std::string_view kDevices[] = {"con", "prn", "aux", "nul"};
  if (std::find(std::begin(kDevices), std::end(kDevices), base) != std::end(kDevices)) return true;
  return base.size() == 4 && (base.rfind("com", 0) == 0 || base.rfind("lpt", 0) == 0) && base[3] >= '1' &&
         base[3] <= '9';
}

// "text" with its quotes. Built by appending: GCC 12 warns falsely
// (-Wrestrict) about a literal put before a string by operator+.
std::string Quoted(std::string_view text) {
  std::string out = "\"";
  out.append(text);
  out += '"';
  return out;
}

}  // namespace

std::vector<std::string> FoldedPathParts(std::string_view path) {
  std::vector<std::string> parts;
  if (path.size() >= 2 && IsSeparator(path[0]) && IsSeparator(path[1])) {
    parts.push_back("unc");
    path.remove_prefix(2);
  } else if (path.size() >= 2 && path[1] == ':' && IsLetter(path[0])) {
    parts.push_back(std::string(1, Lower(path[0])));
    path.remove_prefix(2);
  } else {
    parts.push_back("c");
  }
  const size_t fixed = parts[0] == "unc" ? 3 : 1;
  while (!path.empty()) {
    size_t sep = 0;
    while (sep < path.size() && !IsSeparator(path[sep])) ++sep;
    const std::string_view part = path.substr(0, sep);
    path.remove_prefix(std::min(sep + 1, path.size()));
    if (part.empty() || part == ".") continue;
    if (part == "..") {
      if (parts.size() > fixed) parts.pop_back();
      continue;
    }
    parts.push_back(Folded(part));
  }
  return parts;
}

std::string PathFault(std::string_view path, bool file) {
  if (path.empty()) return "empty path";
  if (path.size() > kMaxPath) return "a path longer than " + std::to_string(kMaxPath) + " characters";
  if (std::any_of(path.begin(), path.end(), [](char c) { return static_cast<unsigned char>(c) < 0x20; }))
    return "a path holding a control character or a line break";
  if (path.find_first_of("<>\"|?*") != std::string_view::npos)
    return "a path holding one of < > \" | ? *, which Windows does not allow";
  const size_t colon = path.find(':');
  if (colon != std::string_view::npos && (colon != 1 || !IsLetter(path[0]) || path.find(':', 2) != path.npos))
    return "a path holding a colon other than the drive's";
  if (file && IsSeparator(path.back())) return "a file's path ending in a backslash, which names a folder";
  size_t start = path.size() >= 2 && path[1] == ':' ? 2 : 0;
  while (start < path.size()) {
    size_t end = start;
    while (end < path.size() && !IsSeparator(path[end])) ++end;
    const std::string_view name = path.substr(start, end - start);
    if (name.size() > kMaxName) return "a name longer than " + std::to_string(kMaxName) + " characters in the path";
    if (!name.empty() && name != "." && name != ".." && (name.back() == '.' || name.back() == ' '))
      return "a name ending in a dot or a blank in the path, which Windows drops";
    if (IsDeviceName(name)) return "a device name (CON, PRN, AUX, NUL, COM1 ..., LPT1 ...) in the path";
    start = end + 1;
  }
  const std::vector<std::string> parts = FoldedPathParts(path);
  if (parts.size() <= RootParts(parts)) return "a path naming a drive or a share, not a file or folder in it";
  return {};
}

std::string PathPlan::MakeParents(const std::vector<std::string>& parts, size_t count, std::string_view path) {
  for (size_t n = RootParts(parts) + 1; n <= count; ++n) {
    auto [it, added] = places_.try_emplace(Joined(parts, n), Place{Kind::Folder, std::string(path)});
    if (!added && it->second.kind == Kind::File)
      return Quoted(it->second.spelling) + " is a file, so " + Quoted(path) + " cannot be made in it";
  }
  return {};
}

std::string PathPlan::MakeFolder(std::string_view path) {
  const std::vector<std::string> parts = FoldedPathParts(path);
  return MakeParents(parts, parts.size(), path);
}

std::string PathPlan::WriteFile(std::string_view path) {
  const std::vector<std::string> parts = FoldedPathParts(path);
  if (std::string fault = MakeParents(parts, parts.size() - 1, path); !fault.empty()) return fault;
  auto [it, added] = places_.try_emplace(Joined(parts, parts.size()), Place{Kind::File, std::string(path)});
  if (!added && it->second.kind == Kind::Folder)
    return Quoted(path) + " is a folder (made for " + Quoted(it->second.spelling) + "), not a file";
  return {};
}

std::string PathPlan::RemoveFile(std::string_view path) {
  const std::vector<std::string> parts = FoldedPathParts(path);
  auto it = places_.find(Joined(parts, parts.size()));
  if (it == places_.end()) return {};
  if (it->second.kind == Kind::Folder)
    return Quoted(path) + " is a folder (made for " + Quoted(it->second.spelling) + "); only files are deleted";
  places_.erase(it);
  return {};
}

}  // namespace kpx::sim
