// The type library the Windows build registers must describe the API member
// table exactly: the host binds by DISPID, and tools bind by the names and
// argument lists. This reads src/com/api.idl and holds it against
// ApiMembers().
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <regex>
#include <sstream>
#include <string>
#include <vector>

#include "addin/api_members.h"

namespace kpx {
namespace {

struct IdlParam {
  std::string attributes;  // inside the brackets, e.g. "in, out, optional"
  std::string type;        // "IDispatch**", "VARIANT*", "short" ...
  std::string name;
};

struct IdlMember {
  int id = 0;
  bool propget = false;
  std::string result;
  std::string name;
  std::vector<IdlParam> params;
};

std::string ReadIdl() {
  const std::filesystem::path idl =
      std::filesystem::path(__FILE__).parent_path().parent_path() / "src" / "com" / "api.idl";
  std::ifstream in(idl);
  std::stringstream text;
  text << in.rdbuf();
  return text.str();
}

std::string Trim(std::string s) {
  const char* blanks = " \t\r\n";
  s.erase(0, s.find_first_not_of(blanks));
  s.erase(s.find_last_not_of(blanks) + 1);
  return s;
}

// Splits an argument list at the commas outside brackets.
std::vector<std::string> SplitParams(const std::string& list) {
  std::vector<std::string> out;
  std::string current;
  int depth = 0;
  for (char c : list) {
    if (c == '[') ++depth;
    if (c == ']') --depth;
    if (c == ',' && depth == 0) {
      out.push_back(Trim(current));
      current.clear();
    } else {
      current += c;
    }
  }
  if (!Trim(current).empty()) out.push_back(Trim(current));
  return out;
}

// The methods of one dispinterface, in declaration order.
std::vector<IdlMember> ParseDispinterface(const std::string& idl, const std::string& name) {
  const size_t start = idl.find("dispinterface " + name + "\n");
  if (start == std::string::npos) return {};
  const size_t end = idl.find("};", start);
  const std::string body = idl.substr(start, end - start);
  static const std::regex method(R"(\[id\((\d+)\)(, (propget|propput|propputref))?\]\s+([\w*]+)\s+(\w+)\(([^;]*)\);)");
  std::vector<IdlMember> members;
  for (std::sregex_iterator it(body.begin(), body.end(), method), stop; it != stop; ++it) {
    IdlMember m;
    m.id = std::stoi((*it)[1]);
    m.propget = (*it)[3] == "propget";
    m.result = (*it)[4];
    m.name = (*it)[5];
    static const std::regex param(R"(\[([^\]]*)\]\s+([\w*]+)\s+(\w+))");
    for (const std::string& p : SplitParams((*it)[6])) {
      std::smatch parts;
      if (std::regex_match(p, parts, param))
        m.params.push_back({parts[1], parts[2], parts[3]});
      else
        m.params.push_back({"?", "?", p});
    }
    members.push_back(std::move(m));
  }
  return members;
}

std::string IdlType(ApiType t) {
  switch (t) {
    case ApiType::None: return "void";
    case ApiType::Object: return "IDispatch*";
    case ApiType::String: return "BSTR";
    case ApiType::Int16: return "short";
    case ApiType::Int32: return "long";
    case ApiType::Bool: return "VARIANT_BOOL";
    case ApiType::Variant: return "VARIANT";
  }
  return "?";
}

// How a parameter of the table must be declared: by reference as an
// [in, out] pointer, optional as an [optional] VARIANT.
IdlParam Expected(const ApiParam& p) {
  if (p.optional) return {p.byRef ? "in, out, optional" : "in, optional", p.byRef ? "VARIANT*" : "VARIANT", p.name};
  if (p.byRef) return {"in, out", IdlType(p.type) + "*", p.name};
  return {"in", IdlType(p.type), p.name};
}

TEST(ApiTypeLibrary, DeclaresEveryMemberInDispatchOrderWithItsKindAndResult) {
  const std::vector<IdlMember> idl = ParseDispinterface(ReadIdl(), "_API");
  std::span<const ApiMember> table = ApiMembers();
  ASSERT_EQ(idl.size(), table.size()) << "api.idl's _API and the member table differ in length";
  ASSERT_EQ(static_cast<int>(table.size()), kApiMemberCount);
  for (size_t i = 0; i < table.size(); ++i) {
    SCOPED_TRACE(table[i].name);
    EXPECT_EQ(idl[i].name, table[i].name);
    EXPECT_EQ(idl[i].id, static_cast<int>(i + 1)) << "the DISPID is the position in the table";
    EXPECT_EQ(idl[i].propget, table[i].kind == CallKind::PropertyGet);
    EXPECT_EQ(idl[i].result, IdlType(table[i].result));
  }
}

TEST(ApiTypeLibrary, ArgumentListsMatchCountsTypesReferencesAndOptionals) {
  const std::vector<IdlMember> idl = ParseDispinterface(ReadIdl(), "_API");
  std::span<const ApiMember> table = ApiMembers();
  ASSERT_EQ(idl.size(), table.size());
  for (size_t i = 0; i < table.size(); ++i) {
    SCOPED_TRACE(table[i].name);
    ASSERT_EQ(idl[i].params.size(), table[i].paramCount);
    for (size_t k = 0; k < table[i].paramCount; ++k) {
      const IdlParam want = Expected(table[i].params[k]);
      EXPECT_EQ(idl[i].params[k].name, want.name);
      EXPECT_EQ(idl[i].params[k].type, want.type);
      EXPECT_EQ(idl[i].params[k].attributes, want.attributes);
    }
  }
}

TEST(ApiTypeLibrary, TokenScannerDeclaresItsMembersOnceEachWithPropertyPairs) {
  const std::vector<IdlMember> idl = ParseDispinterface(ReadIdl(), "_TokenScanner");
  std::vector<std::pair<std::string, int>> seen;
  for (const IdlMember& m : idl) seen.emplace_back(m.name, m.id);
  // ScanString and Delimitors each have a reader and a writer under one id.
  const std::vector<std::pair<std::string, int>> expected = {
      {"Init", 1},       {"NextToken", 2},    {"ReplaceCurrentToken", 3}, {"ScanString", 4},
      {"ScanString", 4}, {"CurrentToken", 5}, {"Delimitors", 6},          {"Delimitors", 6}};
  EXPECT_EQ(seen, expected);
}

}  // namespace
}  // namespace kpx
