#pragma once

#include <QMetaType>

// The kinds of number a QVariant can hold, by type id, for the code that reads values it did not make
// (key paths, the template engine). Decimal is not among them: callers ask for it by its own type.
namespace VariantNumbers {

inline bool isSignedInteger(int typeId) {
  switch (typeId) {
    case QMetaType::Int:
    case QMetaType::LongLong:
    case QMetaType::Long:
    case QMetaType::Short:
    case QMetaType::Char:
    case QMetaType::SChar:
      return true;
    default:
      return false;
  }
}

inline bool isUnsignedInteger(int typeId) {
  switch (typeId) {
    case QMetaType::UInt:
    case QMetaType::ULongLong:
    case QMetaType::ULong:
    case QMetaType::UShort:
    case QMetaType::UChar:
      return true;
    default:
      return false;
  }
}

inline bool isFloatingPoint(int typeId) {
  return typeId == QMetaType::Double || typeId == QMetaType::Float;
}

}  // namespace VariantNumbers
