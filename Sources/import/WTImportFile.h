#pragma once

#include "Date.h"
#include "Decimal.h"
#include "Result.h"
#include "WTRoundingRule.h"

#include <QString>
#include <QStringList>
#include <QTimeZone>

#include <optional>
#include <vector>

class QIODevice;

// One entry of another tracker's export, in Tessal's terms.
struct WTImportRow {
  qint64 line = 0;
  QString client;
  QString project;
  QString task;  // empty: the project's "Default Task"
  QString name;
  QString notes;
  Date start;
  std::optional<Date> end;  // none while it was running when exported
  // Where a running entry had got to when the file was written: its start plus its duration so far, or
  // the file's own time.
  std::optional<Date> lastKnown;
  std::optional<Decimal> rate;    // per hour
  std::optional<Decimal> amount;  // what the file says the entry bills, where it says so
  std::optional<WTRoundingRule> rounding;  // the rule the file billed the entry by, where it says so
  QString currency;
  bool billable = true;
  QStringList tags;
  // Where the entry came from: the format and the source's id, or a hash of the entry's own fields.
  QString importId;
};

struct WTImportProblem {
  qint64 line = 0;
  QString reason;
};

// What a file holds: its entries and every row that could not be read.
struct WTImportFile {
  QString format;
  std::vector<WTImportRow> rows;
  // The first kProblemsKept rows that cannot be read, and how many more there are: a file of garbage
  // holds memory no longer than a file of entries.
  static constexpr size_t kProblemsKept = 1000;
  std::vector<WTImportProblem> problems;
  qint64 moreProblems = 0;
  void addProblem(qint64 line, const QString& reason) {
    if (problems.size() < kProblemsKept)
      problems.push_back({line, reason});
    else
      ++moreProblems;
  }
  qint64 problemCount() const { return qint64(problems.size()) + moreProblems; }
  // Rows of a kind that is not imported (the flat fees and expenses of Tessal's own file), with their
  // line and kind: told, so that nothing is left out unseen, but no reason to refuse the file.
  std::vector<WTImportProblem> leftOut;
  QString mapping;  // how the format's fields were placed, when that is a choice worth telling
};

namespace WTImportFormats {

// "toggl", "clockify", "timewarrior", "kimai", "tessal".
const QStringList& names();

struct Options {
  QString format;                                  // empty: told by the content
  QTimeZone zone;                                  // for times that carry no zone of their own
  QStringList tags = {QStringLiteral("project")};  // timewarrior: what its leading tags are
  std::optional<Date> fileTime;  // when the file was written: where a running entry had got to
};

// Reads an export. A file that is not one (empty, another format, a header lacking a column, text that
// is not UTF-8, a line beyond bounds) is an error naming the line or the column; a row that cannot be
// read is kept among the file's problems with its line and the reason.
Result<WTImportFile> read(QIODevice& device, const Options& options);

}  // namespace WTImportFormats
