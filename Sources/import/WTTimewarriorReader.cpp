#include "WTCSVReader.h"
#include "WTImportFile.h"
#include "WTImportReaders.h"

#include <QHash>
#include <QIODevice>
#include <QRegularExpression>

#include <nlohmann/json.hpp>

namespace WTImportFormats {
namespace {

using detail::when;

// The JSON array streams through an iterator that counts lines and stops an entry past its bounds.
struct JSONSource {
  QIODevice& device;
  QByteArray buffer;
  qsizetype position = 0;
  qint64 line = 1;
  qint64 entryBytes = 0;
  bool tooLong = false;

  int get() {
    if (position >= buffer.size()) {
      buffer = device.read(64 * 1024);
      position = 0;
      if (buffer.isEmpty()) return -1;
    }
    if (++entryBytes > WTCSVReader::kMaxRecordBytes) {
      tooLong = true;
      return -1;
    }
    const char c = buffer.at(position++);
    if (c == '\n') ++line;
    return static_cast<unsigned char>(c);
  }
};

class JSONIterator {
 public:
  using iterator_category = std::input_iterator_tag;
  using value_type = char;
  using difference_type = std::ptrdiff_t;
  using pointer = const char*;
  using reference = const char&;

  JSONIterator() = default;
  explicit JSONIterator(JSONSource* source) : source_(source) { current_ = source_->get(); }
  const char& operator*() const {
    value_ = char(current_);
    return value_;
  }
  JSONIterator& operator++() {
    current_ = source_->get();
    return *this;
  }
  JSONIterator operator++(int) {
    JSONIterator before = *this;
    ++*this;
    return before;
  }
  bool operator==(const JSONIterator& other) const { return atEnd() == other.atEnd(); }
  bool operator!=(const JSONIterator& other) const { return !(*this == other); }

 private:
  bool atEnd() const { return !source_ || current_ < 0; }
  JSONSource* source_ = nullptr;
  int current_ = -1;
  mutable char value_ = 0;
};

// The entries of `timew export`, one object at a time: nothing but the entry being read is held.
class TimewarriorReader : public nlohmann::json_sax<nlohmann::json> {
 public:
  TimewarriorReader(JSONSource& source, const Options& options, WTImportFile& file)
      : source_(source), options_(options), file_(file) {}

  bool null() override { return scalar(QString()); }
  bool boolean(bool) override { return scalar(QString()); }
  bool number_integer(number_integer_t value) override { return scalar(QString::number(value)); }
  bool number_unsigned(number_unsigned_t value) override { return scalar(QString::number(value)); }
  bool number_float(number_float_t value, const string_t&) override { return scalar(QString::number(value)); }
  bool string(string_t& value) override { return scalar(QString::fromStdString(value)); }
  bool binary(binary_t&) override { return scalar(QString()); }
  bool key(string_t& value) override {
    key_ = QString::fromStdString(value);
    return true;
  }
  bool start_object(std::size_t) override {
    if (depth_ == 0) return refuse();
    if (depth_ == 1) {
      entry_ = {};
      tags_.clear();
      line_ = source_.line;
    }
    ++depth_;
    return true;
  }
  bool end_object() override {
    if (--depth_ == 1) finishEntry();
    return true;
  }
  bool start_array(std::size_t) override {
    ++depth_;
    inTags_ = depth_ == 3 && key_ == u"tags";
    return true;
  }
  bool end_array() override {
    --depth_;
    inTags_ = false;
    return true;
  }
  bool parse_error(std::size_t, const std::string&, const nlohmann::detail::exception&) override {
    error_ = source_.tooLong ? QStringLiteral("line %1: an entry longer than %2 bytes")
                                   .arg(line_)
                                   .arg(WTCSVReader::kMaxRecordBytes)
                             : QStringLiteral("line %1: the JSON cannot be read").arg(source_.line);
    return false;
  }

  QString error() const { return error_; }

 private:
  bool refuse() {
    error_ = QStringLiteral("the file is none of the formats Tessal imports (%1)")
                 .arg(names().join(QStringLiteral(", ")));
    return false;
  }
  bool scalar(const QString& value) {
    if (depth_ == 0) return refuse();
    if (inTags_)
      tags_.append(value);
    else if (depth_ == 2)
      entry_.insert(key_, value);
    return true;
  }
  void finishEntry() {
    source_.entryBytes = 0;
    static const QRegularExpression stamp(QStringLiteral("^(\\d{8})T(\\d{6})Z$"));
    auto instant = [](const QString& text) -> std::optional<Date> {
      const auto m = stamp.match(text);
      if (!m.hasMatch()) return std::nullopt;
      const QDateTime date(QDate::fromString(m.captured(1), u"yyyyMMdd"),
                           QTime::fromString(m.captured(2), u"HHmmss"), QTimeZone::utc());
      if (!date.isValid()) return std::nullopt;
      return Date::fromQDateTime(date);
    };
    WTImportRow row;
    row.line = line_;
    const std::optional<Date> start = instant(entry_.value(QStringLiteral("start")));
    if (!start) {
      file_.addProblem(
          line_, QStringLiteral("the start “%1” cannot be read").arg(entry_.value(QStringLiteral("start"))));
      return;
    }
    row.start = *start;
    if (entry_.contains(QStringLiteral("end"))) {
      row.end = instant(entry_.value(QStringLiteral("end")));
      if (!row.end) {
        file_.addProblem(
            line_, QStringLiteral("the end “%1” cannot be read").arg(entry_.value(QStringLiteral("end"))));
        return;
      }
      if (*row.end < row.start) {
        file_.addProblem(line_, QStringLiteral("the entry ends (%1) before it starts (%2)")
                                    .arg(when(*row.end, options_.zone), when(row.start, options_.zone)));
        return;
      }
    } else {
      row.lastKnown = options_.fileTime;
    }
    // The leading tags name what the mapping says; the rest become the entry's name.
    QStringList rest = tags_;
    for (const QString& field : options_.tags) {
      const QString tag = rest.isEmpty() ? QString() : rest.takeFirst();
      if (field == u"client")
        row.client = tag;
      else if (field == u"project")
        row.project = tag;
      else if (field == u"task")
        row.task = tag;
    }
    row.name = rest.join(QStringLiteral(", "));
    row.notes = entry_.value(QStringLiteral("annotation"));
    // Its ids count back from the newest entry and change with every new one: the start is what lasts.
    row.importId = QStringLiteral("timewarrior:") + QString::number(qint64(row.start.secondsSince1970()));
    file_.rows.push_back(std::move(row));
  }

  JSONSource& source_;
  const Options& options_;
  WTImportFile& file_;
  int depth_ = 0;
  bool inTags_ = false;
  qint64 line_ = 0;
  QString key_;
  QHash<QString, QString> entry_;
  QStringList tags_;
  QString error_;
};

}  // namespace

Result<WTImportFile> detail::readTimewarrior(QIODevice& device, const Options& options) {
  WTImportFile file;
  file.format = QStringLiteral("timewarrior");
  file.mapping = QStringLiteral("the first tags are the entry's %1; the others its name")
                     .arg(options.tags.join(QStringLiteral(", ")));
  JSONSource source{device, {}, 0, 1, 0, false};
  TimewarriorReader reader(source, options, file);
  const bool parsed = nlohmann::json::sax_parse(JSONIterator(&source), JSONIterator(), &reader,
                                                nlohmann::json::input_format_t::json, true);
  if (!parsed) return Error{1, reader.error()};
  return file;
}

}  // namespace WTImportFormats
