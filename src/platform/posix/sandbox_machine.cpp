#include "platform/posix/sandbox_machine.h"

#include <fstream>
#include <stdexcept>

namespace kpx::posix {

namespace fs = std::filesystem;

namespace {

fs::path CheckedSandbox(fs::path sandbox) {
  std::error_code ec;
  if (!fs::is_directory(sandbox, ec)) throw std::runtime_error(sandbox.string() + ": not a folder");
  return sandbox;
}

}  // namespace

SandboxMachine::SandboxMachine(fs::path sandbox)
    : registry_(CheckedSandbox(sandbox) / "registry.reg"), files_(sandbox, SandboxFileSystem::Zone::Utc) {}

std::vector<std::string> SandboxMachine::Candidates(doctor::Hive hive, std::string_view key) const {
  const std::string k(key);
  switch (hive) {
    case doctor::Hive::LocalMachine: return {"HKEY_LOCAL_MACHINE\\" + k};
    case doctor::Hive::CurrentUser: return {"HKEY_CURRENT_USER\\" + k};
    case doctor::Hive::ClassesRoot: break;
  }
  return {"HKEY_CURRENT_USER\\Software\\Classes\\" + k, "HKEY_CLASSES_ROOT\\" + k,
          "HKEY_LOCAL_MACHINE\\SOFTWARE\\Classes\\" + k};
}

const platform::RegistryValue* SandboxMachine::Find(doctor::Hive hive, std::string_view key, std::string_view name) {
  for (const std::string& full : Candidates(hive, key)) {
    auto keyIt = registry_.data().find(full);
    if (keyIt == registry_.data().end()) continue;
    auto valueIt = keyIt->second.find(std::string(name));
    if (valueIt != keyIt->second.end()) return &valueIt->second;
  }
  return nullptr;
}

std::optional<std::string> SandboxMachine::ReadString(doctor::View, doctor::Hive hive, std::string_view key,
                                                      std::string_view name) {
  const platform::RegistryValue* v = Find(hive, key, name);
  if (!v || v->type != platform::kRegSz) return std::nullopt;
  std::string text = v->data;
  if (!text.empty() && text.back() == '\0') text.pop_back();
  return text;
}

std::optional<uint32_t> SandboxMachine::ReadDword(doctor::View, doctor::Hive hive, std::string_view key,
                                                  std::string_view name) {
  const platform::RegistryValue* v = Find(hive, key, name);
  if (!v || v->type != platform::kRegDword || v->data.size() != 4) return std::nullopt;
  uint32_t value = 0;
  for (int i = 3; i >= 0; --i) value = value << 8 | static_cast<unsigned char>(v->data[i]);
  return value;
}

bool SandboxMachine::KeyExists(doctor::View, doctor::Hive hive, std::string_view key) {
  for (const std::string& full : Candidates(hive, key)) {
    // A key the file names, or one it names a subkey of.
    auto it = registry_.data().lower_bound(full);
    if (it == registry_.data().end()) continue;
    if (EqualsNoCase(it->first, full)) return true;
    const std::string prefix = full + "\\";
    if (it->first.size() > prefix.size() && EqualsNoCase(std::string_view(it->first).substr(0, prefix.size()), prefix))
      return true;
  }
  return false;
}

bool SandboxMachine::WriteDword(doctor::View, doctor::Hive hive, std::string_view key, std::string_view name,
                                uint32_t value) {
  if (hive == doctor::Hive::ClassesRoot) return false;  // the doctor writes only the debug mask
  platform::RegistryValue v{platform::kRegDword, std::string(4, '\0')};
  for (int i = 0; i < 4; ++i) v.data[i] = static_cast<char>(value >> (8 * i) & 0xFF);
  try {
    registry_.WriteOnce([&] { registry_.data()[Candidates(hive, key).front()][std::string(name)] = v; });
  } catch (const std::runtime_error&) {
    return false;
  }
  return true;
}

doctor::PathKind SandboxMachine::Kind(std::string_view path) {
  std::error_code ec;
  const fs::file_status status = fs::status(files_.HostPath(path), ec);
  if (fs::is_directory(status)) return doctor::PathKind::Folder;
  if (fs::exists(status)) return doctor::PathKind::File;
  return doctor::PathKind::Missing;
}

std::string SandboxMachine::ReadHead(std::string_view path, size_t bytes) {
  std::ifstream in(files_.HostPath(path), std::ios::binary);
  if (!in) return {};
  std::string head(bytes, '\0');
  in.read(head.data(), static_cast<std::streamsize>(bytes));
  head.resize(static_cast<size_t>(in.gcount()));
  return head;
}

std::optional<std::string> SandboxMachine::ReadAll(std::string_view path) {
  if (Kind(path) != doctor::PathKind::File) return std::nullopt;
  std::ifstream in(files_.HostPath(path), std::ios::binary);
  if (!in) return std::nullopt;
  return std::string((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
}

bool SandboxMachine::CanAppend(std::string_view path) {
  // Read-only is the owner's write bit in the sandbox, whoever runs this.
  switch (Kind(path)) {
    case doctor::PathKind::Folder: return false;
    case doctor::PathKind::File: {
      std::error_code ec;
      const fs::perms perms = fs::status(files_.HostPath(path), ec).permissions();
      return !ec && (perms & fs::perms::owner_write) != fs::perms::none;
    }
    case doctor::PathKind::Missing: break;
  }
  // The logger makes the file, never its folder.
  std::error_code ec;
  return fs::is_directory(files_.HostPath(path).parent_path(), ec);
}

doctor::Creation SandboxMachine::CreateInProcess(std::string_view) {
  return {doctor::Creation::Outcome::Unavailable,
          "COM classes are created only on Windows; the registration lines above stand for it here"};
}

}  // namespace kpx::posix
