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

Decimal dec(const char* text) {
  return *Decimal::fromString(QString::fromLatin1(text));
}
QVariant decVar(const char* text) {
  return QVariant::fromValue(dec(text));
}
QVariant dateVar(double seconds) {
  return QVariant::fromValue(Date::fromSeconds(seconds));
}

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

QVariant eval(const QVariant& root, const char* path) {
  return KeyPath::valueForKeyPath(root, QString::fromLatin1(path));
}

bool isDecimal(const QVariant& value) {
  return value.metaType() == QMetaType::fromType<Decimal>();
}

TEST(KeyPathTest, NestedPathsThroughMapsHashesAndRecords) {
  Records records;
  const QVariant client = records.make({{"name", "Acme"}, {"address", QVariantHash{{"city", "Bern"}}}});
  const QVariant project = records.make({{"client", client}, {"rate", decVar("80")}});
  const QVariantMap root{{"project", project}, {"mode", 2}};

  EXPECT_EQ(QVariantList({eval(root, "mode"), eval(root, "project.client.name"),
                          eval(root, "project.client.address.city")}),
            QVariantList({2, QString("Acme"), QString("Bern")}));
  EXPECT_TRUE(eval(root, "project.rate").value<Decimal>().isIdenticalTo(dec("80")));
  EXPECT_EQ(KeyPath::objectFromVariant(eval(root, "project.client")), KeyPath::objectFromVariant(client));
  EXPECT_EQ(eval(root, "project.self"), project);
  EXPECT_EQ(eval(QVariant(7), "self"), QVariant(7));
  EXPECT_EQ(eval(QVariant(7), ""), QVariant(7));
  EXPECT_EQ(eval(QVariantMap{{"self", 1}}, "self"), QVariant(1));
  EXPECT_TRUE(!KeyPath::objectFromVariant(QVariant(5)) && !KeyPath::objectFromVariant(QVariant()));
  EXPECT_FALSE(KeyPath::variantFromObject(nullptr).isValid());
}

TEST(KeyPathTest, UnansweredPathsAreNull) {
  Records records;
  const QVariant record = records.make({{"name", "Acme"}, {"empty", QVariant()}});
  const QVariantMap root{{"record", record}, {"number", 3}};
  for (const char* path : {"missing", "record.missing", "missing.name", "record.name.length", "number.value",
                           "record.empty.deeper", "@sum.x", "number.@count", "record.@max"})
    EXPECT_FALSE(eval(root, path).isValid()) << path;
}

TEST(KeyPathTest, PlainKeysMapOverListsKeepingNulls) {
  Records records;
  const QVariantList tasks{records.make({{"name", "Design"}}), records.make({}),
                           QVariantMap{{"name", "Build"}}, QVariant(12)};
  const QVariant names = eval(tasks, "name");
  ASSERT_EQ(names.typeId(), QMetaType::QVariantList);
  EXPECT_EQ(names.toList(), QVariantList({QString("Design"), QVariant(), QString("Build"), QVariant()}));

  // Lists of lists map element-wise at every level.
  const QVariantList nested{QVariantList{QVariantMap{{"a", 1}}, QVariantMap{{"a", 2}}}, QVariantList{}};
  EXPECT_EQ(eval(nested, "a"), QVariant(QVariantList{QVariantList{1, 2}, QVariantList{}}));

  // A string list answers no keys but still has a count and extremes.
  const QStringList words{"pear", "apple", "fig"};
  EXPECT_EQ(eval(QVariant(words), "length"), QVariant(QVariantList{QVariant(), QVariant(), QVariant()}));
  EXPECT_EQ(eval(QVariant(words), "@count"), QVariant(qlonglong(3)));
  EXPECT_EQ(eval(QVariant(words), "@min").toString(), "apple");
}

TEST(KeyPathTest, SumAndAverageKeepIntegersAndTurnExactOnceDecimalsAppear) {
  const qlonglong big = std::numeric_limits<qlonglong>::max();
  const QVariant third = decVar("0.66666666666666666666666666666666666667");
  const struct {
    QVariantList values;
    QVariant sum, avg;  // Decimals are compared including their exponent
  } cases[] = {
      {{1, 2, qlonglong(3), 4u}, qlonglong(10), decVar("2.5")},
      {{true, false, true}, qlonglong(2), third},  // booleans count as integers
      {{QVariant(), 2, QVariant(), 4}, qlonglong(6), decVar("3")},
      {{}, qlonglong(0), QVariant()},
      {{QVariant(), QVariant()}, qlonglong(0), QVariant()},
      {{decVar("12.30"), 1}, decVar("13.30"), decVar("6.65")},
      {{0.1, 0.2}, decVar("0.3"), decVar("0.15")},  // doubles are summed exactly
      {{5, decVar("0.5"), -3}, decVar("2.5"), decVar("0.83333333333333333333333333333333333333")},
      {{big, big}, decVar("18446744073709551614"), decVar("9223372036854775807")},
      {{std::numeric_limits<qulonglong>::max(), 1},
       decVar("18446744073709551616"),
       decVar("9223372036854775808")},
      {{QString("2.25"), QString("n/a"), 1}, decVar("3.25"), decVar("1.625")},  // other text is skipped
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(QVariant(c.values).toStringList().join(' ').toStdString());
    const QVariant sum = eval(c.values, "@sum");
    ASSERT_EQ(sum.metaType(), c.sum.metaType());
    if (isDecimal(c.sum)) {
      EXPECT_TRUE(sum.value<Decimal>().isIdenticalTo(c.sum.value<Decimal>())) << sum.toString().toStdString();
    } else {
      EXPECT_EQ(sum, c.sum);
    }
    const QVariant avg = eval(c.values, "@avg");
    ASSERT_EQ(avg.isValid(), c.avg.isValid());
    if (c.avg.isValid()) {
      ASSERT_TRUE(isDecimal(avg));
      EXPECT_EQ(avg.value<Decimal>(), c.avg.value<Decimal>()) << avg.toString().toStdString();
    }
  }
}

TEST(KeyPathTest, OperatorsEvaluateTheRestOfThePathOnEachElement) {
  Records records;
  const QVariantList items{records.make({{"duration", 90}, {"cost", decVar("120")}}),
                           records.make({{"duration", 30}, {"cost", decVar("37.5")}}),
                           records.make({{"cost", decVar("12.30")}})};
  const QVariant task = records.make({{"items", items}});
  const QVariantList tasks{task, records.make({{"items", QVariantList{}}})};
  const QVariant project = records.make({{"tasks", tasks}});

  EXPECT_EQ(eval(task, "items.@sum.duration"), QVariant(qlonglong(120)));
  EXPECT_TRUE(eval(task, "items.@sum.cost").value<Decimal>().isIdenticalTo(dec("169.80")));
  EXPECT_EQ(eval(items, "@sum.duration"), QVariant(qlonglong(120)));
  // These tasks answer no duration, and a sum of nothing is the integer 0.
  EXPECT_EQ(eval(project, "tasks.@sum.duration"), QVariant(qlonglong(0)));
  EXPECT_EQ(eval(project, "tasks.items.@count"), QVariant(qlonglong(2)));  // a list of two lists
  EXPECT_EQ(eval(tasks, "@max.items.@count"), QVariant(qlonglong(3)));
  EXPECT_EQ(eval(tasks, "@sum.items.@sum.duration"), QVariant(qlonglong(120)));
  // Nulls are elements too; maps count their keys.
  EXPECT_EQ(eval(QVariantList{1, QVariant(), 3}, "@count"), QVariant(qlonglong(3)));
  EXPECT_EQ(eval(QVariantMap{{"a", 1}, {"b", 2}}, "@count"), QVariant(qlonglong(2)));
}

TEST(KeyPathTest, MaxAndMinReturnTheElementItself) {
  Records records;
  // Mixed number types compare by value and keep their own type in the result.
  const QVariantList numbers{3, decVar("3.5"), QVariant(), 2.75, qlonglong(-1), decVar("3.50")};
  const QVariant max = eval(numbers, "@max");
  ASSERT_TRUE(isDecimal(max));
  EXPECT_TRUE(max.value<Decimal>().isIdenticalTo(dec("3.5")));  // the first of equal extremes
  EXPECT_EQ(eval(numbers, "@min"), QVariant(qlonglong(-1)));

  const QVariantList times{records.make({{"running", false}, {"endDate", dateVar(1000.5)}}),
                           records.make({{"running", true}}),
                           records.make({{"running", false}, {"endDate", dateVar(2000.25)}}),
                           records.make({{"running", false}, {"endDate", dateVar(-5)}})};
  const QVariant latest = eval(times, "@max.endDate");
  ASSERT_EQ(latest.metaType(), QMetaType::fromType<Date>());
  EXPECT_EQ(latest.value<Date>().secondsSince1970(), 2000.25);
  EXPECT_EQ(eval(times, "@min.endDate").value<Date>().secondsSince1970(), -5);
  EXPECT_EQ(QVariantList({eval(times, "@max.running"), eval(times, "@min.running")}),
            QVariantList({true, false}));

  for (const char* path : {"@max", "@min", "@avg", "@max.endDate", "@avg.endDate"})
    EXPECT_FALSE(eval(QVariantList{}, path).isValid()) << path;
  for (const char* path : {"@max.endDate", "@min.endDate", "@avg.endDate"})
    EXPECT_FALSE(eval(QVariantList{QVariant(), records.make({})}, path).isValid()) << path;
}

TEST(KeyPathTest, CompareValuesAcrossTypes) {
  const qlonglong twoTo53 = qlonglong(1) << 53;
  // Null first; integers exact past a double's precision; text case sensitive.
  // clang-format off
  const struct {
    QVariant a, b;
    int expected;
  } cases[] = {
      {QVariant(), -5, -1}, {QVariant(), QString(""), -1}, {QVariant(), QVariant(), 0},
      {12, decVar("12.00"), 0}, {twoTo53 + 1, decVar("9007199254740992"), 1},
      {twoTo53 + 1, double(twoTo53), 1}, {decVar("0.1"), 0.1, 0},
      {decVar("2.5"), decVar("2.49999999999999999999999999"), 1}, {true, 2, -1}, {decVar("-0.5"), 0, -1},
      {std::numeric_limits<qulonglong>::max(), qlonglong(-1), 1}, {QString("apple"), QString("Banana"), 1},
      {dateVar(10.5), dateVar(10.25), 1},
      {dateVar(60), QVariant(QDateTime::fromSecsSinceEpoch(60, Qt::UTC)), 0},
      {QVariant(QDateTime::fromSecsSinceEpoch(59, Qt::UTC)), dateVar(59.5), -1}};
  // clang-format on
  for (const auto& c : cases) {
    EXPECT_EQ(KeyPath::compareValues(c.a, c.b), c.expected) << c.a.toString().toStdString();
    EXPECT_EQ(KeyPath::compareValues(c.b, c.a), -c.expected) << c.a.toString().toStdString();
  }
  EXPECT_EQ(KeyPath::compareValues(QString("apple"), QString("APPLE"), true), 0);
  EXPECT_LT(KeyPath::compareValues(QString("apple"), QString("Banana"), true), 0);
}

// The names of sorted records, in order.
QStringList names(const QVariantList& values) {
  QStringList result;
  for (const QVariant& value : values) result.append(eval(value, "name").toString());
  return result;
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
  using KeyPath::SortDescriptor;
  // clang-format off
  const std::pair<QList<SortDescriptor>, const char*> orders[] = {
      {{{"group", true, true}}, "n1 a1 a2 b1 b2 b3"}, {{{"group", true, false}}, "n1 a1 b2 a2 b1 b3"},
      {{{"group", false, true}}, "b1 b2 b3 a1 a2 n1"},
      {{{"group", true, true}, {"date", false}}, "n1 a2 a1 b1 b3 b2"}, {{}, "b1 a1 n1 b2 a2 b3"}};
  // clang-format on
  for (const auto& [descriptors, expected] : orders)
    EXPECT_EQ(names(KeyPath::sorted(values, descriptors)).join(' '), expected);

  const QVariant acme = records.make({{"name", "acme"}});
  const QVariant zeta = records.make({{"name", "Zeta"}});
  const QVariantList projects{records.make({{"name", "p1"}, {"client", zeta}}),
                              records.make({{"name", "p2"}, {"client", acme}}),
                              records.make({{"name", "p3"}})};
  EXPECT_EQ(names(KeyPath::sorted(projects, {{"client.name", true, true}})), QStringList({"p3", "p2", "p1"}));
  EXPECT_EQ(names(KeyPath::sorted(projects, {{"client.name", true, false}})),
            QStringList({"p3", "p1", "p2"}));

  const QVariantList numbers{3, decVar("1.5"), QVariant(), 2.0};
  EXPECT_EQ(KeyPath::sorted(numbers, {{"", true, false}}), (QVariantList{QVariant(), decVar("1.5"), 2.0, 3}));
}

TEST(KeyPathTest, SortKeepsTheOrderOfEqualKeysInLongLists) {
  // Long enough that an unstable sort would not fall back to insertion sort.
  QVariantList values;
  for (int i = 0; i < 200; ++i) values.append(QVariantMap{{"key", (i * 7) % 5}, {"index", i}});
  const QVariantList result = KeyPath::sorted(values, {{"key", false, false}});
  ASSERT_EQ(result.size(), values.size());
  for (qsizetype i = 1; i < result.size(); ++i) {
    const int previousKey = eval(result[i - 1], "key").toInt();
    const int key = eval(result[i], "key").toInt();
    ASSERT_GE(previousKey, key) << i;
    if (previousKey == key) {
      ASSERT_LT(eval(result[i - 1], "index").toInt(), eval(result[i], "index").toInt()) << i;
    }
  }
}

}  // namespace
