// Helpers shared by the dictionary, JSON reader and lazy payload tests.
#pragma once

#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

namespace dicttest {

using namespace sarn;

using sarntest::Str;

inline VekString Text(VekMempool* pool, std::string_view text) {
  return VekString::FromUtf8Bytes(pool, text.size(), text.data());
}

// The hand-written reader over `json`; null with `error` set on failure.
inline ref<Dictionary> Read(VekMempool* pool, std::string_view json, std::string* error = nullptr,
                            const JsonLimits& limits = JsonLimits()) {
  VekString message;
  ref<Dictionary> result =
      Dictionary::FromJson(reinterpret_cast<const unsigned char*>(json.data()), json.size(), message, pool, limits);
  if (error != nullptr) *error = Str(message);
  return result;
}

inline ref<Dictionary> Parse(VekMempool* pool, const std::vector<std::string_view>& chunks, bool* isOk,
                             std::string* error = nullptr, const JsonLimits& limits = JsonLimits()) {
  return sarntest::StreamParse(pool, chunks, isOk, error, limits);
}

inline ref<Dictionary> Parse(VekMempool* pool, std::string_view json, std::string* error = nullptr,
                             const JsonLimits& limits = JsonLimits()) {
  bool isOk;
  ref<Dictionary> result = Parse(pool, std::vector<std::string_view>{json}, &isOk, error, limits);
  return isOk ? result : ref<Dictionary>();
}

// What a reader said: "accepted", or its message (read once the reader has returned).
inline std::string ReaderVerdict(const ref<Dictionary>& tree, const std::string& error) { return tree ? "accepted" : error; }

inline std::string Compact(const ref<DictValue>& value) { return value ? Str(value->ToJson(false)) : "(null)"; }
inline std::string Pretty(const ref<DictValue>& value) { return value ? Str(value->ToJson(true)) : "(null)"; }

// A document of `depth` nested containers, objects and arrays alternating from an outer object:
// {"k":[{"k":[ ... ]}]}.
inline std::string Nested(int depth) {
  std::string open, close;
  for (int level = 1; level <= depth; ++level) {
    bool isObject = level % 2 == 1;
    open += isObject ? (level < depth ? "{\"k\":" : "{") : "[";
    close.insert(0, isObject ? "}" : "]");
  }
  return open + close;
}

using sarntest::RunOnStack;

}  // namespace dicttest
