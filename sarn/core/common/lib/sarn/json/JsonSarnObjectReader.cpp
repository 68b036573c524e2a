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
#include "sarn/json/internal/JsonObjectReader.h"
#include "sarn/json/internal/JsonTokenScan.h"
#include "sarn/model/FieldAccess.h"
#include "sarn/model/StructInfoMap.h"
#include "sarn/objects/DictionarySarnObject.h"
#include "sarn/values/Base64.h"
#include "sarn/values/ScalarTypes.h"
#include "wynbaselib/Bytestream.h"

namespace sarn {

using internal::Append;
using internal::IsAlnum;
using internal::ReadToken;
using internal::SkipPeek;
using internal::SkipToken;
using internal::Take;
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
const char kNoDuplicateG[] = "Byte source cannot be duplicated.";
const char kNegativeLengthG[] = "Negative JSON length.";

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

}  // namespace

void JsonSarnObject::ReleaseReadState() {
  if (pReadStateM == nullptr) return;
  for (auto& index : pReadStateM->vIndexM) VekMempool::Default()->Free(index.vSlotM);
  VekMempool::Default()->Free(pReadStateM->pKeysM);
  pReadStateM->holdM = VekString();
  VekMempool::Default()->Free(pReadStateM);
  pReadStateM = nullptr;
}

JsonSarnObject::ReadState* JsonSarnObject::Reader::State(JsonSarnObject& self) {
  if (self.pReadStateM == nullptr) {
    self.pReadStateM = static_cast<ReadState*>(VekMempool::Default()->Calloc(sizeof(ReadState)));
  }
  return self.pReadStateM;
}

bool JsonSarnObject::Reader::Ready(JsonSarnObject& self, VekString& error) {
  if (State(self) != nullptr) return true;
  Append(self.pMempoolM, error, kOutOfMemoryMessage);
  return false;
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
  VekString& hold = State(self)->holdM;
  if (!ReadToken(self.pMempoolM, input, name, hold)) {
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
      VekString copy = internal::TokenString(self.pMempoolM, name, hold);
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
    if (!ReadToken(pool, input, key, state->holdM)) {
      Append(pool, error, kBadKeyG);
      return false;
    }
    const unsigned char* limit = key.isHeldM ? key.pM + key.nM : input.pEndM;
    const FieldInfo* field = object ? state->Find(type, key.pM, key.nM, limit) : nullptr;
    bool isType = isFirstPass && key.Is("type", 4);
    // The key is kept for the message of a failing value. Bytes in the cursor's block stay where
    // they are once the source has no more blocks (always, for text in memory); others are copied.
    const char* keyText = reinterpret_cast<const char*>(key.pM);
    long keyAt = -1;
    if (input.fMoreM || key.isHeldM) {
      keyAt = state->PushKey(key.pM, key.nM);
      if (keyAt < 0) {
        Append(pool, error, kOutOfMemoryMessage);
        return false;
      }
    }
    size_t keyLength = key.nM;
    if (Take(input) != ':') {
      Append(pool, error, kNoColonG);
      return false;
    }
    if (field != nullptr && field->arity == SARN_ARITY_OPTIONAL && field->flagOffset != 0) {
      MarkFieldPresent(object.Get(), *field);
    }
    if (isType) {
      if (!RecordType(self, input, ordinal, error)) return false;
    } else if (!Member(self, depth + 1, input, field, object.Get(), error)) {
      Append(pool, error, kForKeyG);
      Append(pool, error, keyAt < 0 ? keyText : state->pKeysM + keyAt, keyLength);
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

// Value, with the most common members (a scalar into a single field, or a token skipped) read
// without its two calls; verdicts and messages are Value's.
inline bool JsonSarnObject::Reader::Member(JsonSarnObject& self, int depth, InputPointerBytesource& input,
                                           const FieldInfo* field, SarnObject* object, VekString& error) {
  char c = SkipPeek(input);
  if (c != '[' && c != '{') {
    bool isRead;
    if (field == nullptr) {
      isRead = SkipToken(input);
    } else if (field->arity != SARN_ARITY_MULTI && field->dataType != SARN_DATA_TYPE_KNOWN_DICT &&
               field->dataType != SARN_DATA_TYPE_SUBDICT && field->dataType != SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY &&
               field->dataType != SARN_DATA_TYPE_ANY_DICT) {
      isRead = Scalar(self, input, *field, object, error);
    } else {
      return Value(self, depth, input, field, object, error);
    }
    if (!isRead) Append(self.pMempoolM, error, kSingleFailedG);
    return isRead;
  }
  return Value(self, depth, input, field, object, error);
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
  VekString& hold = State(self)->holdM;
  if (!ReadToken(pool, input, token, hold)) return false;
  const unsigned char* p = token.pM;
  size_t n = token.nM;
  auto text = [&]() { return internal::TokenString(pool, token, hold); };
  const char* chars = reinterpret_cast<const char*>(p);
  const VekString* held = token.isHeldM ? &hold : nullptr;
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
        // (The first byte rejects most names without a call; an empty token matches only "".)
        if (name == nullptr || (n != 0 && name[0] != static_cast<char>(p[0])) ||
            std::strncmp(name, reinterpret_cast<const char*>(p), n) != 0 || name[n] != '\0') {
          continue;
        }
        uint32_t value = static_cast<uint32_t>(i);
        return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
      }
      return false;
    }
    case SARN_DATA_TYPE_STRING: {
      VekString value = text();
      return Store(self, FieldAccess::PutString(object, field, static_cast<VekString&&>(value)), field, object, error);
    }
    case SARN_DATA_TYPE_STRING_ID: {
      // Ids are converted from the token's bytes in place (the held token as the string it is).
      VekString value, inner;
      if (!DictionarySarnObject::StringToStringId(pool, &field, chars, n, inner, value, held)) return false;
      return Store(self, FieldAccess::PutString(object, field, static_cast<VekString&&>(value)), field, object,
                   error);
    }
    case SARN_DATA_TYPE_INT_ID: {
      unsigned int value;
      VekString inner;
      if (!DictionarySarnObject::StringToIntId(pool, &field, chars, n, inner, value, held)) return false;
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_LONG_ID: {
      unsigned long long value;
      VekString inner;
      if (!DictionarySarnObject::StringToLongId(pool, &field, chars, n, inner, value, held)) return false;
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
      Date value = Date::Parse(chars, n);
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_DATETIME: {
      DateTime value = DateTime::Parse(chars, n);
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    case SARN_DATA_TYPE_TIME: {
      Time value = Time::Parse(chars, n);
      return Store(self, FieldAccess::PutScalar(object, field, &value), field, object, error);
    }
    default:
      return true;  // codes without values: the token is read and dropped
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
    isOk = Object(self, 0, second, type, &object, error);
    if (isOk && result != nullptr) *result = static_cast<ref<SarnObject>&&>(object);
  }
  state->holdM = VekString();  // nothing of the read stays in the caller's pool
  if (type == nullptr || !isOk) {
    if (result != nullptr) result->Reset();
    return false;
  }
  return true;
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
  return Reader::Ready(*this, error) && Reader::Object(*this, depth, input, type, result, error);
}

bool JsonSarnObject::ReadFieldValue(int depth, InputPointerBytesource& input, const FieldInfo* field,
                                    ref<SarnObject> object, VekString& error) {
  return Reader::Ready(*this, error) && Reader::Value(*this, depth, input, field, object.Get(), error);
}

bool JsonSarnObject::UnmarshalOneSingleValue(int depth, InputPointerBytesource& input, const FieldInfo* field,
                                             ref<SarnObject> object, VekString& error) {
  return Reader::Ready(*this, error) && Reader::Single(*this, depth, input, field, object.Get(), error);
}

bool JsonSarnObject::UnmarshalOneMultiValue(int depth, InputPointerBytesource& input, const FieldInfo* field,
                                            ref<SarnObject> object, VekString& error) {
  return Reader::Ready(*this, error) && Reader::Multi(*this, depth, input, field, object.Get(), error);
}

bool JsonSarnObject::ArrayValueFromJson(int depth, InputPointerBytesource& input, const FieldInfo* field,
                                        ref<SarnObject> object, VekString& error) {
  return Reader::Ready(*this, error) && Reader::Array(*this, depth, input, field, object.Get(), error);
}

bool JsonSarnObject::ArrayValueReadFieldValue(int depth, InputPointerBytesource& input, const FieldInfo* field,
                                              ref<SarnObject> object, VekString& error) {
  return Reader::Ready(*this, error) && Reader::Element(*this, depth, input, field, object.Get(), error);
}

}  // namespace sarn
