// The simulator's input files are JSON written by hand. Every fault in them
// must name its line. Lines are found when a fault is reported, by walking
// the text again to the value: an index of every value's line would cost
// more memory than the parsed file itself, for answers needed once.
#pragma once

#include <cstdint>
#include <filesystem>
#include <functional>
#include <initializer_list>
#include <nlohmann/json.hpp>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace kpx::sim {

// Input files keep their members in file order.
using InputJson = nlohmann::ordered_json;

// A fault in a model or scenario file. what() is "FILE:LINE: message".
class InputError : public std::runtime_error {
 public:
  InputError(std::string file, int line, std::string message);
  const std::string& file() const { return file_; }
  int line() const { return line_; }
  const std::string& message() const { return message_; }

 private:
  std::string file_;
  int line_;
  std::string message_;
};

// One parsed JSON file, with its text for finding lines.
class JsonSource {
 public:
  // Lists and objects nest at most this deep. Deeper files are refused:
  // the values are copied and written out by recursion later.
  static constexpr size_t kMaxDepth = 512;
  // Larger files are refused rather than read into memory.
  static constexpr uintmax_t kMaxBytes = uintmax_t{1} << 30;

  // Parses `text`; a syntax error, a number out of range, nesting deeper
  // than kMaxDepth, a duplicate key or a top level that is not an object
  // raises InputError at its line. `name` is how errors name the file.
  JsonSource(std::string name, std::string text);
  // Reads and parses a file; a file that cannot be read (a folder, a
  // missing file, one larger than kMaxBytes) is an InputError at line 0.
  static JsonSource Load(const std::filesystem::path& file);

  const std::string& name() const { return name_; }
  const InputJson& root() const { return root_; }
  // The line of the value at `pointer` ("" is the whole document); 0 when unknown.
  int LineOf(const std::string& pointer) const;
  // The line of the key that names the member at `pointer`; its value's line
  // for array elements and the root.
  int KeyLineOf(const std::string& pointer) const;
  // The same for a value of this document, known by its place in memory.
  int LineOfValue(const InputJson& value) const;
  // The line of the key `key` of the object `object` of this document.
  int KeyLineOfValue(const InputJson& object, std::string_view key) const;
  // The lines of the elements of the list `list`, found in one walk.
  std::vector<int> ElementLines(const InputJson& list) const;
  // Every value in document order with its line and its key's line (the
  // value's own for list elements and the root), in one walk: for checking
  // the lines of a whole document at once.
  void ForEachLine(const std::function<void(const InputJson& value, int line, int keyLine)>& each) const;

 private:
  // Where a value lies: at each level, the place of the member or element
  // among its siblings.
  using Route = std::vector<size_t>;
  std::optional<Route> RouteOf(const std::string& pointer) const;
  std::optional<Route> RouteTo(const InputJson* value) const;
  // The line where the value at `route` starts, or with `key` its key's.
  int LineAt(const Route& route, bool key) const;
  std::string name_;
  std::string text_;
  InputJson root_;
};

// A value inside a JsonSource, for reading it with checks that name the
// right line when they fail. Small: a large file makes millions.
class Node {
 public:
  Node(const JsonSource& source, const InputJson& value) : source_(&source), value_(&value) {}
  static Node Root(const JsonSource& source) { return Node(source, source.root()); }

  const InputJson& json() const { return *value_; }
  const JsonSource& source() const { return *source_; }
  int line() const { return source_->LineOfValue(*value_); }

  [[noreturn]] void Fail(const std::string& message) const;
  // A fault of the member `key` itself (an unknown or misplaced key).
  [[noreturn]] void FailKey(std::string_view key, const std::string& message) const;

  bool IsObject() const { return value_->is_object(); }
  bool IsArray() const { return value_->is_array(); }
  bool IsString() const { return value_->is_string(); }
  bool IsNull() const { return value_->is_null(); }

  void ExpectObject(std::string_view what = "an object") const;
  void ExpectArray(std::string_view what = "a list") const;
  // Every key must be one of `allowed`: unknown keys are typos.
  void ExpectKeys(std::initializer_list<std::string_view> allowed) const;
  void ExpectKeys(const std::vector<std::string_view>& allowed) const;

  // The member `key` of an object (which must be one); Fail when missing.
  Node Member(std::string_view key) const;
  std::optional<Node> Find(std::string_view key) const;
  // Members in file order, and elements of a list.
  std::vector<std::pair<std::string, Node>> Members() const;
  std::vector<Node> Elements() const;

  std::string String() const;
  bool Bool() const;
  double Number() const;
  int64_t Integer() const;
  int32_t Int32() const;

  // Reads an optional member with a default.
  std::string StringOr(std::string_view key, std::string fallback) const;
  bool BoolOr(std::string_view key, bool fallback) const;

 private:
  const JsonSource* source_;
  const InputJson* value_;
};

}  // namespace kpx::sim
