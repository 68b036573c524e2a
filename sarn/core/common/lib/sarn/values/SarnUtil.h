// SarnUtil: enum names and numbers against the schema registry, and the namespace of a long
// identifier. Reads constant tables only: no lock, reentrant.
#pragma once

#include "sarn/base/Export.h"
#include "vek/VekString.h"

namespace sarn {

class SARN_EXPORT SarnUtil {
 public:
  // The prefix of the identifier's top 16 bits ("rs", ..., "vod"); null when they are 0 or no
  // prefix has that code.
  static const char* GetNamespaceForId(unsigned long long id);
  // The number of the enum value named `name`; false, leaving `number` alone, for an unknown
  // enum or name.
  static bool EnumNameToNumber(int enumId, const VekString& name, unsigned int& number);
  // The name of value `number`; the empty string for an unknown enum or number.
  static VekString EnumNumberToName(int enumId, unsigned int number);
};

}  // namespace sarn
