#include "JsonValue.h"

#include <nlohmann/json.hpp>

#include <algorithm>
#include <charconv>
#include <limits>

namespace tessal::server {

JsonValue JsonValue::boolean(bool value) {
  JsonValue v;
  v.type_ = Type::Boolean;
  v.boolean_ = value;
  return v;
}

JsonValue JsonValue::number(std::string text, bool isInteger) {
  JsonValue v;
  v.type_ = Type::Number;
  v.text_ = std::move(text);
  v.integral_ = isInteger;
  return v;
}

JsonValue JsonValue::integer(int64_t value) {
  return number(std::to_string(value), true);
}

JsonValue JsonValue::string(std::string text) {
  JsonValue v;
  v.type_ = Type::String;
  v.text_ = std::move(text);
  return v;
}

JsonValue JsonValue::array(std::vector<JsonValue> elements) {
  JsonValue v;
  v.type_ = Type::Array;
  v.elements_ = std::move(elements);
  return v;
}

JsonValue JsonValue::object(std::vector<Member> members) {
  JsonValue v;
  v.type_ = Type::Object;
  v.members_ = std::move(members);
  return v;
}

std::optional<int64_t> JsonValue::integerValue() const {
  if (type_ != Type::Number || !integral_) return std::nullopt;
  int64_t value = 0;
  const auto [end, ec] = std::from_chars(text_.data(), text_.data() + text_.size(), value);
  if (ec != std::errc() || end != text_.data() + text_.size()) return std::nullopt;
  return value;
}

const JsonValue* JsonValue::find(std::string_view name) const {
  for (const Member& member : members_) {
    if (member.first == name) return &member.second;
  }
  return nullptr;
}

void appendJsonString(std::string& out, std::string_view text) {
  static constexpr char kHex[] = "0123456789abcdef";
  out.push_back('"');
  for (const char c : text) {
    const auto byte = static_cast<unsigned char>(c);
    switch (c) {
      case '"':
        out += "\\\"";
        break;
      case '\\':
        out += "\\\\";
        break;
      case '\n':
        out += "\\n";
        break;
      case '\r':
        out += "\\r";
        break;
      case '\t':
        out += "\\t";
        break;
      case '\b':
        out += "\\b";
        break;
      case '\f':
        out += "\\f";
        break;
      default:
        if (byte < 0x20) {
          out += "\\u00";
          out.push_back(kHex[byte >> 4]);
          out.push_back(kHex[byte & 0xf]);
        } else {
          out.push_back(c);
        }
    }
  }
  out.push_back('"');
}

void JsonValue::dumpTo(std::string& out) const {
  switch (type_) {
    case Type::Null:
      out += "null";
      break;
    case Type::Boolean:
      out += boolean_ ? "true" : "false";
      break;
    case Type::Number:
      out += text_;
      break;
    case Type::String:
      appendJsonString(out, text_);
      break;
    case Type::Array: {
      out.push_back('[');
      bool first = true;
      for (const JsonValue& element : elements_) {
        if (!first) out.push_back(',');
        first = false;
        element.dumpTo(out);
      }
      out.push_back(']');
      break;
    }
    case Type::Object: {
      out.push_back('{');
      bool first = true;
      for (const Member& member : members_) {
        if (!first) out.push_back(',');
        first = false;
        appendJsonString(out, member.first);
        out.push_back(':');
        member.second.dumpTo(out);
      }
      out.push_back('}');
      break;
    }
  }
}

std::string JsonValue::dump() const {
  std::string out;
  dumpTo(out);
  return out;
}

namespace {

// Builds JsonValues from nlohmann's event parser, which hands over the text of every non-integral
// number (nlohmann's own DOM would round it through a double).
class Builder {
 public:
  using json = nlohmann::json;

  Builder(int maxDepth, size_t maxValues) : maxDepth_(maxDepth), maxValues_(maxValues) {}

  bool null() { return add(JsonValue::null()); }
  bool boolean(bool value) { return add(JsonValue::boolean(value)); }
  bool number_integer(json::number_integer_t value) { return add(JsonValue::integer(value)); }
  bool number_unsigned(json::number_unsigned_t value) {
    const bool fits = value <= static_cast<json::number_unsigned_t>(std::numeric_limits<int64_t>::max());
    return add(JsonValue::number(std::to_string(value), fits));
  }
  bool number_float(json::number_float_t, const std::string& text) {
    return add(JsonValue::number(text, false));
  }
  bool string(std::string& value) { return add(JsonValue::string(std::move(value))); }
  bool binary(json::binary_t&) { return fail("binary values are not JSON"); }

  bool start_object(std::size_t) { return open(JsonValue::object()); }
  bool key(std::string& name) {
    keys_.back() = std::move(name);
    return true;
  }
  bool end_object() {
    JsonValue done = close();
    // Sorting views of the names finds a repeated member in n log n, whatever the object's size.
    std::vector<std::string_view> names;
    names.reserve(done.members().size());
    for (const auto& member : done.members()) names.push_back(member.first);
    std::sort(names.begin(), names.end());
    if (std::adjacent_find(names.begin(), names.end()) != names.end())
      return fail("an object repeats a member name");
    return add(std::move(done));
  }
  bool start_array(std::size_t) { return open(JsonValue::array()); }
  bool end_array() { return add(close()); }

  // The library's message quotes the offending input, which need not even be UTF-8: the position is
  // all that goes into a reply.
  bool parse_error(std::size_t position, const std::string&, const nlohmann::detail::exception&) {
    if (error_.empty()) error_ = "invalid JSON at byte " + std::to_string(position);
    return false;
  }

  std::optional<JsonValue> result() {
    return done_ ? std::optional<JsonValue>(std::move(root_)) : std::nullopt;
  }
  const std::string& error() const { return error_; }

 private:
  bool fail(std::string reason) {
    error_ = std::move(reason);
    return false;
  }

  bool count() {
    return ++values_ <= maxValues_ || fail("JSON holds more than " + std::to_string(maxValues_) + " values");
  }

  bool open(JsonValue container) {
    if (!count()) return false;
    if (static_cast<int>(stack_.size()) >= maxDepth_) return fail("JSON nested too deeply");
    stack_.push_back(std::move(container));
    keys_.emplace_back();
    return true;
  }

  JsonValue close() {
    JsonValue done = std::move(stack_.back());
    stack_.pop_back();
    keys_.pop_back();
    return done;
  }

  bool add(JsonValue value) {
    if (!value.isArray() && !value.isObject() && !count()) return false;
    if (stack_.empty()) {
      root_ = std::move(value);
      done_ = true;
      return true;
    }
    JsonValue& top = stack_.back();
    if (top.isArray()) {
      top.push(std::move(value));
    } else {
      top.insert(std::move(keys_.back()), std::move(value));
    }
    return true;
  }

  int maxDepth_;
  size_t maxValues_;
  size_t values_ = 0;
  std::vector<JsonValue> stack_;
  std::vector<std::string> keys_;
  JsonValue root_;
  bool done_ = false;
  std::string error_;
};

}  // namespace

std::optional<JsonValue> JsonValue::parse(std::string_view text, std::string* error, int maxDepth,
                                          size_t maxValues) {
  Builder builder(maxDepth, maxValues);
  bool ok = false;
  try {
    ok = nlohmann::json::sax_parse(text.begin(), text.end(), &builder, nlohmann::json::input_format_t::json,
                                   true);
  } catch (const std::exception&) {
    if (error) *error = "invalid JSON";
    return std::nullopt;
  }
  if (!ok) {
    if (error) *error = builder.error().empty() ? "invalid JSON" : builder.error();
    return std::nullopt;
  }
  return builder.result();
}

}  // namespace tessal::server
