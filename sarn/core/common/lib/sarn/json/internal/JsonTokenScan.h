// Internal: token scanning for the object reader, over InputPointerBytesource, with the grammar of
// JsonBytesourceToString (a quoted string, or a bare run of letters, digits, '+', '-' and '.',
// possibly empty) but without making a string where none is needed. Not installed.
//
// SkipToken gives the same verdict as JsonBytesourceToString and leaves the cursor where it would
// after a success. ReadToken gives the token's text: in place when it lies wholly in the current
// block and has no escape (the common case; the bytes stay valid until the cursor reads its next
// block), otherwise through JsonBytesourceToString into `holder`.
#pragma once

#include <cstddef>
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

// The end of a quoted run at `p`: the first closing quote, backslash or NUL before `end`.
inline const unsigned char* QuotedRunEnd(const unsigned char* p, const unsigned char* end) {
  while (p != end && *p != '"' && *p != '\\' && *p != 0) ++p;
  return p;
}

inline bool SkipToken(InputPointerBytesource& input) {
  input.SkipWhitespace();
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

// A token's text: [pM, pM + nM), in the cursor's block or in holdM.
struct TokenText {
  const unsigned char* pM = nullptr;
  size_t nM = 0;
  VekString holdM;

  bool Is(const char* text, size_t n) const { return nM == n && std::memcmp(pM, text, n) == 0; }
};

inline bool ReadToken(VekMempool* pool, InputPointerBytesource& input, TokenText& token) {
  input.SkipWhitespace();
  const unsigned char* p = input.pCurM;
  const unsigned char* end = input.pEndM;
  if (p != end) {
    if (*p == '"') {
      const unsigned char* q = QuotedRunEnd(p + 1, end);
      if (q != end && *q == '"') {
        token.pM = p + 1;
        token.nM = static_cast<size_t>(q - p - 1);
        input.pCurM = q + 1;
        return true;
      }
    } else {
      const unsigned char* q = p;
      while (q != end && kBareTokenBytesG.vM[*q]) ++q;
      if (q != end) {  // otherwise the token may go on in the next block
        token.pM = p;
        token.nM = static_cast<size_t>(q - p);
        input.pCurM = q;
        return true;
      }
    }
  }
  if (!JsonBytesourceToString(pool, nullptr, input, token.holdM)) return false;
  token.pM = reinterpret_cast<const unsigned char*>(token.holdM.Utf8());
  token.nM = token.holdM.NByte();
  return true;
}

}  // namespace internal
}  // namespace sarn
