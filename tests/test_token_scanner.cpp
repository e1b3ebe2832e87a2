#include <gtest/gtest.h>

#include "fakes.h"
#include "shared/host_ids.h"
#include "shared/token_scanner.h"

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
