#include <gtest/gtest.h>

#include "automation/automation_error.h"
#include "automation/error_styles.h"
#include "automation/object.h"
#include "automation/variant.h"
#include "automation/vb_strings.h"
#include "fakes.h"

namespace kpx {
namespace {

using kpx::test::ErrorNumberOf;

TEST(VariantConversion, NumbersRoundHalfToEvenAndOverflowLikeVb) {
  EXPECT_EQ(Variant(2.5).toInt32(), 2);
  EXPECT_EQ(Variant(3.5).toInt32(), 4);
  EXPECT_EQ(Variant(-2.5).toInt16(), -2);
  EXPECT_EQ(ErrorNumberOf([] { Variant(40000).toInt16(); }), vberr::kOverflow);
  EXPECT_EQ(ErrorNumberOf([] { Variant(3e9).toInt32(); }), vberr::kOverflow);
  EXPECT_EQ(Variant(true).toInt32(), -1);
}

TEST(VariantConversion, TextConvertsOnlyWhenAllOfItIsANumber) {
  EXPECT_EQ(Variant(" 42 ").toInt32(), 42);
  EXPECT_EQ(Variant("&HFF000080").toInt32(), static_cast<int32_t>(0xFF000080u));
  EXPECT_EQ(ErrorNumberOf([] { Variant("12x").toInt32(); }), vberr::kTypeMismatch);
  EXPECT_EQ(ErrorNumberOf([] { Variant("").toInt32(); }), vberr::kTypeMismatch);
  EXPECT_EQ(ErrorNumberOf([] { Variant::Null().toString(); }), vberr::kInvalidUseOfNull);
  EXPECT_EQ(ErrorNumberOf([] { Variant(5).toObject(); }), vberr::kObjectRequired);
}

TEST(VariantConversion, TextBeyondTheRangeOverflowsAndCsNumberFormsAreNotNumbers) {
  EXPECT_EQ(ErrorNumberOf([] { Variant("1e400").toDouble(); }), vberr::kOverflow);
  EXPECT_EQ(ErrorNumberOf([] { Variant("-1.8E+308").toInt32(); }), vberr::kOverflow);
  EXPECT_EQ(ErrorNumberOf([] { Variant("&H100000000").toInt32(); }), vberr::kOverflow);
  EXPECT_EQ(Variant("1e-400").toDouble(), 0);  // too small to hold is 0, not an error
  for (const char* text : {"inf", "-Infinity", "nan", "0x1A", "0x1p4", "&H+1", "&H-1", "&H 1", "&H0x1", "1e", "."})
    EXPECT_EQ(ErrorNumberOf([&] { Variant(text).toDouble(); }), vberr::kTypeMismatch) << text;
  EXPECT_EQ(ErrorNumberOf([] { Variant("nan").toInt32(); }), vberr::kTypeMismatch);
  EXPECT_EQ(Variant("\t-.5E1 ").toDouble(), -5);
}

TEST(VariantConversion, EmptyReadsAsZeroBlankAndFalse) {
  Variant empty;
  EXPECT_EQ(empty.toInt32(), 0);
  EXPECT_EQ(empty.toString(), "");
  EXPECT_FALSE(empty.toBool());
  EXPECT_TRUE(EqualsBool(empty, false));
  EXPECT_FALSE(EqualsBool(empty, true));
  EXPECT_TRUE(EqualsBool(Variant(int16_t{-1}), true));
  EXPECT_FALSE(EqualsBool(Variant(1), true));  // only -1 is True
  EXPECT_EQ(Variant(true).toString(), "True");
}

TEST(VariantConversion, ReferencesReadAndWriteTheCallersVariant) {
  Variant target(1);
  Variant ref = Variant::Ref(&target);
  EXPECT_TRUE(ref.isByRef());
  EXPECT_EQ(ref.valueType(), VarType::Long);
  ref.assign(Variant("x"));
  EXPECT_EQ(target.toString(), "x");
}

TEST(VbStrings, TrimStripsBlanksOnly) {
  EXPECT_EQ(Trim("  a b  "), "a b");
  EXPECT_EQ(Trim("\ta\t"), "\ta\t");
  EXPECT_EQ(Trim("   "), "");
}

TEST(VbStrings, PositionsAreOneBasedAndClamped) {
  EXPECT_EQ(InStr("abcabc", "c"), 3u);
  EXPECT_EQ(InStr(4, "abcabc", "c"), 6u);
  EXPECT_EQ(InStr("abc", "x"), 0u);
  EXPECT_EQ(InStrRev("a\\b\\c", "\\"), 4u);
  EXPECT_EQ(Mid("abcdef", 2, 3), "bcd");
  EXPECT_EQ(Mid("abc", 3), "c");
  EXPECT_EQ(Mid("abc", 9), "");
  EXPECT_EQ(Left("abc", 9), "abc");
  EXPECT_EQ(Right("abc", 2), "bc");
  EXPECT_TRUE(EqualsNoCase("ATLObject", "atlobject"));
  EXPECT_FALSE(EqualsNoCase("atl", "atlobject"));
}

TEST(VbStrings, ValReadsTheLeadingNumber) {
  EXPECT_EQ(Val(" 12 34abc"), 1234);
  EXPECT_EQ(Val("-1.5e2x"), -150);
  EXPECT_EQ(Val("abc"), 0);
  EXPECT_EQ(Val("&H10"), 16);
  EXPECT_EQ(Val("1e"), 1);
  EXPECT_EQ(Val("1e-400x"), 0);
  EXPECT_EQ(ErrorNumberOf([] { Val("1e400"); }), vberr::kOverflow);
}

TEST(VbStrings, SinglePrecisionTextHasSevenSignificantDigits) {
  EXPECT_EQ(FormatSingle(11232.5f), "11232.5");
  EXPECT_EQ(FormatSingle(86399.99f), "86399.99");
  EXPECT_EQ(FormatSingle(0.0f), "0");
}

TEST(LateBinding, ByReferenceArgumentsComeBackAndNothingRaises91) {
  auto obj = std::make_shared<test::FakeObject>("o", nullptr);
  obj->On(7, "Swap", [](std::span<Variant> a) -> Variant {
    a[0].assign(Variant("replaced"));
    return Variant();
  });
  Variant slot("original");
  CallMethod(obj, 7, {Variant::Ref(&slot)});
  EXPECT_EQ(slot.toString(), "replaced");
  CallByName(obj, "SWAP", CallKind::Method, {Variant::Ref(&slot)});

  EXPECT_EQ(ErrorNumberOf([] { CallMethod(nullptr, 1); }), vberr::kObjectNotSet);
  EXPECT_EQ(ErrorNumberOf([&] { CallByName(obj, "Missing", CallKind::Method); }), vberr::kNoSuchMember);
  EXPECT_EQ(ErrorNumberOf([&] { CallOwnOperation(obj, 3, CallKind::Method); }), vberr::kNoSuchMember);
}

TEST(ErrorStyles, ResumeNextKeepsTheLastFailureAndCarriesOn) {
  ResumeNext onError;
  int ran = 0;
  EXPECT_FALSE(onError([] { throw AutomationError(5); }));
  EXPECT_TRUE(onError([&] { ++ran; }));
  EXPECT_EQ(onError.number(), 5);  // a later success does not clear it
  EXPECT_EQ(onError.description(), "Invalid procedure call or argument");
  EXPECT_FALSE(onError([] { throw std::runtime_error("boom"); }));
  EXPECT_EQ(onError.number(), vberr::kInternal);
  onError.Clear();
  EXPECT_FALSE(onError.failed());
  EXPECT_EQ(ran, 1);

  int handled = CatchAll([]() -> int { throw AutomationError(438); }, [](const AutomationError& e) { return e.number(); });
  EXPECT_EQ(handled, 438);
}

}  // namespace
}  // namespace kpx
