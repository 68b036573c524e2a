// Id and enum texts shared by the object writers, so the JSON text and the Dictionary of an object
// always agree on them. Built by hand rather than with snprintf ("%s%s" into 100 bytes), with the
// same bytes: a prefix, then the rest up to its first NUL, cut to 99 bytes.
#include "sarn/objects/internal/ObjectText.h"

#include <cstdio>
#include <cstring>

#include "sarn/dict/Dict.h"
#include "sarn/model/FieldAccess.h"
#include "sarn/values/internal/LongIdText.h"

namespace sarn {
namespace internal {

namespace {

// Appends up to the room left (one byte is kept for the NUL).
void Put(char (&text)[kIdTextRoom], size_t& length, const char* bytes, size_t n) {
  size_t room = sizeof text - 1 - length;
  if (n > room) n = room;
  std::memcpy(text + length, bytes, n);
  length += n;
}

void PutLongId(char (&text)[kIdTextRoom], size_t& length, uint64_t id) {
  char digits[kLongIdTextRoom];
  Put(text, length, digits, FormatLongIdInto(digits, id));
}

}  // namespace

size_t FormatIdText(VekMempool* pool, const StructInfo* const* structDefs, uint32_t nStructDefs,
                    const FieldInfo& field, const SarnObject* object, unsigned i, char (&text)[kIdTextRoom]) {
  (void)pool;
  size_t length = 0;
  const StructInfo* target = field.refIndex != 0 && field.refIndex < nStructDefs ? structDefs[field.refIndex] : nullptr;
  if (target == nullptr) {
    Put(text, length, "XXX", 3);
  } else {
    if (target->pIdPrefix != nullptr) Put(text, length, target->pIdPrefix, std::strlen(target->pIdPrefix));
    if (field.dataType == SARN_DATA_TYPE_STRING_ID) {
      const char* rest = FieldAccess::StringAt(object, field, i).Utf8();
      Put(text, length, rest, std::strlen(rest));
    } else {
      PutLongId(text, length,
                field.dataType == SARN_DATA_TYPE_INT_ID ? FieldAccess::ScalarValue<uint32_t>(object, field, i)
                                                        : FieldAccess::ScalarValue<uint64_t>(object, field, i));
    }
  }
  text[length] = '\0';
  return length;
}

size_t FormatInvalidEnum(uint32_t value, char (&text)[32]) {
  return static_cast<size_t>(std::snprintf(text, sizeof text, "INVALID_VALUE:%u", value));
}

}  // namespace internal
}  // namespace sarn
