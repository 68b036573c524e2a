// Seeded schema objects built through the metadata, the one object builder of the tests and
// benchmarks: optional fields present or not and arrays of zero to three elements, or (fills)
// every field set with a fixed number of elements; values at and between the extremes of their
// types, free-form dictionaries with repeated and nested values, lazy fields holding objects.
// Every value has a text that reads back (named enum values, channel numbers and currencies that
// parse, printable strings with characters JSON must escape), so one object can travel through
// every form. The same seed builds equal objects. Header-only, so that benchmarks can use it
// without the test library.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "sarn/Sarn.h"

namespace sarntest {

class RandomObjects {
 public:
  // Known dicts and lazy fields hold objects of `knownTypes` (type ids); nested objects stop at
  // `maxDepth` levels, except required ones, which go a few levels further.
  // `isWithBytes` false: optional and multi byte strings are left out (equality never takes two
  // byte strings for equal).
  RandomObjects(VekMempool* pool, uint64_t seed, std::vector<unsigned> knownTypes, int maxDepth = 3,
                bool isWithBytes = true)
      : pPoolM(pool), stateM(seed), knownTypesM(std::move(knownTypes)), maxDepthM(maxDepth), isWithBytesM(isWithBytes) {}

  // False: strings hold no control characters, whose escapes one JSON reader decodes and the
  // other keeps as text, so that an object reads back alike through both.
  bool isWithControlsM = true;
  // True: strings hold only letters, digits and spaces.
  bool isPlainM = false;
  // At zero or more: every field is set, arrays with this many elements.
  int nEveryM = -1;

  ref<sarn::SarnObject> Make(unsigned typeId) { return Make(typeId, maxDepthM); }
  ref<sarn::SarnObject> MakeKnown() { return Make(knownTypesM[Next(knownTypesM.size())], maxDepthM); }
  void Fill(sarn::SarnObject* object) { Fill(object, maxDepthM); }

  uint64_t Next() {  // splitmix64
    uint64_t z = (stateM += 0x9E3779B97F4A7C15ull);
    z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9ull;
    z = (z ^ (z >> 27)) * 0x94D049BB133111EBull;
    return z ^ (z >> 31);
  }
  uint64_t Next(uint64_t bound) { return Next() % bound; }

 private:
  ref<sarn::SarnObject> Make(unsigned typeId, int depth) {
    const sarn::StructInfo* info = sarn::StructInfoForId(typeId);
    if (info == nullptr) return ref<sarn::SarnObject>();
    ref<sarn::SarnObject> object = info->pFactory(pPoolM);
    Fill(object.Get(), depth);
    return object;
  }

  void Fill(sarn::SarnObject* object, int depth) {
    using namespace sarn;
    const StructInfo* info = object->GetStructInfo();
    for (unsigned n = 0; n < info->nFieldInfo; ++n) {
      const FieldInfo& field = info->vFieldInfo[n];
      if (field.arity == SARN_ARITY_NONE || field.dataType > SARN_DATA_TYPE_U64) continue;
      bool isRequired = field.arity == SARN_ARITY_REQUIRED || nEveryM >= 0;
      if (!isRequired && (Next(3) == 0 || (!isWithBytesM && field.dataType == SARN_DATA_TYPE_BYTESTRING))) continue;
      unsigned count = field.arity != SARN_ARITY_MULTI ? 1 : nEveryM >= 0 ? nEveryM : static_cast<unsigned>(Next(4));
      bool isSet = true;
      for (unsigned e = 0; e < count && isSet; ++e) isSet = PutValue(object, field, depth, isRequired);
      if (isSet || isRequired) MarkFieldPresent(object, field);
    }
  }

  // The first named value of enum `enumId` at or after a random one (wrapping), or 0.
  uint32_t SomeEnumValue(unsigned enumId) {
    const sarn::EnumDef* def = sarn::EnumDefForId(enumId);
    uint64_t start = static_cast<unsigned>(Next());
    for (uint64_t k = 0; def != nullptr && k < def->nValue; ++k) {
      if (def->vName[(start + k) % def->nValue] != nullptr) return static_cast<uint32_t>((start + k) % def->nValue);
    }
    return 0;
  }

  // Adds (MULTI) or sets one value; false when a nested object was not made at this depth.
  bool PutValue(sarn::SarnObject* object, const sarn::FieldInfo& field, int depth, bool isRequired) {
    using namespace sarn;
    static const int32_t kS32[] = {0, -1, 1, INT32_MIN, INT32_MAX};
    static const char* const kCodes[] = {"USD", "EUR", "NOK"};
    switch (field.dataType) {
      case SARN_DATA_TYPE_BOOL: return Put(object, field, static_cast<uint8_t>(Next(2)));
      case SARN_DATA_TYPE_DATE: return Put(object, field, Date{static_cast<int>(Next(200000)) - 100000});
      case SARN_DATA_TYPE_TIME: return Put(object, field, Time{static_cast<int>(Next(86400)) * 1000});
      case SARN_DATA_TYPE_DATETIME:
        return Put(object, field, DateTime{(static_cast<long long>(Next(8000000000ull)) - 4000000000ll) * 1000});
      case SARN_DATA_TYPE_ENUM: return Put(object, field, SomeEnumValue(field.refIndex));
      case SARN_DATA_TYPE_S32:
        return Put(object, field, Next(2) ? kS32[Next(5)] : static_cast<int32_t>(static_cast<uint32_t>(Next())));
      case SARN_DATA_TYPE_INT_ID:
      case SARN_DATA_TYPE_U32:
        return Put(object, field, Next(4) ? static_cast<uint32_t>(Next(2ull << Next(32))) : UINT32_MAX);
      case SARN_DATA_TYPE_LONG_ID: {
        uint64_t low = Next(2ull << Next(48));
        uint64_t code = Next(2) ? sarn::longIdPrefixesG[Next(nLongIdPrefixesG)].codeM : 0;
        return Put(object, field, (code << 48) | low);
      }
      case SARN_DATA_TYPE_S64:
      case SARN_DATA_TYPE_U64: return Put(object, field, Next() >> Next(64));
      case SARN_DATA_TYPE_FLOAT:
        return Put(object, field, static_cast<double>(static_cast<int64_t>(Next())) / static_cast<double>(1ull << Next(40)));
      case SARN_DATA_TYPE_CHANNEL_NUMBER:
        return Put(object, field, ChannelNumber(static_cast<int>(Next(10000)), Next(2) ? -2 : static_cast<int>(Next(100))));
      case SARN_DATA_TYPE_CURRENCY:
        return Put(object, field, Currency(static_cast<int>(Next(INT32_MAX + 1ull)), kCodes[Next(3)]));
      case SARN_DATA_TYPE_STRING:
      case SARN_DATA_TYPE_STRING_ID: {
        std::string text = RandomText();
        FieldAccess::PutString(object, field, VekString::FromUtf8Bytes(pPoolM, text.size(), text.data()));
        return true;
      }
      case SARN_DATA_TYPE_BYTESTRING: {
        unsigned char bytes[8];
        size_t length = Next(sizeof bytes + 1);
        for (size_t i = 0; i < length; ++i) bytes[i] = static_cast<unsigned char>(Next());
        FieldAccess::PutReference(object, field, vek::ByteBuffer::New(pPoolM, bytes, length).Get());
        return true;
      }
      case SARN_DATA_TYPE_ANY_DICT:
        FieldAccess::PutReference(object, field, RandomDict(2).Get());
        return true;
      default: break;
    }
    // Nested objects: past the depth only required ones, up to a bound (readers insist on them).
    if (depth <= 0 && (!isRequired || depth < -4)) return false;
    unsigned typeId = field.dataType == SARN_DATA_TYPE_SUBDICT ? field.refIndex
                                                               : knownTypesM[Next(knownTypesM.size())];
    // Fills give lazy fields a fresh object: a payload writes an object it holds type first and a
    // tree it has read in name order, so only an object without fields reads back the same text.
    bool isLazy = field.dataType == SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY;
    ref<SarnObject> value = isLazy && nEveryM >= 0 ? StructInfoForId(typeId)->pFactory(pPoolM) : Make(typeId, depth - 1);
    if (!value) return false;
    if (isLazy) {
      FieldAccess::PutReference(object, field, LazyDict::FromSarnObject(pPoolM, value, 0).Get());
    } else {
      FieldAccess::PutReference(object, field, value.Get());
    }
    return true;
  }

  template <typename T>
  bool Put(sarn::SarnObject* object, const sarn::FieldInfo& field, T value) {
    sarn::FieldAccess::PutScalar(object, field, &value);
    return true;
  }

  // Zero to twelve pieces: letters, digits, and what JSON escapes or keeps as is.
  std::string RandomText() {
    static const char* const kPieces[] = {"a", "Z", "7", " ", "\"", "\\", "/", "\t", "\n", "\x01", "\xC3\xA9",
                                          "\xE2\x82\xAC", "\xF0\x9F\x98\x80", "~"};
    std::string text;
    for (uint64_t n = Next(13); n > 0; --n) {
      const char* piece = kPieces[Next(isPlainM ? 4 : sizeof kPieces / sizeof kPieces[0])];
      text += isWithControlsM || static_cast<unsigned char>(piece[0]) >= 0x20 ? piece : "~";
    }
    return text;
  }

  // Up to three names (some repeated), string values, nested dictionaries down to `depth`.
  ref<sarn::Dict> RandomDict(int depth) {
    ref<sarn::Dict> dict = sarn::Dict::New(pPoolM, VekString());
    for (uint64_t n = Next(4); n > 0; --n) {
      std::string name = "k" + std::to_string(Next(3));
      if (depth > 0 && Next(4) == 0) {
        dict->AddDict(name.c_str(), RandomDict(depth - 1));
      } else {
        dict->AddString(name.c_str(), RandomText().c_str());
      }
    }
    return dict;
  }

  VekMempool* pPoolM;
  uint64_t stateM;
  std::vector<unsigned> knownTypesM;
  int maxDepthM;
  bool isWithBytesM;
};

}  // namespace sarntest
