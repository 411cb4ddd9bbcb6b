#include "RZString.h"
#include "TessalLogging.h"

#include <QUrl>
#include <QtGlobal>

namespace {

// The characters of `characters` as code points, so a set may hold characters outside the BMP.
bool inSet(char32_t c, const QList<uint>& set) {
  return set.contains(uint(c));
}

// Whole code points of `text` that are not in `set`.
QString withoutCharacters(const QString& text, const QString& characters, bool* removedAny) {
  const QList<uint> set = characters.toUcs4();
  QString out;
  out.reserve(text.size());
  *removedAny = false;
  for (qsizetype i = 0; i < text.size();) {
    char32_t c = text.at(i).unicode();
    qsizetype length = 1;
    if (QChar::isHighSurrogate(c) && i + 1 < text.size() && text.at(i + 1).isLowSurrogate()) {
      c = QChar::surrogateToUcs4(text.at(i), text.at(i + 1));
      length = 2;
    }
    if (inSet(c, set))
      *removedAny = true;
    else
      out.append(QStringView(text).mid(i, length));
    i += length;
  }
  return out;
}

// Reads an optionally signed integer at `pos` after skipping blanks and line breaks; moves `pos` past it.
bool scanInteger(const QString& text, qsizetype& pos) {
  qsizetype i = pos;
  while (i < text.size() && text.at(i).isSpace()) ++i;
  if (i < text.size() && (text.at(i) == u'+' || text.at(i) == u'-')) ++i;
  const qsizetype digits = i;
  while (i < text.size() && text.at(i).isDigit()) ++i;
  if (i == digits) return false;
  pos = i;
  return true;
}

bool isLineTerminator(QChar c) {
  return c == u'\n' || c == u'\r' || c == QChar(0x0085) || c == QChar(0x2028) || c == QChar(0x2029);
}

}  // namespace

namespace RZString {

// An empty prefix or needle never counts as found, as with a search for an empty string.
bool hasCaseInsensitivePrefix(const QString& text, const QString& prefix) {
  if (prefix.isEmpty() || text.size() < prefix.size()) return false;
  return QStringView(text).left(prefix.size()).compare(prefix, Qt::CaseInsensitive) == 0;
}

bool stringContains(const QString& text, const QString& needle) {
  return !needle.isEmpty() && text.contains(needle, Qt::CaseSensitive);
}

bool stringContainsOneSpace(const QString& text) {
  return text.split(u' ').size() == 2;
}

bool stringContainsHyphen(const QString& text) {
  return text.contains(u'\'');
}

// "12 5", "12-5" and " -3 +4x" qualify: two integers read one after the other from the start.
bool stringBeginsWithTwoNumbers(const QString& text) {
  qsizetype pos = 0;
  return scanInteger(text, pos) && scanInteger(text, pos);
}

// Terminators are LF, CR, CR LF, NEL, LINE SEPARATOR and PARAGRAPH SEPARATOR; each stays on its line.
QStringList splitLines(const QString& text) {
  QStringList lines;
  qsizetype start = 0;
  for (qsizetype i = 0; i < text.size(); ++i) {
    if (!isLineTerminator(text.at(i))) continue;
    if (text.at(i) == u'\r' && i + 1 < text.size() && text.at(i + 1) == u'\n') ++i;
    lines.append(text.mid(start, i + 1 - start));
    start = i + 1;
  }
  if (start < text.size()) lines.append(text.mid(start));
  return lines;
}

// Blanks, tabs and line breaks in the Unicode sense (QChar::isSpace).
QString stringByRemovingWhitespace(const QString& text) {
  QString out;
  out.reserve(text.size());
  for (QChar c : text)
    if (!c.isSpace()) out.append(c);
  return out;
}

QString stringByRemovingCharactersFromSet(const QString& text, const QString& characters) {
  bool removedAny = false;
  QString out = withoutCharacters(text, characters, &removedAny);
  return removedAny ? out : text;
}

QString stringByRemovingPathCharacters(const QString& text) {
  return stringByRemovingCharactersFromSet(text, QStringLiteral("/*[]?"));
}

// UTF-8 percent escapes of everything but the unreserved characters and the reserved ones that may stand
// in a URL as they are; "?", "=", "&" and "+" are escaped too so the result can be a query value.
// "%", "#", "[" and "]" and blanks are always escaped.
QString stringByURLEncoding(const QString& text) {
  static const QByteArray kKept = QByteArrayLiteral("!$'()*,/:;@");
  return QString::fromLatin1(QUrl::toPercentEncoding(text, kKept));
}

void removeCharactersInSet(QString& text, const QString& characters) {
  bool removedAny = false;
  QString out = withoutCharacters(text, characters, &removedAny);
  if (removedAny) text = std::move(out);
}

// A replacement that contains the target would be found again forever. Debug builds stop at the
// programming error; release builds refuse and leave the text unchanged.
void replaceAllOccurrenceOfString(QString& text, const QString& target, const QString& replacement) {
  if (target.isEmpty()) return;
  if (replacement.contains(target)) {
    Q_ASSERT_X(false, "NSMutableString(RZAddition)", "replacement contains the target: would never end");
    qCWarning(lcFoundation,
              "replaceAllOccurrenceOfString: replacement contains the target; text left unchanged");
    return;
  }
  // Searching from the start after every replacement lets a replacement join with its neighbours into a
  // new occurrence ("aab" with "ab" -> "a" becomes "ab", then "a").
  for (qsizetype at = text.indexOf(target); at >= 0; at = text.indexOf(target))
    text.replace(at, target.size(), replacement);
}

}  // namespace RZString
