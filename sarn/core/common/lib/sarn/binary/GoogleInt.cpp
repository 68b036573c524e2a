#include "sarn/binary/GoogleInt.h"

#include <cstdint>

#include "sarn/binary/ProtoBufByteOutputStream.h"
#include "sarn/binary/internal/Varint.h"

namespace sarn {

namespace {

// One reader for both widths: the last byte may sit at shift kMaxShift at most (28 or 63), so a
// varint longer than 5 or 10 bytes fails; the shift is checked before it is used, so a long run
// of continuation bytes is refused without shifting past the value's width.
template <class U, unsigned kMaxShift>
bool ReadVarint(const unsigned char** cursor, const unsigned char* end, U* value) {
  const unsigned char* p = *cursor;
  if (p >= end) return false;
  U result = 0;
  unsigned shift = 0;
  for (;;) {
    unsigned char byte = *p++;
    if (shift > kMaxShift) return false;
    result |= static_cast<U>(byte & 0x7F) << shift;  // bits beyond the width fall off here
    if ((byte & 0x80) == 0) break;
    if (p == end) return false;
    shift += 7;
  }
  *value = result;
  *cursor = p;
  return true;
}

}  // namespace

void GoogleInt::WriteGoogleU32(unsigned int value, ProtoBufByteOutputStream* out) {
  internal::AppendVarint(value, out);
}

void GoogleInt::WriteGoogleU64(unsigned long long value, ProtoBufByteOutputStream* out) {
  internal::AppendVarint(value, out);
}

void GoogleInt::WriteGoogleS32(int value, ProtoBufByteOutputStream* out) { internal::AppendZigZag32(value, out); }

void GoogleInt::WriteGoogleS64(long long value, ProtoBufByteOutputStream* out) {
  internal::AppendZigZag64(value, out);
}

bool GoogleInt::ReadGoogleU32(const unsigned char** cursor, const unsigned char* end, unsigned int* value) {
  return ReadVarint<unsigned int, 28>(cursor, end, value);
}

bool GoogleInt::ReadGoogleU64(const unsigned char** cursor, const unsigned char* end, unsigned long long* value) {
  return ReadVarint<unsigned long long, 63>(cursor, end, value);
}

bool GoogleInt::ReadGoogleS32(const unsigned char** cursor, const unsigned char* end, int* value) {
  unsigned int u;
  if (!ReadGoogleU32(cursor, end, &u)) return false;
  *value = static_cast<int>((u >> 1) ^ (0u - (u & 1)));
  return true;
}

bool GoogleInt::ReadGoogleS64(const unsigned char** cursor, const unsigned char* end, long long* value) {
  unsigned long long u;
  if (!ReadGoogleU64(cursor, end, &u)) return false;
  *value = static_cast<long long>((u >> 1) ^ (0ull - (u & 1)));
  return true;
}

}  // namespace sarn
