// SarnObject holds nothing but its type id; the generated classes own their fields.
#include "sarn/model/SarnObject.h"

namespace sarn {

SarnObject::~SarnObject() {}

VekString SarnObject::GetTypeName() const {
  const StructInfo* info = GetStructInfo();
  return info != nullptr ? VekString(info->pName) : VekString();
}

void SarnObject::SetDebugLockOwner(VekLockId) {}

}  // namespace sarn
