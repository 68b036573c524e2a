// Internal: the numbers of the object reader, read as sscanf reads them ("%d", "%u", "%lld",
// "%llu", "%lg": leading whitespace skipped, trailing text ignored, a minus sign wrapping the
// unsigned types), with a direct conversion for the plain texts whose value is provably the same,
// and sscanf itself for everything else. Not installed.
//
// The direct forms: an integer of at most 9 (32-bit) or 18 (64-bit) decimal digits, with a minus
// only for the signed types, followed by anything but a digit (sscanf stops there too, and no
// such number overflows); a float that is the whole text, an optional minus, digits and at most
// one '.', with at most 15 significant digits and at most 22 after the point (an integer below
// 2^53 divided by an exact power of ten is one correctly rounded operation, as strtod rounds).
#pragma once

#include <cstddef>
#include <cstdio>
#include <cstring>

#include "vek/VekString.h"

namespace sarn {
namespace internal {

// Reads the digits of text[0, n) into `value` when there are 1..maxDigits of them after an
// optional minus (only when `isSigned`) and no digit follows. False for anything else.
inline bool DirectInteger(const unsigned char* text, size_t n, bool isSigned, size_t maxDigits, bool& isNegative,
                          unsigned long long& value) {
  size_t i = 0;
  isNegative = false;
  if (isSigned && n != 0 && text[0] == '-') isNegative = true, i = 1;
  size_t start = i;
  value = 0;
  while (i < n && text[i] >= '0' && text[i] <= '9') {
    if (i - start == maxDigits) return false;
    value = value * 10 + static_cast<unsigned>(text[i] - '0');
    ++i;
  }
  return i != start;
}

inline bool DirectFloat(const unsigned char* text, size_t n, double& out) {
  static const double kPowers[] = {1e0,  1e1,  1e2,  1e3,  1e4,  1e5,  1e6,  1e7,  1e8,  1e9,  1e10, 1e11,
                                   1e12, 1e13, 1e14, 1e15, 1e16, 1e17, 1e18, 1e19, 1e20, 1e21, 1e22};
  size_t i = 0;
  bool isNegative = n != 0 && text[0] == '-';
  if (isNegative) i = 1;
  unsigned long long mantissa = 0;
  size_t nDigits = 0, nSignificant = 0, nAfterPoint = 0;
  bool isAfterPoint = false;
  for (; i < n; ++i) {
    unsigned char c = text[i];
    if (c == '.' && !isAfterPoint) {
      isAfterPoint = true;
      continue;
    }
    if (c < '0' || c > '9') return false;
    ++nDigits;
    if (isAfterPoint) ++nAfterPoint;
    if (mantissa != 0 || c != '0') ++nSignificant;
    if (nSignificant > 15 || nAfterPoint > 22) return false;
    mantissa = mantissa * 10 + static_cast<unsigned>(c - '0');
  }
  if (nDigits == 0) return false;
  double value = static_cast<double>(mantissa) / kPowers[nAfterPoint];
  out = isNegative ? -value : value;
  return true;
}

// sscanf of `format` over text[0, n) (which need not end with NUL); false when nothing converts.
// Texts of 64 bytes or more are copied into `pool` (false when that fails).
template <class T>
bool ScanNumber(VekMempool* pool, const unsigned char* text, size_t n, const char* format, T& out) {
  char small[64];
  if (n < sizeof small) {
    std::memcpy(small, text, n);
    small[n] = '\0';
    return std::sscanf(small, format, &out) == 1;
  }
  VekString copy = VekString::FromUtf8Bytes(pool, n, text);
  return !copy.FEmpty() && std::sscanf(copy.Utf8(), format, &out) == 1;
}

}  // namespace internal
}  // namespace sarn
