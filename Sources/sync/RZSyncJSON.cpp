#include "RZSyncJSON.h"

#include "Decimal.h"

#include <QStringList>

#include <nlohmann/json.hpp>

#include <algorithm>
#include <cmath>
#include <utility>
#include <vector>

namespace RZSyncJSON {

namespace {

// Builds QVariants straight from the parser's events. The parser hands number tokens with a fraction
// or an exponent over with their text, which is what keeps money exact.
class VariantBuilder final : public nlohmann::json_sax<nlohmann::json> {
 public:
  explicit VariantBuilder(std::size_t maxValues) : maxValues_(maxValues), valuesLeft_(maxValues) {}

  bool null() override { return counted() && add(QVariant()); }
  bool boolean(bool value) override { return counted() && add(value); }
  bool number_integer(number_integer_t value) override { return counted() && add(qint64(value)); }
  bool number_unsigned(number_unsigned_t value) override {
    if (!counted()) return false;
    if (value <= number_unsigned_t(std::numeric_limits<qint64>::max())) return add(qint64(value));
    return add(QVariant::fromValue(*Decimal::fromString(QString::number(value))));
  }
  bool number_float(number_float_t value, const string_t& text) override {
    if (!counted()) return false;
    if (std::optional<Decimal> exact = Decimal::fromString(QString::fromStdString(text))) {
      return add(QVariant::fromValue(*exact));
    }
    // Beyond Decimal's range: nothing exact is possible, keep the nearest double.
    return add(double(value));
  }
  bool string(string_t& value) override { return counted() && add(QString::fromStdString(value)); }
  bool binary(binary_t&) override { return false; }
  bool start_object(std::size_t) override {
    if (!enter()) return false;
    stack_.push_back({true, {}, {}, {}});
    return true;
  }
  bool key(string_t& key) override {
    stack_.back().key = QString::fromStdString(key);
    return true;
  }
  bool end_object() override { return close(); }
  bool start_array(std::size_t) override {
    if (!enter()) return false;
    stack_.push_back({false, {}, {}, {}});
    return true;
  }
  bool end_array() override { return close(); }
  bool parse_error(std::size_t, const std::string&, const nlohmann::detail::exception& ex) override {
    error = QString::fromUtf8(ex.what());
    return false;
  }

  QVariant root;
  QString error;

 private:
  struct Frame {
    bool object;
    QVariantMap map;
    QVariantList list;
    QString key;
  };

  // Documents of this protocol nest a few levels; a deep one is refused before it is built, since
  // building, copying and destroying nested values recurses once per level.
  bool enter() {
    if (!counted()) return false;
    if (stack_.size() < kMaxDepth) return true;
    error = QStringLiteral("JSON nested deeper than %1 levels").arg(kMaxDepth);
    return false;
  }

  // Bytes alone do not bound the memory: "[]," is three bytes of text and a QVariant of 32 with its
  // share of the list, so each value is counted before it is built.
  bool counted() {
    if (valuesLeft_ > 0) {
      --valuesLeft_;
      return true;
    }
    error = QStringLiteral("JSON holds more than %1 values").arg(qulonglong(maxValues_));
    return false;
  }

  bool add(QVariant value) {
    if (stack_.empty()) {
      root = std::move(value);
    } else if (Frame& top = stack_.back(); top.object) {
      top.map.insert(top.key, std::move(value));  // a repeated key: the last one counts
    } else {
      top.list.append(std::move(value));
    }
    return true;
  }

  bool close() {
    Frame frame = std::move(stack_.back());
    stack_.pop_back();
    return add(frame.object ? QVariant(std::move(frame.map)) : QVariant(std::move(frame.list)));
  }

  std::vector<Frame> stack_;
  const std::size_t maxValues_;
  std::size_t valuesLeft_;
};

void writeString(QByteArray& out, const QString& text) {
  static const char kHex[] = "0123456789abcdef";
  // Most texts (identities, names, dates) are plain ASCII that needs no escape: those go in as they are,
  // without their UTF-8 copy.
  const auto plain = [](QChar c) {
    return c.unicode() >= 0x20 && c.unicode() < 0x7f && c != u'"' && c != u'\\';
  };
  if (std::all_of(text.begin(), text.end(), plain)) {
    const qsizetype at = out.size();
    out.resize(at + text.size() + 2);
    char* to = out.data() + at;
    *to++ = '"';
    for (const QChar c : text) *to++ = char(c.unicode());
    *to = '"';
    return;
  }
  const QByteArray utf8 = text.toUtf8();
  out.append('"');
  // Runs of bytes that need no escape go in whole: most text is nothing but such a run.
  const char* run = utf8.constData();
  const char* const end = run + utf8.size();
  for (const char* at = run; at != end; ++at) {
    const auto byte = static_cast<unsigned char>(*at);
    if (byte >= 0x20 && byte != 0x7f && byte != '"' && byte != '\\') continue;
    out.append(run, at - run);
    run = at + 1;
    switch (*at) {
      case '"':
        out.append("\\\"");
        break;
      case '\\':
        out.append("\\\\");
        break;
      case '\n':
        out.append("\\n");
        break;
      case '\r':
        out.append("\\r");
        break;
      case '\t':
        out.append("\\t");
        break;
      case '\b':
        out.append("\\b");
        break;
      case '\f':
        out.append("\\f");
        break;
      default:
        out.append("\\u00");
        out.append(kHex[byte >> 4]);
        out.append(kHex[byte & 0xf]);
    }
  }
  out.append(run, end - run);
  out.append('"');
}

void newline(QByteArray& out, Style style, int depth) {
  if (style == Style::Compact) return;
  out.append('\n');
  out.append(qsizetype(depth) * 2, ' ');
}

void writeValue(QByteArray& out, const QVariant& value, Style style, int depth) {
  if (!value.isValid() || value.isNull()) {
    out.append("null");
    return;
  }
  if (value.metaType() == QMetaType::fromType<Decimal>()) {
    out.append(value.value<Decimal>().toString().toLatin1());
    return;
  }
  switch (value.typeId()) {
    case QMetaType::QVariantMap:
    case QMetaType::QVariantHash: {
      const QVariantMap map = value.typeId() == QMetaType::QVariantMap ? value.toMap() : [&] {
        QVariantMap sorted;
        const QVariantHash hash = value.toHash();
        for (auto it = hash.begin(); it != hash.end(); ++it) sorted.insert(it.key(), it.value());
        return sorted;
      }();
      if (map.isEmpty()) {
        out.append("{}");
        return;
      }
      out.append('{');
      bool first = true;
      for (auto it = map.begin(); it != map.end(); ++it) {
        if (!first) out.append(',');
        first = false;
        newline(out, style, depth + 1);
        writeString(out, it.key());
        out.append(style == Style::Pretty ? ": " : ":");
        writeValue(out, it.value(), style, depth + 1);
      }
      newline(out, style, depth);
      out.append('}');
      return;
    }
    case QMetaType::QVariantList:
    case QMetaType::QStringList: {
      const QVariantList list = value.toList();
      if (list.isEmpty()) {
        out.append("[]");
        return;
      }
      out.append('[');
      bool first = true;
      for (const QVariant& element : list) {
        if (!first) out.append(',');
        first = false;
        newline(out, style, depth + 1);
        writeValue(out, element, style, depth + 1);
      }
      newline(out, style, depth);
      out.append(']');
      return;
    }
    case QMetaType::QString:
      writeString(out, value.toString());
      return;
    case QMetaType::Bool:
      out.append(value.toBool() ? "true" : "false");
      return;
    case QMetaType::Int:
    case QMetaType::Long:
    case QMetaType::LongLong:
    case QMetaType::Short:
    case QMetaType::SChar:
      out.append(QByteArray::number(value.toLongLong()));
      return;
    case QMetaType::UInt:
    case QMetaType::ULong:
    case QMetaType::ULongLong:
    case QMetaType::UShort:
    case QMetaType::UChar:
      out.append(QByteArray::number(value.toULongLong()));
      return;
    case QMetaType::Double:
    case QMetaType::Float: {
      const std::optional<Decimal> decimal = Decimal::fromDouble(value.toDouble());
      out.append(decimal ? decimal->toString().toLatin1() : QByteArray("null"));
      return;
    }
    default:
      if (value.canConvert<QString>()) {
        writeString(out, value.toString());
      } else {
        out.append("null");
      }
  }
}

}  // namespace

std::optional<QVariant> parse(QByteArrayView text, QString* error, std::size_t maxValues) {
  VariantBuilder builder(maxValues);
  const char* begin = text.data();
  const bool ok = nlohmann::json::sax_parse(begin, begin + text.size(), &builder);
  if (!ok) {
    if (error) *error = builder.error.isEmpty() ? QStringLiteral("malformed JSON") : builder.error;
    return std::nullopt;
  }
  return builder.root;
}

QByteArray write(const QVariant& value, Style style) {
  QByteArray out;
  writeValue(out, value, style, 0);
  return out;
}

void CompactObject::add(const QString& key, const QVariant& value) {
  if (text_.isEmpty()) {
    // Room for the entry of a typical record, so that it is not moved as it grows.
    text_.reserve(512);
    text_.append('{');
  } else {
    text_.append(',');
  }
  writeString(text_, key);
  text_.append(':');
  writeValue(text_, value, Style::Compact, 1);
}

QByteArray CompactObject::take() {
  text_.append(text_.isEmpty() ? "{}" : "}");
  return std::exchange(text_, QByteArray());
}

bool sameValue(const QVariant& a, const QVariant& b) {
  return write(a, Style::Compact) == write(b, Style::Compact);
}

bool isContainer(const QVariant& value) {
  return value.typeId() == QMetaType::QVariantMap || value.typeId() == QMetaType::QVariantList;
}

}  // namespace RZSyncJSON
