#pragma once

#include "Date.h"
#include "Result.h"
#include "WTImportFile.h"

#include <QString>
#include <QTimeZone>

class QIODevice;

// What the format readers share among themselves, not with the rest of the program.
namespace WTImportFormats::detail {

// A moment as a refusal names it: "2024-03-31 02:30" in `zone`.
QString when(const Date& date, const QTimeZone& zone);

// The JSON array that `timew export` writes, streamed one entry at a time.
Result<WTImportFile> readTimewarrior(QIODevice& device, const Options& options);

}  // namespace WTImportFormats::detail
