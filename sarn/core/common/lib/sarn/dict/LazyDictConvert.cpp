// LazyDict: the conversions to objects and to protocol-buffer bytes, objects written as JSON, and
// the measured paths with their log line.
#include <cstring>
#include <sys/types.h>

#include "sarn/base/Limits.h"
#include "sarn/binary/ProtoBuf.h"
#include "sarn/binary/ProtoBufByteOutputStream.h"
#include "sarn/dict/LazyDict.h"
#include "sarn/dict/internal/LazyDictSupport.h"
#include "sarn/json/JsonSarnObject.h"
#include "sarn/objects/DictionarySarnObject.h"
#include "vek/VekServices.h"

namespace sarn {

using internal::FormOf;
using internal::LazyForm;
using internal::LazyNesting;

namespace {

// The platform switch of the direct JSON paths; read on every use so that it may change at run time.
constexpr int kDirectJsonFeature = 548;

// The one type whose conversions are logged.
const char kLoggedTypeG[] = "channelMapConfigInstructions";

ProtoBuf Binary(VekMempool* pool) { return ProtoBuf(pool, Schema::vStructDefG, Schema::nStructDefG); }
DictionarySarnObject Converter(VekMempool* pool) {
  return DictionarySarnObject(pool, Schema::vStructDefG, Schema::nStructDefG);
}

// The pool and clock figures around one conversion to an object, and the line that reports it.
class ConversionLog {
 public:
  explicit ConversionLog(VekMempool* pool)
      : poolM(pool),
        startM(VekMonotonicTime::Now()),
        usedM(pool->GetUsedBytes()),
        highWaterM(pool->GetUsedBytesHighWater()) {}

  const ref<SarnObject>& Report(const char* label, size_t inputSize, const ref<SarnObject>& result) const {
    VekTime end = VekMonotonicTime::Now();
    size_t used = poolM->GetUsedBytes();
    size_t highWater = poolM->GetUsedBytesHighWater();
    const StructInfo* info = result ? result->GetStructInfo() : nullptr;
    if (info == nullptr || std::strcmp(info->pName, kLoggedTypeG) != 0) return result;
    const char* poolName = poolM->GetName();
    VekString elapsed = (end - startM).DebugStringAsInterval();
    VekLogger::Log(0, 6, "LazyDict",
                   "ToSarnObject %s <%s> %zd %s usedBytes (%zd/%zd) highWater (%zd/%zd) elapsedTime %s", label,
                   info->pName, static_cast<ssize_t>(inputSize), poolName != nullptr ? poolName : "",
                   static_cast<ssize_t>(usedM / 1000), static_cast<ssize_t>(used / 1000),
                   static_cast<ssize_t>(highWaterM / 1000), static_cast<ssize_t>(highWater / 1000), elapsed.Utf8());
    return result;
  }

 private:
  VekMempool* poolM;
  VekTime startM;
  size_t usedM;
  size_t highWaterM;
};

// A tree to an object under the payload's version; null with the converter's message.
ref<SarnObject> TreeToObject(const LazyDict& payload, const ref<Dictionary>& tree, VekString& error) {
  ref<SarnObject> object;
  VekString message;
  if (Converter(payload.GetMempool()).DictionaryToSarnObject(tree, payload.versionM, object, message)) return object;
  error = message;
  return ref<SarnObject>();
}

ref<SarnObject> DictionaryToObjectOrError(const LazyDict& payload, const ref<Dictionary>& tree) {
  if (!tree) return ref<SarnObject>();  // out of memory
  VekString error;
  ref<SarnObject> object = TreeToObject(payload, tree, error);
  if (object) return object;
  return MakeErrorObject(payload.GetMempool(), VekString::Format(payload.GetMempool(), "%s%s", error.Utf8(),
                                                              "Dict did not unmarshal"));
}

ref<vek::ByteBuffer> ObjectToProtobuf(const LazyDict& payload, const SarnObject* object) {
  if (object == nullptr) return ref<vek::ByteBuffer>();
  ProtoBufByteOutputStream stream;
  Binary(payload.GetMempool()).MarshalKnownDict(object, &stream);
  const unsigned char* data = nullptr;
  unsigned long length = 0;
  stream.Finish(data, length);
  if (stream.IsOutOfMemory()) return ref<vek::ByteBuffer>();
  return vek::ByteBuffer::New(payload.GetMempool(), data, length);
}

// Stored JSON to an object: directly with feature 548, otherwise through a Dictionary.
ref<SarnObject> JsonToObject(const LazyDict& payload, VekString& error) {
  VekMempool* pool = payload.GetMempool();
  ConversionLog log(pool);
  ref<SarnObject> object;
  if (VekFeatures::FEnabled(kDirectJsonFeature)) {
    VekString message;
    int length = static_cast<int>(payload.bytesM->GetLength());
    if (!JsonSarnObject(pool).JsonToSarnObject(payload.bytesM->GetData(), length, payload.versionM, &object, message)) {
      error = message;
    }
    return log.Report("new REP_JSON", payload.bytesM->GetLength(), object);
  }
  ref<Dictionary> tree = Dictionary::FromJsonBytestring(payload.bytesM, error, pool);
  if (tree) object = TreeToObject(payload, tree, error);
  return log.Report("old REP_JSON", 0, object);
}

// A byte source to an object: directly with feature 548, otherwise through a Dictionary.
ref<SarnObject> BytesourceToObject(const LazyDict& payload, VekString& error) {
  VekMempool* pool = payload.GetMempool();
  ConversionLog log(pool);
  ref<SarnObject> object;
  if (VekFeatures::FEnabled(kDirectJsonFeature)) {
    VekString message;
    size_t bytesRead = 0;
    if (!JsonSarnObject(pool).JsonToSarnObject(payload.pBytesourceM, bytesRead, payload.versionM, &object, message)) {
      error = message;
    }
    return log.Report("new REP_BYTESOURCE", bytesRead, object);
  }
  ref<Dictionary> tree;
  if (internal::ReadBytesource(payload, tree, error)) object = TreeToObject(payload, tree, error);
  return log.Report("old REP_BYTESOURCE", 0, object);
}

}  // namespace

namespace internal {

ref<SarnObject> ProtobufToObject(const LazyDict& payload) {
  ref<SarnObject> object;
  if (Binary(payload.GetMempool())
          .UnmarshalKnownDict(payload.bytesM->GetData(), static_cast<int>(payload.bytesM->GetLength()), &object)) {
    return object;
  }
  return MakeErrorObject(payload.GetMempool(), VekString::Format(payload.GetMempool(), "%s", "protobuf did not unmarshal"));
}

void ObjectToJson(const LazyDict& payload, const SarnObject* object, ByteBuffer& out, bool pretty) {
  if (!pretty) {
    JsonSarnObject(payload.GetMempool()).SarnObjectToJson(object, payload.versionM, out);
    return;
  }
  ref<Dictionary> tree = Converter(payload.GetMempool()).SarnObjectToDictionary(object, payload.versionM);
  if (tree) {
    tree->ToJson(out, JsonFormat(true));
  } else {
    out.Fail();
  }
}

void ObjectToJson(const LazyDict& payload, const SarnObject* object, wynbaselib::Bytesink& out, bool pretty) {
  if (!pretty && VekFeatures::FEnabled(kDirectJsonFeature)) {
    ByteBuffer text(payload.GetMempool());
    JsonSarnObject(payload.GetMempool()).SarnObjectToJson(object, payload.versionM, text);
    const char* data = reinterpret_cast<const char*>(text.GetData());
    for (unsigned long at = 0, n = 0; at < text.GetLength(); at += n) {
      n = std::min<unsigned long>(kSinkPieceBytes, text.GetLength() - at);
      if (!out.Write(data + at, n)) break;
    }
    return;
  }
  ref<Dictionary> tree = Converter(payload.GetMempool()).SarnObjectToDictionary(object, payload.versionM);
  if (tree) tree->ToJson(out, JsonFormat(pretty));
}

}  // namespace internal

ref<vek::ByteBuffer> LazyDict::ToProtobuf() const {
  LazyNesting nesting;
  LazyForm form = FormOf(*this, nesting);
  VekString error;
  switch (form.repM) {
    case REP_PROTOBUF:
      return bytesM;
    case REP_OBJECT:
      return ObjectToProtobuf(*this, form.objectM.Get());
    case REP_DICT:
    case REP_JSON:
    case REP_DICTIONARY:
    case REP_BYTESOURCE:
      return ObjectToProtobuf(*this, DictionaryToObjectOrError(*this, internal::TreeOf(*this, form, error, true)).Get());
    default:
      return vek::ByteBuffer::New(pMempoolM);
  }
}

ref<SarnObject> LazyDict::ToSarnObjectOrErrorString(VekString& error) const {
  LazyNesting nesting;
  LazyForm form = FormOf(*this, nesting);
  switch (form.repM) {
    case REP_DICT:
      return TreeToObject(*this, dictM->GetDictionary(), error);
    case REP_JSON:
      return JsonToObject(*this, error);
    case REP_PROTOBUF: {
      ref<SarnObject> object;
      if (Binary(pMempoolM).UnmarshalKnownDict(bytesM->GetData(), static_cast<int>(bytesM->GetLength()), &object)) {
        return object;
      }
      error = VekString::Format(pMempoolM, "%s", "Protobuf did not unmarshal to SarnObject");
      return ref<SarnObject>();
    }
    case REP_OBJECT:
      return form.objectM;
    case REP_DICTIONARY:
      return TreeToObject(*this, dictionaryM, error);
    case REP_BYTESOURCE:
      return BytesourceToObject(*this, error);
    default:
      error = VekString::Format(pMempoolM, "%s", "unknown rep in LazyDict");
      return ref<SarnObject>();
  }
}

ref<SarnObject> LazyDict::ToSarnObjectOrError() const {
  VekString error;
  ref<SarnObject> object = ToSarnObjectOrErrorString(error);
  return object ? object : MakeErrorObject(pMempoolM, error);
}

bool LazyDict::ToSarnObject(ref<SarnObject>& out) const {
  VekString error;
  out = ToSarnObjectOrErrorString(error);
  return static_cast<bool>(out);
}

}  // namespace sarn
