// kpxdoctor's view of a kpx-sim sandbox: its registry file (DIR/registry.reg)
// and its drive folders (DIR/C/...). The sandbox is a 32-bit Windows, as
// the machine the Quarn host sees: it has one registry view, and COM
// classes cannot be created in it.
#pragma once

#include <filesystem>

#include "doctor/machine.h"
#include "platform/posix/posix_platform.h"

namespace kpx::posix {

class SandboxMachine final : public doctor::Machine {
 public:
  // Raises std::runtime_error when DIR is not a folder or its registry file
  // is not REGEDIT4.
  explicit SandboxMachine(std::filesystem::path sandbox);

  int ProcessBits() override { return 32; }
  std::vector<doctor::View> Views() override { return {doctor::View::Bits32}; }
  std::optional<std::string> ReadString(doctor::View view, doctor::Hive hive, std::string_view key,
                                        std::string_view name) override;
  std::optional<uint32_t> ReadDword(doctor::View view, doctor::Hive hive, std::string_view key,
                                    std::string_view name) override;
  bool KeyExists(doctor::View view, doctor::Hive hive, std::string_view key) override;
  bool WriteDword(doctor::View view, doctor::Hive hive, std::string_view key, std::string_view name,
                  uint32_t value) override;
  doctor::PathKind Kind(std::string_view path) override;
  std::string ReadHead(std::string_view path, size_t bytes) override;
  std::optional<std::string> ReadAll(std::string_view path) override;
  bool CanAppend(std::string_view path) override;
  doctor::Creation CreateInProcess(std::string_view progId) override;

 private:
  // The full key paths a key of the hive may have in the file, in the order
  // Windows looks: HKEY_CLASSES_ROOT is the user's classes over the
  // machine's, and a file may name it directly as well.
  std::vector<std::string> Candidates(doctor::Hive hive, std::string_view key) const;
  const platform::RegistryValue* Find(doctor::Hive hive, std::string_view key, std::string_view name);

  FileRegistry registry_;
  SandboxFileSystem files_;
};

}  // namespace kpx::posix
