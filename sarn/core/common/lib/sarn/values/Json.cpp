// JSON string writing and reading. The writer copies runs of plain bytes in one piece and
// handles the few bytes that need an escape one by one; the in-memory reader makes its result
// straight from the input unless an escape has to be replaced; the byte-source reader does the
// same within one block and gathers into a scratch buffer only across blocks or escapes.
#include "sarn/values/Json.h"

#include <optional>

namespace sarn {

namespace {

// Bytes the writer cannot copy as they are: control bytes except 0x03 and 0x1A (which reach the
// output raw), the double quote and the backslash.
struct EscapeTable {
  bool vM[256];
  constexpr EscapeTable() : vM() {
    for (int c = 0; c < 0x20; ++c) vM[c] = c != 0x03 && c != 0x1A;
    vM[static_cast<unsigned char>('"')] = true;
    vM[static_cast<unsigned char>('\\')] = true;
  }
};
constexpr EscapeTable kEscapeG;

// ASCII letters and digits (the C-locale isalnum) plus the characters `extra` lists.
struct ByteSet {
  bool vM[256];
  constexpr ByteSet(const char* extra) : vM() {
    for (int c = 0; c < 256; ++c) vM[c] = (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z');
    for (; *extra != '\0'; ++extra) vM[static_cast<unsigned char>(*extra)] = true;
  }
};
constexpr ByteSet kBareWriteG("-");      // what may be written without quotes
constexpr ByteSet kBareTokenG("+-.");    // what a bare token read may hold

// Bytes that stop the scan of a quoted string: NUL, the backslash and the closing quote.
struct StopTable {
  bool vM[256];
  constexpr StopTable() : vM() {
    vM[0] = true;
    vM[static_cast<unsigned char>('\\')] = true;
    vM[static_cast<unsigned char>('"')] = true;
  }
};
constexpr StopTable kStopG;

const char kHexDigitsG[] = "0123456789ABCDEF";

// The offset (0 to 7) of the first of the 8 bytes at `p` that may need an escape, or 8 when none
// does. The classic "has a byte below n" test on v, v ^ '"' and v ^ '\\' finds bytes below
// 0x20, quotes and backslashes; its lowest flag is always exact (only the flags above a true one
// can be false). It also flags 0x03 and 0x1A, which the caller then lets through.
inline unsigned FirstEscapeIn8(const unsigned char* p) {
  constexpr uint64_t kOnes = 0x0101010101010101ull;
  constexpr uint64_t kHighs = 0x8080808080808080ull;
  uint64_t v;
  std::memcpy(&v, p, sizeof v);
  uint64_t quote = v ^ (kOnes * '"');
  uint64_t backslash = v ^ (kOnes * '\\');
  uint64_t hits = (((v - kOnes * 0x20) & ~v) | ((quote - kOnes) & ~quote) | ((backslash - kOnes) & ~backslash)) & kHighs;
  return hits == 0 ? 8 : static_cast<unsigned>(__builtin_ctzll(hits)) / 8;
}

// The letter of a two-character escape, 0 for bytes written as backslash-u.
struct ShortEscapeTable {
  unsigned char vM[256];
  constexpr ShortEscapeTable() : vM() {
    vM[static_cast<unsigned char>('\b')] = 'b';
    vM[static_cast<unsigned char>('\t')] = 't';
    vM[static_cast<unsigned char>('\n')] = 'n';
    vM[static_cast<unsigned char>('\f')] = 'f';
    vM[static_cast<unsigned char>('\r')] = 'r';
    vM[static_cast<unsigned char>('"')] = '"';
    vM[static_cast<unsigned char>('\\')] = '\\';
  }
};
constexpr ShortEscapeTable kShortEscapeG;

// Input is escaped in slices; a slice of n bytes writes at most 6 n of output.
constexpr size_t kSliceBytes = 512;
constexpr size_t kSliceOutBytes = 6 * kSliceBytes;

wynbaselib::InMemoryBytestream& EmptyStream() {
  static wynbaselib::InMemoryBytestream stream;
  return stream;
}

// Writers hand out room for one slice's output (Claim) and take back how much was used
// (Commit), so the escaping loop stores bytes directly without a call per piece.
class BufferOut {
 public:
  explicit BufferOut(ByteBuffer& out) : outM(out.bufferM) {}
  void Expect(size_t n) { outM.Reserve(n); }
  // Null when the buffer cannot grow.
  unsigned char* Claim(size_t n) {
    if (!outM.Reserve(n)) return nullptr;
    return outM.bytesM->GetData() + outM.nUsedM;
  }
  void Commit(const unsigned char* end) { outM.nUsedM = static_cast<uint64_t>(end - outM.bytesM->GetData()); }
  bool Finish() { return true; }

 private:
  Vek1ByteBuffer& outM;
};

// Stages the output on the stack and passes it to the sink one full stage at a time.
class SinkOut {
 public:
  explicit SinkOut(wynbaselib::Bytesink& out) : outM(out) {}
  void Expect(size_t) {}
  unsigned char* Claim(size_t n) {
    if (n > sizeof stageM - nStagedM) Flush();
    return stageM + nStagedM;
  }
  void Commit(const unsigned char* end) { nStagedM = static_cast<size_t>(end - stageM); }
  bool Finish() {
    Flush();
    return isOkM;
  }

 private:
  void Flush() {
    if (nStagedM != 0) isOkM = outM.Write(reinterpret_cast<const char*>(stageM), nStagedM) && isOkM;
    nStagedM = 0;
  }
  wynbaselib::Bytesink& outM;
  unsigned char stageM[2 * kSliceOutBytes + 2];
  size_t nStagedM = 0;
  bool isOkM = true;
};

bool IsBare(const VekString& text) {
  if (text.FEmpty()) return false;
  for (const unsigned char* p = reinterpret_cast<const unsigned char*>(text.Utf8()); *p != '\0'; ++p) {
    if (!kBareWriteG.vM[*p]) return false;
  }
  return true;
}

// Escapes [p, end) into `o`, which has room for 6 bytes per input byte; `textEnd` is where the
// whole text ends (a backslash looks one byte ahead for a 'u'). Returns the new output end.
unsigned char* EscapeSlice(const unsigned char* p, const unsigned char* end, const unsigned char* textEnd,
                           unsigned char* o) {
  while (p != end) {
    if (end - p >= 8) {
      // Copy all 8 bytes, keep those before the first candidate.
      unsigned k = FirstEscapeIn8(p);
      std::memcpy(o, p, 8);
      o += k;
      p += k;
      if (k == 8) continue;
    }
    unsigned char c = *p++;
    if (!kEscapeG.vM[c]) {
      *o++ = c;
      continue;
    }
    o[0] = '\\';
    unsigned char letter = kShortEscapeG.vM[c];
    if (c == '\\' && p != textEnd && *p == 'u') {
      // A backslash-u escape passes through as it is: the 'u' follows as an ordinary byte.
      o += 1;
    } else if (letter != 0) {
      o[1] = letter;
      o += 2;
    } else {
      o[1] = 'u';
      o[2] = '0';
      o[3] = '0';
      o[4] = static_cast<unsigned char>(kHexDigitsG[c >> 4]);
      o[5] = static_cast<unsigned char>(kHexDigitsG[c & 15]);
      o += 6;
    }
  }
  return o;
}

template <class Out>
bool WriteJsonString(const VekString& text, bool fBareAllowed, Out& out) {
  bool isQuoted = !(fBareAllowed && IsBare(text));
  const unsigned char* p = reinterpret_cast<const unsigned char*>(text.Utf8());
  const unsigned char* end = p + text.NByte();
  // Room for the whole text up front, plus the worst case of the last slice: most texts need no
  // escape, so a long one makes the buffer grow once rather than slice by slice.
  size_t n = text.NByte();
  out.Expect(n + 2 + 5 * (n < kSliceBytes ? n : kSliceBytes));
  unsigned char* o = out.Claim(1);
  if (o == nullptr) return false;
  if (isQuoted) *o++ = '"';
  out.Commit(o);
  while (p != end) {
    n = static_cast<size_t>(end - p) < kSliceBytes ? static_cast<size_t>(end - p) : kSliceBytes;
    o = out.Claim(6 * n + 1);
    if (o == nullptr) return false;
    o = EscapeSlice(p, p + n, end, o);
    out.Commit(o);
    p += n;
  }
  if (isQuoted) {
    o = out.Claim(1);
    if (o == nullptr) return false;
    *o++ = '"';
    out.Commit(o);
  }
  return out.Finish();
}

// The result of a read: an interned instance when the table has a non-empty one.
VekString MakeResult(VekMempool* mempool, VekHashStringToStringNew* internTable, const unsigned char* data,
                     size_t n) {
  if (internTable != nullptr) {
    const VekString* stored = internTable->Find(reinterpret_cast<const char*>(data), n);
    if (stored != nullptr && !stored->FEmpty()) return *stored;
  }
  return VekString::FromUtf8Bytes(mempool, n, data);
}

}  // namespace

InputPointerBytesource::InputPointerBytesource(wynbaselib::Bytesource* source)
    : pSourceM(source),
      pCurM(bufferM),
      pEndM(bufferM),
      nLastReadM(0),
      nEarlierBytesM(0),
      fMoreM(source != nullptr),
      fEchoM(false),
      pEchoStartM(bufferM),
      pEchoSinkM(nullptr),
      wasEchoFailedM(false) {}

InputPointerBytesource::InputPointerBytesource(const unsigned char* data, size_t length)
    : pSourceM(&EmptyStream()),
      pCurM(data),
      pEndM(data + length),
      nLastReadM(length),
      nEarlierBytesM(0),
      fMoreM(false),
      fEchoM(false),
      pEchoStartM(data),
      pEchoSinkM(nullptr),
      wasEchoFailedM(false) {}

void InputPointerBytesource::FlushEcho() {
  if (pCurM != pEchoStartM && pEchoSinkM != nullptr &&
      !pEchoSinkM->Write(reinterpret_cast<const char*>(pEchoStartM), static_cast<size_t>(pCurM - pEchoStartM))) {
    wasEchoFailedM = true;
  }
  pEchoStartM = pCurM;
}

bool InputPointerBytesource::Refill() {
  if (fEchoM) FlushEcho();
  if (!fMoreM) return false;
  nEarlierBytesM += nLastReadM;
  size_t n = pSourceM->Read(bufferM, kBlockBytes);
  // A source that claims more than it was allowed to write must not move the cursor past the
  // buffer.
  if (n > kBlockBytes) n = kBlockBytes;
  pCurM = bufferM;
  pEchoStartM = bufferM;
  pEndM = bufferM + n;
  nLastReadM = n;
  // After the end the source is not asked again: some sources block or fail on a second read.
  if (n == 0) fMoreM = false;
  return n != 0;
}

void InputPointerBytesource::SkipWhitespace() {
  for (;;) {
    char c = Peek();
    if (c != ' ' && c != '\n' && c != '\r' && c != '\t') return;
    ++pCurM;
  }
}

void InputPointerBytesource::StartEcho(wynbaselib::Bytesink* sink) {
  pEchoStartM = pCurM;
  pEchoSinkM = sink;
  fEchoM = true;
  wasEchoFailedM = false;
}

bool InputPointerBytesource::StopEcho() {
  if (fEchoM) FlushEcho();
  fEchoM = false;
  return !wasEchoFailedM;
}

namespace Json {

bool StringToJson(const VekString& text, bool fBareAllowed, ByteBuffer& out) {
  BufferOut writer(out);
  return WriteJsonString(text, fBareAllowed, writer);
}

bool StringToJson(const VekString& text, bool fBareAllowed, wynbaselib::Bytesink& out) {
  SinkOut writer(out);
  return WriteJsonString(text, fBareAllowed, writer);
}

bool EscapedCharToChar(char escaped, char& result) {
  switch (escaped) {
    case '"': result = '"'; return true;
    case '/': result = '/'; return true;
    case '\\': result = '\\'; return true;
    case 'b': result = '\b'; return true;
    case 'f': result = '\f'; return true;
    case 'n': result = '\n'; return true;
    case 'r': result = '\r'; return true;
    case 't': result = '\t'; return true;
    default: return false;
  }
}

bool JsonToString(VekMempool* mempool, VekHashStringToStringNew* internTable, InputPointer& input,
                  VekString& result) {
  input.SkipWhitespace();
  const unsigned char* p = input.pCurM;
  const unsigned char* end = input.pEndM;
  if (p == end || *p != '"') {
    const unsigned char* start = p;
    while (p != end && kBareTokenG.vM[*p]) ++p;
    result = MakeResult(mempool, internTable, start, static_cast<size_t>(p - start));
    if (result.FEmpty() && p != start) return false;  // out of memory: the cursor stays at the start
    input.pCurM = p;
    return true;
  }
  const unsigned char* start = ++p;
  const unsigned char* run = p;
  // Created at the first replaced escape only; released on every path by going out of scope.
  std::optional<ByteBuffer> scratch;
  for (;;) {
    while (p != end && !kStopG.vM[*p]) ++p;
    if (p == end || *p == '"') break;
    if (*p == '\0' || p + 1 == end) {
      input.pCurM = p;
      return false;
    }
    if (p[1] == 'u') {
      p += 2;  // the escape and its four digits stay in the text
      continue;
    }
    char replacement;
    if (!EscapedCharToChar(static_cast<char>(p[1]), replacement)) {
      input.pCurM = p;
      return false;
    }
    if (!scratch) scratch.emplace(mempool);
    scratch->AppendBytes(run, static_cast<unsigned long>(p - run));
    scratch->AppendByte(static_cast<unsigned char>(replacement));
    p += 2;
    run = p;
  }
  size_t n;
  if (!scratch) {
    n = static_cast<size_t>(p - start);
    result = MakeResult(mempool, internTable, start, n);
  } else {
    scratch->AppendBytes(run, static_cast<unsigned long>(p - run));
    n = scratch->GetLength();
    result = MakeResult(mempool, internTable, scratch->GetData(), n);
  }
  if ((scratch && scratch->HasFailed()) || (result.FEmpty() && n != 0)) {
    input.pCurM = start - 1;  // out of memory: back at the opening quote
    return false;
  }
  input.pCurM = p == end ? p : p + 1;
  return true;
}

}  // namespace Json

}  // namespace sarn

namespace {

// Moves the run [run, input.pCurM) into the scratch buffer, creating it on first use.
void KeepRun(VekMempool* mempool, std::optional<sarn::ByteBuffer>& scratch, const unsigned char* run,
             const unsigned char* p) {
  if (!scratch) scratch.emplace(mempool);
  scratch->AppendBytes(run, static_cast<unsigned long>(p - run));
}

}  // namespace

bool JsonBytesourceToString(VekMempool* mempool, VekHashStringToStringNew* internTable,
                            sarn::InputPointerBytesource& input, VekString& result) {
  (void)internTable;
  input.SkipWhitespace();
  std::optional<sarn::ByteBuffer> scratch;
  bool isQuoted = input.Peek() == '"';
  if (isQuoted) ++input.pCurM;
  for (;;) {
    const unsigned char* run = input.pCurM;
    const unsigned char* p = run;
    const unsigned char* end = input.pEndM;
    if (isQuoted) {
      while (p != end && !sarn::kStopG.vM[*p]) ++p;
    } else {
      while (p != end && sarn::kBareTokenG.vM[*p]) ++p;
    }
    if (p == end) {
      // The token goes on in the next block, or the input ends here.
      KeepRun(mempool, scratch, run, p);
      input.pCurM = p;
      if (input.Refill()) continue;
      if (isQuoted) return false;
      break;
    }
    if (!isQuoted || *p == '"') {
      // The token ends here: a bare token at the first byte outside its set, a quoted string
      // at its closing quote.
      input.pCurM = isQuoted ? p + 1 : p;
      if (scratch) {
        scratch->AppendBytes(run, static_cast<unsigned long>(p - run));
        break;
      }
      result = VekString::FromUtf8Bytes(mempool, static_cast<size_t>(p - run), run);
      return true;
    }
    if (*p == '\0') {
      input.pCurM = p;
      return false;
    }
    // A backslash: its partner may lie in the next block, so escapes always go through the
    // scratch buffer.
    KeepRun(mempool, scratch, run, p);
    input.pCurM = p + 1;
    char escaped = input.Next();
    char replacement;
    if (escaped == 'u') {
      scratch->AppendByte('\\');
      scratch->AppendByte('u');
    } else if (escaped != 0 && sarn::Json::EscapedCharToChar(escaped, replacement)) {
      scratch->AppendByte(static_cast<unsigned char>(replacement));
    } else {
      return false;
    }
  }
  result = VekString::FromUtf8Bytes(mempool, scratch->GetLength(), scratch->GetData());
  return true;
}
