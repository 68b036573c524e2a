// The text of a field value, which both object writers (JSON and Dictionary) produce, so that the
// JSON text of an object and its Dictionary always agree. Internal to the library.
#pragma once

#include <cstddef>
#include <cstdint>

#include "sarn/model/Schema.h"
#include "vek/VekMempool.h"
#include "vek/VekString.h"

namespace sarn {

class SarnObject;

namespace internal {

// Room for an id text: a 100-byte buffer, so the text holds at most 99 bytes.
constexpr size_t kIdTextRoom = 100;

// One value's text. The bytes are pBytesM[0, nLengthM); where they are those of a string (the
// field's own, or one the formatter had to make), pStringM points at it, so a writer can share
// it instead of copying. isNameM says that the bytes are a constant name of the metadata (an enum
// item), which outlives every writer.
struct FieldText {
  FieldText() = default;
  FieldText(const FieldText&) = delete;
  FieldText& operator=(const FieldText&) = delete;

  const char* pBytesM = nullptr;
  size_t nLengthM = 0;
  const VekString* pStringM = nullptr;
  bool isNameM = false;
  // A text the formatter had to make could not be had (memory ran out); the bytes are then empty
  // and must not be written as the value.
  bool isFailedM = false;
  VekString madeM;
  char roomM[kIdTextRoom];
};

// The text of value `i` of a field whose data type has a text form (every type but the
// dictionaries, objects and lazy payloads): BOOL true/false, numbers in decimal (FLOAT as
// Dict::FormatFloat), byte strings in Base64 (a null one empty), the scalar types' ToString forms,
// enum item names ("INVALID_VALUE:%u" without one), and id texts: the prefix of the type the
// field refers to (looked up in `structDefs`), then the number (as a long id) or the string, cut
// to 99 bytes; "XXX" when the field refers to no type. Strings are their own text. When memory
// runs out for a text that had to be made, text.isFailedM is set.
void FormatFieldText(VekMempool* pool, const StructInfo* const* structDefs, uint32_t nStructDefs,
                     const FieldInfo& field, const SarnObject* object, unsigned i, FieldText& text);

}  // namespace internal
}  // namespace sarn
