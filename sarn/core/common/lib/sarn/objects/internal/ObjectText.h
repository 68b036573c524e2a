// The text forms of enum and id values that both object writers (JSON and Dictionary) produce.
// Internal to the library.
#pragma once

#include <cstddef>
#include <cstdint>

#include "sarn/model/Schema.h"
#include "vek/VekMempool.h"

namespace sarn {

class SarnObject;

namespace internal {

// Room for an id text: a 100-byte buffer, so the text holds at most 99 bytes.
constexpr size_t kIdTextRoom = 100;

// Value `i` of an INT_ID, LONG_ID or STRING_ID field as its id text: the prefix of the type that
// the field refers to (looked up in `structDefs`), then the number (as a long id) or the string;
// "XXX" when the field refers to no type. A type without a prefix contributes nothing. Returns
// the length, at most 99; the text is NUL-terminated.
size_t FormatIdText(VekMempool* pool, const StructInfo* const* structDefs, uint32_t nStructDefs,
                    const FieldInfo& field, const SarnObject* object, unsigned i, char (&text)[kIdTextRoom]);

// The name of `value` in the enum the field refers to, or null when it has none.
inline const char* EnumText(const FieldInfo& field, uint32_t value) { return EnumNumberName(field.refIndex, value); }

// "INVALID_VALUE:" and the number, for an enum value without a name; returns the length.
size_t FormatInvalidEnum(uint32_t value, char (&text)[32]);

}  // namespace internal
}  // namespace sarn
