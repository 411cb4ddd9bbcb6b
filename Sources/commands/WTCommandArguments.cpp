#include "WTCommandArguments.h"

#include "WTObjectContext.h"

#include <QCollator>

#include <algorithm>
#include <cstdio>
#include <cstdlib>

#ifdef TESSAL_COVERAGE
extern "C" void __gcov_dump();
#endif

namespace WTCommandArguments {

int usage(QTextStream& err, const char* usageLine, const QString& problem) {
  if (!problem.isEmpty()) err << "tessal: " << problem << '\n';
  err << usageLine;
  err.flush();
  return 2;
}

int failure(QTextStream& err, const QString& message) {
  err << "tessal: " << message << '\n';
  err.flush();
  return 1;
}

QString parse(QCommandLineParser& parser, const QStringList& arguments, const QStringList& options) {
  for (const QString& name : options)
    parser.addOption(QCommandLineOption(name, QString(), QStringLiteral("value")));
  parser.setSingleDashWordOptionMode(QCommandLineParser::ParseAsLongOptions);
  if (!parser.parse(QStringList{QStringLiteral("tessal")} + arguments)) return parser.errorText();
  if (!parser.positionalArguments().isEmpty())
    return QStringLiteral("unexpected argument '%1'").arg(parser.positionalArguments().first());
  for (const QString& name : options) {
    if (parser.values(name).size() > 1) return QStringLiteral("--%1 given more than once").arg(name);
  }
  return {};
}

QString clientWithoutProject(const QCommandLineParser& parser) {
  if (!parser.isSet(QStringLiteral("client")) || parser.isSet(QStringLiteral("project"))) return {};
  return QStringLiteral("--client says whose --project is meant; name the project too");
}

bool sortsBefore(const QString& a, const QString& b) {
  static const QCollator collator;
  return collator.compare(a, b) < 0;
}

void writeText(QTextStream& out, QStringView text) {
  // The stream encodes and writes what it holds once it holds more than 16 Ki units.
  constexpr qsizetype kSlice = 16 << 10;
  for (qsizetype at = 0; at < text.size(); at += kSlice)
    out << text.sliced(at, std::min(kSlice, text.size() - at));
  out.flush();
}

void endProcess(int status, QTextStream& out, QTextStream& err, WTObjectContext& context) {
  out.flush();
  err.flush();
  context.closeStore();
  std::fflush(nullptr);
#ifdef TESSAL_COVERAGE
  __gcov_dump();  // a coverage build writes its counts in the exit handlers _Exit skips
#endif
  std::_Exit(status);
}

}  // namespace WTCommandArguments
