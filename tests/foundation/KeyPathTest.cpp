#include "Date.h"
#include "Decimal.h"
#include "KeyPath.h"

#include <gtest/gtest.h>

#include <QDateTime>
#include <QStringList>

#include <deque>
#include <limits>

namespace {

// A record that answers its keys from a map, standing in for the model's records.
class Record : public KeyValueCoding {
 public:
  explicit Record(QVariantMap values = {}) : values_(std::move(values)) {}
  QVariant valueForKey(const QString& key) const override { return values_.value(key); }

 private:
  QVariantMap values_;
};

const auto dec = [](const char* text) { return *Decimal::fromString(QString::fromLatin1(text)); };
const auto decVar = [](const char* text) { return QVariant::fromValue(dec(text)); };
const auto dateVar = [](double seconds) { return QVariant::fromValue(Date::fromSeconds(seconds)); };
const auto isDecimal = [](const QVariant& value) {
  return value.metaType() == QMetaType::fromType<Decimal>();
};

// Owns records for a test and hands them out as variants.
class Records {
 public:
  QVariant make(QVariantMap values) {
    records_.emplace_back(std::move(values));
    return KeyPath::variantFromObject(&records_.back());
  }

 private:
  std::deque<Record> records_;
};

const auto eval = [](const QVariant& root, const char* path) {
  return KeyPath::valueForKeyPath(root, QString::fromLatin1(path));
};

// Paths run through maps, hashes and records; those nothing answers are null.
TEST(KeyPathTest, NestedPathsThroughMapsHashesAndRecords) {
  Records records;
  const QVariant client =
      records.make({{"name", "Acme"}, {"address", QVariantHash{{"city", "Bern"}}}, {"empty", {}}});
  const QVariant project = records.make({{"client", client}, {"rate", decVar("80")}});
  const QVariantMap root{{"project", project}, {"mode", 2}};
  EXPECT_EQ(QVariantList({eval(root, "mode"), eval(root, "project.client.name"),
                          eval(root, "project.client.address.city")}),
            QVariantList({2, QString("Acme"), QString("Bern")}));
  EXPECT_TRUE(eval(root, "project.rate").value<Decimal>().isIdenticalTo(dec("80")));
  EXPECT_EQ(KeyPath::objectFromVariant(eval(root, "project.client")), KeyPath::objectFromVariant(client));
  EXPECT_EQ(eval(root, "project.self"), project);
  EXPECT_EQ(QVariantList(
                {eval(QVariant(7), "self"), eval(QVariant(7), ""), eval(QVariantMap{{"self", 1}}, "self")}),
            QVariantList({7, 7, 1}));
  EXPECT_TRUE(!KeyPath::objectFromVariant(QVariant(5)) && !KeyPath::objectFromVariant(QVariant()));
  EXPECT_FALSE(KeyPath::variantFromObject(nullptr).isValid());
  for (const char* path :
       {"missing", "project.client.missing", "missing.name", "project.client.name.length", "mode.value",
        "project.client.empty.deeper", "@sum.x", "mode.@count", "project.@max"})
    EXPECT_FALSE(eval(root, path).isValid()) << path;
}

// Decimal sums are compared including their exponent.
TEST(KeyPathTest, SumAndAverageKeepIntegersAndTurnExactOnceDecimalsAppear) {
  const qlonglong big = std::numeric_limits<qlonglong>::max();
  const std::tuple<QVariantList, QVariant, QVariant> cases[] = {
      // values, sum, average; booleans count as integers, doubles are summed exactly, other text is skipped
      // clang-format off
      {{1, 2, qlonglong(3), 4u}, qlonglong(10), decVar("2.5")},
      {{true, false, true}, qlonglong(2), decVar("0.66666666666666666666666666666666666667")},
      {{QVariant(), 2, QVariant(), 4}, qlonglong(6), decVar("3")}, {{}, qlonglong(0), QVariant()},
      {{QVariant(), QVariant()}, qlonglong(0), QVariant()},
      {{decVar("12.30"), 1}, decVar("13.30"), decVar("6.65")},
      {{0.1, 0.2}, decVar("0.3"), decVar("0.15")},
      {{5, decVar("0.5"), -3}, decVar("2.5"), decVar("0.83333333333333333333333333333333333333")},
      {{big, big}, decVar("18446744073709551614"), decVar("9223372036854775807")},
      {{std::numeric_limits<qulonglong>::max(), 1}, decVar("18446744073709551616"), decVar("9223372036854775808")},
      {{QString("2.25"), QString("n/a"), 1}, decVar("3.25"), decVar("1.625")},
      // clang-format on
  };
  for (const auto& [values, sum, avg] : cases) {
    SCOPED_TRACE(QVariant(values).toStringList().join(' ').toStdString());
    const QVariant gotSum = eval(values, "@sum"), gotAvg = eval(values, "@avg");
    ASSERT_EQ(gotSum.metaType(), sum.metaType());
    EXPECT_TRUE(isDecimal(sum) ? gotSum.value<Decimal>().isIdenticalTo(sum.value<Decimal>()) : gotSum == sum)
        << gotSum.toString().toStdString();
    ASSERT_EQ(gotAvg.isValid(), avg.isValid());
    EXPECT_TRUE(!avg.isValid() || (isDecimal(gotAvg) && gotAvg.value<Decimal>() == avg.value<Decimal>()))
        << gotAvg.toString().toStdString();
  }
}

// Plain keys map over lists, nested ones too, keeping nulls; operators evaluate the rest of the path on each
// element; a string list answers no keys but has a count and extremes; nulls count, maps count their keys.
TEST(KeyPathTest, ListsAndOperators) {
  Records records;
  const QVariantList items{records.make({{"duration", 90}, {"cost", decVar("120")}}),
                           records.make({{"duration", 30}, {"cost", decVar("37.5")}}),
                           records.make({{"cost", decVar("12.30")}})};
  const QVariant task = records.make({{"items", items}});
  const QVariantList tasks{task, records.make({{"items", QVariantList{}}})};
  const QVariant project = records.make({{"tasks", tasks}});
  const QVariantList named{records.make({{"name", "Design"}}), records.make({}),
                           QVariantMap{{"name", "Build"}}, 12};
  const QVariantList nested{QVariantList{QVariantMap{{"a", 1}}, QVariantMap{{"a", 2}}}, QVariantList{}};
  const QVariant words = QStringList{"pear", "apple", "fig"};
  // clang-format off
  const std::tuple<QVariant, const char*, QVariant> cases[] = {
      {named, "name", QVariantList{QString("Design"), {}, QString("Build"), {}}},
      {nested, "a", QVariantList{QVariantList{1, 2}, QVariantList{}}},
      {words, "length", QVariantList{{}, {}, {}}}, {words, "@count", qlonglong(3)},
      {words, "@min", QString("apple")},
      {task, "items.@sum.duration", qlonglong(120)}, {items, "@sum.duration", qlonglong(120)},
      {project, "tasks.@sum.duration", qlonglong(0)},  // these tasks answer no duration
      {project, "tasks.items.@count", qlonglong(2)},  // a list of two lists
      {tasks, "@max.items.@count", qlonglong(3)}, {tasks, "@sum.items.@sum.duration", qlonglong(120)},
      {QVariantList{1, QVariant(), 3}, "@count", qlonglong(3)},
      {QVariantMap{{"a", 1}, {"b", 2}}, "@count", qlonglong(2)}};
  // clang-format on
  for (const auto& [root, path, expected] : cases) EXPECT_EQ(eval(root, path), expected) << path;
  EXPECT_TRUE(eval(task, "items.@sum.cost").value<Decimal>().isIdenticalTo(dec("169.80")));
}

// Mixed number types compare by value and keep their type; the first of equal extremes wins.
TEST(KeyPathTest, MaxAndMinReturnTheElementItself) {
  Records records;
  const QVariantList numbers{3, decVar("3.5"), QVariant(), 2.75, qlonglong(-1), decVar("3.50")};
  const QVariant max = eval(numbers, "@max");
  EXPECT_TRUE(isDecimal(max) && max.value<Decimal>().isIdenticalTo(dec("3.5")));
  EXPECT_EQ(eval(numbers, "@min"), QVariant(qlonglong(-1)));
  const QVariantList times{records.make({{"running", false}, {"endDate", dateVar(1000.5)}}),
                           records.make({{"running", true}}),
                           records.make({{"running", false}, {"endDate", dateVar(2000.25)}}),
                           records.make({{"running", false}, {"endDate", dateVar(-5)}})};
  EXPECT_EQ(QVariantList({eval(times, "@max.endDate"), eval(times, "@min.endDate"),
                          eval(times, "@max.running"), eval(times, "@min.running")}),
            QVariantList({dateVar(2000.25), dateVar(-5), true, false}));
  for (const char* path : {"@max", "@min", "@avg", "@max.endDate", "@avg.endDate"})
    EXPECT_FALSE(eval(QVariantList{}, path).isValid()) << path;
  for (const char* path : {"@max.endDate", "@min.endDate", "@avg.endDate"})
    EXPECT_FALSE(eval(QVariantList{QVariant(), records.make({})}, path).isValid()) << path;
}

// Null first; integers exact past a double's precision; text case sensitive unless asked.
TEST(KeyPathTest, CompareValuesAcrossTypes) {
  const qlonglong twoTo53 = qlonglong(1) << 53;
  // clang-format off
  const std::tuple<QVariant, QVariant, int> cases[] = {
      {QVariant(), -5, -1}, {QVariant(), QString(""), -1}, {QVariant(), QVariant(), 0},
      {12, decVar("12.00"), 0}, {twoTo53 + 1, decVar("9007199254740992"), 1},
      {twoTo53 + 1, double(twoTo53), 1}, {decVar("0.1"), 0.1, 0},
      {decVar("2.5"), decVar("2.49999999999999999999999999"), 1}, {true, 2, -1}, {decVar("-0.5"), 0, -1},
      {std::numeric_limits<qulonglong>::max(), qlonglong(-1), 1}, {QString("apple"), QString("Banana"), 1},
      {dateVar(10.5), dateVar(10.25), 1},
      {dateVar(60), QVariant(QDateTime::fromSecsSinceEpoch(60, Qt::UTC)), 0},
      {QVariant(QDateTime::fromSecsSinceEpoch(59, Qt::UTC)), dateVar(59.5), -1}};
  // clang-format on
  for (const auto& [a, b, expected] : cases)
    EXPECT_EQ(std::pair(KeyPath::compareValues(a, b), KeyPath::compareValues(b, a)),
              std::pair(expected, -expected))
        << a.toString().toStdString();
  EXPECT_EQ(KeyPath::compareValues(QString("apple"), QString("APPLE"), true), 0);
  EXPECT_LT(KeyPath::compareValues(QString("apple"), QString("Banana"), true), 0);
}

TEST(KeyPathTest, SortIsStableAndFollowsDescriptorsInTurn) {
  Records records;
  const QVariantList values{
      records.make({{"name", "b1"}, {"group", "beta"}, {"date", dateVar(3)}}),
      records.make({{"name", "a1"}, {"group", "Alpha"}, {"date", dateVar(1)}}),
      records.make({{"name", "n1"}, {"date", dateVar(2)}}),
      records.make({{"name", "b2"}, {"group", "Beta"}, {"date", dateVar(1)}}),
      records.make({{"name", "a2"}, {"group", "alpha"}, {"date", dateVar(3)}}),
      records.make({{"name", "b3"}, {"group", "beta"}, {"date", dateVar(2)}}),
  };
  const QVariantList projects{records.make({{"name", "p1"}, {"client", records.make({{"name", "Zeta"}})}}),
                              records.make({{"name", "p2"}, {"client", records.make({{"name", "acme"}})}}),
                              records.make({{"name", "p3"}})};
  // clang-format off
  const std::tuple<QVariantList, QList<KeyPath::SortDescriptor>, const char*> orders[] = {
      {values, {{"group", true, true}}, "n1 a1 a2 b1 b2 b3"}, {values, {{"group", true, false}}, "n1 a1 b2 a2 b1 b3"},
      {values, {{"group", false, true}}, "b1 b2 b3 a1 a2 n1"},
      {values, {{"group", true, true}, {"date", false}}, "n1 a2 a1 b1 b3 b2"}, {values, {}, "b1 a1 n1 b2 a2 b3"},
      {projects, {{"client.name", true, true}}, "p3 p2 p1"}, {projects, {{"client.name", true, false}}, "p3 p1 p2"}};
  // clang-format on
  for (const auto& [list, descriptors, expected] : orders)
    EXPECT_EQ(eval(KeyPath::sorted(list, descriptors), "name").toStringList().join(' '), expected);

  const QVariantList numbers{3, decVar("1.5"), QVariant(), 2.0};
  EXPECT_EQ(KeyPath::sorted(numbers, {{"", true, false}}), (QVariantList{QVariant(), decVar("1.5"), 2.0, 3}));
  // Long enough that an unstable sort would not fall back to insertion sort.
  QVariantList many, expected;
  for (int i = 0; i < 200; ++i) many.append(QVariantMap{{"key", (i * 7) % 5}, {"index", i}});
  for (int key = 4; key >= 0; --key)
    for (const QVariant& value : many)
      if (eval(value, "key").toInt() == key) expected.append(value);
  EXPECT_EQ(KeyPath::sorted(many, {{"key", false, false}}), expected);
}

}  // namespace
