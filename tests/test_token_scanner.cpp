#include <gtest/gtest.h>

#include <chrono>
#include <random>

#include "automation/dictionary.h"
#include "fakes.h"
#include "shared/host_ids.h"
#include "shared/token_scanner.h"
#include "shared/token_scanner_object.h"

namespace kpx {
namespace {

std::vector<std::string> Tokens(std::string_view text, std::string_view delimiters) {
  TokenScanner s;
  s.Init(text, delimiters);
  std::vector<std::string> out;
  for (std::string t = s.NextToken(); !t.empty(); t = s.NextToken()) out.push_back(t);
  return out;
}

using V = std::vector<std::string>;

TEST(TokenScanner, SkipsEmptyTokensAndLeadingOrTrailingDelimiters) {
  EXPECT_EQ(Tokens("a,,b", "|,"), (V{"a", "b"}));
  EXPECT_EQ(Tokens(",a", "|,"), (V{"a"}));
  EXPECT_EQ(Tokens("a,", "|,"), (V{"a"}));
  EXPECT_EQ(Tokens(",,,", "|,"), V{});
  EXPECT_EQ(Tokens("", "|,"), V{});
  EXPECT_EQ(Tokens("abc", "|,"), (V{"abc"}));
  EXPECT_EQ(Tokens("x", "|,"), (V{"x"}));
}

TEST(TokenScanner, DelimiterListSyntax) {
  EXPECT_EQ(Tokens("ATLObject, coclass;x y", "|,|;| |"), (V{"ATLObject", "coclass", "x", "y"}));
  EXPECT_EQ(Tokens("coclass|atlobject", "|,|;| |"), (V{"coclass|atlobject"}));
  // The separator doubled makes it a delimiter as well.
  EXPECT_EQ(Tokens("x|y,z", "|,||"), (V{"x", "y", "z"}));
  // Any character can separate the list; pieces are added once.
  EXPECT_EQ(Tokens("a;b,c", "/;/,/;"), (V{"a", "b", "c"}));

  TokenScanner s;
  EXPECT_TRUE(s.Init("a,b", "|,"));
  EXPECT_EQ(s.Delimitors(), V{","});
  EXPECT_FALSE(s.Init("a;b", ""));  // keeps the old delimiters
  EXPECT_EQ(s.ScanString(), "a;b");
  EXPECT_EQ(s.Delimitors(), V{","});
  EXPECT_EQ(s.NextToken(), "a;b");
}

TEST(TokenScanner, LongDelimitersOnlySkipWholeTokensEqualToThem) {
  TokenScanner s;
  s.Init("ab,cd,ab", "|,|ab");
  EXPECT_EQ(s.Delimitors(), (V{",", "ab"}));
  EXPECT_EQ(s.NextToken(), "cd");
  EXPECT_EQ(s.NextToken(), "");
  EXPECT_EQ(Tokens("xaby", "|ab"), (V{"xaby"}));
}

TEST(TokenScanner, AMillionDelimitersIsOneCallNotARecursion) {
  std::string text(1'000'000, ',');
  text += "end";
  EXPECT_EQ(Tokens(text, "|,"), (V{"end"}));
  std::string tokens;
  for (int i = 0; i < 200'000; ++i) tokens += "d,";  // each token is itself a delimiter
  EXPECT_EQ(Tokens(tokens, "|,|d"), V{});
}

TEST(TokenScanner, ReplaceCurrentTokenKeepsDelimitersAndScanningGoesOn) {
  TokenScanner s;
  s.Init("a,b,c", "|,");
  EXPECT_FALSE(s.ReplaceCurrentToken("nothing read yet"));
  EXPECT_EQ(s.NextToken(), "a");
  EXPECT_EQ(s.NextToken(), "b");
  EXPECT_TRUE(s.ReplaceCurrentToken("xx"));
  EXPECT_EQ(s.ScanString(), "a,xx,c");
  EXPECT_EQ(s.CurrentToken(), "b");
  EXPECT_EQ(s.NextToken(), "c");
  EXPECT_TRUE(s.ReplaceCurrentToken(""));  // shrinking at the end
  EXPECT_EQ(s.ScanString(), "a,xx,");
  EXPECT_EQ(s.NextToken(), "");
  EXPECT_FALSE(s.ReplaceCurrentToken("y"));

  s.Init(",,first", "|,");
  EXPECT_EQ(s.NextToken(), "first");
  s.ReplaceCurrentToken("1");
  EXPECT_EQ(s.ScanString(), ",,1");
}

// The plain way of replacing a token: rebuild the whole text. The scanner
// must give the same texts, positions and tokens without the rebuild.
struct ReferenceScanner {
  std::string text, token;
  int32_t position = 0, start = 0;
  std::string Next(const std::string& delimiters) {
    for (;;) {
      token.clear();
      start = position;
      do ++position;
      while (position <= static_cast<int32_t>(text.size()) &&
             delimiters.find(text[static_cast<size_t>(position - 1)]) == std::string::npos);
      if (position - start > 1) {
        token = text.substr(static_cast<size_t>(start), static_cast<size_t>(position - start - 1));
        return token;
      }
      if (position >= static_cast<int32_t>(text.size())) return token;
    }
  }
  bool Replace(const std::string& with) {
    if (token.empty()) return false;
    const int32_t old = static_cast<int32_t>(text.size());
    std::string tail = position <= old ? text.substr(static_cast<size_t>(position - 1)) : "";
    text = text.substr(0, static_cast<size_t>(start)) + with + tail;
    position += static_cast<int32_t>(text.size()) - old;
    return true;
  }
};

TEST(TokenScanner, ReplacingAgreesWithRebuildingTheTextUnderAnyMixOfCalls) {
  std::mt19937 random(7);
  const std::string alphabet = "ab,;";
  for (int round = 0; round < 300; ++round) {
    std::string text;
    for (int i = static_cast<int>(random() % 30); i > 0; --i) text += alphabet[random() % alphabet.size()];
    TokenScanner s;
    s.Init(text, "|,|;");
    ReferenceScanner r;
    r.text = text;
    for (int step = 0; step < 40; ++step) {
      switch (random() % 5) {
        case 0:
        case 1:
          ASSERT_EQ(s.NextToken(), r.Next(",;"));
          break;
        case 2:
        case 3: {  // the same token may be replaced again
          const std::string with(random() % 4, "xy,"[random() % 3]);
          ASSERT_EQ(s.ReplaceCurrentToken(with), r.Replace(with));
          break;
        }
        default:  // reading the text between replacements
          ASSERT_EQ(s.ScanString(), r.text);
      }
      ASSERT_EQ(s.CurrentToken(), r.token);
    }
    ASSERT_EQ(s.ScanString(), r.text) << "round " << round;
  }
}

TEST(TokenScanner, ReplacingEveryTokenOfAMegabyteTakesOnePass) {
  std::string text;
  for (int i = 0; i < 250'000; ++i) text += "abc,";
  const auto begun = std::chrono::steady_clock::now();
  TokenScanner s;
  s.Init(text, "|,");
  size_t tokens = 0;
  for (std::string t = s.NextToken(); !t.empty(); t = s.NextToken(), ++tokens) s.ReplaceCurrentToken("z");
  const std::string& result = s.ScanString();
  const double seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - begun).count();
  EXPECT_EQ(tokens, 250'000u);
  ASSERT_EQ(result.size(), 500'000u);
  EXPECT_EQ(result.substr(0, 6), "z,z,z,");
  EXPECT_EQ(result.find_first_not_of("z,"), std::string::npos);
  // Rebuilding the text per replacement takes minutes here; one pass, a second.
  EXPECT_LT(seconds, 60.0);
}

TEST(TokenScannerObject, DelimitersAreADictionaryTheCallerMayChangeOrReplace) {
  test::World world;
  TokenScannerObject scanner(world.factory);
  auto call = [&](const char* member, std::initializer_list<Variant> args, CallKind kind = CallKind::Method) {
    std::vector<Variant> list(args);
    return scanner.Invoke(scanner.IdOfName(member), kind, list);
  };
  EXPECT_TRUE(call("Delimitors", {}, CallKind::PropertyGet).isNothing());  // none before Init

  call("Init", {Variant("a;b,c"), Variant("|,")});
  ObjectPtr own = call("Delimitors", {}, CallKind::PropertyGet).toObject();
  ASSERT_TRUE(own);
  EXPECT_EQ(CallByName(own, "Count", CallKind::PropertyGet).toInt32(), 1);
  EXPECT_EQ(call("Delimitors", {}, CallKind::PropertyGet).toObject(), own);  // the same one each time
  CallByName(own, "Add", CallKind::Method, {Variant(";"), Variant("")});
  EXPECT_EQ(call("NextToken", {}).toString(), "a");  // the change counts at once
  EXPECT_EQ(call("NextToken", {}).toString(), "b");

  // A dictionary of the caller's: keys compare as written.
  auto given = std::make_shared<Dictionary>();
  CallByName(given, "Add", CallKind::Method, {Variant("X"), Variant("")});
  call("Delimitors", {Variant(ObjectPtr(given))}, CallKind::PropertyPutRef);
  call("ScanString", {Variant("1234qxrXs")}, CallKind::PropertyPut);
  EXPECT_EQ(call("NextToken", {}).toString(), "qxr");  // goes on from where it was

  // Anything else is refused and the set stays as it was.
  auto stranger = std::make_shared<test::FakeObject>("stranger", nullptr);
  try {
    call("Delimitors", {Variant(ObjectPtr(stranger))}, CallKind::PropertyPutRef);
    ADD_FAILURE() << "a non-dictionary was taken";
  } catch (const AutomationError& e) {
    EXPECT_EQ(e.number(), vberr::kTypeMismatch);
  }
  EXPECT_EQ(call("Delimitors", {}, CallKind::PropertyGet).toObject(), ObjectPtr(given));

  // Init makes a set of its own again: the old dictionary no longer counts.
  call("Init", {Variant("aXb,c"), Variant("|,")});
  CallByName(given, "Add", CallKind::Method, {Variant(","), Variant("")});
  CallByName(given, "Remove", CallKind::Method, {Variant(",")});
  EXPECT_EQ(call("NextToken", {}).toString(), "aXb");
  EXPECT_NE(call("Delimitors", {}, CallKind::PropertyGet).toObject(), ObjectPtr(given));

  // Nothing leaves no delimiters at all.
  call("Delimitors", {Variant::Nothing()}, CallKind::PropertyPutRef);
  call("ScanString", {Variant("u,v")}, CallKind::PropertyPut);
  EXPECT_TRUE(call("Delimitors", {}, CallKind::PropertyGet).isNothing());
}

TEST(HasStereotype, MatchesWholeTokensIgnoringCase) {
  auto element = std::make_shared<test::FakeObject>("e", nullptr);
  std::string stereotype;
  element->On(hostid::kStereotype, "Stereotype", [&](std::span<Variant>) -> Variant { return stereotype; });

  stereotype = "ATLObject, coclass";
  EXPECT_TRUE(HasStereotype("atlobject", element));
  EXPECT_TRUE(HasStereotype("CoClass", element));
  EXPECT_FALSE(HasStereotype("interface", element));
  stereotype = "coclass|atlobject";
  EXPECT_FALSE(HasStereotype("coclass", element));
  stereotype = "";
  EXPECT_FALSE(HasStereotype("", element));
  stereotype = "  interface ;";
  EXPECT_TRUE(HasStereotype("INTERFACE", element));
  EXPECT_THROW(HasStereotype("x", nullptr), AutomationError);  // host failures go to the caller
}

}  // namespace
}  // namespace kpx
