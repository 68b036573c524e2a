// Oracles shared by the two JSON reader fuzz targets.
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

inline bool TreeHasPassThrough(const sarn::DictValue& value) {
  using sarn::DictValue;
  switch (value.kindM) {
    case DictValue::KIND_STRING:
      return HasPassThrough(static_cast<const sarn::StringValue&>(value).valueM);
    case DictValue::KIND_ARRAY: {
      const sarn::ArrayValue& array = static_cast<const sarn::ArrayValue&>(value);
      for (unsigned i = 0; i < array.CountValues(); ++i) {
        if (TreeHasPassThrough(*array.GetValueAt(i))) return true;
      }
      return false;
    }
    case DictValue::KIND_DICTIONARY: {
      const sarn::Dictionary& dictionary = static_cast<const sarn::Dictionary&>(value);
      VekStringArray names(dictionary.GetMempool());
      dictionary.GetSortedNames(names);
      for (int i = 0; i < names.Count(); ++i) {
        if (HasPassThrough(names[i])) return true;
        VekArray<DictValue> values(dictionary.GetMempool());
        dictionary.GetRange(names[i], values);
        for (int k = 0; k < values.Count(); ++k) {
          if (TreeHasPassThrough(*values.Get(k))) return true;
        }
      }
      return false;
    }
    default:
      return false;
  }
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
