// Private helper: decimal digits without printf. Each function writes the same characters as
// the printf conversion it names and returns how many; no NUL is written.
#pragma once

#include <cstddef>
#include <cstring>

namespace sarn {
namespace internal {

// "%llu": at most 20 characters.
inline size_t FormatU64Into(char* out, unsigned long long value) {
  static const char kPairs[] =
      "00010203040506070809101112131415161718192021222324252627282930313233343536373839"
      "40414243444546474849505152535455565758596061626364656667686970717273747576777879"
      "8081828384858687888990919293949596979899";
  char digits[20];
  char* p = digits + sizeof digits;
  while (value >= 100) {
    unsigned int pair = static_cast<unsigned int>(value % 100) * 2;
    value /= 100;
    *--p = kPairs[pair + 1];
    *--p = kPairs[pair];
  }
  if (value >= 10) {
    unsigned int pair = static_cast<unsigned int>(value) * 2;
    *--p = kPairs[pair + 1];
    *--p = kPairs[pair];
  } else {
    *--p = static_cast<char>('0' + value);
  }
  size_t n = static_cast<size_t>(digits + sizeof digits - p);
  std::memcpy(out, p, n);
  return n;
}

// "%lld" (also "%d" of an int): at most 20 characters.
inline size_t FormatS64Into(char* out, long long value) {
  if (value >= 0) return FormatU64Into(out, static_cast<unsigned long long>(value));
  *out = '-';
  // Negated in unsigned arithmetic so that the smallest value does not overflow.
  return 1 + FormatU64Into(out + 1, 0ull - static_cast<unsigned long long>(value));
}

}  // namespace internal
}  // namespace sarn
