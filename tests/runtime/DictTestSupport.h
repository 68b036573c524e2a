// Helpers shared by the dictionary, JSON reader and lazy payload tests.
#pragma once

#include <pthread.h>

#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

namespace dicttest {

using namespace sarn;

inline std::string Str(const VekString& text) { return std::string(text.Utf8(), text.NByte()); }

inline std::string Str(const ref<vek::ByteBuffer>& bytes) {
  return std::string(reinterpret_cast<const char*>(bytes->GetData()), bytes->GetLength());
}

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

// The streaming parser fed `chunks`; the tree is returned even on failure (it may be partial).
inline ref<Dictionary> Parse(VekMempool* pool, const std::vector<std::string_view>& chunks, bool* isOk,
                             std::string* error = nullptr, const JsonLimits& limits = JsonLimits()) {
  PDictionary result;
  JsonParser parser(pool, limits);
  parser.BeginParse(result);
  bool ok = true;
  for (std::string_view chunk : chunks) {
    if (!parser.ParseChunk(chunk.data(), chunk.size())) {
      ok = false;
      break;
    }
  }
  if (ok) ok = parser.EndParse();
  if (error != nullptr) *error = ok || parser.pErrorTextM == nullptr ? "" : parser.pErrorTextM;
  *isOk = ok;
  return result;
}

inline ref<Dictionary> Parse(VekMempool* pool, std::string_view json, std::string* error = nullptr,
                             const JsonLimits& limits = JsonLimits()) {
  bool isOk;
  ref<Dictionary> result = Parse(pool, std::vector<std::string_view>{json}, &isOk, error, limits);
  return isOk ? result : ref<Dictionary>();
}

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

// Runs `work` on a thread with a native stack of `bytes` (256 KiB is what the depth limit
// promises a whole read, write, compare and release fits in). Sanitizers and unoptimised
// builds multiply frame sizes, so they get more room; the promise is about release builds.
inline void RunOnStack(size_t bytes, const std::function<void()>& work) {
#if defined(__SANITIZE_ADDRESS__) || !defined(__OPTIMIZE__)
  bytes *= 8;
#endif
  pthread_attr_t attributes;
  pthread_attr_init(&attributes);
  pthread_attr_setstacksize(&attributes, bytes);
  pthread_t thread;
  auto call = [](void* argument) -> void* {
    (*static_cast<const std::function<void()>*>(argument))();
    return nullptr;
  };
  ASSERT_EQ(pthread_create(&thread, &attributes, call, const_cast<std::function<void()>*>(&work)), 0);
  pthread_join(thread, nullptr);
  pthread_attr_destroy(&attributes);
}

}  // namespace dicttest
