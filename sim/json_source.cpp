#include "sim/json_source.h"

#include <algorithm>
#include <fstream>
#include <limits>
#include <set>
#include <sstream>

namespace kpx::sim {

InputError::InputError(std::string file, int line, std::string message)
    : std::runtime_error(file + ":" + std::to_string(line) + ": " + message),
      file_(std::move(file)),
      line_(line),
      message_(std::move(message)) {}

std::string PointerAppend(const std::string& pointer, std::string_view token) {
  std::string out = pointer;
  out += '/';
  for (char c : token) {
    if (c == '~')
      out += "~0";
    else if (c == '/')
      out += "~1";
    else
      out += c;
  }
  return out;
}

namespace {

// Walks text that nlohmann has already accepted, noting where each value and
// each key starts. It need not diagnose syntax; it must only agree with the
// parser on the structure, and catch duplicate keys, which the parser allows.
class LineScanner {
 public:
  LineScanner(const std::string& name, const std::string& text, std::map<std::string, int>& values,
              std::map<std::string, int>& keys)
      : name_(name), t_(text), values_(values), keys_(keys) {
    if (t_.compare(0, 3, "\xEF\xBB\xBF") == 0) i_ = 3;
  }

  void Value(const std::string& pointer) {
    SkipBlanks();
    values_[pointer] = line_;
    if (i_ >= t_.size()) return;
    const char c = t_[i_];
    if (c == '{') {
      ++i_;
      std::set<std::string> seen;
      SkipBlanks();
      if (Peek() == '}') {
        ++i_;
        return;
      }
      for (;;) {
        SkipBlanks();
        const int keyLine = line_;
        const std::string key = nlohmann::json::parse(StringToken()).get<std::string>();
        const std::string child = PointerAppend(pointer, key);
        if (!seen.insert(key).second) throw InputError(name_, keyLine, "duplicate key \"" + key + "\"");
        keys_[child] = keyLine;
        SkipBlanks();
        ++i_;  // ':'
        Value(child);
        SkipBlanks();
        if (Peek() == ',') {
          ++i_;
          continue;
        }
        ++i_;  // '}'
        return;
      }
    }
    if (c == '[') {
      ++i_;
      SkipBlanks();
      if (Peek() == ']') {
        ++i_;
        return;
      }
      for (size_t index = 0;; ++index) {
        Value(pointer + "/" + std::to_string(index));
        SkipBlanks();
        if (Peek() == ',') {
          ++i_;
          continue;
        }
        ++i_;  // ']'
        return;
      }
    }
    if (c == '"') {
      StringToken();
      return;
    }
    while (i_ < t_.size() && std::string_view(",]} \t\r\n").find(t_[i_]) == std::string_view::npos) ++i_;
  }

 private:
  char Peek() const { return i_ < t_.size() ? t_[i_] : '\0'; }
  void SkipBlanks() {
    while (i_ < t_.size() && (t_[i_] == ' ' || t_[i_] == '\t' || t_[i_] == '\r' || t_[i_] == '\n')) {
      if (t_[i_] == '\n') ++line_;
      ++i_;
    }
  }
  // A string literal with its quotes; JSON strings hold no raw line breaks.
  std::string StringToken() {
    const size_t start = i_++;
    while (i_ < t_.size() && t_[i_] != '"') i_ += t_[i_] == '\\' ? 2 : 1;
    ++i_;
    return t_.substr(start, i_ - start);
  }

  const std::string& name_;
  const std::string& t_;
  std::map<std::string, int>& values_;
  std::map<std::string, int>& keys_;
  size_t i_ = 0;
  int line_ = 1;
};

int LineAtByte(const std::string& text, size_t byte) {
  // nlohmann counts bytes from 1 and may point one past the end.
  size_t end = std::min(byte > 0 ? byte - 1 : 0, text.size());
  if (end == text.size() && end > 0 && text[end - 1] == '\n') --end;  // an error at the end belongs to the last line
  return 1 + static_cast<int>(std::count(text.begin(), text.begin() + static_cast<std::ptrdiff_t>(end), '\n'));
}

// "[json.exception.parse_error.101] parse error at line 2, column 3: syntax
// error while parsing ..." -> "syntax error while parsing ...": the line is
// ours to give, in our own form.
std::string ParseErrorText(const std::string& what) {
  size_t column = what.find("column ");
  size_t colon = column == std::string::npos ? std::string::npos : what.find(": ", column);
  if (colon != std::string::npos) return what.substr(colon + 2);
  size_t bracket = what.find("] ");
  return bracket == std::string::npos ? what : what.substr(bracket + 2);
}

const char* TypeName(const InputJson& j) {
  switch (j.type()) {
    case InputJson::value_t::null:
      return "null";
    case InputJson::value_t::object:
      return "an object";
    case InputJson::value_t::array:
      return "a list";
    case InputJson::value_t::string:
      return "a string";
    case InputJson::value_t::boolean:
      return "true or false";
    case InputJson::value_t::number_integer:
    case InputJson::value_t::number_unsigned:
      return "a whole number";
    case InputJson::value_t::number_float:
      return "a number";
    default:
      return "something else";
  }
}

}  // namespace

JsonSource::JsonSource(std::string name, std::string text) : name_(std::move(name)), text_(std::move(text)) {
  try {
    root_ = InputJson::parse(text_);
  } catch (const nlohmann::json::parse_error& e) {
    throw InputError(name_, LineAtByte(text_, e.byte), ParseErrorText(e.what()));
  }
  Index();
  if (!root_.is_object()) throw InputError(name_, LineOf(""), "the file must hold one JSON object");
}

JsonSource JsonSource::Load(const std::filesystem::path& file) {
  std::ifstream in(file, std::ios::binary);
  if (!in) throw InputError(file.string(), 0, "cannot read the file");
  std::ostringstream text;
  text << in.rdbuf();
  return JsonSource(file.string(), text.str());
}

void JsonSource::Index() {
  LineScanner scanner(name_, text_, valueLines_, keyLines_);
  scanner.Value("");
}

int JsonSource::LineOf(const std::string& pointer) const {
  auto it = valueLines_.find(pointer);
  return it == valueLines_.end() ? 0 : it->second;
}

int JsonSource::KeyLineOf(const std::string& pointer) const {
  auto it = keyLines_.find(pointer);
  return it == keyLines_.end() ? LineOf(pointer) : it->second;
}

// ------------------------------------------------------------------- Node

void Node::Fail(const std::string& message) const { throw InputError(source_->name(), line(), message); }

void Node::FailKey(std::string_view key, const std::string& message) const {
  throw InputError(source_->name(), source_->KeyLineOf(PointerAppend(pointer_, key)), message);
}

void Node::ExpectObject(std::string_view what) const {
  if (!IsObject()) Fail("expected " + std::string(what) + ", found " + TypeName(*value_));
}

void Node::ExpectArray(std::string_view what) const {
  if (!IsArray()) Fail("expected " + std::string(what) + ", found " + TypeName(*value_));
}

void Node::ExpectKeys(std::initializer_list<std::string_view> allowed) const {
  ExpectKeys(std::vector<std::string_view>(allowed));
}

void Node::ExpectKeys(const std::vector<std::string_view>& allowed) const {
  ExpectObject();
  for (auto it = value_->begin(); it != value_->end(); ++it) {
    if (std::find(allowed.begin(), allowed.end(), it.key()) != allowed.end()) continue;
    std::string list;
    for (std::string_view a : allowed) list += (list.empty() ? "" : ", ") + std::string(a);
    FailKey(it.key(), "unknown key \"" + it.key() + "\" (expected " + (list.empty() ? "none" : list) + ")");
  }
}

Node Node::Member(std::string_view key) const {
  std::optional<Node> n = Find(key);
  if (!n) Fail("missing \"" + std::string(key) + "\"");
  return *n;
}

std::optional<Node> Node::Find(std::string_view key) const {
  ExpectObject();
  auto it = value_->find(std::string(key));
  if (it == value_->end()) return std::nullopt;
  return Node(*source_, *it, PointerAppend(pointer_, key));
}

std::vector<std::pair<std::string, Node>> Node::Members() const {
  ExpectObject();
  std::vector<std::pair<std::string, Node>> out;
  for (auto it = value_->begin(); it != value_->end(); ++it)
    out.emplace_back(it.key(), Node(*source_, it.value(), PointerAppend(pointer_, it.key())));
  return out;
}

std::vector<Node> Node::Elements() const {
  ExpectArray();
  std::vector<Node> out;
  for (size_t i = 0; i < value_->size(); ++i)
    out.emplace_back(*source_, (*value_)[i], pointer_ + "/" + std::to_string(i));
  return out;
}

std::string Node::String() const {
  if (!IsString()) Fail(std::string("expected a string, found ") + TypeName(*value_));
  return value_->get<std::string>();
}

bool Node::Bool() const {
  if (!value_->is_boolean()) Fail(std::string("expected true or false, found ") + TypeName(*value_));
  return value_->get<bool>();
}

double Node::Number() const {
  if (!value_->is_number()) Fail(std::string("expected a number, found ") + TypeName(*value_));
  return value_->get<double>();
}

int64_t Node::Integer() const {
  if (value_->is_number_unsigned()) {
    uint64_t u = value_->get<uint64_t>();
    if (u > static_cast<uint64_t>(std::numeric_limits<int64_t>::max())) Fail("number too large");
    return static_cast<int64_t>(u);
  }
  if (!value_->is_number_integer()) Fail(std::string("expected a whole number, found ") + TypeName(*value_));
  return value_->get<int64_t>();
}

int32_t Node::Int32() const {
  int64_t v = Integer();
  if (v < std::numeric_limits<int32_t>::min() || v > std::numeric_limits<int32_t>::max())
    Fail("number out of the 32-bit range");
  return static_cast<int32_t>(v);
}

std::string Node::StringOr(std::string_view key, std::string fallback) const {
  std::optional<Node> n = Find(key);
  return n ? n->String() : std::move(fallback);
}

bool Node::BoolOr(std::string_view key, bool fallback) const {
  std::optional<Node> n = Find(key);
  return n ? n->Bool() : fallback;
}

}  // namespace kpx::sim
