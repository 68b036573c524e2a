#include "sarn/values/SarnUtil.h"

#include "sarn/model/Schema.h"
#include "sarn/values/internal/LongIdText.h"

namespace sarn {

const char* SarnUtil::GetNamespaceForId(unsigned long long id) {
  unsigned int code = static_cast<unsigned int>(id >> internal::kLongIdShift);
  return code == 0 ? nullptr : internal::FindLongIdPrefix(code);
}

bool SarnUtil::EnumNameToNumber(int enumId, const VekString& name, unsigned int& number) {
  return EnumNameNumber(enumId, name.Utf8(), number);
}

VekString SarnUtil::EnumNumberToName(int enumId, unsigned int number) {
  return VekString(EnumNumberName(enumId, number));
}

}  // namespace sarn
