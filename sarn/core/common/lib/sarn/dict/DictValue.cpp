// The value classes, the release queue and the shared tree walks (equality and JSON writing).
//
// Writing goes through one template over the output (a ByteBuffer or a Bytesink) so that the
// two ToJson forms cannot drift apart byte-wise; the per-class virtual ToJson members only
// forward to it, and the walk itself dispatches on kindM.
#include "sarn/dict/DictValue.h"

#include <cstdio>
#include <cstring>

#include "sarn/values/Base64.h"
#include "sarn/values/ByteBuffer.h"
#include "sarn/dict/Dict.h"
#include "sarn/dict/Dictionary.h"
#include "sarn/values/Json.h"
#include "sarn/dict/LazyDict.h"
#include "sarn/dict/internal/LazyDictSupport.h"
#include "sarn/dict/internal/TextValue.h"
#include "sarn/dict/internal/TreeWalk.h"

namespace sarn {

using internal::TreeRelease;
using internal::TreeWalk;

namespace {

const char kSpacesG[] = "                                                                ";  // 64

// Output adaptors: the same walk writes to a buffer or to a sink.
struct BufferOut {
  ByteBuffer& bufferM;
  void Put(const char* data, size_t n) {
    // The pieces of the structure are one or two bytes: not worth a call to memcpy each.
    if (n <= 2) {
      for (size_t i = 0; i < n; ++i) bufferM.AppendByte(static_cast<unsigned char>(data[i]));
    } else {
      bufferM.AppendBytes(reinterpret_cast<const unsigned char*>(data), n);
    }
  }
  void Put(char c) { bufferM.AppendByte(static_cast<unsigned char>(c)); }
  void Text(const VekString& text, bool fBareAllowed) { Json::StringToJson(text, fBareAllowed, bufferM); }
  void Lazy(const LazyDict& payload, bool pretty) { payload.ToJsonByteBuffer(bufferM, pretty); }
};

// Payloads inside are written as their trees, whatever form holds them, for comparisons.
struct ComparableOut : BufferOut {
  void Lazy(const LazyDict& payload, bool) { internal::WriteComparableJson(payload, bufferM); }
};

struct SinkOut {
  wynbaselib::Bytesink& sinkM;
  void Put(const char* data, size_t n) { sinkM.Write(data, n); }
  void Put(char c) { sinkM.Write(&c, 1); }
  void Text(const VekString& text, bool fBareAllowed) { Json::StringToJson(text, fBareAllowed, sinkM); }
  void Lazy(const LazyDict& payload, bool pretty) { payload.ToJsonBytesink(sinkM, pretty); }
};

template <class Out>
void NewLine(Out& out, const JsonFormat& format) {
  if (format.prettyM) out.Put('\n');
}

template <class Out>
void Indent(Out& out, const JsonFormat& format) {
  if (!format.prettyM || format.depthM < 1) return;
  size_t n = static_cast<size_t>(format.depthM) * 4;
  for (; n > sizeof kSpacesG - 1; n -= sizeof kSpacesG - 1) out.Put(kSpacesG, sizeof kSpacesG - 1);
  out.Put(kSpacesG, n);
}

}  // namespace

// ---------------------------------------------------------------------------------------------
// Walks

class TreeWriter {
 public:
  template <class Out>
  static void Value(const DictValue& value, Out& out, JsonFormat format) {
    switch (value.kindM) {
      case DictValue::KIND_STRING: {
        const StringValue& text = static_cast<const StringValue&>(value);
        out.Text(text.valueM, !text.needQuotesM);
        return;
      }
      case DictValue::KIND_NULL:
        out.Put("null", 4);
        return;
      case DictValue::KIND_ARRAY:
        Array(static_cast<const ArrayValue&>(value), out, format);
        return;
      case DictValue::KIND_DICTIONARY:
        Object(static_cast<const Dictionary&>(value), out, format);
        return;
      case DictValue::KIND_LAZY_DICT: {
        const LazyDictValue& lazy = static_cast<const LazyDictValue&>(value);
        if (lazy.lazyDictM) {
          out.Lazy(*lazy.lazyDictM, format.prettyM);
        } else {
          out.Put("null", 4);
        }
        return;
      }
    }
  }

  template <class Out>
  static void Array(const ArrayValue& array, Out& out, JsonFormat format) {
    out.Put('[');
    NewLine(out, format);
    ++format.depthM;
    int n = array.valuesM.Count();
    for (int i = 0; i < n; ++i) {
      Indent(out, format);
      Value(*static_cast<const DictValue*>(array.valuesM.Get(i)), out, format);
      if (i + 1 < n) {
        out.Put(", ", 2);
        NewLine(out, format);
      }
    }
    NewLine(out, format);
    --format.depthM;
    Indent(out, format);
    out.Put(']');
  }

  template <class Out>
  static void Object(const Dictionary& dictionary, Out& out, JsonFormat format) {
    // The sorted order lives on the stack for the small objects that dominate; a larger one
    // borrows a block of the dictionary's pool for the duration of the write, with as much
    // again for sorting. Without that block the names are picked one at a time instead: the
    // same bytes, in quadratic time.
    Dictionary::SortKey local[16];
    Dictionary::SortKey* order = local;
    if (dictionary.nNameM > 16) {
      order = static_cast<Dictionary::SortKey*>(
          dictionary.GetMempool()->Malloc(sizeof(Dictionary::SortKey) * dictionary.nNameM * size_t{2}));
    }
    if (order != nullptr) dictionary.SortedFirsts(order, order != local ? order + dictionary.nNameM : nullptr);
    out.Put('{');
    ++format.depthM;
    int32_t first = -1;
    for (uint32_t k = 0; k < dictionary.nNameM; ++k) {
      if (k > 0) out.Put(", ", 2);
      first = order != nullptr ? order[k].entryM : NextFirstByName(dictionary, first);
      for (int32_t i = first; i >= 0; i = dictionary.vEntryM[i].nextM) {
        if (i != first) out.Put(", ", 2);
        NewLine(out, format);
        Indent(out, format);
        out.Text(dictionary.vEntryM[i].nameM, false);
        out.Put(": ", 2);
        Value(*dictionary.vEntryM[i].pValueM, out, format);
      }
    }
    NewLine(out, format);
    --format.depthM;
    Indent(out, format);
    out.Put('}');
    if (order != local) dictionary.GetMempool()->Free(order);
  }

 private:
  // The first entry of the least name above the name of entry `previous` (-1: the least name).
  static int32_t NextFirstByName(const Dictionary& dictionary, int32_t previous) {
    int32_t best = -1;
    for (uint32_t i = 0; i < dictionary.nEntryM; ++i) {
      if (dictionary.vEntryM[i].lastOrOrdinalM < 0) continue;
      const VekString& name = dictionary.vEntryM[i].nameM;
      if (previous >= 0 && !NameLess(dictionary.vEntryM[previous].nameM, name)) continue;
      if (best < 0 || NameLess(name, dictionary.vEntryM[best].nameM)) best = static_cast<int32_t>(i);
    }
    return best;
  }
  // Byte order, a shorter name before the longer one it starts (SortedFirsts' order).
  static bool NameLess(const VekString& x, const VekString& y) {
    size_t nx = x.NByte(), ny = y.NByte();
    int c = std::memcmp(x.Utf8(), y.Utf8(), nx < ny ? nx : ny);
    return c != 0 ? c < 0 : nx < ny;
  }
};

bool TreeWalk::Equal(const DictValue& a, const DictValue* b) {
  if (b == nullptr || b->kindM != a.kindM) return false;
  switch (a.kindM) {
    case DictValue::KIND_STRING:
      return static_cast<const StringValue&>(a).valueM.FEqual(static_cast<const StringValue*>(b)->valueM);
    case DictValue::KIND_NULL:
      return true;
    case DictValue::KIND_ARRAY: {
      const VekGenericArray& x = static_cast<const ArrayValue&>(a).valuesM;
      const VekGenericArray& y = static_cast<const ArrayValue*>(b)->valuesM;
      if (x.Count() != y.Count()) return false;
      for (int i = 0; i < x.Count(); ++i) {
        const DictValue* element = static_cast<const DictValue*>(x.Get(i));
        if (element == nullptr || !Equal(*element, static_cast<const DictValue*>(y.Get(i)))) return false;
      }
      return true;
    }
    case DictValue::KIND_DICTIONARY:
      return static_cast<const Dictionary&>(a).EqualsDictionary(*static_cast<const Dictionary*>(b));
    case DictValue::KIND_LAZY_DICT: {
      const LazyDict* x = static_cast<const LazyDictValue&>(a).lazyDictM.Get();
      const LazyDict* y = static_cast<const LazyDictValue*>(b)->lazyDictM.Get();
      if (x == nullptr || y == nullptr) return x == y;
      return *x == *y;
    }
  }
  return false;
}

void TreeWalk::Write(const DictValue& value, ByteBuffer& out, JsonFormat format) {
  BufferOut adaptor{out};
  TreeWriter::Value(value, adaptor, format);
}

void TreeWalk::WriteComparable(const DictValue& value, ByteBuffer& out) {
  ComparableOut adaptor{{out}};
  TreeWriter::Value(value, adaptor, JsonFormat(false));
}

void TreeWalk::Write(const DictValue& value, wynbaselib::Bytesink& out, JsonFormat format) {
  SinkOut adaptor{out};
  TreeWriter::Value(value, adaptor, format);
}

// ---------------------------------------------------------------------------------------------
// Release queue

namespace {
// Initial-exec: the queue is touched once per released container, and the general TLS model of
// a shared library would cost a resolver call each time.
thread_local DictValue* tReleaseQueueG __attribute__((tls_model("initial-exec"))) = nullptr;
thread_local bool tIsDrainingG __attribute__((tls_model("initial-exec"))) = false;
}  // namespace

DictValue*& TreeRelease::Link(DictValue* value) {
  return value->kindM == DictValue::KIND_ARRAY ? static_cast<ArrayValue*>(value)->pNextReleaseM
                                               : static_cast<Dictionary*>(value)->pNextReleaseM;
}

void TreeRelease::Release(DictValue* value) {
  if (value == nullptr) return;
  // Only a container whose last reference this is can be queued: nobody else can reach it, so
  // it cannot be queued twice. Any other value is released directly; if that destroys it, its
  // destructor queues its own children since this thread is draining or about to drain.
  bool isContainer = value->kindM == DictValue::KIND_DICTIONARY || value->kindM == DictValue::KIND_ARRAY;
  if (!isContainer || value->GetRefCount() != 1) {
    value->DownRef();
    return;
  }
  Link(value) = tReleaseQueueG;
  tReleaseQueueG = value;
  if (tIsDrainingG) return;
  tIsDrainingG = true;
  while (tReleaseQueueG != nullptr) {
    DictValue* next = tReleaseQueueG;
    tReleaseQueueG = Link(next);
    Link(next) = nullptr;
    next->DownRef();
  }
  tIsDrainingG = false;
}

// ---------------------------------------------------------------------------------------------
// JsonFormat

void JsonFormat::NewLine(ByteBuffer& out) const {
  BufferOut adaptor{out};
  sarn::NewLine(adaptor, *this);
}

void JsonFormat::NewLine(wynbaselib::Bytesink& out) const {
  SinkOut adaptor{out};
  sarn::NewLine(adaptor, *this);
}

void JsonFormat::Indent(ByteBuffer& out) const {
  BufferOut adaptor{out};
  sarn::Indent(adaptor, *this);
}

void JsonFormat::Indent(wynbaselib::Bytesink& out) const {
  SinkOut adaptor{out};
  sarn::Indent(adaptor, *this);
}

// ---------------------------------------------------------------------------------------------
// DictValue

VekString DictValue::ToJson(bool pretty) const {
  ByteBuffer text(pMempoolM);
  ToJson(text, JsonFormat(pretty));
  // A failed buffer is empty, so the result is too: no value's JSON is empty.
  return VekString::FromUtf8Bytes(pMempoolM, text.GetLength(), text.GetData());
}

// ---------------------------------------------------------------------------------------------
// StringValue

StringValue::StringValue() : DictValue(KIND_STRING), needQuotesM(true) {}
StringValue::StringValue(const VekString& text) : DictValue(KIND_STRING), valueM(text), needQuotesM(true) {}
StringValue::StringValue(VekString&& text)
    : DictValue(KIND_STRING), valueM(static_cast<VekString&&>(text)), needQuotesM(true) {}

bool StringValue::GetValue(bool& out) const {
  if (valueM.FEqual("true")) {
    out = true;
  } else if (valueM.FEqual("false")) {
    out = false;
  } else {
    return false;
  }
  return true;
}

bool StringValue::GetValue(double& out) const {
  double value;
  if (std::sscanf(valueM.Utf8(), "%lg", &value) != 1) return false;
  out = value;
  return true;
}

bool StringValue::GetValue(long long& out) const {
  long long value;
  if (std::sscanf(valueM.Utf8(), "%lld", &value) != 1) return false;
  out = value;
  return true;
}

bool StringValue::GetValue(int& out) const {
  long long value;
  if (!GetValue(value) || value < -2147483648LL || value > 2147483647LL) return false;
  out = static_cast<int>(value);
  return true;
}

bool StringValue::GetValue(unsigned long long& out) const {
  unsigned long long value;
  if (std::sscanf(valueM.Utf8(), "%llu", &value) != 1) return false;
  out = value;
  return true;
}

bool StringValue::GetValue(unsigned int& out) const {
  unsigned long long value;
  if (!GetValue(value) || value > 4294967295ULL) return false;
  out = static_cast<unsigned int>(value);
  return true;
}

bool StringValue::GetValue(ref<vek::ByteBuffer>& out) const {
  out = DecodeBase64(pMempoolM, valueM);
  return out != nullptr;
}

namespace internal {
namespace {
// A text value and its text in one block: the value, then the text's representation, then the
// bytes. The representation owns the block (VekString::Embed) and the value holds one of its
// references for its own bytes, given up in operator delete, after the destructor has released
// valueM; so the block goes when the value and every copy of its text are gone, in either order,
// and a valueM the user replaced leaves the block to the value alone.
class InlineTextValue final : public StringValue {
 public:
  static constexpr size_t kRepOffset = (sizeof(StringValue) + 7) / 8 * 8;

  InlineTextValue(VekMempool* pool, const void* bytes, size_t nByte, bool needQuotes) {
    valueM = VekString::Embed(pool, this, kRepOffset, nByte, bytes);
    needQuotesM = needQuotes;
  }
  ~InlineTextValue() override {
    // While valueM and this value hold the only two references, nobody else can take one: the
    // value takes valueM's reference as its own with a plain store, and operator delete then
    // frees the block without a locked instruction.
    VekStringRepN* rep = Rep(this);
    if (valueM.GetRep() == rep && rep->refCountM.load(std::memory_order_acquire) == 2) {
      valueM.Detach();
      rep->refCountM.store(1, std::memory_order_relaxed);
    }
  }
  static void* operator new(size_t, VekMempool* pool, size_t nByte) noexcept {
    return VekCore::operator new(kRepOffset + sizeof(VekStringRepN) + nByte + 1, pool);
  }
  static void operator delete(void* p, VekMempool* pool, size_t) noexcept { VekCore::operator delete(p, pool); }
  static void operator delete(void* p) { VekString::DropEmbedded(Rep(p)); }

 private:
  static VekStringRepN* Rep(void* block) {
    return reinterpret_cast<VekStringRepN*>(static_cast<char*>(block) + kRepOffset);
  }
};
static_assert(sizeof(InlineTextValue) <= InlineTextValue::kRepOffset, "the text follows the value");
}  // namespace

StringValue* NewTextValue(VekMempool* pool, const void* bytes, size_t nByte, bool needQuotes) {
  if (pool == nullptr) pool = VekMempool::Default();
  // Lengths are 32-bit in a text's representation; an empty text has none.
  if (nByte > UINT32_MAX - 1) return nullptr;
  if (nByte == 0) {
    StringValue* value = new (pool) StringValue();
    if (value != nullptr) value->needQuotesM = needQuotes;
    return value;
  }
  return new (pool, nByte) InlineTextValue(pool, bytes, nByte, needQuotes);
}
}  // namespace internal

namespace {
// `isEmptyAllowed` is false where only a failed allocation leaves the text empty.
ref<StringValue> MakeText(VekString&& text, bool needQuotes, VekMempool* pool, bool isEmptyAllowed = false) {
  if (text.FEmpty() && !isEmptyAllowed) return ref<StringValue>();
  ref<StringValue> value = new (pool) StringValue(static_cast<VekString&&>(text));
  if (value) value->needQuotesM = needQuotes;
  return value;
}
}  // namespace

ref<StringValue> StringValue::Make(const char* text, VekMempool* pool) {
  size_t n = text != nullptr ? std::strlen(text) : 0;
  return internal::NewTextValue(pool, text, n, true);
}
ref<StringValue> StringValue::Make(const ref<vek::ByteBuffer>& bytes, VekMempool* pool) {
  return MakeText(EncodeBase64(pool, bytes), true, pool, !bytes || bytes->GetLength() == 0);
}
ref<StringValue> StringValue::Make(bool value, VekMempool* pool) {
  return MakeText(Dict::FormatBool(pool, value), false, pool);
}
ref<StringValue> StringValue::Make(double value, VekMempool* pool) {
  return MakeText(Dict::FormatFloat(pool, value), false, pool);
}
ref<StringValue> StringValue::Make(int value, VekMempool* pool) {
  return MakeText(Dict::FormatS32(pool, value), false, pool);
}
ref<StringValue> StringValue::Make(unsigned int value, VekMempool* pool) {
  return MakeText(Dict::FormatU32(pool, value), false, pool);
}
ref<StringValue> StringValue::Make(long long value, VekMempool* pool) {
  return MakeText(Dict::FormatS64(pool, value), true, pool);
}
ref<StringValue> StringValue::Make(unsigned long long value, VekMempool* pool) {
  return MakeText(Dict::FormatU64(pool, value), true, pool);
}

VekString StringValue::EmptyValue(VekMempool*) {
  // The empty string holds no representation, so it belongs to no pool in particular.
  return VekString();
}

bool StringValue::Equals(const ref<DictValue>& other) const { return TreeWalk::Equal(*this, other.Get()); }
void StringValue::ToJson(ByteBuffer& out, JsonFormat format) const { TreeWalk::Write(*this, out, format); }
void StringValue::ToJson(wynbaselib::Bytesink& out, JsonFormat format) const { TreeWalk::Write(*this, out, format); }

// ---------------------------------------------------------------------------------------------
// NullValue

bool NullValue::Equals(const ref<DictValue>& other) const { return TreeWalk::Equal(*this, other.Get()); }
void NullValue::ToJson(ByteBuffer& out, JsonFormat format) const { TreeWalk::Write(*this, out, format); }
void NullValue::ToJson(wynbaselib::Bytesink& out, JsonFormat format) const { TreeWalk::Write(*this, out, format); }

// ---------------------------------------------------------------------------------------------
// ArrayValue

ArrayValue::ArrayValue() : DictValue(KIND_ARRAY), valuesM(GetMempool()), pNextReleaseM(nullptr) {}

ArrayValue::~ArrayValue() {
  // Hand nested containers to the release queue before the platform array drops them directly.
  for (int i = valuesM.Count() - 1; i >= 0; --i) {
    DictValue* value = static_cast<DictValue*>(valuesM.Get(i));
    if (value == nullptr || (value->kindM != KIND_ARRAY && value->kindM != KIND_DICTIONARY)) continue;
    value->UpRef();
    valuesM.Set(i, nullptr);
    TreeRelease::Release(value);
  }
}

bool ArrayValue::Add(const ref<DictValue>& value) { return value && valuesM.Add(value.Get()); }
bool ArrayValue::Add(const ref<ArrayValue>& value) { return Add(ref<DictValue>(value)); }
bool ArrayValue::Add(const ref<NullValue>& value) { return Add(ref<DictValue>(value)); }
bool ArrayValue::Add(const ref<StringValue>& value) { return Add(ref<DictValue>(value)); }
bool ArrayValue::Add(const ref<Dictionary>& value) { return Add(ref<DictValue>(value)); }
bool ArrayValue::Add(const VekString& text) {
  return Add(ref<DictValue>(MempoolNew<StringValue>(pMempoolM, text)));
}
bool ArrayValue::Add(const ref<LazyDict>& payload) {
  return Add(ref<DictValue>(MempoolNew<LazyDictValue>(pMempoolM, payload)));
}
bool ArrayValue::AddBytestring(const ref<vek::ByteBuffer>& bytes) {
  return Add(ref<DictValue>(StringValue::Make(bytes, pMempoolM)));
}

ref<DictValue> ArrayValue::GetValueAt(unsigned long index) const {
  if (index >= valuesM.Count()) return ref<DictValue>();
  return ref<DictValue>(static_cast<DictValue*>(valuesM.Get(static_cast<int>(index))));
}

bool ArrayValue::Remove(unsigned long index) {
  if (index >= valuesM.Count()) return false;
  return valuesM.Remove(valuesM.Get(static_cast<int>(index)));
}

bool ArrayValue::Equals(const ref<DictValue>& other) const { return TreeWalk::Equal(*this, other.Get()); }
void ArrayValue::ToJson(ByteBuffer& out, JsonFormat format) const { TreeWalk::Write(*this, out, format); }
void ArrayValue::ToJson(wynbaselib::Bytesink& out, JsonFormat format) const { TreeWalk::Write(*this, out, format); }

// ---------------------------------------------------------------------------------------------
// LazyDictValue

LazyDictValue::LazyDictValue() : DictValue(KIND_LAZY_DICT) {}
LazyDictValue::LazyDictValue(const ref<LazyDict>& payload) : DictValue(KIND_LAZY_DICT), lazyDictM(payload) {}
LazyDictValue::~LazyDictValue() {}

ref<LazyDict> LazyDictValue::GetValue() const { return lazyDictM; }

ref<LazyDict> LazyDictValue::EmptyValue(VekMempool* pool) { return LazyDict::FromJsonString(pool, VekString("{}"), 0); }

bool LazyDictValue::Equals(const ref<DictValue>& other) const { return TreeWalk::Equal(*this, other.Get()); }
void LazyDictValue::ToJson(ByteBuffer& out, JsonFormat format) const { TreeWalk::Write(*this, out, format); }
void LazyDictValue::ToJson(wynbaselib::Bytesink& out, JsonFormat format) const {
  TreeWalk::Write(*this, out, format);
}

}  // namespace sarn
