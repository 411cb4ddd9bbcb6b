// libFuzzer target: renders arbitrary templates (and templates under other delimiters) over a fixed set
// of variables, twice on one engine, checking only that nothing crashes, hangs or trips a sanitizer.
//
// Build and run from /work/main (clang 14 from Debian; the tests are left out of this configuration):
//   cmake -S . -B build-gx-fuzz -G Ninja -DCMAKE_BUILD_TYPE=Debug -DCMAKE_CXX_COMPILER=clang++-14 \
//         -DTESSAL_BUILD_FUZZERS=ON -DTESSAL_BUILD_TESTS=OFF
//   ninja -C build-gx-fuzz template_fuzzer
//   mkdir -p /tmp/template-corpus
//   build-gx-fuzz/GXTemplate/template_fuzzer -max_total_time=600 -timeout=10 -rss_limit_mb=2048 \
//     -max_len=4096 -dict=tests/fuzz/template.dict /tmp/template-corpus tests/fuzz/corpus
// New inputs go to the scratch corpus (first folder); tests/fuzz/corpus holds the few seeds kept in the
// repository. Reproduce a finding with: build-gx-fuzz/GXTemplate/template_fuzzer CRASH_FILE
#include "Date.h"
#include "Decimal.h"
#include "GXTemplateEngine.h"
#include "ICUTemplateMatcher.h"
#include "KeyPath.h"

#include <QString>
#include <QVariant>

#include <cstddef>
#include <cstdint>

namespace {

// A record as the model offers them: answers a few keys, nothing else.
class FuzzRecord : public KeyValueCoding {
 public:
  QVariant valueForKey(const QString& key) const override {
    if (key == QLatin1String("name")) return QStringLiteral("Client \"A\"");
    if (key == QLatin1String("uuid")) return QStringLiteral("1@WTClient");
    if (key == QLatin1String("rate"))
      return QVariant::fromValue(*Decimal::fromString(QStringLiteral("80.50")));
    return {};
  }
};

const FuzzRecord gRecord;

QVariantMap fixedVariables() {
  QVariantList items;
  for (int i = 0; i < 3; ++i) {
    items.append(
        QVariantMap{{"name", QStringLiteral("Item %1").arg(i)},
                    {"date", QVariant::fromValue(Date::fromSeconds(1704067200.0 + 5400.0 * i))},
                    {"duration", 45 * i - 30},
                    {"cost", QVariant::fromValue(*Decimal::fromString(QStringLiteral("%1.05").arg(i)))},
                    {"kind", i % 2 ? QStringLiteral("time") : QStringLiteral("expense")}});
  }
  return {{"items", items},
          {"empty", QVariantList{}},
          {"words", QStringList{"alpha", "beta", "gamma"}},
          {"nested", QVariantMap{{"list", QVariantList{1, QVariantList{2, 3}, QVariantMap{{"k", "v"}}}}}},
          {"client", KeyPath::variantFromObject(&gRecord)},
          {"n", 5},
          {"zero", 0},
          {"big", qlonglong(1) << 40},
          {"ratio", 0.1},
          {"money", QVariant::fromValue(*Decimal::fromString(QStringLiteral("-1234.5")))},
          {"flag", true},
          {"text", QStringLiteral("x y")},
          {"mode", 2}};
}

struct Delimiters {
  const char* markerStart;
  const char* markerEnd;
  const char* expressionStart;
  const char* expressionEnd;
  const char* filter;
};

// The defaults first; the others include regular-expression characters and one-character delimiters.
const Delimiters kDelimiters[] = {{"{%", "%}", "{{", "}}", "|"},
                                  {"<%", "%>", "<%=", "%>", "!"},
                                  {"[[", "]]", "$(", ")", "\\"},
                                  {"(", ")", "*", "*", "."}};

class Quiet : public GXTemplateEngineDelegate {};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const QVariantMap variables = fixedVariables();
  // The first byte picks the delimiters when it is a control character; otherwise it is template text.
  std::size_t choice = 0;
  if (size > 0 && data[0] < 4) {
    choice = data[0];
    ++data;
    --size;
  }
  const QString text = QString::fromUtf8(reinterpret_cast<const char*>(data), qsizetype(size));
  const Delimiters& d = kDelimiters[choice];

  GXTemplateEngine engine;
  Quiet delegate;
  engine.setDelegate(&delegate);
  engine.setMarkerStartDelimiter(QString::fromLatin1(d.markerStart));
  engine.setMarkerEndDelimiter(QString::fromLatin1(d.markerEnd));
  engine.setExpressionStartDelimiter(QString::fromLatin1(d.expressionStart));
  engine.setExpressionEndDelimiter(QString::fromLatin1(d.expressionEnd));
  engine.setFilterDelimiter(QString::fromLatin1(d.filter));
  engine.setMatcher(ICUTemplateMatcher::matcherWithTemplateEngine(&engine));
  // Runaway loops end at these limits instead of running for minutes.
  engine.setMaximumSteps(20000);
  engine.setMaximumOutputLength(1 << 20);
  // Twice: state left by the first run (globals, cycles, loaded handlers) must not upset the second.
  for (int run = 0; run < 2; ++run) {
    const QString output = engine.processTemplate(text, variables);
    if (output.isNull()) __builtin_trap();  // a matcher is set: there is always a result
  }
  return 0;
}
