#include "sarn/values/SarnUtil.h"

#include "sarn/dict/Dict.h"
#include "sarn/model/Schema.h"

namespace sarn {

const char* SarnUtil::GetNamespaceForId(unsigned long long id) {
  unsigned int code = static_cast<unsigned int>(id >> 48);
  if (code == 0) return nullptr;
  for (const LongIdPrefix& row : longIdPrefixesG) {
    if (row.codeM == code) return row.pPrefixM;
  }
  return nullptr;
}

bool SarnUtil::EnumNameToNumber(int enumId, const VekString& name, unsigned int& number) {
  return EnumNameNumber(enumId, name.Utf8(), number);
}

VekString SarnUtil::EnumNumberToName(int enumId, unsigned int number) {
  return VekString(EnumNumberName(enumId, number));
}

}  // namespace sarn
