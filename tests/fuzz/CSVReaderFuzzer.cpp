// libFuzzer target over the import's CSV reader and the formats read through it (see README.md): no input
// may crash it or make it hold more than its bound, and every record it gives stays within the bound.
#include "FuzzCheck.h"
#include "WTCSVReader.h"
#include "WTImportFile.h"

#include <QBuffer>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  QByteArray bytes(reinterpret_cast<const char*>(data), qsizetype(size));
  {
    QBuffer buffer(&bytes);
    buffer.open(QIODevice::ReadOnly);
    WTCSVReader reader(buffer);
    QStringList fields;
    qint64 lastLine = 0;
    for (int records = 0; records < 100000; ++records) {
      const WTCSVReader::Status status = reader.next(fields);
      if (status != WTCSVReader::Status::Record) break;
      // Lines only go forward, and a record holds no more text than the bound lets in.
      check(reader.line() > lastLine);
      lastLine = reader.line();
      qsizetype length = 0;
      for (const QString& field : fields) length += field.size();
      check(length <= WTCSVReader::kMaxRecordBytes);
    }
  }
  QBuffer buffer(&bytes);
  buffer.open(QIODevice::ReadOnly);
  WTImportFormats::Options options;
  options.zone = QTimeZone::utc();
  const Result<WTImportFile> file = WTImportFormats::read(buffer, options);
  if (file)
    for (const WTImportRow& row : file.value().rows) check(!row.end || !(*row.end < row.start));
  return 0;
}
