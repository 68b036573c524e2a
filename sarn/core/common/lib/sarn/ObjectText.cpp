// Id and enum texts shared by the object writers, so the JSON text and the Dictionary of an object
// always agree on them.
#include "sarn/internal/ObjectText.h"

#include <cstdio>

#include "sarn/Dict.h"
#include "sarn/FieldAccess.h"

namespace sarn {
namespace internal {

size_t FormatIdText(VekMempool* pool, const StructInfo* const* structDefs, uint32_t nStructDefs,
                    const FieldInfo& field, const SarnObject* object, unsigned i, char (&text)[kIdTextRoom]) {
  const StructInfo* target = field.refIndex != 0 && field.refIndex < nStructDefs ? structDefs[field.refIndex] : nullptr;
  int length;
  if (target == nullptr) {
    length = std::snprintf(text, sizeof text, "XXX");
  } else {
    const char* prefix = target->pIdPrefix != nullptr ? target->pIdPrefix : "";
    if (field.dataType == SARN_DATA_TYPE_STRING_ID) {
      length = std::snprintf(text, sizeof text, "%s%s", prefix, FieldAccess::StringAt(object, field, i).Utf8());
    } else {
      uint64_t value = field.dataType == SARN_DATA_TYPE_INT_ID ? FieldAccess::ScalarValue<uint32_t>(object, field, i)
                                                                : FieldAccess::ScalarValue<uint64_t>(object, field, i);
      length = std::snprintf(text, sizeof text, "%s%s", prefix, Dict::FormatLongId(pool, value).Utf8());
    }
  }
  if (length < 0) return 0;
  return static_cast<size_t>(length) < sizeof text ? static_cast<size_t>(length) : sizeof text - 1;
}

size_t FormatInvalidEnum(uint32_t value, char (&text)[32]) {
  return static_cast<size_t>(std::snprintf(text, sizeof text, "INVALID_VALUE:%u", value));
}

}  // namespace internal
}  // namespace sarn
