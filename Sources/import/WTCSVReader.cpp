#include "WTCSVReader.h"

#include <QIODevice>
#include <QStringDecoder>

namespace {

constexpr qint64 kChunkBytes = 64 * 1024;

}  // namespace

WTCSVReader::WTCSVReader(QIODevice& device) : device_(device) {}

bool WTCSVReader::fill() {
  if (atEnd_) return false;
  if (position_ > 0) {
    buffer_.remove(0, position_);
    position_ = 0;
  }
  const qsizetype kept = buffer_.size();
  buffer_.resize(kept + kChunkBytes);
  const qint64 read = device_.read(buffer_.data() + kept, kChunkBytes);
  buffer_.resize(kept + qMax<qint64>(read, 0));
  if (read <= 0) atEnd_ = true;
  return read > 0;
}

int WTCSVReader::get() {
  if (position_ >= buffer_.size() && !fill()) return -1;
  return static_cast<unsigned char>(buffer_.at(position_++));
}

// Most bytes mean nothing to the reader: it takes them a buffered run at a time, up to the next quote,
// line end or (outside quotes) separator.
qsizetype WTCSVReader::takePlainRun(QByteArray& field, bool quoted) {
  if (position_ >= buffer_.size() && !fill()) return 0;
  const char* begin = buffer_.constData() + position_;
  const char* end = buffer_.constData() + buffer_.size();
  const char* p = begin;
  while (p < end && *p != '"' && *p != '\n' && *p != '\r' && (quoted || *p != separator_)) ++p;
  field.append(begin, p - begin);
  position_ += p - begin;
  return p - begin;
}

int WTCSVReader::peek() {
  if (position_ >= buffer_.size() && !fill()) return -1;
  return static_cast<unsigned char>(buffer_.at(position_));
}

// The header line decides the separator: the one of ',' and ';' that it holds more of outside quotes.
void WTCSVReader::detectSeparator() {
  while (!atEnd_ && buffer_.indexOf('\n', position_) < 0 && buffer_.size() - position_ < kMaxRecordBytes)
    fill();
  int commas = 0, semicolons = 0;
  bool quoted = false;
  for (qsizetype i = position_; i < buffer_.size() && (quoted || buffer_.at(i) != '\n'); ++i) {
    const char c = buffer_.at(i);
    if (c == '"') quoted = !quoted;
    if (!quoted && c == ',') ++commas;
    if (!quoted && c == ';') ++semicolons;
  }
  separator_ = semicolons > commas ? ';' : ',';
}

WTCSVReader::Status WTCSVReader::next(QStringList& fields) {
  if (!error_.isEmpty()) return Status::Failed;
  if (!started_) {
    started_ = true;
    if (peek() == 0xEF) {
      fill();
      if (buffer_.mid(position_, 3) == "\xEF\xBB\xBF") position_ += 3;
    }
    detectSeparator();
  }
  QStringDecoder decoder(QStringDecoder::Utf8, QStringDecoder::Flag::Stateless);
  for (;;) {
    fields.clear();
    recordLine_ = nextLine_;
    QByteArray field;
    qsizetype recordBytes = 0;
    bool quoted = false, wasQuoted = false, any = false;
    auto finishField = [&] {
      QString text = decoder(field);
      if (decoder.hasError()) return false;
      fields.append(std::move(text));
      field.clear();
      wasQuoted = false;
      return true;
    };
    int c = 0;
    for (;;) {
      if (const qsizetype plain = takePlainRun(field, quoted)) {
        any = true;
        recordBytes += plain;
      }
      c = get();
      if (c >= 0) {
        any = true;
        ++recordBytes;
      }
      if (recordBytes > kMaxRecordBytes) {
        error_ = QStringLiteral("line %1 is longer than %2 bytes").arg(recordLine_).arg(kMaxRecordBytes);
        return Status::Failed;
      }
      if (c < 0) break;
      if (quoted) {
        if (c == '"') {
          if (peek() == '"') {
            get();
            field.append('"');
          } else {
            quoted = false;
          }
        } else if (c == '\r' && peek() == '\n') {
          // A line break inside a field is kept as one LF, whichever line ends the file uses.
        } else {
          if (c == '\n') ++nextLine_;
          field.append(char(c));
        }
      } else if (c == '"' && field.isEmpty() && !wasQuoted) {
        quoted = wasQuoted = true;
      } else if (c == separator_) {
        if (!finishField()) break;
      } else if (c == '\r' || c == '\n') {
        if (c == '\r' && peek() == '\n') get();
        ++nextLine_;
        break;
      } else {
        field.append(char(c));
      }
    }
    if (quoted) {
      error_ = QStringLiteral("line %1: a quoted field is never closed").arg(recordLine_);
      return Status::Failed;
    }
    const bool lastQuoted = wasQuoted;
    if (decoder.hasError() || !finishField()) {
      error_ = QStringLiteral("line %1 is not UTF-8 text").arg(recordLine_);
      return Status::Failed;
    }
    if (!any) return Status::End;
    // A blank line holds no record.
    if (fields.size() == 1 && fields.first().isEmpty() && !lastQuoted) {
      if (c < 0) return Status::End;
      continue;
    }
    return Status::Record;
  }
}
