// Internal: what the two files of the JSON-to-object reader share (the reading side of
// JsonSarnObject): the converter's read state with its per-type field-name indexes, and the
// Reader, whose functions do the work on plain object pointers. Not installed.
#pragma once

#include <cstdint>
#include <cstring>

#include "sarn/json/JsonSarnObject.h"
#include "sarn/json/internal/JsonTokenScan.h"
#include "vek/VekMempool.h"

namespace sarn {
namespace internal {

inline void Append(VekMempool* pool, VekString& error, const char* piece, size_t n) {
  error = VekString::Format(pool, "%s%.*s", error.Utf8(), static_cast<int>(n), piece);
}
inline void Append(VekMempool* pool, VekString& error, const char* piece) { Append(pool, error, piece, std::strlen(piece)); }

// Skip, then take one byte (0 at the end of the input).
inline char Take(InputPointerBytesource& input) {
  Skip(input);
  return input.Next();
}
inline char SkipPeek(InputPointerBytesource& input) {
  Skip(input);
  return input.Peek();
}
inline bool IsAlnum(char c) { return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z'); }

// A hash of a name from its length and three of its bytes: field names of one type rarely share
// all four, and probing sorts out the rest.
inline uint32_t NameHash(const unsigned char* p, size_t n) {
  if (n == 0) return 0;
  uint32_t h = static_cast<uint32_t>(n) * 0x9E3779B1u ^ (p[0] | p[n / 2] << 8 | p[n - 1] << 16);
  return (h * 0x85EBCA6Bu) >> 7;
}


}  // namespace internal


// Scratch kept by a converter between reads (in the default pool, like vObjectTypesM, so that a
// read leaves the caller's pool as it found it): a field-name index per type met, the keys of
// the members being read (for messages), and the state of the current read.
struct JsonSarnObject::ReadState {
  // One slot per field name: the field, its name and length, and the name's first eight bytes as
  // a number, so that most keys are matched without touching the schema's tables.
  struct NameSlot {
    const FieldInfo* pFieldM;  // null for an empty slot
    const char* pNameM;
    uint64_t headM;
    size_t nM;
  };
  struct NameIndex {
    const StructInfo* pTypeM;
    NameSlot* vSlotM;
    uint32_t maskM;
  };
  static constexpr unsigned kIndexes = 64;
  NameIndex vIndexM[kIndexes];
  char* pKeysM;  // the keys of the members open, end to end
  size_t nKeysM;
  size_t capKeysM;
  bool isFirstPassM;      // array elements may be separated by whitespace alone
  bool isDepthRefusedM;   // the nesting limit refused a container: its message must reach the caller
  VekString holdM;        // the text of the last token that could not be read in place

  // The field named [key, key + n) of `type`, or null. A key never holds a NUL (the token reader
  // refuses one in a quoted string and ends a bare token there).
  // `limit` ends the readable bytes around the key (at least key + n).
  const FieldInfo* Find(const StructInfo* type, const unsigned char* key, size_t n, const unsigned char* limit) {
    NameIndex& index = vIndexM[(reinterpret_cast<uintptr_t>(type) >> 4) % kIndexes];
    if (index.pTypeM != type && !Build(index, type)) return LinearFind(type, key, n);
    uint64_t head;
#if defined(__BYTE_ORDER__) && __BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__
    if (limit - key >= 8) {  // one load, the bytes past the key masked off
      std::memcpy(&head, key, 8);
      if (n < 8) head &= (uint64_t{1} << (8 * n)) - 1;
    } else {
      head = Head(key, n);
    }
#else
    head = Head(key, n);
#endif
    for (uint32_t slot = internal::NameHash(key, n) & index.maskM;; slot = (slot + 1) & index.maskM) {
      const NameSlot& entry = index.vSlotM[slot];
      if (entry.pFieldM == nullptr) return nullptr;
      if (entry.nM == n && entry.headM == head && (n <= 8 || SameBytes(entry.pNameM + 8, key + 8, n - 8))) {
        return entry.pFieldM;
      }
    }
  }
  // The first (up to) eight bytes of a name, the first in the lowest byte.
  static uint64_t Head(const unsigned char* p, size_t n) {
    uint64_t head = 0;
    for (size_t i = 0; i < n && i < 8; ++i) head |= static_cast<uint64_t>(p[i]) << (8 * i);
    return head;
  }
  // Field names are short: a loop beats a call.
  static bool SameBytes(const char* name, const unsigned char* key, size_t n) {
    for (size_t i = 0; i < n; ++i) {
      if (static_cast<unsigned char>(name[i]) != key[i]) return false;
    }
    return true;
  }
  static const FieldInfo* LinearFind(const StructInfo* type, const unsigned char* key, size_t n) {
    for (unsigned i = 0; i < type->nFieldInfo; ++i) {
      const FieldInfo& field = type->vFieldInfo[i];
      if (field.arity == SARN_ARITY_NONE) continue;
      const char* name = FieldName(type, field);
      if (std::strncmp(name, reinterpret_cast<const char*>(key), n) == 0 && name[n] == '\0') {
        return &field;
      }
    }
    return nullptr;
  }
  // Fills `index` for `type`, keeping the first field of each name; false when memory runs out
  // (the caller then searches linearly).
  bool Build(NameIndex& index, const StructInfo* type) {
    uint32_t size = 8;
    while (size < 2u * type->nFieldInfo) size *= 2;
    auto* slots = static_cast<NameSlot*>(VekMempool::Default()->Calloc(size, sizeof(NameSlot)));
    if (slots == nullptr) return false;
    VekMempool::Default()->Free(index.vSlotM);
    index.pTypeM = type;
    index.vSlotM = slots;
    index.maskM = size - 1;
    for (unsigned i = 0; i < type->nFieldInfo; ++i) {
      const FieldInfo& field = type->vFieldInfo[i];
      if (field.arity == SARN_ARITY_NONE) continue;
      const char* name = FieldName(type, field);
      size_t n = std::strlen(name);
      const auto* bytes = reinterpret_cast<const unsigned char*>(name);
      for (uint32_t slot = internal::NameHash(bytes, n) & index.maskM;; slot = (slot + 1) & index.maskM) {
        if (slots[slot].pFieldM == nullptr) {
          slots[slot] = NameSlot{&field, name, Head(bytes, n), n};
          break;
        }
        if (std::strcmp(slots[slot].pNameM, name) == 0) break;  // the first stays
      }
    }
    return true;
  }
  // Remembers a key; returns its offset, or -1 when memory runs out.
  long PushKey(const unsigned char* key, size_t n) {
    if (nKeysM + n > capKeysM) {
      size_t capacity = capKeysM * 2 + n + 64;
      auto* keys = static_cast<char*>(VekMempool::Default()->Realloc(pKeysM, capacity));
      if (keys == nullptr) return -1;
      pKeysM = keys;
      capKeysM = capacity;
    }
    if (n != 0) std::memcpy(pKeysM + nKeysM, key, n);  // an empty key before any other has no buffer yet
    long at = static_cast<long>(nKeysM);
    nKeysM += n;
    return at;
  }
};

// Hidden: its functions call each other directly rather than through the library's symbol table.
class __attribute__((visibility("hidden"))) JsonSarnObject::Reader {
 public:
  static bool Object(JsonSarnObject& self, int depth, InputPointerBytesource& input, const StructInfo* type,
                     ref<SarnObject>* result, VekString& error);
  static bool Value(JsonSarnObject& self, int depth, InputPointerBytesource& input, const FieldInfo* field,
                    SarnObject* object, VekString& error);
  static bool Single(JsonSarnObject& self, int depth, InputPointerBytesource& input, const FieldInfo* field,
                     SarnObject* object, VekString& error);
  static bool Multi(JsonSarnObject& self, int depth, InputPointerBytesource& input, const FieldInfo* field,
                    SarnObject* object, VekString& error);
  static bool Array(JsonSarnObject& self, int depth, InputPointerBytesource& input, const FieldInfo* field,
                    SarnObject* object, VekString& error);
  static bool Element(JsonSarnObject& self, int depth, InputPointerBytesource& input, const FieldInfo* field,
                      SarnObject* object, VekString& error);
  static bool AnyValue(JsonSarnObject& self, int depth, InputPointerBytesource& input, dictvalue::Type& type,
                       VekString& text, ref<Dict>& dict, VekString& error);
  static bool AnyField(JsonSarnObject& self, int depth, InputPointerBytesource& input, const ref<Dict>& dict,
                       VekString& error);
  static bool TwoPass(JsonSarnObject& self, InputPointerBytesource& first, InputPointerBytesource& second,
                      ref<SarnObject>* result, VekString& error);
  static ReadState* State(JsonSarnObject& self);
  // True when the read state exists; otherwise "Out of memory." is appended to `error`.
  static bool Ready(JsonSarnObject& self, VekString& error);

 private:
  // One value of a field that holds no objects, converted and stored (a single field) or appended.
  static bool Scalar(JsonSarnObject& self, InputPointerBytesource& input, const FieldInfo& field, SarnObject* object,
                     VekString& error);
  static bool Member(JsonSarnObject& self, int depth, InputPointerBytesource& input, const FieldInfo* field,
                     SarnObject* object, VekString& error);
  static bool Store(JsonSarnObject& self, bool isStored, const FieldInfo& field, SarnObject* object,
                    VekString& error);
  static bool Nested(JsonSarnObject& self, int depth, InputPointerBytesource& input, const FieldInfo& field,
                     SarnObject* object, VekString& error, const char* multiWords);
  static bool Lazy(JsonSarnObject& self, int depth, InputPointerBytesource& input, const FieldInfo& field,
                   SarnObject* object, VekString& error, bool isMulti);
  static bool FreeForm(JsonSarnObject& self, int depth, InputPointerBytesource& input, const FieldInfo& field,
                       SarnObject* object, VekString& error);
  static bool TooDeep(JsonSarnObject& self, int level, VekString& error);
  // The first pass's value of a "type" member, looked up and recorded for object `ordinal`. Kept
  // out of Object, whose frame is paid once per nesting level.
  static bool RecordType(JsonSarnObject& self, InputPointerBytesource& input, uint32_t ordinal, VekString& error)
      __attribute__((noinline));
  // An inner text that the Part drops is kept when it carries the depth message.
  static void Discard(JsonSarnObject& self, VekString& error, const VekString& inner) {
    if (State(self)->isDepthRefusedM) internal::Append(self.pMempoolM, error, inner.Utf8(), inner.NByte());
  }
  // A message that replaces the inner one, unless that carries the depth message.
  static void Replace(JsonSarnObject& self, VekString& error, const char* text) {
    if (State(self)->isDepthRefusedM) {
      internal::Append(self.pMempoolM, error, text);
    } else {
      error = VekString::Format(self.pMempoolM, "%s", text);
    }
  }
};


}  // namespace sarn
