// VB's text-to-number rules: CDbl, CSng, CLng, CInt and CBool of a string,
// and Val. A conversion gives a finite number or raises 13 (not a number) or
// 6 (too large for the type); CLng and CInt are CDbl rounded half to even;
// CSng and CBool follow CDbl; the text CStr writes for a number reads back
// through CDbl and Val alike.
#include <cfloat>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "automation/automation_error.h"
#include "automation/variant.h"
#include "automation/vb_strings.h"

namespace {

using kpx::AutomationError;
namespace vberr = kpx::vberr;

// Names the failed check before stopping, so a finding reads at once.
void Require(bool condition, int line = __builtin_LINE()) {
  if (condition) return;
  std::fprintf(stderr, "%s:%d: check failed\n", __FILE__, line);
  std::abort();
}

struct Outcome {
  bool ok = false;
  double value = 0;
  int32_t error = 0;
};

template <class Conversion>
Outcome Convert(Conversion convert) {
  try {
    return {true, static_cast<double>(convert()), 0};
  } catch (const AutomationError& e) {
    return {false, 0, e.number()};
  }
}

// A whole-number conversion of a text CDbl read as `d`.
void CheckWhole(const Outcome& d, const Outcome& whole, double lo, double hi) {
  if (!d.ok) {
    Require(!whole.ok && whole.error == d.error);
    return;
  }
  const double r = kpx::RoundHalfEven(d.value);
  if (r >= lo && r <= hi)
    Require(whole.ok && whole.value == r);
  else
    Require(!whole.ok && whole.error == vberr::kOverflow);
}

bool IsNumberError(int32_t error) { return error == vberr::kTypeMismatch || error == vberr::kOverflow; }

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string text(reinterpret_cast<const char*>(data), size);
  const kpx::Variant v(text);

  const Outcome d = Convert([&] { return v.toDouble(); });
  Require(d.ok ? std::isfinite(d.value) : IsNumberError(d.error));
  CheckWhole(d, Convert([&] { return v.toInt32(); }), -2147483648.0, 2147483647.0);
  CheckWhole(d, Convert([&] { return v.toInt16(); }), -32768.0, 32767.0);

  const Outcome f = Convert([&] { return v.toSingle(); });
  if (!d.ok)
    Require(!f.ok && f.error == d.error);
  else if (std::fabs(d.value) > FLT_MAX)
    Require(!f.ok && f.error == vberr::kOverflow);
  else
    Require(f.ok && f.value == static_cast<double>(static_cast<float>(d.value)));

  const Outcome b = Convert([&] { return v.toBool(); });
  Require(d.ok ? (b.ok && b.value == (d.value != 0 ? 1 : 0)) : (!b.ok && b.error == d.error));

  // Val reads any text; only a number too large for a Double stops it.
  const Outcome val = Convert([&] { return kpx::Val(text); });
  Require(val.ok ? std::isfinite(val.value) : val.error == vberr::kOverflow);

  // What CStr writes (15 significant digits) reads back as nearly the same
  // number, and Val reads it as CDbl does. Near the largest Double the 15
  // digits round up past it, as they do in VB.
  if (d.ok && std::fabs(d.value) < 1e308) {
    const std::string written = kpx::Variant(d.value).toString();
    const Outcome again = Convert([&] { return kpx::Variant(written).toDouble(); });
    Require(again.ok);
    if (std::fabs(d.value) >= DBL_MIN) Require(std::fabs(again.value - d.value) <= 1e-14 * std::fabs(d.value));
    const Outcome valAgain = Convert([&] { return kpx::Val(written); });
    Require(valAgain.ok && valAgain.value == again.value);
  }
  return 0;
}
