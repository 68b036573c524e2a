// Small helpers the object writers share for putting text into a ByteBuffer: decimal numbers
// without printf, and quoting of texts that need no escaping. Internal to the library.
#pragma once

#include <cstddef>
#include <cstdint>
#include <type_traits>

#include "sarn/values/ByteBuffer.h"
#include "sarn/base/internal/NumberText.h"

namespace sarn {
namespace internal {

inline void AppendText(ByteBuffer& out, const char* text, size_t length) {
  out.AppendBytes(reinterpret_cast<const unsigned char*>(text), length);
}

// "%llu" or "%lld" of the value, in double quotes when `isQuoted`.
template <class Integer>
inline void AppendInteger(ByteBuffer& out, Integer value, bool isQuoted) {
  char text[24];
  text[0] = '"';
  size_t n = 1;
  if constexpr (std::is_signed<Integer>::value) {
    n += FormatS64Into(text + 1, static_cast<long long>(value));
  } else {
    n += FormatU64Into(text + 1, static_cast<unsigned long long>(value));
  }
  if (isQuoted) text[n++] = '"';
  AppendText(out, isQuoted ? text : text + 1, isQuoted ? n : n - 1);
}

// True when the JSON string form of these bytes is the bytes themselves in quotes: no control
// byte, double quote or backslash.
inline bool IsPlainText(const char* text, size_t length) {
  for (size_t i = 0; i < length; ++i) {
    unsigned char c = static_cast<unsigned char>(text[i]);
    if (c < 0x20 || c == '"' || c == '\\') return false;
  }
  return true;
}

}  // namespace internal
}  // namespace sarn
