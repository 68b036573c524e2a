// Base64 and byte lists. Both directions know the size of their result from the size of their
// input, so each allocates its result once and writes into it; nothing is accumulated and
// copied.
#include "sarn/values/Base64.h"

#include <climits>
#include <cstring>

#include "sarn/base/internal/ByteStrings.h"

namespace sarn {

const char Base64::DEFAULT_CODE_SET[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
const unsigned char Base64::DEFAULT_TERMINATOR = '=';
const char Base64::YAHOO_CODE_SET[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789._";
const unsigned char Base64::YAHOO_TERMINATOR = '-';

namespace {

// Text length of n bytes: 4 characters per started group of 3.
size_t EncodedLength(size_t n) { return (n + 2) / 3 * 4; }

void EncodeInto(const unsigned char* codes, unsigned char terminator, const unsigned char* in, size_t n,
                unsigned char* out) {
  size_t i = 0;
  for (; n - i >= 3; i += 3, out += 4) {
    unsigned int v = (unsigned int)in[i] << 16 | (unsigned int)in[i + 1] << 8 | in[i + 2];
    out[0] = codes[v >> 18];
    out[1] = codes[(v >> 12) & 63];
    out[2] = codes[(v >> 6) & 63];
    out[3] = codes[v & 63];
  }
  if (n - i == 1) {
    unsigned int v = (unsigned int)in[i] << 16;
    out[0] = codes[v >> 18];
    out[1] = codes[(v >> 12) & 48];
    out[2] = terminator;
    out[3] = terminator;
  } else if (n - i == 2) {
    unsigned int v = (unsigned int)in[i] << 16 | (unsigned int)in[i + 1] << 8;
    out[0] = codes[v >> 18];
    out[1] = codes[(v >> 12) & 63];
    out[2] = codes[(v >> 6) & 60];
    out[3] = terminator;
  }
}

// Decodes n characters (n a non-zero multiple of 4) into `out`, which holds n / 4 * 3 bytes.
bool DecodeInto(const unsigned char* decode, unsigned char terminator, const unsigned char* in, size_t n,
                unsigned char* out, size_t& nOut) {
  unsigned char* start = out;
  const unsigned char* last = in + n - 4;
  for (; in != last; in += 4, out += 3) {
    unsigned int d0 = decode[in[0]], d1 = decode[in[1]], d2 = decode[in[2]], d3 = decode[in[3]];
    // Valid values are below 64; 255 marks padding or a stranger, neither allowed before the
    // last group.
    if ((d0 | d1 | d2 | d3) & 0x80) return false;
    out[0] = static_cast<unsigned char>(d0 << 2 | d1 >> 4);
    out[1] = static_cast<unsigned char>(d1 << 4 | d2 >> 2);
    out[2] = static_cast<unsigned char>(d2 << 6 | d3);
  }
  unsigned int d0 = decode[in[0]], d1 = decode[in[1]], d2 = decode[in[2]], d3 = decode[in[3]];
  if (d0 == 255 || d1 == 255) return false;
  *out++ = static_cast<unsigned char>(d0 << 2 | d1 >> 4);
  if (d2 == 255) {
    nOut = static_cast<size_t>(out - start);
    return in[2] == terminator;  // the fourth character is not looked at
  }
  *out++ = static_cast<unsigned char>(d1 << 4 | d2 >> 2);
  if (d3 == 255) {
    nOut = static_cast<size_t>(out - start);
    return in[3] == terminator;
  }
  *out++ = static_cast<unsigned char>(d2 << 6 | d3);
  nOut = static_cast<size_t>(out - start);
  return true;
}

// Decodes with the given tables into a new byte string; null when the text does not decode.
// Null when the text does not decode or when memory runs out (`isOutOfMemory` then says so).
ref<vek::ByteBuffer> DecodeToByteString(VekMempool* pool, const unsigned char* decode, unsigned char terminator,
                                        const unsigned char* text, size_t n, bool& isOutOfMemory) {
  isOutOfMemory = false;
  if (n % 4 != 0) return ref<vek::ByteBuffer>();
  unsigned char* data;
  ref<internal::SizedByteString> bytes = internal::NewSizedByteString(pool, n / 4 * 3, data);
  if (!bytes) {
    isOutOfMemory = true;
    return ref<vek::ByteBuffer>();
  }
  if (n == 0) return bytes;
  size_t nOut = 0;
  if (!DecodeInto(decode, terminator, text, n, data, nOut)) return ref<vek::ByteBuffer>();
  bytes->Truncate(nOut);
  return bytes;
}

const Base64& DefaultCodec() {
  static const Base64 codec(Base64::DEFAULT_CODE_SET, Base64::DEFAULT_TERMINATOR);
  return codec;
}

// A scratch block for text that is then copied into a string: on the stack when small.
class Scratch {
 public:
  Scratch(VekMempool* pool, size_t n)
      : pPoolM(pool != nullptr ? pool : VekMempool::Default()),
        pDataM(n <= sizeof stackM ? stackM : static_cast<unsigned char*>(pPoolM->Malloc(n))) {}
  ~Scratch() {
    if (pDataM != stackM) pPoolM->Free(pDataM);
  }
  unsigned char* Get() const { return pDataM; }

 private:
  VekMempool* pPoolM;
  unsigned char stackM[512];
  unsigned char* pDataM;
};

const unsigned char* BytesOf(const VekString& text) { return reinterpret_cast<const unsigned char*>(text.Utf8()); }

VekString FormatHex(VekMempool* pool, const unsigned char* bytes, size_t n) {
  static const char kDigits[] = "0123456789ABCDEF";
  if (n == 0 || n > UINT32_MAX / 3) return VekString();
  Scratch scratch(pool, 3 * n);
  unsigned char* out = scratch.Get();
  if (out == nullptr) return VekString();
  for (size_t i = 0; i < n; ++i, out += 3) {
    out[0] = static_cast<unsigned char>(kDigits[bytes[i] >> 4]);
    out[1] = static_cast<unsigned char>(kDigits[bytes[i] & 15]);
    out[2] = ' ';
  }
  return VekString::FromUtf8Bytes(pool, 3 * n, scratch.Get());
}

bool IsCSpace(unsigned char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

int HexValue(unsigned char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

// strtol(token, nullptr, 16) of a token without whitespace, cut to its low 8 bits: an optional
// sign, an optional 0x, hexadecimal digits up to the first other character, and the saturation
// at LONG_MAX or LONG_MIN on overflow.
unsigned char TokenValue(const unsigned char* p, const unsigned char* end) {
  bool isNegative = false;
  if (*p == '+' || *p == '-') isNegative = *p++ == '-';
  if (end - p >= 2 && p[0] == '0' && (p[1] == 'x' || p[1] == 'X')) p += 2;
  unsigned long value = 0;
  bool isOverflow = false;
  for (; p != end; ++p) {
    int digit = HexValue(*p);
    if (digit < 0) break;
    if (value > (ULONG_MAX >> 4)) isOverflow = true;
    value = value << 4 | static_cast<unsigned long>(digit);
  }
  long result;
  if (!isNegative) {
    result = isOverflow || value > static_cast<unsigned long>(LONG_MAX) ? LONG_MAX : static_cast<long>(value);
  } else if (isOverflow || value > static_cast<unsigned long>(LONG_MAX) + 1) {
    result = LONG_MIN;
  } else {
    result = static_cast<long>(0 - value);
  }
  return static_cast<unsigned char>(result);
}

// Writes the bytes of a byte list to `out`, which holds at least n / 2 + 1 bytes (a byte needs
// a token and a delimiter), and returns how many.
size_t ParseHexInto(const unsigned char* in, size_t n, unsigned char* out) {
  size_t count = 0;
  size_t i = 0;
  for (;;) {
    while (i < n && (in[i] == ' ' || in[i] == '\t' || in[i] == '\n' || in[i] == '\r')) ++i;
    if (i == n) return count;
    size_t start = i;
    while (i < n && in[i] != '\0' && !IsCSpace(in[i])) ++i;
    if (i > start) {
      out[count++] = TokenValue(in + start, in + i);
    } else {
      // An empty token sits on a vertical tab, form feed or NUL. Stepping over it is what keeps
      // the parse moving: the whitespace skip above does not take these bytes.
      ++i;
    }
  }
}

}  // namespace

Base64::Base64(const char* codeSet, unsigned char terminator) : codesM(), fBadCodeSetM(true), terminatorM(terminator) {
  std::memset(decodeM, 255, sizeof decodeM);
  if (codeSet == nullptr) return;
  for (int i = 0; i < 64; ++i) {
    unsigned char c = static_cast<unsigned char>(codeSet[i]);
    // The NUL test also keeps a short code set from being read past its end.
    if (c == '\0' || c == terminator || decodeM[c] != 255) return;
    codesM[i] = c;
    decodeM[c] = static_cast<unsigned char>(i);
  }
  fBadCodeSetM = false;
}

void Base64::Encode(VekMempool* pool, const ref<vek::ByteBuffer>& input, ref<vek::ByteBuffer>& output) const {
  size_t n = input ? input->GetLength() : 0;
  if (fBadCodeSetM) n = 0;
  unsigned char* data;
  ref<internal::SizedByteString> text = internal::NewSizedByteString(pool, EncodedLength(n), data);
  if (text && n != 0) EncodeInto(codesM, terminatorM, input->GetData(), n, data);
  output = text;
}

bool Base64::Decode(VekMempool* pool, const ref<vek::ByteBuffer>& input, ref<vek::ByteBuffer>& output) const {
  if (fBadCodeSetM) return false;
  bool isOutOfMemory;
  ref<vek::ByteBuffer> bytes =
      input ? DecodeToByteString(pool, decodeM, terminatorM, input->GetData(), input->GetLength(), isOutOfMemory)
            : DecodeToByteString(pool, decodeM, terminatorM, nullptr, 0, isOutOfMemory);
  if (!bytes) return false;
  output = bytes;
  return true;
}

VekString EncodeBase64(VekMempool* pool, const ref<vek::ByteBuffer>& bytes) {
  size_t n = bytes ? bytes->GetLength() : 0;
  if (n == 0) return VekString();
  const Base64& codec = DefaultCodec();
  Scratch scratch(pool, EncodedLength(n));
  if (scratch.Get() == nullptr) return VekString();
  EncodeInto(codec.codesM, codec.terminatorM, bytes->GetData(), n, scratch.Get());
  return VekString::FromUtf8Bytes(pool, EncodedLength(n), scratch.Get());
}

ref<vek::ByteBuffer> DecodeBase64(VekMempool* pool, const VekString& text) {
  const Base64& codec = DefaultCodec();
  bool isOutOfMemory;
  ref<vek::ByteBuffer> bytes =
      DecodeToByteString(pool, codec.decodeM, codec.terminatorM, BytesOf(text), text.NByte(), isOutOfMemory);
  if (bytes || isOutOfMemory) return bytes;
  return vek::ByteBuffer::New(pool);
}

VekString FormatBytes(VekMempool* pool, const VekString& bytes) { return FormatHex(pool, BytesOf(bytes), bytes.NByte()); }

VekString FormatBytesFromBytestring(VekMempool* pool, const ref<vek::ByteBuffer>& bytes) {
  return bytes ? FormatHex(pool, bytes->GetData(), bytes->GetLength()) : VekString();
}

VekString ParseBytes(VekMempool* pool, const VekString& text) {
  size_t n = text.NByte();
  Scratch scratch(pool, n / 2 + 1);
  if (scratch.Get() == nullptr) return VekString();
  size_t count = ParseHexInto(BytesOf(text), n, scratch.Get());
  return VekString::FromUtf8Bytes(pool, count, scratch.Get());
}

ref<vek::ByteBuffer> ParseBytesToBytestring(VekMempool* pool, const VekString& text) {
  size_t n = text.NByte();
  unsigned char* data;
  ref<internal::SizedByteString> bytes = internal::NewSizedByteString(pool, n / 2 + 1, data);
  if (!bytes) return ref<vek::ByteBuffer>();
  bytes->Truncate(ParseHexInto(BytesOf(text), n, data));
  return bytes;
}

}  // namespace sarn
