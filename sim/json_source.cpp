#include "sim/json_source.h"

#include <algorithm>
#include <fstream>
#include <functional>
#include <limits>
#include <unordered_set>

namespace kpx::sim {

InputError::InputError(std::string file, int line, std::string message)
    : std::runtime_error(file + ":" + std::to_string(line) + ": " + message),
      file_(std::move(file)),
      line_(line),
      message_(std::move(message)) {}

namespace {

// Builds the document from the parser's events. An object's members are
// gathered apart and moved into it when it closes: an ordered object
// searches its members on each insert (the square of its size), and its
// members, whose keys are const, are copied, subtrees and all, each time
// it grows. Duplicate keys are noted here instead (the first one, by where
// it lies) and reported once the whole text has parsed, so that a syntax
// error anywhere is reported first.
class DocumentBuilder {
 public:
  using number_integer_t = InputJson::number_integer_t;
  using number_unsigned_t = InputJson::number_unsigned_t;
  using number_float_t = InputJson::number_float_t;
  using string_t = InputJson::string_t;
  using binary_t = InputJson::binary_t;

  explicit DocumentBuilder(InputJson& root) : root_(root) {}

  bool null() { return Scalar(nullptr); }
  bool boolean(bool v) { return Scalar(v); }
  bool number_integer(number_integer_t v) { return Scalar(v); }
  bool number_unsigned(number_unsigned_t v) { return Scalar(v); }
  bool number_float(number_float_t v, const string_t&) { return Scalar(v); }
  bool string(string_t& v) { return Scalar(std::move(v)); }
  bool binary(binary_t& v) { return Scalar(InputJson::binary(std::move(v))); }
  bool start_object(std::size_t) { return Open(InputJson::object()); }
  bool start_array(std::size_t) { return Open(InputJson::array()); }
  bool end_object() {
    Frame& f = stack_.back();
    InputJson::object_t& members = f.value->get_ref<InputJson::object_t&>();
    members.reserve(f.members.size());
    for (auto& [key, value] : f.members) members.emplace_back(std::move(key), std::move(value));
    stack_.pop_back();
    return true;
  }
  bool end_array() {
    stack_.pop_back();
    return true;
  }

  bool key(string_t& key) {
    Frame& f = stack_.back();
    // Small objects are searched; large ones keep a set of their keys.
    constexpr size_t kSearched = 16;
    bool seen = false;
    if (f.members.size() < kSearched) {
      seen = std::any_of(f.members.begin(), f.members.end(), [&](const auto& m) { return m.first == key; });
    } else {
      if (f.keys.empty())
        for (const auto& m : f.members) f.keys.insert(m.first);
      seen = !f.keys.insert(key).second;
    }
    if (seen && !duplicate_) {
      duplicate_ = RouteHere();
      duplicate_->push_back(f.members.size());
      duplicateKey_ = key;
    }
    key_ = std::move(key);
    return true;
  }

  bool parse_error(std::size_t position, const std::string&, const nlohmann::detail::exception& e) {
    errorByte_ = position;
    errorId_ = e.id;
    errorText_ = e.what();
    return false;
  }

  bool failed() const { return errorByte_.has_value(); }
  size_t errorByte() const { return *errorByte_; }
  int errorId() const { return errorId_; }
  const std::string& errorText() const { return errorText_; }
  bool tooDeep() const { return tooDeep_; }
  // The place of the first duplicate key, and the key.
  const std::optional<std::vector<size_t>>& duplicate() const { return duplicate_; }
  const std::string& duplicateKey() const { return duplicateKey_; }

 private:
  struct Frame {
    InputJson* value;
    size_t place;                                          // among its parent's members or elements
    std::vector<std::pair<std::string, InputJson>> members;  // of an object, until it closes
    std::unordered_set<std::string> keys;
  };

  bool Scalar(InputJson&& v) {
    Put(std::move(v));
    return true;
  }

  // Stores a value where the parser is; returns where it went. A container
  // is added to only while it is innermost, so the places of the open ones
  // (kept on the stack) stay valid.
  InputJson* Put(InputJson&& v) {
    if (stack_.empty()) {
      root_ = std::move(v);
      return &root_;
    }
    Frame& parent = stack_.back();
    if (parent.value->is_array()) {
      InputJson::array_t& elements = parent.value->get_ref<InputJson::array_t&>();
      elements.push_back(std::move(v));
      return &elements.back();
    }
    parent.members.emplace_back(std::move(key_), std::move(v));
    return &parent.members.back().second;
  }

  bool Open(InputJson&& container) {
    if (stack_.size() >= JsonSource::kMaxDepth) {
      tooDeep_ = true;
      return false;
    }
    const size_t place = stack_.empty() ? 0
                         : stack_.back().value->is_array() ? stack_.back().value->size()
                                                           : stack_.back().members.size();
    InputJson* at = Put(std::move(container));
    stack_.push_back({at, place, {}, {}});
    return true;
  }

  std::vector<size_t> RouteHere() const {
    std::vector<size_t> route;
    for (size_t i = 1; i < stack_.size(); ++i) route.push_back(stack_[i].place);
    return route;
  }

  InputJson& root_;
  std::vector<Frame> stack_;
  std::string key_;
  std::optional<size_t> errorByte_;
  int errorId_ = 0;
  std::string errorText_;
  bool tooDeep_ = false;
  std::optional<std::vector<size_t>> duplicate_;
  std::string duplicateKey_;
};

// Moves through text the parser has accepted, as far as it goes. It need
// not diagnose syntax; it must only agree with the parser on structure.
// Loops, not recursion: the text may nest as deep as the parser allows.
class TextWalker {
 public:
  explicit TextWalker(const std::string& text) : t_(text) {
    if (t_.compare(0, 3, "\xEF\xBB\xBF") == 0) i_ = 3;
    SkipBlanks();
  }

  size_t at() const { return i_; }

  // From the start of an object or list to the start of its member or
  // element at `place`; for a member, `keyAt` is where its key starts.
  // False when there is no such member.
  bool Enter(size_t place, size_t* keyAt) {
    if (Peek() != '{' && Peek() != '[') return false;
    const bool object = Peek() == '{';
    ++i_;
    SkipBlanks();
    for (size_t n = 0;; ++n) {
      if (Peek() == '}' || Peek() == ']' || i_ >= t_.size()) return false;
      if (object) {
        if (n == place && keyAt) *keyAt = i_;
        SkipString();
        SkipBlanks();
        ++i_;  // ':'
        SkipBlanks();
      }
      if (n == place) return true;
      SkipValue();
      SkipBlanks();
      if (Peek() != ',') return false;
      ++i_;
      SkipBlanks();
    }
  }

  // Step by step through everything, for walking the document alongside:
  // into an object or list, past a member's key and colon, past a scalar,
  // past the comma between two, and out past the closing bracket.
  void Open() {
    ++i_;
    SkipBlanks();
  }
  size_t Key() {
    const size_t at = i_;
    SkipString();
    SkipBlanks();
    ++i_;  // ':'
    SkipBlanks();
    return at;
  }
  void Scalar() {
    SkipValue();
    SkipBlanks();
  }
  void Comma() { Open(); }
  void Close() { Open(); }

  // From the start of a list to the start of each element, one by one.
  bool FirstElement() {
    if (Peek() != '[') return false;
    ++i_;
    SkipBlanks();
    return Peek() != ']' && i_ < t_.size();
  }
  bool NextElement() {
    SkipValue();
    SkipBlanks();
    if (Peek() != ',') return false;
    ++i_;
    SkipBlanks();
    return true;
  }

 private:
  char Peek() const { return i_ < t_.size() ? t_[i_] : '\0'; }
  void SkipBlanks() {
    while (i_ < t_.size() && (t_[i_] == ' ' || t_[i_] == '\t' || t_[i_] == '\r' || t_[i_] == '\n')) ++i_;
  }
  void SkipString() {
    ++i_;
    while (i_ < t_.size() && t_[i_] != '"') i_ += t_[i_] == '\\' ? 2 : 1;
    ++i_;
  }
  void SkipValue() {
    size_t depth = 0;
    do {
      const char c = Peek();
      if (c == '"') {
        SkipString();
      } else if (c == '{' || c == '[') {
        ++depth;
        ++i_;
      } else if (c == '}' || c == ']') {
        --depth;
        ++i_;
      } else if (depth > 0) {
        ++i_;
      } else {
        while (i_ < t_.size() && std::string_view(",]} \t\r\n").find(t_[i_]) == std::string_view::npos) ++i_;
      }
    } while (depth > 0 && i_ < t_.size());
  }

  const std::string& t_;
  size_t i_ = 0;
};

// Counts lines up to positions that only move forward.
class LineCounter {
 public:
  explicit LineCounter(const std::string& text) : t_(text) {}
  int At(size_t byte) {
    byte = std::min(byte, t_.size());
    line_ += static_cast<int>(std::count(t_.begin() + static_cast<std::ptrdiff_t>(at_),
                                         t_.begin() + static_cast<std::ptrdiff_t>(byte), '\n'));
    at_ = byte;
    return line_;
  }

 private:
  const std::string& t_;
  size_t at_ = 0;
  int line_ = 1;
};

int LineAtByte(const std::string& text, size_t byte) {
  // nlohmann counts bytes from 1 and may point one past the end.
  size_t end = std::min(byte > 0 ? byte - 1 : 0, text.size());
  if (end == text.size() && end > 0 && text[end - 1] == '\n') --end;  // an error at the end belongs to the last line
  return LineCounter(text).At(end);
}

// The line where lists and objects first nest deeper than `limit`, in text
// the parser accepted up to there.
int LineTooDeep(const std::string& text, size_t limit) {
  size_t depth = 0;
  for (size_t i = 0; i < text.size(); ++i) {
    const char c = text[i];
    if (c == '"') {
      for (++i; i < text.size() && text[i] != '"';) i += text[i] == '\\' ? 2 : 1;
    } else if (c == '{' || c == '[') {
      if (++depth > limit) return LineCounter(text).At(i);
    } else if (c == '}' || c == ']') {
      --depth;
    }
  }
  return LineCounter(text).At(text.size());
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

// nlohmann's id for a number too large for a double.
constexpr int kNumberOverflow = 406;

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
  DocumentBuilder builder(root_);
  InputJson::sax_parse(text_, &builder);
  if (builder.failed()) {
    std::string message = ParseErrorText(builder.errorText());
    if (builder.errorId() == kNumberOverflow) {
      const size_t quote = builder.errorText().find('\'');
      message = "the number " + builder.errorText().substr(quote + 1, builder.errorText().size() - quote - 2) +
                " is out of range";
    }
    throw InputError(name_, LineAtByte(text_, builder.errorByte()), message);
  }
  if (builder.tooDeep())
    throw InputError(name_, LineTooDeep(text_, kMaxDepth),
                     "lists and objects nest deeper than " + std::to_string(kMaxDepth) + " levels");
  if (builder.duplicate()) {
    TextWalker walker(text_);
    const std::vector<size_t>& route = *builder.duplicate();
    size_t keyAt = 0;
    for (size_t place : route) walker.Enter(place, &keyAt);
    throw InputError(name_, LineCounter(text_).At(keyAt), "duplicate key \"" + builder.duplicateKey() + "\"");
  }
  if (!root_.is_object()) throw InputError(name_, LineOf(""), "the file must hold one JSON object");
}

JsonSource JsonSource::Load(const std::filesystem::path& file) {
  std::error_code ec;
  const std::filesystem::file_status status = std::filesystem::status(file, ec);
  if (std::filesystem::is_directory(status)) throw InputError(file.string(), 0, "a folder, not a file");
  if (status.type() == std::filesystem::file_type::not_found) throw InputError(file.string(), 0, "no such file");
  if (!ec && std::filesystem::is_regular_file(status) && std::filesystem::file_size(file, ec) > kMaxBytes)
    throw InputError(file.string(), 0, "larger than " + std::to_string(kMaxBytes >> 20) + " MiB");
  std::ifstream in(file, std::ios::binary);
  if (!in) throw InputError(file.string(), 0, "cannot read the file");
  // Read in pieces up to the limit: a pipe or a device tells no size.
  std::string text;
  std::vector<char> piece(1 << 16);
  while (in) {
    in.read(piece.data(), static_cast<std::streamsize>(piece.size()));
    text.append(piece.data(), static_cast<size_t>(in.gcount()));
    if (text.size() > kMaxBytes)
      throw InputError(file.string(), 0, "larger than " + std::to_string(kMaxBytes >> 20) + " MiB");
  }
  if (in.bad()) throw InputError(file.string(), 0, "cannot read the file");
  return JsonSource(file.string(), std::move(text));
}

std::optional<JsonSource::Route> JsonSource::RouteOf(const std::string& pointer) const {
  Route route;
  const InputJson* at = &root_;
  size_t i = 0;
  while (i < pointer.size()) {
    if (pointer[i] != '/') return std::nullopt;
    const size_t end = std::min(pointer.find('/', i + 1), pointer.size());
    std::string token;
    for (size_t k = i + 1; k < end; ++k) {
      if (pointer[k] == '~' && k + 1 < end && (pointer[k + 1] == '0' || pointer[k + 1] == '1')) {
        token += pointer[++k] == '0' ? '~' : '/';
      } else {
        token += pointer[k];
      }
    }
    i = end;
    if (at->is_object()) {
      const InputJson::object_t& members = at->get_ref<const InputJson::object_t&>();
      auto it = std::find_if(members.begin(), members.end(), [&](const auto& m) { return m.first == token; });
      if (it == members.end()) return std::nullopt;
      route.push_back(static_cast<size_t>(it - members.begin()));
      at = &it->second;
    } else if (at->is_array()) {
      if (token.empty() || token.size() > 18 ||
          !std::all_of(token.begin(), token.end(), [](char c) { return c >= '0' && c <= '9'; }))
        return std::nullopt;
      const size_t index = std::stoull(token);
      if (index >= at->size()) return std::nullopt;
      route.push_back(index);
      at = &(*at)[index];
    } else {
      return std::nullopt;
    }
  }
  return route;
}

std::optional<JsonSource::Route> JsonSource::RouteTo(const InputJson* value) const {
  if (value == &root_) return Route{};
  struct Level {
    const InputJson* value;
    size_t next;  // the child to look at next
  };
  std::vector<Level> stack{{&root_, 0}};
  while (!stack.empty()) {
    Level& top = stack.back();
    const InputJson& v = *top.value;
    const size_t count = v.is_object() || v.is_array() ? v.size() : 0;
    if (top.next >= count) {
      stack.pop_back();
      continue;
    }
    const size_t i = top.next++;
    const InputJson* child = v.is_object() ? &(v.get_ref<const InputJson::object_t&>().begin() + static_cast<std::ptrdiff_t>(i))->second
                                           : &v.get_ref<const InputJson::array_t&>()[i];
    if (child == value) {
      Route route;
      for (const Level& level : stack) route.push_back(level.next - 1);
      return route;
    }
    if (child->is_object() || child->is_array()) stack.push_back({child, 0});
  }
  return std::nullopt;
}

int JsonSource::LineAt(const Route& route, bool key) const {
  TextWalker walker(text_);
  size_t keyAt = std::string::npos;
  for (size_t place : route) {
    keyAt = std::string::npos;
    if (!walker.Enter(place, &keyAt)) return 0;
  }
  return LineCounter(text_).At(key && keyAt != std::string::npos ? keyAt : walker.at());
}

int JsonSource::LineOf(const std::string& pointer) const {
  std::optional<Route> route = RouteOf(pointer);
  return route ? LineAt(*route, false) : 0;
}

int JsonSource::KeyLineOf(const std::string& pointer) const {
  std::optional<Route> route = RouteOf(pointer);
  return route ? LineAt(*route, true) : 0;
}

int JsonSource::LineOfValue(const InputJson& value) const {
  std::optional<Route> route = RouteTo(&value);
  return route ? LineAt(*route, false) : 0;
}

int JsonSource::KeyLineOfValue(const InputJson& object, std::string_view key) const {
  std::optional<Route> route = RouteTo(&object);
  if (!route || !object.is_object()) return 0;
  const InputJson::object_t& members = object.get_ref<const InputJson::object_t&>();
  auto it = std::find_if(members.begin(), members.end(), [&](const auto& m) { return m.first == key; });
  if (it == members.end()) return LineAt(*route, false);
  route->push_back(static_cast<size_t>(it - members.begin()));
  return LineAt(*route, true);
}

void JsonSource::ForEachLine(const std::function<void(const InputJson&, int, int)>& each) const {
  struct Level {
    const InputJson* value;
    size_t next;
  };
  TextWalker walker(text_);
  LineCounter counter(text_);
  const int rootLine = counter.At(walker.at());
  each(root_, rootLine, rootLine);
  std::vector<Level> stack;
  auto enter = [&](const InputJson& v) {
    if (v.is_object() || v.is_array()) {
      walker.Open();
      stack.push_back({&v, 0});
    } else {
      walker.Scalar();
    }
  };
  enter(root_);
  while (!stack.empty()) {
    Level& top = stack.back();
    const InputJson& v = *top.value;
    if (top.next == v.size()) {
      walker.Close();
      stack.pop_back();
      continue;
    }
    if (top.next > 0) walker.Comma();
    const size_t i = top.next++;
    int keyLine = 0;
    const InputJson* child = nullptr;
    if (v.is_object()) {
      keyLine = counter.At(walker.Key());
      child = &(v.get_ref<const InputJson::object_t&>().begin() + static_cast<std::ptrdiff_t>(i))->second;
    } else {
      child = &v.get_ref<const InputJson::array_t&>()[i];
    }
    const int line = counter.At(walker.at());
    each(*child, line, v.is_object() ? keyLine : line);
    enter(*child);  // may make `top` dangle
  }
}

std::vector<int> JsonSource::ElementLines(const InputJson& list) const {
  std::vector<int> lines;
  std::optional<Route> route = RouteTo(&list);
  if (!route) return lines;
  TextWalker walker(text_);
  for (size_t place : *route)
    if (!walker.Enter(place, nullptr)) return lines;
  LineCounter counter(text_);
  for (bool more = walker.FirstElement(); more; more = walker.NextElement()) lines.push_back(counter.At(walker.at()));
  return lines;
}

// ------------------------------------------------------------------- Node

void Node::Fail(const std::string& message) const { throw InputError(source_->name(), line(), message); }

void Node::FailKey(std::string_view key, const std::string& message) const {
  throw InputError(source_->name(), source_->KeyLineOfValue(*value_, key), message);
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
  for (const auto& [name, value] : value_->get_ref<const InputJson::object_t&>())
    if (name == key) return Node(*source_, value);
  return std::nullopt;
}

std::vector<std::pair<std::string, Node>> Node::Members() const {
  ExpectObject();
  std::vector<std::pair<std::string, Node>> out;
  for (auto it = value_->begin(); it != value_->end(); ++it)
    out.emplace_back(it.key(), Node(*source_, it.value()));
  return out;
}

std::vector<Node> Node::Elements() const {
  ExpectArray();
  std::vector<Node> out;
  out.reserve(value_->size());
  for (const InputJson& element : *value_) out.emplace_back(*source_, element);
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
