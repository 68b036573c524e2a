// The hand-written JSON reader: text wholly in memory into a Dictionary tree.
//
// The grammar is a recursive descent (object, member value, array, element, scalar), but it runs
// as a loop over an explicit stack of open containers rather than as native recursion: the
// native stack then stays flat at any depth, the depth limit is one comparison where a container
// opens, and an error message can be built in one pass when the failure happens. The message is
// exactly what the recursive form produces by appending, level by level from the inside out:
// the failing step's own words, then for every open container below it (innermost first) the
// words of the member or element that was being read ("... Failed to parse value for key a").
//
// Speed: strings without escapes and bare tokens are taken straight from the input (escapes go
// through Json::JsonToString, which owns their rules), keys are shared through a small cache,
// and members are appended to their dictionary without a second lookup after the duplicate check.
#include <cstring>
#include <type_traits>

#include "sarn/values/ByteBuffer.h"
#include "sarn/dict/Dictionary.h"
#include "sarn/dict/internal/TextValue.h"
#include "sarn/values/Json.h"
#include "sarn/json/internal/JsonReadSupport.h"
#include "sarn/json/internal/JsonTokenScan.h"

namespace sarn {

using internal::JsonReadSupport;

namespace {

using Byte = unsigned char;

// Bytes of a bare token: ASCII letters, digits, '+', '-', '.'.
struct TokenTable {
  bool vIsTokenM[256];
  constexpr TokenTable() : vIsTokenM() {
    for (int c = 0; c < 256; ++c) {
      vIsTokenM[c] = (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '+' ||
                     c == '-' || c == '.';
    }
  }
};
constexpr TokenTable kTokenG;

inline bool IsAlnum(Byte c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9'); }

inline const Byte* SkipWhitespace(const Byte* p, const Byte* end) {
  while (p < end && (*p == ' ' || *p == '\n' || *p == '\r' || *p == '\t')) ++p;
  return p;
}

// Converts between our byte pointers and whatever byte type the cursor uses.
using CursorByte = std::remove_pointer_t<decltype(InputPointer::pCurM)>;
inline const Byte* AsBytes(CursorByte* p) { return reinterpret_cast<const Byte*>(p); }
inline CursorByte* AsCursor(const Byte* p) { return reinterpret_cast<CursorByte*>(p); }

struct Frame {
  DictValue* pContainerM;  // owned by the tree
  // Object: the text of the key of the member being read, only for failure messages. Not a
  // counted copy (two locked instructions per member): the reader's current key holds it until
  // the member is added, and from then on the container's entry does, for the whole read.
  const char* pKeyM;
  uint32_t indexM;         // array: the index of the element being read
  bool isObjectM;
};

// The open containers: a few dozen inline, more in the pool as the document actually nests.
class FrameStack {
 public:
  explicit FrameStack(VekMempool* pool)
      : pMempoolM(pool), vFrameM(vInlineM), nFrameM(0), capacityM(kInline) {}
  ~FrameStack() {
    if (!IsInline()) pMempoolM->Free(vFrameM);
  }
  FrameStack(const FrameStack&) = delete;
  FrameStack& operator=(const FrameStack&) = delete;

  bool Push(DictValue* container, bool isObject) {
    if (nFrameM == capacityM && !Grow()) return false;
    vFrameM[nFrameM++] = Frame{container, "", 0, isObject};
    return true;
  }
  void Pop() { --nFrameM; }
  Frame& Top() { return vFrameM[nFrameM - 1]; }
  Frame& At(uint32_t i) { return vFrameM[i]; }
  uint32_t Count() const { return nFrameM; }

 private:
  static constexpr uint32_t kInline = 24;
  bool IsInline() const { return vFrameM == vInlineM; }
  bool Grow() {
    Frame* frames = static_cast<Frame*>(pMempoolM->Malloc(sizeof(Frame) * capacityM * 2));
    if (frames == nullptr) return false;
    std::memcpy(frames, vFrameM, sizeof(Frame) * nFrameM);
    if (!IsInline()) pMempoolM->Free(vFrameM);
    vFrameM = frames;
    capacityM *= 2;
    return true;
  }

  VekMempool* pMempoolM;
  Frame* vFrameM;
  uint32_t nFrameM;
  uint32_t capacityM;
  Frame vInlineM[kInline];  // plain data: left uninitialised until pushed
};

class HandReader {
 public:
  HandReader(VekMempool* pool, const JsonLimits& limits, VekString& error)
      : supportM(pool), framesM(pool), maxDepthM(limits.maxDepthM), errorM(error) {}

  // Reads one container from its opening byte into `root`, which the caller has made (and
  // attached, if it has a parent) and which sits at nesting level `rootDepth`.
  bool ReadContainer(InputPointer& input, DictValue* root, int rootDepth);
  // Reads one scalar at the cursor (whitespace skipped). The new value has no reference yet.
  bool ReadScalar(InputPointer& input, DictValue*& value);
  void SetDepthError() { errorM = VekString::Format(supportM.Pool(), kJsonDepthLimitFormat, maxDepthM); }
  VekMempool* Pool() const { return supportM.Pool(); }
  // True once a read failed because the pool ran out: the failure then says so, with no
  // words about the value's syntax.
  bool WasOutOfMemory() const { return wasOutOfMemoryM; }

 private:
  // The bytes of a text in the input (or, escaped, in `escaped`).
  struct Span {
    const Byte* pBytesM;
    size_t nByteM;
  };
  // Reads a quoted text or a bare token at p; false when it is malformed or memory runs out.
  bool ReadText(const Byte*& p, const Byte* end, InputPointer& input, Span& span, VekString& escaped);
  bool ReadKey(const Byte*& p, const Byte* end, InputPointer& input, VekString& key);
  // The failure of an open container's own step (its brackets, a key, a colon): its words, then
  // the words of every container below it.
  bool FailOwn(const char* message, const VekString& tail = VekString());
  // The failure of the value being read in the top container: the value's words (a scalar adds
  // its suffix), then the words of every open container from the top down.
  bool FailValue(const char* message, bool isScalar);
  bool Fail(const char* message, const VekString& tail, bool isScalar, uint32_t nFrame);
  bool OutOfMemory() {
    wasOutOfMemoryM = true;
    return false;
  }
  // OutOfMemory with the message that ReadScalar's callers expect in errorM.
  bool ScalarOutOfMemory();

  JsonReadSupport supportM;
  FrameStack framesM;
  int maxDepthM;
  VekString& errorM;
  bool wasOutOfMemoryM = false;
};

bool HandReader::ReadText(const Byte*& p, const Byte* end, InputPointer& input, Span& span, VekString& escaped) {
  const Byte* start = p;
  if (*p == '"') {
    const Byte* q = internal::QuotedRunEnd(p + 1, end);
    if (q < end && *q == '"') {
      span = Span{start + 1, static_cast<size_t>(q - start - 1)};
      p = q + 1;
      return true;
    }
    // An escape, a NUL or a missing closing quote: the shared string reader decides.
    input.pCurM = AsCursor(start);
    bool isRead = Json::JsonToString(Pool(), nullptr, input, escaped);
    p = AsBytes(input.pCurM);
    // Malformed text fails past the opening quote; only a lack of memory fails on it.
    if (!isRead && p == start) return OutOfMemory();
    span = Span{reinterpret_cast<const Byte*>(escaped.Utf8()), escaped.NByte()};
    return isRead;
  }
  const Byte* q = p;
  while (q < end && kTokenG.vIsTokenM[*q]) ++q;
  span = Span{p, static_cast<size_t>(q - p)};
  p = q;
  return true;
}

bool HandReader::ReadKey(const Byte*& p, const Byte* end, InputPointer& input, VekString& key) {
  Span span;
  key = VekString();
  if (!ReadText(p, end, input, span, key)) return false;
  // An escaped key is its own new text; a plain one goes through the document's key cache.
  if (key.FEmpty()) key = supportM.Key(reinterpret_cast<const char*>(span.pBytesM), span.nByteM);
  return !key.FEmpty() || span.nByteM == 0 || OutOfMemory();
}

bool HandReader::ReadScalar(InputPointer& input, DictValue*& value) {
  const Byte* p = SkipWhitespace(AsBytes(input.pCurM), AsBytes(input.pEndM));
  const Byte* end = AsBytes(input.pEndM);
  bool isQuoted = p < end && *p == '"';
  if (p == end) {
    errorM = VekString::Format(Pool(), "%s", "Empty scalar value");
    input.pCurM = AsCursor(p);
    return false;
  }
  Span span;
  VekString escaped;
  if (!ReadText(p, end, input, span, escaped)) {
    errorM = VekString::Format(Pool(), "%s", wasOutOfMemoryM ? kOutOfMemoryMessage : "Can't parse scalar field");
    return false;
  }
  input.pCurM = AsCursor(p);
  if (!isQuoted) {
    if (span.nByteM == 0) {
      errorM = VekString::Format(Pool(), "%s", "Empty scalar value");
      return false;
    }
    if (span.nByteM == 4 && std::memcmp(span.pBytesM, "null", 4) == 0) {
      value = new (Pool()) NullValue();
      return value != nullptr || ScalarOutOfMemory();
    }
  }
  value = internal::NewTextValue(Pool(), span.pBytesM, span.nByteM, isQuoted);
  return value != nullptr || ScalarOutOfMemory();
}

bool HandReader::ScalarOutOfMemory() {
  errorM = VekString::Format(Pool(), "%s", kOutOfMemoryMessage);
  return OutOfMemory();
}

bool HandReader::FailOwn(const char* message, const VekString& tail) {
  return Fail(message, tail, false, framesM.Count() - 1);
}

bool HandReader::FailValue(const char* message, bool isScalar) {
  return Fail(message, VekString(), isScalar, framesM.Count());
}

bool HandReader::Fail(const char* message, const VekString& tail, bool isScalar, uint32_t nFrame) {
  ByteBuffer text(Pool());
  text.AppendString(message);
  text.AppendString(tail.Utf8());
  if (isScalar) text.AppendString(framesM.Top().isObjectM ? " for Object field " : " for Array element.");
  if (isScalar && framesM.Top().isObjectM) text.AppendString(framesM.Top().pKeyM);
  for (uint32_t i = nFrame; i-- > 0;) {
    Frame& frame = framesM.At(i);
    if (frame.isObjectM) {
      text.AppendString(" Failed to parse value for key ");
      text.AppendString(frame.pKeyM);
    } else {
      text.AppendString(frame.indexM == 0 ? " Failed to parse an array element." : " Failed to parse an array member.");
    }
  }
  errorM = VekString::FromUtf8Bytes(Pool(), text.GetLength(), text.GetData());
  return false;
}

bool HandReader::ReadContainer(InputPointer& input, DictValue* root, int rootDepth) {
  enum Step { OPEN, NEXT, AFTER_VALUE, CLOSE };
  const Byte* p = AsBytes(input.pCurM);
  const Byte* const end = AsBytes(input.pEndM);
  framesM.Push(root, root->kindM == DictValue::KIND_DICTIONARY);  // inline room: cannot fail
  int depth = rootDepth;
  Step step = OPEN;
  VekString key;
  uint64_t keyHash = 0;  // set by the duplicate check of each key
  bool isOk = true;
  for (;;) {
    Frame& frame = framesM.Top();
    p = SkipWhitespace(p, end);
    if (step == OPEN) {
      Byte open = frame.isObjectM ? '{' : '[';
      if (p == end || *p != open) {
        isOk = FailOwn(frame.isObjectM ? "JSON object does not start with '{'." : "Array must start with '['.");
        break;
      }
      p = SkipWhitespace(p + 1, end);
      step = !frame.isObjectM && p < end && *p == ']' ? CLOSE : NEXT;
    } else if (step == AFTER_VALUE) {
      if (!frame.isObjectM && p == end) {
        isOk = FailOwn("Array must end with ']'.");
        break;
      }
      if (p < end && *p == ',') {
        p = SkipWhitespace(p + 1, end);
        step = NEXT;
      } else {
        step = CLOSE;
      }
    }
    if (step == CLOSE) {
      Byte close = frame.isObjectM ? '}' : ']';
      if (p == end || *p != close) {
        isOk = FailOwn(frame.isObjectM ? "JSON object does not end with '}'." : "Array must end with ']'.");
        break;
      }
      ++p;
      framesM.Pop();
      --depth;
      if (framesM.Count() == 0) break;
      step = AFTER_VALUE;
      continue;
    }

    // step == NEXT: a member (key, colon, value) or an element.
    if (frame.isObjectM) {
      if (p == end || !(*p == '"' || IsAlnum(*p))) {
        step = CLOSE;
        continue;
      }
      if (!ReadKey(p, end, input, key)) {
        isOk = FailOwn(wasOutOfMemoryM ? kOutOfMemoryMessage : "Failed to parse a Dictionary key.");
        break;
      }
      if (JsonReadSupport::Has(*static_cast<Dictionary*>(frame.pContainerM), key.Utf8(), key.NByte(), keyHash)) {
        isOk = FailOwn("Duplicate key: ", key);
        break;
      }
      p = SkipWhitespace(p, end);
      if (p == end || *p != ':') {
        isOk = FailOwn("JSON field name must be followed by a colon.");
        break;
      }
      p = SkipWhitespace(p + 1, end);
      frame.pKeyM = key.Utf8();
    } else {
      frame.indexM = static_cast<ArrayValue*>(frame.pContainerM)->valuesM.Count();
      if (frame.indexM >= kMaxValuesPerContainer) {
        isOk = FailValue(kJsonArrayLimitMessage, false);
        break;
      }
    }

    DictValue* value;
    bool isContainer = p < end && (*p == '{' || *p == '[');
    if (isContainer) {
      if (depth >= maxDepthM) {
        SetDepthError();
        isOk = FailValue(errorM.Utf8(), false);
        break;
      }
      value = *p == '{' ? static_cast<DictValue*>(new (Pool()) Dictionary())
                        : static_cast<DictValue*>(new (Pool()) ArrayValue());
      if (value == nullptr) {
        isOk = FailValue(kOutOfMemoryMessage, false);
        break;
      }
    } else {
      input.pCurM = AsCursor(p);
      if (!ReadScalar(input, value)) {
        isOk = FailValue(VekString(errorM).Utf8(), !wasOutOfMemoryM);
        break;
      }
      p = AsBytes(input.pCurM);
    }
    bool isAdded = frame.isObjectM ? JsonReadSupport::AddNew(*static_cast<Dictionary*>(frame.pContainerM),
                                                             static_cast<VekString&&>(key), value, keyHash)
                                   : static_cast<ArrayValue*>(frame.pContainerM)->valuesM.AddUnshared(value);
    if (!isAdded) {
      delete value;
      isOk = FailValue(kOutOfMemoryMessage, false);
      break;
    }
    if (isContainer) {
      if (!framesM.Push(value, value->kindM == DictValue::KIND_DICTIONARY)) {
        isOk = FailValue(kOutOfMemoryMessage, false);
        break;
      }
      ++depth;
      step = OPEN;
    } else {
      step = AFTER_VALUE;
    }
  }
  input.pCurM = AsCursor(p);
  while (framesM.Count() > 0) framesM.Pop();
  return isOk;
}

// Appends `suffix` and then `key` to the message already in `error`, as every level does.
void AppendToError(VekString& error, VekMempool* pool, const char* suffix, const VekString& key) {
  error = VekString::Format(pool, "%s%s", error.Utf8(), suffix);
  if (!key.FEmpty()) error = VekString::Format(pool, "%s%s", error.Utf8(), key.Utf8());
}

// One member value or element at the cursor, attached to its parent through `attach`.
template <class Attach>
bool ReadOneValue(InputPointer& input, VekMempool* pool, const JsonLimits& limits, VekString& error,
                  const char* scalarSuffix, const VekString& key, const char* fullMessage, Attach attach) {
  HandReader reader(pool, limits, error);
  const Byte* p = SkipWhitespace(AsBytes(input.pCurM), AsBytes(input.pEndM));
  input.pCurM = AsCursor(p);
  if (p < AsBytes(input.pEndM) && (*p == '{' || *p == '[')) {
    if (limits.maxDepthM < 2) {
      reader.SetDepthError();
      return false;
    }
    ref<DictValue> child = *p == '{' ? static_cast<DictValue*>(new (pool) Dictionary())
                                     : static_cast<DictValue*>(new (pool) ArrayValue());
    if (!child || !attach(child)) {
      error = VekString::Format(pool, "%s", kOutOfMemoryMessage);
      return false;
    }
    return reader.ReadContainer(input, child.Get(), 2);
  }
  DictValue* scalar;
  if (!reader.ReadScalar(input, scalar)) {
    if (!reader.WasOutOfMemory()) AppendToError(error, pool, scalarSuffix, key);
    return false;
  }
  ref<DictValue> value = scalar;
  if (!attach(value)) {
    error = VekString::Format(pool, "%s", fullMessage);
    return false;
  }
  return true;
}

ref<Dictionary> ReadDocument(const Byte* data, size_t length, VekString& error, VekMempool* mempool,
                             const JsonLimits& limits) {
  error = VekString();
  const Byte* end = data + length;
  const Byte* p = SkipWhitespace(data, end);
  if (p == end || *p != '{') {
    error = VekString::Format(mempool, "%s", "JSON must start with '{'.");
    return ref<Dictionary>();
  }
  HandReader reader(mempool, limits, error);
  if (limits.maxDepthM < 1) {
    reader.SetDepthError();
    return ref<Dictionary>();
  }
  ref<Dictionary> result = new (mempool) Dictionary();
  if (!result) {
    error = VekString::Format(mempool, "%s", kOutOfMemoryMessage);
    return ref<Dictionary>();
  }
  InputPointer input;
  input.pCurM = AsCursor(p);
  input.pEndM = AsCursor(end);
  if (!reader.ReadContainer(input, result.Get(), 1)) return ref<Dictionary>();
  if (SkipWhitespace(AsBytes(input.pCurM), end) != end) {
    error = VekString::Format(mempool, "%s", "Extra data after JSON.");
    return ref<Dictionary>();
  }
  return result;
}

}  // namespace

ref<Dictionary> Dictionary::FromJson(const unsigned char* data, size_t length, VekString& error, VekMempool* mempool) {
  return ReadDocument(data, length, error, mempool, JsonLimits());
}

ref<Dictionary> Dictionary::FromJson(const unsigned char* data, size_t length, VekString& error, VekMempool* mempool,
                                     const JsonLimits& limits) {
  return ReadDocument(data, length, error, mempool, limits);
}

ref<Dictionary> Dictionary::FromJson(const VekString& json, VekString& error, VekMempool* mempool) {
  return FromJson(json, error, mempool, JsonLimits());
}

ref<Dictionary> Dictionary::FromJson(const VekString& json, VekString& error, VekMempool* mempool,
                                     const JsonLimits& limits) {
  return ReadDocument(reinterpret_cast<const Byte*>(json.Utf8()), json.NByte(), error, mempool, limits);
}

ref<Dictionary> Dictionary::FromJsonBytestring(const ref<vek::ByteBuffer>& bytes, VekString& error,
                                               VekMempool* mempool) {
  return FromJsonBytestring(bytes, error, mempool, JsonLimits());
}

ref<Dictionary> Dictionary::FromJsonBytestring(const ref<vek::ByteBuffer>& bytes, VekString& error,
                                               VekMempool* mempool, const JsonLimits& limits) {
  static const Byte kNothing = 0;
  const Byte* data = bytes && bytes->GetData() != nullptr ? bytes->GetData() : &kNothing;
  return ReadDocument(data, bytes ? bytes->GetLength() : 0, error, mempool, limits);
}

bool Dictionary::FromJson(InputPointer& input, VekString& error) { return FromJson(input, error, JsonLimits()); }

bool Dictionary::FromJson(InputPointer& input, VekString& error, const JsonLimits& limits) {
  HandReader reader(pMempoolM, limits, error);
  if (limits.maxDepthM < 1) {
    reader.SetDepthError();
    return false;
  }
  return reader.ReadContainer(input, this, 1);
}

bool Dictionary::ReadFieldValue(InputPointer& input, const VekString& key, VekString& error) {
  return ReadFieldValue(input, key, error, JsonLimits());
}

bool Dictionary::ReadFieldValue(InputPointer& input, const VekString& key, VekString& error,
                                const JsonLimits& limits) {
  return ReadOneValue(input, pMempoolM, limits, error,  " for Object field ", key, kJsonRepeatedKeyLimitMessage,
                      [this, &key](const ref<DictValue>& value) { return Add(key, value); });
}

bool ArrayValue::FromJson(InputPointer& input, VekString& error) { return FromJson(input, error, JsonLimits()); }

bool ArrayValue::FromJson(InputPointer& input, VekString& error, const JsonLimits& limits) {
  HandReader reader(pMempoolM, limits, error);
  if (limits.maxDepthM < 1) {
    reader.SetDepthError();
    return false;
  }
  return reader.ReadContainer(input, this, 1);
}

bool ArrayValue::ReadFieldValue(InputPointer& input, VekString& error) {
  return ReadFieldValue(input, error, JsonLimits());
}

bool ArrayValue::ReadFieldValue(InputPointer& input, VekString& error, const JsonLimits& limits) {
  return ReadOneValue(input, pMempoolM, limits, error,  " for Array element.", VekString(), kJsonArrayLimitMessage,
                      [this](const ref<DictValue>& value) { return Add(value); });
}

}  // namespace sarn
