// ObjectIdAndType: an object id with the schema type id it belongs to, and its text form
// ("vask:ch.5 - channel"). A plain copyable value; ToString reads the constant registry only.
#pragma once

#include <cstdint>

#include "sarn/base/Export.h"
#include "vek/VekString.h"

namespace sarn {

struct SARN_EXPORT ObjectIdAndType {
  static const ObjectIdAndType nil;  // both 0

  constexpr ObjectIdAndType() : objectIdM(0), typeIdM(0) {}
  constexpr ObjectIdAndType(uint32_t objectId, uint16_t typeId) : objectIdM(objectId), typeIdM(typeId) {}

  // The type's id prefix (when it has one), the object id in decimal, " - " and the type's
  // name; the empty string when the type id names no type.
  VekString ToString() const;
  bool operator==(const ObjectIdAndType& other) const {
    return objectIdM == other.objectIdM && typeIdM == other.typeIdM;
  }
  bool operator!=(const ObjectIdAndType& other) const { return !(*this == other); }

  uint32_t objectIdM;
  uint16_t typeIdM;
};

}  // namespace sarn
