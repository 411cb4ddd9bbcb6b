#pragma once

#include <QString>
#include <QStringList>

// Small string helpers used by editors and importers.
namespace RZString {

bool hasCaseInsensitivePrefix(const QString& text, const QString& prefix);
bool stringContains(const QString& text, const QString& needle);
bool stringContainsOneSpace(const QString& text);
// True when the text holds an apostrophe; the name is historical and kept for callers.
bool stringContainsHyphen(const QString& text);
bool stringBeginsWithTwoNumbers(const QString& text);
QStringList splitLines(const QString& text);  // terminators kept; "" gives no lines
QString stringByRemovingWhitespace(const QString& text);
QString stringByRemovingCharactersFromSet(const QString& text, const QString& characters);
QString stringByRemovingPathCharacters(const QString& text);
QString stringByURLEncoding(const QString& text);
void removeCharactersInSet(QString& text, const QString& characters);
// Replaces the first occurrence until none is left; the replacement must not contain the target.
void replaceAllOccurrenceOfString(QString& text, const QString& target, const QString& replacement);

}  // namespace RZString
