// The JSON-to-object reader: two passes over the same text, the first recording each object's
// type by ordinal, the second creating the objects and reading members straight into fields.
//
// The public members keep the interface's shape (the object as a counted pointer); the work is
// done by the Reader's functions on plain pointers, so that reading a member costs no reference
// count traffic. `depth` everywhere is the number of containers open around the value read.
//
// Speed: the first pass makes no string except for the rare token that crosses a block or holds
// an escape; keys are compared in place through a per-type name index (built once per converter
// and type, giving the first field of that name whose arity is not NONE, as a linear search
// would); plain numbers are converted directly where that gives sscanf's value.
#include <cstring>
#include <new>

#include "sarn/dict/LazyDict.h"
#include "sarn/json/JsonSarnObject.h"
#include "sarn/json/internal/JsonNumberText.h"
#include "sarn/json/internal/JsonTokenScan.h"
#include "sarn/model/FieldAccess.h"
#include "sarn/model/StructInfoMap.h"
#include "sarn/objects/DictionarySarnObject.h"
#include "sarn/values/Base64.h"
#include "sarn/values/ScalarTypes.h"
#include "wynbaselib/Bytestream.h"

namespace sarn {

using internal::ReadToken;
using internal::SkipToken;
using internal::TokenText;

namespace {

const char kNotObjectStartG[] = "JSON object does not start with '{'.";
const char kNotObjectEndG[] = "JSON object does not end with '}'.";
const char kNoFactoryG[] = "Failed to create sarn object";
const char kBadKeyG[] = "Failed to parse a fieldName key.";
const char kNoColonG[] = "JSON field name must be followed by a colon.";
const char kBadTypeG[] = "Can't parse type.";
const char kForKeyG[] = " Failed to parse value for key ";
const char kSingleFailedG[] = " failed to UnmarshalOneSingleValue in ReadFieldValue";
const char kArrayForSingleG[] = "Array value given for a single field.";
const char kBadFirstElementG[] = " Failed to parse an array element.";
const char kBadElementG[] = " Failed to parse an array member.";
const char kNoArrayEndG[] = "Array must end with ']'.";
const char kMultiFailedG[] = " failed to UnmarshalOneMultiValue in AVReadFieldValue";
const char kKnownDictMultiG[] = " failed to Unmarshal KNOWN_DICT in Multi";
const char kSubdictMultiG[] = " failed to Unmarshal TYPE_OBJECT in Multi";
const char kLazySingleG[] = " Single SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY can't Unmarshal";
const char kLazyMultiG[] = " Multi SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY can't unmarshal";
const char kNullLazyG[] = "null lazy dict";
const char kBadAnyFieldG[] = "bad field in AnyDictValue";
const char kAnyNoEndG[] = "expected , or }";
const char kAnyBadStringG[] = "failed to read string in UnmarshalAnyDictValue";
const char kAnyBadNameG[] = "UnmarshalAnyDictField can't read fieldName";
const char kAnyNoColonG[] = "UnmarshalAnyDictField expected :";
const char kAnyBadValueG[] = "bad value in AnyDictField";
const char kNoDuplicateG[] = "Byte source cannot be duplicated.";
const char kNegativeLengthG[] = "Negative JSON length.";

void Append(VekMempool* pool, VekString& error, const char* piece, size_t n) {
  error = VekString::Format(pool, "%s%.*s", error.Utf8(), static_cast<int>(n), piece);
}
void Append(VekMempool* pool, VekString& error, const char* piece) { Append(pool, error, piece, std::strlen(piece)); }

// Skip, then take one byte (0 at the end of the input).
inline char Take(InputPointerBytesource& input) {
  input.SkipWhitespace();
  return input.Next();
}
inline char SkipPeek(InputPointerBytesource& input) {
  input.SkipWhitespace();
  return input.Peek();
}
inline bool IsAlnum(char c) { return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z'); }

// Writes to two sinks: an echo already running on the cursor and the capture of a lazy member.
struct TeeSink : wynbaselib::Bytesink {
  TeeSink(wynbaselib::Bytesink* first, wynbaselib::Bytesink* second) : pFirstM(first), pSecondM(second) {}
  bool Write(const char* data, size_t size) override {
    bool isOk = pFirstM->Write(data, size);
    return pSecondM->Write(data, size) && isOk;
  }
  bool Flush() override { return pFirstM->Flush() && pSecondM->Flush(); }
  wynbaselib::Bytesink* pFirstM;
  wynbaselib::Bytesink* pSecondM;
};

// FNV-1a over the bytes of a name.
inline uint32_t NameHash(const unsigned char* p, size_t n) {
  uint32_t h = 2166136261u;
  for (size_t i = 0; i < n; ++i) h = (h ^ p[i]) * 16777619u;
  return h;
}

}  // namespace

// Scratch kept by a converter between reads (in the default pool, like vObjectTypesM, so that a
// read leaves the caller's pool as it found it): a field-name index per type met, the keys of
// the members being read (for messages), and the state of the current read.
struct JsonSarnObject::ReadState {
  struct NameIndex {
    const StructInfo* pTypeM;
    uint16_t* vSlotM;  // field number + 1, 0 for an empty slot
    uint32_t maskM;
  };
  static constexpr unsigned kIndexes = 64;
  NameIndex vIndexM[kIndexes];
  char* pKeysM;  // the keys of the members open, end to end
  size_t nKeysM;
  size_t capKeysM;
  bool isFirstPassM;      // array elements may be separated by whitespace alone
  bool isDepthRefusedM;   // the nesting limit refused a container: its message must reach the caller

  // The field named [key, key + n) of `type`, or null. A key never holds a NUL (the token reader
  // refuses one in a quoted string and ends a bare token there).
  const FieldInfo* Find(const StructInfo* type, const unsigned char* key, size_t n) {
    NameIndex& index = vIndexM[(reinterpret_cast<uintptr_t>(type) >> 4) % kIndexes];
    if (index.pTypeM != type && !Build(index, type)) return LinearFind(type, key, n);
    for (uint32_t slot = NameHash(key, n) & index.maskM;; slot = (slot + 1) & index.maskM) {
      unsigned entry = index.vSlotM[slot];
      if (entry == 0) return nullptr;
      const FieldInfo& field = type->vFieldInfo[entry - 1];
      const char* name = FieldName(type, field);
      if (std::strncmp(name, reinterpret_cast<const char*>(key), n) == 0 && name[n] == '\0') {
        return &field;
      }
    }
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
    auto* slots = static_cast<uint16_t*>(VekMempool::Default()->Calloc(size, sizeof(uint16_t)));
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
      for (uint32_t slot = NameHash(reinterpret_cast<const unsigned char*>(name), n) & index.maskM;;
           slot = (slot + 1) & index.maskM) {
        if (slots[slot] == 0) {
          slots[slot] = static_cast<uint16_t>(i + 1);
          break;
        }
        if (std::strcmp(FieldName(type, type->vFieldInfo[slots[slot] - 1]), name) == 0) break;  // the first stays
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
    if (n != 0) std::memcpy(pKeysM + nKeysM, key, n);  // an empty key may come with no bytes at all
    long at = static_cast<long>(nKeysM);
    nKeysM += n;
    return at;
  }
};

void JsonSarnObject::ReleaseReadState() {
  if (pReadStateM == nullptr) return;
  for (auto& index : pReadStateM->vIndexM) VekMempool::Default()->Free(index.vSlotM);
  VekMempool::Default()->Free(pReadStateM->pKeysM);
  VekMempool::Default()->Free(pReadStateM);
  pReadStateM = nullptr;
}

class JsonSarnObject::Reader {
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

 private:
  // One value of a field that holds no objects, converted and stored (a single field) or appended.
  static bool Scalar(JsonSarnObject& self, InputPointerBytesource& input, const FieldInfo& field, SarnObject* object,
                     VekString& error);
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
    if (State(self)->isDepthRefusedM) Append(self.pMempoolM, error, inner.Utf8(), inner.NByte());
  }
  // A message that replaces the inner one, unless that carries the depth message.
  static void Replace(JsonSarnObject& self, VekString& error, const char* text) {
    if (State(self)->isDepthRefusedM) {
      Append(self.pMempoolM, error, text);
    } else {
      error = VekString::Format(self.pMempoolM, "%s", text);
    }
  }
};

JsonSarnObject::ReadState* JsonSarnObject::Reader::State(JsonSarnObject& self) {
  if (self.pReadStateM == nullptr) {
    self.pReadStateM = static_cast<ReadState*>(VekMempool::Default()->Calloc(sizeof(ReadState)));
  }
  return self.pReadStateM;
}

bool JsonSarnObject::Reader::TooDeep(JsonSarnObject& self, int level, VekString& error) {
  if (level <= self.limitsM.maxDepthM) return false;
  VekString message = VekString::Format(self.pMempoolM, kJsonDepthLimitFormat, self.limitsM.maxDepthM);
  Append(self.pMempoolM, error, message.Utf8(), message.NByte());
  State(self)->isDepthRefusedM = true;
  return true;
}

bool JsonSarnObject::Reader::RecordType(JsonSarnObject& self, InputPointerBytesource& input, uint32_t ordinal,
                                        VekString& error) {
  TokenText name;
  if (!ReadToken(self.pMempoolM, input, name)) {
    Append(self.pMempoolM, error, kBadTypeG);
    return false;
  }
  // Type names are letters and digits: a name holding a NUL (through no escape) names no type.
  const StructInfo* named = nullptr;
  if (std::memchr(name.pM, 0, name.nM) == nullptr) {
    char text[128];
    if (name.nM < sizeof text) {
      std::memcpy(text, name.pM, name.nM);
      text[name.nM] = '\0';
      named = StructInfoMap::LookupStructByName(text);
    } else {
      VekString copy = name.holdM.FEmpty() ? VekString::FromUtf8Bytes(self.pMempoolM, name.nM, name.pM) : name.holdM;
      named = StructInfoMap::LookupStructByName(copy.Utf8());
    }
  }
  std::memcpy(self.vObjectTypesM.Get(static_cast<int>(ordinal)), &named, sizeof named);
  return true;
}

// ---- Objects ----------------------------------------------------------------------------------

bool JsonSarnObject::Reader::Object(JsonSarnObject& self, int depth, InputPointerBytesource& input,
                                    const StructInfo* type, ref<SarnObject>* result, VekString& error) {
  VekMempool* pool = self.pMempoolM;
  ReadState* state = State(self);
  uint32_t ordinal = self.nObjectIndexM++;
  bool isFirstPass = ordinal >= self.vObjectTypesM.Count();
  if (isFirstPass) {
    const void* none = nullptr;
    if (self.vObjectTypesM.Count() == VekGenericIntArray::kMaxCount) {
      Append(pool, error, kJsonObjectCountLimitMessage);
      return false;
    }
    if (!self.vObjectTypesM.Add(&none)) {
      Append(pool, error, kOutOfMemoryMessage);
      return false;
    }
  }
  if (Take(input) != '{') {
    Append(pool, error, kNotObjectStartG);
    return false;
  }
  if (TooDeep(self, depth + 1, error)) return false;
  ref<SarnObject> object;
  if (!isFirstPass && type != nullptr) {
    object = type->pFactory(pool);
    if (!object) {
      Append(pool, error, kNoFactoryG);
      return false;
    }
  }
  size_t keysAtStart = state->nKeysM;
  for (;;) {
    char c = SkipPeek(input);
    if (c != '"' && !IsAlnum(c)) break;
    TokenText key;
    if (!ReadToken(pool, input, key)) {
      Append(pool, error, kBadKeyG);
      return false;
    }
    const FieldInfo* field = object ? state->Find(type, key.pM, key.nM) : nullptr;
    bool isType = isFirstPass && key.Is("type", 4);
    long keyAt = state->PushKey(key.pM, key.nM);
    if (keyAt < 0) {
      Append(pool, error, kOutOfMemoryMessage);
      return false;
    }
    size_t keyLength = key.nM;
    key.holdM = VekString();
    if (Take(input) != ':') {
      Append(pool, error, kNoColonG);
      return false;
    }
    if (field != nullptr && field->arity == SARN_ARITY_OPTIONAL && field->flagOffset != 0) {
      MarkFieldPresent(object.Get(), *field);
    }
    if (isType) {
      if (!RecordType(self, input, ordinal, error)) return false;
    } else if (!Value(self, depth + 1, input, field, object.Get(), error)) {
      Append(pool, error, kForKeyG);
      Append(pool, error, state->pKeysM + keyAt, keyLength);
      return false;
    }
    state->nKeysM = keysAtStart;
    if (SkipPeek(input) != ',') break;
    input.Next();
  }
  if (Take(input) != '}') {
    Append(pool, error, kNotObjectEndG);
    return false;
  }
  if (result != nullptr) *result = static_cast<ref<SarnObject>&&>(object);
  return true;
}

bool JsonSarnObject::Reader::Value(JsonSarnObject& self, int depth, InputPointerBytesource& input,
                                   const FieldInfo* field, SarnObject* object, VekString& error) {
  bool isBracket = SkipPeek(input) == '[';
  if (isBracket && field != nullptr && field->arity != SARN_ARITY_MULTI) {
    Append(self.pMempoolM, error, kArrayForSingleG);
    return false;
  }
  if (isBracket || (field != nullptr && field->arity == SARN_ARITY_MULTI)) {
    return Array(self, depth, input, field, object, error);
  }
  if (Single(self, depth, input, field, object, error)) return true;
  Append(self.pMempoolM, error, kSingleFailedG);
  return false;
}

// ---- Arrays -----------------------------------------------------------------------------------

bool JsonSarnObject::Reader::Array(JsonSarnObject& self, int depth, InputPointerBytesource& input,
                                   const FieldInfo* field, SarnObject* object, VekString& error) {
  VekMempool* pool = self.pMempoolM;
  bool isBracketed = SkipPeek(input) == '[';
  if (isBracketed) {
    input.Next();
    if (TooDeep(self, depth + 1, error)) return false;
    ++depth;
  }
  if (SkipPeek(input) == ']') {
    if (isBracketed) input.Next();
    return true;
  }
  if (!Element(self, depth, input, field, object, error)) {
    Append(pool, error, kBadFirstElementG);
    return false;
  }
  if (!isBracketed) return true;
  const bool isLoose = State(self)->isFirstPassM;
  for (;;) {
    char c = SkipPeek(input);
    if (c == ',') {
      input.Next();
    } else if (!isLoose || c == ']' || c == 0) {
      break;
    }
    // In the first pass an element may follow after whitespace alone; one that reads nothing
    // ends the walk.
    uint64_t before = input.BytesDelivered() - static_cast<uint64_t>(input.pEndM - input.pCurM);
    if (!Element(self, depth, input, field, object, error)) {
      Append(pool, error, kBadElementG);
      return false;
    }
    uint64_t after = input.BytesDelivered() - static_cast<uint64_t>(input.pEndM - input.pCurM);
    if (c != ',' && before == after) break;
  }
  if (Take(input) != ']') {
    Append(pool, error, kNoArrayEndG);
    return false;
  }
  return true;
}

bool JsonSarnObject::Reader::Element(JsonSarnObject& self, int depth, InputPointerBytesource& input,
                                     const FieldInfo* field, SarnObject* object, VekString& error) {
  if (SkipPeek(input) == '[') return Array(self, depth, input, field, object, error);
  if (Multi(self, depth, input, field, object, error)) return true;
  Append(self.pMempoolM, error, kMultiFailedG);
  return false;
}

// ---- Values -----------------------------------------------------------------------------------

bool JsonSarnObject::Reader::Single(JsonSarnObject& self, int depth, InputPointerBytesource& input,
                                    const FieldInfo* field, SarnObject* object, VekString& error) {
  if (field == nullptr) {
    if (SkipPeek(input) == '{') return Object(self, depth, input, nullptr, nullptr, error);
    return SkipToken(input);
  }
  switch (field->dataType) {
    case SARN_DATA_TYPE_KNOWN_DICT:
    case SARN_DATA_TYPE_SUBDICT:
      return Nested(self, depth, input, *field, object, error, nullptr);
    case SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY:
      return Lazy(self, depth, input, *field, object, error, false);
    case SARN_DATA_TYPE_ANY_DICT:
      return FreeForm(self, depth, input, *field, object, error);
    default:
      return Scalar(self, input, *field, object, error);
  }
}

bool JsonSarnObject::Reader::Multi(JsonSarnObject& self, int depth, InputPointerBytesource& input,
                                   const FieldInfo* field, SarnObject* object, VekString& error) {
  if (field == nullptr) return Single(self, depth, input, nullptr, object, error);
  switch (field->dataType) {
    case SARN_DATA_TYPE_KNOWN_DICT:
      return Nested(self, depth, input, *field, object, error, kKnownDictMultiG);
    case SARN_DATA_TYPE_SUBDICT:
      return Nested(self, depth, input, *field, object, error, kSubdictMultiG);
    case SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY:
      return Lazy(self, depth, input, *field, object, error, true);
    case SARN_DATA_TYPE_ANY_DICT:
      return FreeForm(self, depth, input, *field, object, error);
    default:
      return Scalar(self, input, *field, object, error);
  }
}

bool JsonSarnObject::Reader::Store(JsonSarnObject& self, bool isStored, const FieldInfo& field, SarnObject* object,
                                   VekString& error) {
  if (isStored) return true;
  unsigned count = FieldAccess::Count(object, field);
  Append(self.pMempoolM, error, count >= kMaxValuesPerContainer ? kJsonArrayLimitMessage : kOutOfMemoryMessage);
  return false;
}

bool JsonSarnObject::Reader::Nested(JsonSarnObject& self, int depth, InputPointerBytesource& input,
                                    const FieldInfo& field, SarnObject* object, VekString& error,
                                    const char* multiWords) {
  const StructInfo* type = nullptr;
  if (field.dataType == SARN_DATA_TYPE_SUBDICT) {
    if (field.refIndex < self.nStructDefsM) type = self.pStructDefsM[field.refIndex];
  } else if (self.nObjectIndexM < self.vObjectTypesM.Count()) {
    std::memcpy(&type, self.vObjectTypesM.Get(static_cast<int>(self.nObjectIndexM)), sizeof type);
  }
  ref<SarnObject> child;
  VekString inner;
  if (!Object(self, depth, input, type, &child, inner)) {
    Discard(self, error, inner);
    if (multiWords != nullptr) Append(self.pMempoolM, error, multiWords);
    return false;
  }
  return Store(self, FieldAccess::PutReference(object, field, child.Get()), field, object, error);
}

bool JsonSarnObject::Reader::Lazy(JsonSarnObject& self, int depth, InputPointerBytesource& input,
                                  const FieldInfo& field, SarnObject* object, VekString& error, bool isMulti) {
  VekMempool* pool = self.pMempoolM;
  auto* capture = new (std::nothrow) wynbaselib::InMemoryBytestream();
  if (capture == nullptr) {
    Append(pool, error, kOutOfMemoryMessage);
    return false;
  }
  input.SkipWhitespace();
  // An echo the caller runs on the cursor goes on receiving every byte, the captured ones too.
  wynbaselib::Bytesink* outer = input.fEchoM ? input.pEchoSinkM : nullptr;
  bool isOuterOk = outer == nullptr || input.StopEcho();
  TeeSink tee(outer, capture);
  input.StartEcho(outer != nullptr ? static_cast<wynbaselib::Bytesink*>(&tee) : capture);
  bool isWalked = Object(self, depth, input, nullptr, nullptr, error);
  bool isCaptured = input.StopEcho();
  if (outer != nullptr) {
    input.StartEcho(outer);
    if (!isOuterOk) input.wasEchoFailedM = true;
  }
  if (!isWalked) {
    delete capture;
    Append(pool, error, isMulti ? kLazyMultiG : kLazySingleG);
    return false;
  }
  if (!isCaptured) {
    delete capture;
    Append(pool, error, kOutOfMemoryMessage);
    return false;
  }
  ref<LazyDict> payload = LazyDict::FromBytesource(pool, capture, 0);  // takes the stream
  if (!payload) {
    if (isMulti) {
      Replace(self, error, kNullLazyG);
    } else {
      Append(pool, error, kOutOfMemoryMessage);
    }
    return false;
  }
  return Store(self, FieldAccess::PutReference(object, field, payload.Get()), field, object, error);
}

bool JsonSarnObject::Reader::FreeForm(JsonSarnObject& self, int depth, InputPointerBytesource& input,
                                      const FieldInfo& field, SarnObject* object, VekString& error) {
  dictvalue::Type type = dictvalue::TYPE_NONE;
  VekString text;
  ref<Dict> dict;
  VekString inner;
  // The free-form reader's own text is dropped (unless it carries the depth message).
  if (!AnyValue(self, depth, input, type, text, dict, inner)) {
    Discard(self, error, inner);
    return false;
  }
  if (type != dictvalue::TYPE_DICT) return false;
  return Store(self, FieldAccess::PutReference(object, field, dict.Get()), field, object, error);
}

bool JsonSarnObject::Reader::Scalar(JsonSarnObject& self, InputPointerBytesource& input, const FieldInfo& field,
                                    SarnObject* object, VekString& error) {
  VekMempool* pool = self.pMempoolM;
  TokenText token;
  if (!ReadToken(pool, input, token)) return false;
  const unsigned char* p = token.pM;
  size_t n = token.nM;
  auto text = [&]() { return token.holdM.FEmpty() ? VekString::FromUtf8Bytes(pool, n, p) : token.holdM; };
  bool isNegative;
  unsigned long long digits;
  switch (field.dataType) {
    case SARN_DATA_TYPE_BOOL: {
      uint8_t value;
      if (token.Is("true", 4)) {
        value = 1;
      } else if (token.Is("false", 5)) {
        value = 0;
      } else {
        return false;
      }
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_S32: {
      int value;
      if (internal::DirectInteger(p, n, true, 9, isNegative, digits)) {
        value = isNegative ? -static_cast<int>(digits) : static_cast<int>(digits);
      } else if (!internal::ScanNumber(pool, p, n, "%d", value)) {
        return false;
      }
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_U32: {
      unsigned int value;
      if (internal::DirectInteger(p, n, false, 9, isNegative, digits)) {
        value = static_cast<unsigned int>(digits);
      } else if (!internal::ScanNumber(pool, p, n, "%u", value)) {
        return false;
      }
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_S64: {
      long long value;
      if (internal::DirectInteger(p, n, true, 18, isNegative, digits)) {
        value = isNegative ? -static_cast<long long>(digits) : static_cast<long long>(digits);
      } else if (!internal::ScanNumber(pool, p, n, "%lld", value)) {
        return false;
      }
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_U64: {
      unsigned long long value;
      if (internal::DirectInteger(p, n, false, 19, isNegative, digits)) {
        value = digits;
      } else if (!internal::ScanNumber(pool, p, n, "%llu", value)) {
        return false;
      }
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_FLOAT: {
      double value;
      if (!internal::DirectFloat(p, n, value) && !internal::ScanNumber(pool, p, n, "%lg", value)) return false;
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_ENUM: {
      const EnumDef* def = EnumDefForId(field.refIndex);
      if (def == nullptr || std::memchr(p, 0, n) != nullptr) return false;
      for (uint64_t i = 0; i < def->nValue; ++i) {
        const char* name = def->vName[i];
        if (name == nullptr || std::strncmp(name, reinterpret_cast<const char*>(p), n) != 0 || name[n] != '\0') {
          continue;
        }
        uint32_t value = static_cast<uint32_t>(i);
        return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
      }
      return false;
    }
    case SARN_DATA_TYPE_STRING:
      return Store(self, FieldAccess::PutString(object, field, text()), field, object, error);
    case SARN_DATA_TYPE_STRING_ID: {
      VekString value, inner;
      if (!DictionarySarnObject::StringToStringId(pool, &field, text(), inner, value)) return false;
      return Store(self, FieldAccess::PutString(object, field, value), field, object, error);
    }
    case SARN_DATA_TYPE_INT_ID: {
      unsigned int value;
      VekString inner;
      if (!DictionarySarnObject::StringToIntId(pool, &field, text(), inner, value)) return false;
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_LONG_ID: {
      unsigned long long value;
      VekString inner;
      if (!DictionarySarnObject::StringToLongId(pool, &field, text(), inner, value)) return false;
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_BYTESTRING: {
      ref<vek::ByteBuffer> bytes = DecodeBase64(pool, text());
      if (!bytes) return false;
      return Store(self, FieldAccess::PutReference(object, field, bytes.Get()), field, object, error);
    }
    case SARN_DATA_TYPE_CHANNEL_NUMBER: {
      ChannelNumber value = ChannelNumber::Parse(text());
      if (value == ChannelNumber::INVALID) return false;
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_CURRENCY: {
      Currency value = Currency::Parse(text());
      if (value == Currency::INVALID) return false;
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_DATE: {
      Date value = Date::Parse(text());
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_DATETIME: {
      DateTime value = DateTime::Parse(text());
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_TIME: {
      Time value = Time::Parse(text());
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    default:
      return true;  // codes without values: the token is read and dropped
  }
}

// ---- Free-form dictionaries -------------------------------------------------------------------

bool JsonSarnObject::Reader::AnyValue(JsonSarnObject& self, int depth, InputPointerBytesource& input,
                                      dictvalue::Type& type, VekString& text, ref<Dict>& dict, VekString& error) {
  VekMempool* pool = self.pMempoolM;
  if (SkipPeek(input) != '{') {
    type = dictvalue::TYPE_STRING;
    TokenText token;
    if (!ReadToken(pool, input, token)) {
      Replace(self, error, kAnyBadStringG);
      return false;
    }
    text = token.holdM.FEmpty() ? VekString::FromUtf8Bytes(pool, token.nM, token.pM) : token.holdM;
    return true;
  }
  type = dictvalue::TYPE_DICT;
  input.Next();
  ++self.nObjectIndexM;  // the first pass gave this object an ordinal too
  if (TooDeep(self, depth + 1, error)) return false;
  for (;;) {
    if (!dict) {
      dict = MakeDict(pool);
      if (!dict) {
        Replace(self, error, kOutOfMemoryMessage);
        return false;
      }
    }
    if (!AnyField(self, depth + 1, input, dict, error)) {
      Replace(self, error, kBadAnyFieldG);
      return false;
    }
    char c = Take(input);
    if (c == '}') return true;
    if (c != ',') {
      Replace(self, error, kAnyNoEndG);
      return false;
    }
  }
}

bool JsonSarnObject::Reader::AnyField(JsonSarnObject& self, int depth, InputPointerBytesource& input,
                                      const ref<Dict>& dict, VekString& error) {
  VekMempool* pool = self.pMempoolM;
  VekString name;
  if (!JsonBytesourceToString(pool, nullptr, input, name)) {
    Replace(self, error, kAnyBadNameG);
    return false;
  }
  if (Take(input) != ':') {
    Replace(self, error, kAnyNoColonG);
    return false;
  }
  bool isList = SkipPeek(input) == '[';
  if (isList) {
    input.Next();
    if (TooDeep(self, depth + 1, error)) return false;
    ++depth;
  }
  for (;;) {
    uint64_t before = input.BytesDelivered() - static_cast<uint64_t>(input.pEndM - input.pCurM);
    dictvalue::Type type = dictvalue::TYPE_NONE;
    VekString text;
    ref<Dict> value;
    if (!AnyValue(self, depth, input, type, text, value, error)) {
      Replace(self, error, kAnyBadValueG);
      return false;
    }
    uint64_t after = input.BytesDelivered() - static_cast<uint64_t>(input.pEndM - input.pCurM);
    bool isAdded = type == dictvalue::TYPE_DICT ? dict->AddDict(name, value) : dict->AddString(name, text);
    if (!isAdded) {
      bool isFull = dict->CountValues(name) >= kMaxValuesPerContainer;
      Replace(self, error, isFull ? kJsonRepeatedKeyLimitMessage : kOutOfMemoryMessage);
      return false;
    }
    if (!isList) return true;
    char c = SkipPeek(input);
    // A value that read nothing is only the empty one before the closing bracket.
    if (before == after && c != ']') {
      Replace(self, error, kAnyBadValueG);
      return false;
    }
    if (c == ']') {
      input.Next();
      return true;
    }
    if (c == ',') input.Next();
  }
}

// ---- Entry points -----------------------------------------------------------------------------

bool JsonSarnObject::Reader::TwoPass(JsonSarnObject& self, InputPointerBytesource& first,
                                     InputPointerBytesource& second, ref<SarnObject>* result, VekString& error) {
  ReadState* state = State(self);
  if (state == nullptr) {
    Append(self.pMempoolM, error, kOutOfMemoryMessage);
    if (result != nullptr) result->Reset();
    return false;
  }
  self.vObjectTypesM.Clear();
  self.nObjectIndexM = 0;
  state->nKeysM = 0;
  state->isDepthRefusedM = false;
  state->isFirstPassM = true;
  bool isOk = Object(self, 0, first, nullptr, nullptr, error);
  state->isFirstPassM = false;
  const StructInfo* type = nullptr;
  if (isOk && self.vObjectTypesM.Count() != 0) std::memcpy(&type, self.vObjectTypesM.Get(0), sizeof type);
  if (type != nullptr) {
    self.nObjectIndexM = 0;
    ref<SarnObject> object;
    if (Object(self, 0, second, type, &object, error)) {
      if (result != nullptr) *result = static_cast<ref<SarnObject>&&>(object);
      return true;
    }
  }
  if (result != nullptr) result->Reset();
  return false;
}

bool JsonSarnObject::JsonToSarnObject(InputPointerBytesource& firstPass, InputPointerBytesource& secondPass,
                                      KernoVersion version, ref<SarnObject>* result, VekString& error) {
  (void)version;  // every field of the type is read, whatever its version range
  return Reader::TwoPass(*this, firstPass, secondPass, result, error);
}

bool JsonSarnObject::JsonToSarnObject(wynbaselib::Bytesource* source, size_t& bytesRead, KernoVersion version,
                                      ref<SarnObject>* result, VekString& error) {
  wynbaselib::Bytesource* first = source != nullptr ? source->Duplicate() : nullptr;
  wynbaselib::Bytesource* second = first != nullptr ? source->Duplicate() : nullptr;
  bool isOk = false;
  if (second == nullptr) {
    Append(pMempoolM, error, kNoDuplicateG);
    if (result != nullptr) result->Reset();
  } else {
    InputPointerBytesource firstPass(first);
    InputPointerBytesource secondPass(second);
    isOk = JsonToSarnObject(firstPass, secondPass, version, result, error);
    bytesRead = static_cast<size_t>(firstPass.BytesDelivered());
  }
  delete first;
  delete second;
  return isOk;
}

bool JsonSarnObject::JsonToSarnObject(const unsigned char* data, int length, KernoVersion version,
                                      ref<SarnObject>* result, VekString& error) {
  if (data == nullptr) length = length < 0 ? length : 0;
  if (length < 0) {
    Append(pMempoolM, error, kNegativeLengthG);
    if (result != nullptr) result->Reset();
    return false;
  }
  InputPointerBytesource firstPass(data, static_cast<size_t>(length));
  InputPointerBytesource secondPass(data, static_cast<size_t>(length));
  return JsonToSarnObject(firstPass, secondPass, version, result, error);
}

bool JsonSarnObject::Unmarshal(int depth, InputPointerBytesource& input, const StructInfo* type,
                               ref<SarnObject>* result, VekString& error) {
  if (Reader::State(*this) == nullptr) {
    Append(pMempoolM, error, kOutOfMemoryMessage);
    return false;
  }
  return Reader::Object(*this, depth, input, type, result, error);
}

bool JsonSarnObject::ReadFieldValue(int depth, InputPointerBytesource& input, const FieldInfo* field,
                                    ref<SarnObject> object, VekString& error) {
  return Reader::State(*this) != nullptr && Reader::Value(*this, depth, input, field, object.Get(), error);
}

bool JsonSarnObject::UnmarshalOneSingleValue(int depth, InputPointerBytesource& input, const FieldInfo* field,
                                             ref<SarnObject> object, VekString& error) {
  return Reader::State(*this) != nullptr && Reader::Single(*this, depth, input, field, object.Get(), error);
}

bool JsonSarnObject::UnmarshalOneMultiValue(int depth, InputPointerBytesource& input, const FieldInfo* field,
                                            ref<SarnObject> object, VekString& error) {
  return Reader::State(*this) != nullptr && Reader::Multi(*this, depth, input, field, object.Get(), error);
}

bool JsonSarnObject::ArrayValueFromJson(int depth, InputPointerBytesource& input, const FieldInfo* field,
                                        ref<SarnObject> object, VekString& error) {
  return Reader::State(*this) != nullptr && Reader::Array(*this, depth, input, field, object.Get(), error);
}

bool JsonSarnObject::ArrayValueReadFieldValue(int depth, InputPointerBytesource& input, const FieldInfo* field,
                                              ref<SarnObject> object, VekString& error) {
  return Reader::State(*this) != nullptr && Reader::Element(*this, depth, input, field, object.Get(), error);
}

bool JsonSarnObject::UnmarshalAnyDict(int depth, InputPointerBytesource& input, ref<Dict>* result,
                                      VekString& error) {
  if (Reader::State(*this) == nullptr) {
    Append(pMempoolM, error, kOutOfMemoryMessage);
    return false;
  }
  if (depth == 0) pReadStateM->isDepthRefusedM = false;
  dictvalue::Type type = dictvalue::TYPE_NONE;
  VekString text;
  ref<Dict> dict;
  if (!Reader::AnyValue(*this, depth, input, type, text, dict, error) || type != dictvalue::TYPE_DICT) return false;
  if (result != nullptr) *result = dict;
  return true;
}

bool JsonSarnObject::UnmarshalAnyDict(InputPointerBytesource& input, ref<Dict>* result) {
  VekString error;
  return UnmarshalAnyDict(0, input, result, error);
}

bool JsonSarnObject::UnmarshalAnyDictValue(int depth, InputPointerBytesource& input, dictvalue::Type& type,
                                           VekString& text, ref<Dict>& dict, VekString& error) {
  return Reader::State(*this) != nullptr && Reader::AnyValue(*this, depth, input, type, text, dict, error);
}

bool JsonSarnObject::UnmarshalAnyDictField(int depth, InputPointerBytesource& input, const ref<Dict>& dict,
                                           VekString& error) {
  return Reader::State(*this) != nullptr && Reader::AnyField(*this, depth, input, dict, error);
}

}  // namespace sarn
