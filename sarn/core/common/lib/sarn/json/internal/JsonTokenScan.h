// Internal: token scanning for the object reader, over InputPointerBytesource, with the grammar of
// JsonBytesourceToString (a quoted string, or a bare run of letters, digits, '+', '-' and '.',
// possibly empty) but without making a string where none is needed. Not installed.
//
// SkipToken gives the same verdict as JsonBytesourceToString and leaves the cursor where it would
// after a success. ReadToken gives the token's text: in place when it lies wholly in the current
// block and has no escape (the common case; the bytes stay valid until the cursor reads its next
// block), otherwise through JsonBytesourceToString into `hold`.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

#include "sarn/values/Json.h"
#include "vek/VekString.h"

namespace sarn {
namespace internal {

struct BareTokenBytes {
  bool vM[256];
  constexpr BareTokenBytes() : vM() {
    for (int c = 0; c < 256; ++c) vM[c] = (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z');
    vM[static_cast<unsigned char>('+')] = vM[static_cast<unsigned char>('-')] = vM[static_cast<unsigned char>('.')] = true;
  }
};
inline constexpr BareTokenBytes kBareTokenBytesG;

// The end of a quoted run at `p`: the first closing quote, backslash or NUL before `end`. Eight
// bytes at a time: a byte of the word is one of the three when the word XORed with its pattern
// (or the word itself, for NUL) has a zero byte. A borrow can mark bytes above the first zero
// byte, never below it, so on a little-endian machine the lowest mark is the first match.
inline const unsigned char* QuotedRunEnd(const unsigned char* p, const unsigned char* end) {
  constexpr uint64_t kOnes = 0x0101010101010101ull, kHighs = 0x8080808080808080ull;
  while (end - p >= 8) {
    uint64_t word;
    std::memcpy(&word, p, 8);
    uint64_t quote = word ^ (kOnes * '"'), backslash = word ^ (kOnes * '\\');
    uint64_t found = ((word - kOnes) & ~word) | ((quote - kOnes) & ~quote) | ((backslash - kOnes) & ~backslash);
    found &= kHighs;
    if (found != 0) {
#if defined(__BYTE_ORDER__) && __BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__
      return p + (__builtin_ctzll(found) >> 3);
#else
      break;
#endif
    }
    p += 8;
  }
  while (p != end && *p != '"' && *p != '\\' && *p != 0) ++p;
  return p;
}

// Skips whitespace; the cursor's own (out-of-line) skip runs only at the end of a block.
inline void Skip(InputPointerBytesource& input) {
  const unsigned char* p = input.pCurM;
  while (p != input.pEndM && (*p == ' ' || *p == '\n' || *p == '\r' || *p == '\t')) ++p;
  input.pCurM = p;
  if (p == input.pEndM) input.SkipWhitespace();
}

inline bool SkipToken(InputPointerBytesource& input) {
  Skip(input);
  if (input.Peek() != '"') {
    for (;;) {
      const unsigned char* p = input.pCurM;
      while (p != input.pEndM && kBareTokenBytesG.vM[*p]) ++p;
      input.pCurM = p;
      if (p != input.pEndM || !input.Refill()) return true;
    }
  }
  ++input.pCurM;
  for (;;) {
    const unsigned char* p = QuotedRunEnd(input.pCurM, input.pEndM);
    input.pCurM = p;
    if (p == input.pEndM) {
      if (input.Refill()) continue;
      return false;  // an unclosed string
    }
    if (*p == '"') {
      input.pCurM = p + 1;
      return true;
    }
    if (*p == 0) return false;
    input.pCurM = p + 1;
    char escaped = input.Next();
    char replacement;
    if (escaped != 'u' && (escaped == 0 || !Json::EscapedCharToChar(escaped, replacement))) return false;
  }
}

// The token as a string in `pool` (`hold` itself when it holds the token).
struct TokenText;
inline VekString TokenString(VekMempool* pool, const TokenText& token, const VekString& hold);

// A token's text: [pM, pM + nM), in the cursor's block, or (isHeldM) in the string the reader
// passed to hold it. Plain data, so that the common case costs no string at all.
struct TokenText {
  const unsigned char* pM = nullptr;
  size_t nM = 0;
  bool isHeldM = false;

  bool Is(const char* text, size_t n) const { return nM == n && std::memcmp(pM, text, n) == 0; }
};

inline VekString TokenString(VekMempool* pool, const TokenText& token, const VekString& hold) {
  return token.isHeldM ? hold : VekString::FromUtf8Bytes(pool, token.nM, token.pM);
}

inline bool ReadToken(VekMempool* pool, InputPointerBytesource& input, TokenText& token, VekString& hold) {
  Skip(input);
  const unsigned char* p = input.pCurM;
  const unsigned char* end = input.pEndM;
  if (p != end) {
    if (*p == '"') {
      const unsigned char* q = QuotedRunEnd(p + 1, end);
      if (q != end && *q == '"') {
        token.pM = p + 1;
        token.nM = static_cast<size_t>(q - p - 1);
        token.isHeldM = false;
        input.pCurM = q + 1;
        return true;
      }
    } else {
      const unsigned char* q = p;
      while (q != end && kBareTokenBytesG.vM[*q]) ++q;
      if (q != end) {  // otherwise the token may go on in the next block
        token.pM = p;
        token.nM = static_cast<size_t>(q - p);
        token.isHeldM = false;
        input.pCurM = q;
        return true;
      }
    }
  }
  if (!JsonBytesourceToString(pool, nullptr, input, hold)) return false;
  token.pM = reinterpret_cast<const unsigned char*>(hold.Utf8());
  token.nM = hold.NByte();
  token.isHeldM = true;
  return true;
}

}  // namespace internal
}  // namespace sarn
