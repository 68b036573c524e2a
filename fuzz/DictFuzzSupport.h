// Scaffolding shared by the fuzz targets: walks over trees and objects, and the input layout of
// the two JSON reader targets.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <algorithm>
#include <string_view>
#include <vector>

#include "sarn/Sarn.h"
#include "../tests/testutil/TestStreams.h"

namespace dictfuzz {

using sarntest::Require;

// Whether a text holds what the writer passes through unescaped and yajl then reads back
// differently: a backslash before 'u', or the raw bytes 0x03 and 0x1A.
inline bool HasPassThrough(const VekString& text) {
  const char* p = text.Utf8();
  for (size_t i = 0; i < text.NByte(); ++i) {
    if (p[i] == 0x03 || p[i] == 0x1A || (p[i] == '\\' && i + 1 < text.NByte() && p[i + 1] == 'u')) return true;
  }
  return false;
}

// Whether the bytes hold a control byte that the JSON writers escape as backslash-u (any but
// \b \t \n \f \r and those in `except`): the readers keep such an escape as six characters.
inline bool HasUnicodeEscapedControl(const void* data, size_t size, const char* except = "") {
  const auto* bytes = static_cast<const unsigned char*>(data);
  for (size_t i = 0; i < size; ++i) {
    const char c = static_cast<char>(bytes[i]);
    if (bytes[i] < 0x20 && (c == 0 || (!std::strchr("\b\t\n\f\r", c) && !std::strchr(except, c)))) return true;
  }
  return false;
}

// Whether an object's JSON holds a value the text forms cannot name (an enum number without a
// name, or an id of a type the registry lacks), which is written but refused on reading.
inline bool HoldsUnnamedValue(const std::string& json) {
  return json.find("\"INVALID_VALUE:") != std::string::npos || json.find("\"XXX\"") != std::string::npos;
}

// Reads `text` as an object at `version` from memory (piece 0) or from a byte source handing out
// `piece` bytes per read: the object written at version 0, or "!" and the message. A refusal
// clears a stale result in `object`; the byte source is left unmoved, both its duplicates deleted.
inline std::string ReadObject(VekMempool* pool, sarn::JsonSarnObject& reader, const std::string& text, size_t piece,
                              ref<sarn::SarnObject>& object, sarn::KernoVersion version = 0, size_t* pBytesRead = nullptr) {
  VekString error;
  sarntest::PieceSource::Counters counters;
  sarntest::PieceSource source(text, piece, &counters);
  size_t bytesRead = 0;
  bool isOk = piece == 0 ? reader.JsonToSarnObject(reinterpret_cast<const unsigned char*>(text.data()),
                                                   static_cast<int>(text.size()), version, &object, error)
                         : reader.JsonToSarnObject(&source, bytesRead, version, &object, error);
  Require(isOk == (object != nullptr) && source.GetPosition() == 0 && bytesRead <= text.size() &&
          counters.nDuplicatedM == (piece == 0 ? 0 : 2) && counters.nDeletedM == counters.nDuplicatedM);
  if (pBytesRead != nullptr) *pBytesRead = bytesRead;
  return isOk ? sarntest::Str(sarn::JsonSarnObject(pool).SarnObjectToJson(object.Get(), 0)) : "!" + sarntest::Str(error);
}

// Whether `test` holds for one of the names of `dictionary`.
template <class Test>
bool AnyName(const sarn::Dictionary& dictionary, const Test& test) {
  VekStringArray names(nullptr);
  dictionary.GetSortedNames(names);
  for (int i = 0; i < names.Count(); ++i) {
    if (test(names[i])) return true;
  }
  return false;
}

// Whether `test` holds for `value` or for a value anywhere inside it.
template <class Test>
bool AnyValue(const sarn::DictValue& value, const Test& test) {
  using sarn::DictValue;
  if (test(value)) return true;
  if (value.kindM == DictValue::KIND_ARRAY) {
    const auto& array = static_cast<const sarn::ArrayValue&>(value);
    for (unsigned i = 0; i < array.CountValues(); ++i) {
      if (AnyValue(*array.GetValueAt(i), test)) return true;
    }
  }
  const auto& dictionary = static_cast<const sarn::Dictionary&>(value);
  return value.kindM == DictValue::KIND_DICTIONARY && AnyName(dictionary, [&](const VekString& name) {
           VekArray<DictValue> values(nullptr);
           dictionary.GetRange(name, values);
           for (int k = 0; k < values.Count(); ++k) {
             if (AnyValue(*values.Get(k), test)) return true;
           }
           return false;
         });
}

// Whether `test(object, field)` holds for a field of `object` or of an object it holds in a known
// dict or subdict, at any depth.
template <class Test>
bool AnyField(const sarn::SarnObject* object, const Test& test) {
  using namespace sarn;
  const StructInfo* info = object != nullptr ? object->GetStructInfo() : nullptr;
  for (unsigned n = 0; info != nullptr && n < info->nFieldInfo; ++n) {
    const FieldInfo& field = info->vFieldInfo[n];
    if (field.arity == SARN_ARITY_NONE) continue;
    if (test(object, field)) return true;
    if (field.dataType != SARN_DATA_TYPE_KNOWN_DICT && field.dataType != SARN_DATA_TYPE_SUBDICT) continue;
    for (unsigned i = 0; i < FieldAccess::Count(object, field); ++i) {
      if (AnyField(static_cast<const SarnObject*>(FieldAccess::ReferenceAt(object, field, i)), test)) return true;
    }
  }
  return false;
}

inline bool TreeHasPassThrough(const sarn::DictValue& tree) {
  return AnyValue(tree, [](const sarn::DictValue& value) {
    if (value.kindM == sarn::DictValue::KIND_STRING) return HasPassThrough(static_cast<const sarn::StringValue&>(value).valueM);
    return value.kindM == sarn::DictValue::KIND_DICTIONARY &&
           AnyName(static_cast<const sarn::Dictionary&>(value), [](const VekString& name) { return HasPassThrough(name); });
  });
}

// The layout both targets share: byte 0 chooses a depth limit (low four bits; 0 keeps the
// default) and how many of the following bytes (bits 4-6) choose chunk lengths; the rest is the
// document.
struct Input {
  sarn::JsonLimits limitsM;
  const uint8_t* pSeedM;
  size_t nSeedM;
  const uint8_t* pJsonM;
  size_t nJsonM;
};

inline bool SplitInput(const uint8_t* data, size_t size, Input& input) {
  if (size < 1) return false;
  input.limitsM = (data[0] & 15) == 0 ? sarn::JsonLimits() : sarn::JsonLimits(data[0] & 15);
  input.nSeedM = (data[0] >> 4) & 7;
  if (size < 1 + input.nSeedM) return false;
  input.pSeedM = data + 1;
  input.pJsonM = data + 1 + input.nSeedM;
  input.nJsonM = size - 1 - input.nSeedM;
  return true;
}

// Cuts the `size` bytes at `data` into chunks whose lengths come from `seed` bytes (1 to 64 each,
// cycling); no seed gives the whole text as one chunk.
inline std::vector<std::string_view> Chunks(const uint8_t* data, size_t size, const uint8_t* seed = nullptr,
                                            size_t nSeed = 0) {
  std::vector<std::string_view> chunks;
  for (size_t at = 0, i = 0; at < size; ++i) {
    size_t n = nSeed == 0 ? size : 1 + seed[i % nSeed] % 64;
    chunks.emplace_back(reinterpret_cast<const char*>(data) + at, std::min(n, size - at));
    at += chunks.back().size();
  }
  return chunks;
}

}  // namespace dictfuzz
