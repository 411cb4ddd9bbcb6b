#pragma once

#include <QString>
#include <QStringView>
#include <QVariant>

#include <optional>

// How time entries are billed: each entry's minutes rounded to a multiple of `minutes` by `mode`. A rule
// of 1 minute (or less) bills the minutes as they are. Clients, projects and tasks may each set the
// minutes and the mode, each inherited on its own from above where not set; the preferences stand at the
// top.
struct WTRoundingRule {
  enum class Mode : unsigned char { Up, Nearest, Down };

  int minutes = 1;
  Mode mode = Mode::Nearest;

  // `duration` rounded by the rule: "up" to the next multiple, "down" to the one below, "nearest" to the
  // closer one (a half goes up). A negative duration is rounded as its length and keeps its sign.
  int apply(int duration) const;

  // "up", "nearest", "down"; none for any other text.
  static std::optional<Mode> modeFromName(QStringView name);
  static QString nameOfMode(Mode mode);
  // This rule with what a record sets itself in its stored keys: minutes above 0 and a known mode take
  // the place of this rule's own (0, none or another text inherit them).
  WTRoundingRule refinedBy(const std::optional<qint64>& ownMinutes, const QString& ownMode) const;
  // A mode as a record stores it: a known name, or a null text for none (a null or empty value); none for
  // anything else, which is refused.
  static std::optional<QString> storedMode(const QVariant& value);
  // {"minutes": 15, "mode": "up"}, for templates.
  QVariantMap toVariantMap() const;
  // "15 up", or "none" for a rule that bills the minutes as they are; the spreadsheet export's text.
  QString toText() const;
  // A rule from toText()'s text; none for any other.
  static std::optional<WTRoundingRule> fromText(QStringView text);
  // Whether two rules bill every duration alike (all rules of a minute or less do).
  bool billsLike(const WTRoundingRule& other) const {
    return minutes <= 1 ? other.minutes <= 1 : *this == other;
  }

  friend bool operator==(const WTRoundingRule&, const WTRoundingRule&) = default;
};
