// A tiny check framework for the Windows test host (Debian has no GoogleTest
// for mingw-w64). Checks are grouped; a failed check prints where and why,
// and the run ends with a summary line and a non-zero exit on failure.
#pragma once

#include <cstdio>
#include <sstream>
#include <string>

namespace wintest {

struct Tally {
  int checks = 0;
  int failed = 0;
  std::string group;
};

Tally& tally();

inline void Group(const char* name) {
  tally().group = name;
  std::printf("[ group ] %s\n", name);
  std::fflush(stdout);
}

inline bool Report(bool ok, const char* file, int line, const std::string& what) {
  Tally& t = tally();
  ++t.checks;
  if (!ok) {
    ++t.failed;
    std::printf("[FAILED ] %s: %s:%d: %s\n", t.group.c_str(), file, line, what.c_str());
    std::fflush(stdout);
  }
  return ok;
}

template <class A, class B>
bool ReportEqual(const A& a, const B& b, const char* file, int line, const char* as, const char* bs) {
  if (a == b) return Report(true, file, line, {});
  std::ostringstream out;
  out << as << " == " << bs << " (got " << a << ", expected " << b << ")";
  return Report(false, file, line, out.str());
}

}  // namespace wintest

#define CHECK(cond) ::wintest::Report(static_cast<bool>(cond), __FILE__, __LINE__, #cond)
#define CHECK_EQ(a, b) ::wintest::ReportEqual((a), (b), __FILE__, __LINE__, #a, #b)
#define CHECK_HR(expr, expected) ::wintest::ReportEqual(::wintest::Hex(expr), ::wintest::Hex(expected), __FILE__, __LINE__, #expr, #expected)

namespace wintest {
// HRESULTs print in hex.
struct Hex {
  explicit Hex(long v) : value(static_cast<unsigned long>(v)) {}
  unsigned long value;
  bool operator==(const Hex& o) const { return value == o.value; }
};
inline std::ostream& operator<<(std::ostream& out, const Hex& h) {
  char buf[16];
  std::snprintf(buf, sizeof buf, "0x%08lX", h.value);
  return out << buf;
}
}  // namespace wintest
