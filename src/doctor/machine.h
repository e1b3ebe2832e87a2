// What kpxdoctor reads of a machine: its registry in each view, its files,
// and whether a COM class can really be created. On Windows it is the real
// machine; natively a kpx-sim sandbox (its registry file and drive folders).
// Paths are Windows paths; text is UTF-8.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kpx::doctor {

// A registry view: 64-bit Windows keeps the classes of 32-bit and of 64-bit
// programs apart, and a 32-bit program's HKLM\SOFTWARE is its own too.
enum class View { Bits32, Bits64 };

enum class Hive { ClassesRoot, LocalMachine, CurrentUser };

enum class PathKind { Missing, File, Folder };

struct Creation {
  enum class Outcome { Created, Failed, Unavailable };
  Outcome outcome = Outcome::Unavailable;
  std::string detail;  // why it failed or was not tried
};

class Machine {
 public:
  virtual ~Machine() = default;

  // The bitness of this program: the classes it can create in-process are
  // those registered for it.
  virtual int ProcessBits() = 0;
  // The views this machine has: the 32-bit one always (the host's), the
  // 64-bit one on 64-bit Windows.
  virtual std::vector<View> Views() = 0;

  // A REG_SZ or REG_EXPAND_SZ value as stored (nothing expanded); "" names
  // the key's default value. Nothing when the key, the value is missing or
  // of another type.
  virtual std::optional<std::string> ReadString(View view, Hive hive, std::string_view key,
                                                std::string_view name) = 0;
  // A REG_DWORD value; nothing when missing or of another type.
  virtual std::optional<uint32_t> ReadDword(View view, Hive hive, std::string_view key, std::string_view name) = 0;
  virtual bool KeyExists(View view, Hive hive, std::string_view key) = 0;
  // Writes a REG_DWORD value, creating the key when missing.
  virtual bool WriteDword(View view, Hive hive, std::string_view key, std::string_view name, uint32_t value) = 0;

  virtual PathKind Kind(std::string_view path) = 0;
  // Up to `bytes` bytes from the start of a file; "" when it cannot be read.
  virtual std::string ReadHead(std::string_view path, size_t bytes) = 0;
  // The whole file; nothing when it cannot be read.
  virtual std::optional<std::string> ReadAll(std::string_view path) = 0;
  // Whether the file can be opened for appending, as the debug logger opens
  // it. A file made only to find out is removed again.
  virtual bool CanAppend(std::string_view path) = 0;

  // Creates the class of the ProgID in this process and lets it go again.
  virtual Creation CreateInProcess(std::string_view progId) = 0;
};

}  // namespace kpx::doctor
