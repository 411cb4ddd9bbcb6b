#pragma once

#include <QByteArray>
#include <QString>
#include <QStringList>

class QIODevice;

// Reads a CSV file record by record as it streams in: quoted fields with doubled quotes and line breaks
// inside them, a byte order mark, CR LF or LF line ends, ',' or ';' between fields (whichever the header
// line holds more of). Memory stays bounded whatever the file: a record longer than kMaxRecordBytes is
// refused, as is text that is not UTF-8, each naming its line.
class WTCSVReader {
 public:
  static constexpr qsizetype kMaxRecordBytes = 1 << 20;

  explicit WTCSVReader(QIODevice& device);

  enum class Status { Record, End, Failed };
  // The next record's fields; blank lines are passed over. After Failed, error() says why.
  Status next(QStringList& fields);
  // The line the record last read starts on, from 1.
  qint64 line() const { return recordLine_; }
  QString error() const { return error_; }
  char separator() const { return separator_; }

 private:
  int get();
  int peek();
  qsizetype takePlainRun(QByteArray& field, bool quoted);
  bool fill();
  void detectSeparator();

  QIODevice& device_;
  QByteArray buffer_;
  qsizetype position_ = 0;
  bool atEnd_ = false;
  bool started_ = false;
  char separator_ = ',';
  qint64 nextLine_ = 1;
  qint64 recordLine_ = 0;
  QString error_;
};
