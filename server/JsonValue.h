#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace tessal::server {

// A parsed JSON value that keeps every number exactly as the sender wrote it. Money travels as JSON
// numbers with decimal fractions ("12.30"); a double would turn that into 12.3 or worse, so numbers are
// kept as their text and written back unchanged.
class JsonValue {
 public:
  enum class Type { Null, Boolean, Number, String, Array, Object };
  using Member = std::pair<std::string, JsonValue>;

  JsonValue() = default;
  static JsonValue null() { return {}; }
  static JsonValue boolean(bool value);
  // `text` must be a valid JSON number; `isInteger` marks one without fraction or exponent that fits
  // a signed 64-bit integer.
  static JsonValue number(std::string text, bool isInteger);
  static JsonValue integer(int64_t value);
  static JsonValue string(std::string text);
  static JsonValue array(std::vector<JsonValue> elements = {});
  static JsonValue object(std::vector<Member> members = {});

  Type type() const { return type_; }
  bool isNull() const { return type_ == Type::Null; }
  bool isString() const { return type_ == Type::String; }
  bool isArray() const { return type_ == Type::Array; }
  bool isObject() const { return type_ == Type::Object; }
  bool isNumber() const { return type_ == Type::Number; }
  bool boolValue() const { return boolean_; }
  // The contents of a string, or the text of a number.
  const std::string& text() const { return text_; }
  // The value of an integral number; none for anything else.
  std::optional<int64_t> integerValue() const;
  const std::vector<JsonValue>& elements() const { return elements_; }
  const std::vector<Member>& members() const { return members_; }
  // The member of an object by name; none when absent or when this is not an object.
  const JsonValue* find(std::string_view name) const;

  // Appends to an array, or a member to an object (the caller keeps names unique).
  void push(JsonValue element) { elements_.push_back(std::move(element)); }
  void insert(std::string name, JsonValue value) { members_.emplace_back(std::move(name), std::move(value)); }

  // Compact JSON text; numbers come out as they went in.
  std::string dump() const;
  void dumpTo(std::string& out) const;

  // Parses a whole JSON document. Objects may not repeat a member name, nesting is limited to
  // `maxDepth` levels and the document to `maxValues` values (containers and members count, names do
  // not): each costs about a hundred bytes however short its text, so the bound is what keeps a body of
  // tiny values from becoming gigabytes. On failure returns none and, when `error` is given, a short
  // reason.
  static std::optional<JsonValue> parse(std::string_view text, std::string* error = nullptr,
                                        int maxDepth = 16, size_t maxValues = SIZE_MAX);

 private:
  Type type_ = Type::Null;
  bool boolean_ = false;
  bool integral_ = false;
  std::string text_;
  std::vector<JsonValue> elements_;
  std::vector<Member> members_;
};

// Appends `text` as a quoted JSON string (UTF-8 passes through; quotes, backslashes and control
// characters are escaped).
void appendJsonString(std::string& out, std::string_view text);

}  // namespace tessal::server
