// The scalar text conventions. Number formatting is on the hot path of every writer, so the
// integer and long-identifier texts are built digit by digit, and floats go through
// std::to_chars, which produces exactly the characters of printf's "%.8g" without parsing a
// format or taking the locale.
#include <charconv>
#include <cstdio>
#include <cstring>

#include "sarn/values/Base64.h"
#include "sarn/dict/Dict.h"
#include "sarn/base/internal/NumberText.h"
#include "sarn/values/internal/LongIdText.h"

namespace sarn {

namespace {

VekString Text(const char* data, size_t n) { return VekString::FromUtf8Bytes(nullptr, n, data); }

bool IsDigit(char c) { return c >= '0' && c <= '9'; }

}  // namespace

VekString Dict::FormatBool(VekMempool* pool, bool value) { return value ? Text("true", 4) : Text("false", 5); }

VekString Dict::FormatS32(VekMempool* pool, int value) { return FormatS64(pool, value); }

VekString Dict::FormatS64(VekMempool* pool, long long value) {
  char text[24];
  return Text(text, internal::FormatS64Into(text, value));
}

VekString Dict::FormatU32(VekMempool* pool, unsigned int value) { return FormatU64(pool, value); }

VekString Dict::FormatU64(VekMempool* pool, unsigned long long value) {
  char text[24];
  return Text(text, internal::FormatU64Into(text, value));
}

VekString Dict::FormatFloat(VekMempool* pool, double value) {
  char text[100];
  std::to_chars_result end = std::to_chars(text, text + sizeof text - 2, value, std::chars_format::general, 8);
  size_t n = static_cast<size_t>(end.ptr - text);
  if (std::memchr(text, '.', n) == nullptr) {
    text[n++] = '.';
    text[n++] = '0';
  }
  return Text(text, n);
}

VekString Dict::FormatLongId(VekMempool* pool, unsigned long long id) {
  char text[internal::kLongIdTextRoom];
  return Text(text, internal::FormatLongIdInto(text, id));
}

VekString Dict::FormatBytestring(VekMempool* pool, const ref<vek::ByteBuffer>& bytes) { return EncodeBase64(pool, bytes); }

// Parsers read their text as a C string, up to its first NUL, as the strtoll and sscanf forms that
// define them do (ScalarTypes.cpp follows the same rule).
bool Dict::ParseBool(VekMempool* pool, const VekString& text) { return std::strcmp(text.Utf8(), "true") == 0; }

int Dict::ParseS32(VekMempool* pool, const VekString& text) {
  return static_cast<int>(static_cast<unsigned int>(static_cast<unsigned long long>(ParseS64(pool, text))));
}

long long Dict::ParseS64(VekMempool* pool, const VekString& text) {
  const char* p = text.Utf8();
  const char* end = p + std::strlen(p);
  bool isNegative = p != end && *p == '-';
  if (isNegative) ++p;
  if (p == end) return 0;
  // The limit's magnitude: 2^63 - 1, or 2^63 for a negative number. Beyond it the value
  // saturates, as strtoll does.
  unsigned long long limit = isNegative ? 1ull << 63 : (1ull << 63) - 1;
  unsigned long long value = 0;
  for (; p != end; ++p) {
    if (!IsDigit(*p)) return 0;  // a sign, space or anything after the number
    unsigned int digit = static_cast<unsigned int>(*p - '0');
    value = value > (limit - digit) / 10 ? limit : value * 10 + digit;
  }
  return isNegative ? static_cast<long long>(0 - value) : static_cast<long long>(value);
}

unsigned long long Dict::ParseU64(VekMempool* pool, const char* text) {
  if (text == nullptr || *text == '\0') return 0;
  unsigned long long value = 0;
  for (; *text != '\0'; ++text) {
    if (!IsDigit(*text)) return 0;
    value = value * 10 + static_cast<unsigned int>(*text - '0');  // wraps, as the text form allows
  }
  return value;
}

unsigned int Dict::ParseU32(VekMempool* pool, const char* text) {
  unsigned long long value = ParseU64(pool, text);
  return value > 0xFFFFFFFFull ? 0 : static_cast<unsigned int>(value);
}

double Dict::ParseFloat(VekMempool* pool, const VekString& text) {
  double value = 0.0;
  if (std::sscanf(text.Utf8(), "%lg", &value) != 1) return 0.0;
  return value;
}

unsigned long long Dict::ParseLongId(VekMempool* pool, const char* text) {
  if (text == nullptr) return 0;
  const char* dot = std::strrchr(text, '.');
  if (dot == nullptr) return ParseU64(pool, text);
  size_t prefixLength = static_cast<size_t>(dot - text);
  unsigned long long number = ParseU64(pool, dot + 1);
  unsigned int code = 0;
  if (!internal::FindLongIdCode(text, prefixLength, code)) return 0;
  return number + (static_cast<unsigned long long>(code) << internal::kLongIdShift);
}

ref<vek::ByteBuffer> Dict::ParseBytestring(VekMempool* pool, const VekString& text) { return DecodeBase64(pool, text); }

}  // namespace sarn
