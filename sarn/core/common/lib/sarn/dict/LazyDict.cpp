// LazyDict: construction, the conversions of the Dict, JSON and Dictionary forms to one another,
// and the object form as an object.
//
// The object, protocol-buffer and byte-source forms are not converted to dictionaries or JSON:
// wherever such a conversion meets one of them it takes the branch of an unknown representation,
// so that their answers are the documented failures rather than something half-done.
#include "sarn/dict/LazyDict.h"

#include "sarn/binary/ProtoBuf.h"
#include "sarn/dict/internal/TreeWalk.h"

namespace sarn {

using internal::TreeRelease;

namespace {

const char kUnknownRepForDictionaryG[] = "LazyDict to Dictionary: unknown representation in LazyDict";

// Output adaptors, so that the buffer and sink writers share one switch.
struct BufferTarget {
  ByteBuffer& bufferM;
  void Raw(const vek::ByteBuffer& bytes) { bufferM.AppendBytes(bytes.GetData(), bytes.GetLength()); }
  void Tree(const Dictionary& dictionary, bool pretty) { dictionary.ToJson(bufferM, JsonFormat(pretty)); }
};

struct SinkTarget {
  wynbaselib::Bytesink& sinkM;
  void Raw(const vek::ByteBuffer& bytes) {
    sinkM.Write(reinterpret_cast<const char*>(bytes.GetData()), bytes.GetLength());
  }
  void Tree(const Dictionary& dictionary, bool pretty) { dictionary.ToJson(sinkM, JsonFormat(pretty)); }
};

bool TypeNameOfDictionary(const Dictionary& dictionary, VekString* name) {
  static const VekString kType("type");
  if (dictionary.CountValues(kType) == 0) return false;
  if (name != nullptr) *name = dictionary.GetString(kType);
  return true;
}

}  // namespace

ref<Dictionary> MakeErrorDictionary(VekMempool* pool, const VekString& text) {
  ref<Dictionary> error = Dictionary::New(pool, VekString("error"));
  if (!error || !error->Add(VekString("code"), VekString("badArgument")) || !error->Add(VekString("text"), text)) {
    return ref<Dictionary>();
  }
  return error;
}

LazyDict::LazyDict(Rep rep, const ref<Dict>& dict, const ref<vek::ByteBuffer>& bytes, const ref<SarnObject>& object,
                   wynbaselib::Bytesource* bytesource, KernoVersion version)
    : repM(rep),
      dictM(dict),
      bytesM(bytes),
      objectM(object),
      versionM(version),
      pBytesourceM(bytesource) {}

LazyDict::~LazyDict() {
  delete pBytesourceM;
  pBytesourceM = nullptr;
  objectM.Reset();
  bytesM.Reset();
  // A payload inside a tree holds a tree of its own; release it without recursing.
  TreeRelease::Release(dictionaryM);
  dictM.Reset();
}

ref<LazyDict> LazyDict::New(VekMempool* pool, Rep rep, const ref<Dict>& dict, const ref<vek::ByteBuffer>& bytes,
                            const ref<SarnObject>& object, wynbaselib::Bytesource* bytesource, KernoVersion version) {
  ref<LazyDict> payload = new (pool) LazyDict(rep, dict, bytes, object, bytesource, version);
  // The payload owns the source; one that was never made cannot release it.
  if (!payload) delete bytesource;
  return payload;
}

ref<LazyDict> LazyDict::FromDict(VekMempool* pool, const ref<Dict>& dict, unsigned short version) {
  return New(pool, REP_DICT, dict, nullptr, nullptr, nullptr, version);
}

ref<LazyDict> LazyDict::FromBytestring(VekMempool* pool, const ref<vek::ByteBuffer>& bytes, KernoVersion version) {
  if (!bytes || bytes->GetLength() == 0 || bytes->GetData()[0] == 0) return ref<LazyDict>();
  unsigned char first = bytes->GetData()[0];
  Rep rep = first == ' ' || first == '{' ? REP_JSON : REP_PROTOBUF;
  return New(pool, rep, nullptr, bytes, nullptr, nullptr, version);
}

ref<LazyDict> LazyDict::FromJsonString(VekMempool* pool, const VekString& json, KernoVersion version) {
  return FromBytestring(pool, vek::ByteBuffer::New(pool, json.Utf8(), json.NByte()), version);
}

ref<LazyDict> LazyDict::FromSarnObject(VekMempool* pool, const ref<SarnObject>& object, KernoVersion version) {
  return New(pool, REP_OBJECT, nullptr, nullptr, object, nullptr, version);
}

ref<LazyDict> LazyDict::FromBytesource(VekMempool* pool, wynbaselib::Bytesource* source, KernoVersion version) {
  return New(pool, REP_BYTESOURCE, nullptr, nullptr, nullptr, source, version);
}

ref<LazyDict> LazyDict::FromDictionary(VekMempool* pool, const ref<Dictionary>& dictionary, KernoVersion version) {
  ref<LazyDict> payload = New(pool, REP_DICTIONARY, nullptr, nullptr, nullptr, nullptr, version);
  if (payload) payload->SetDictionary(dictionary);
  return payload;
}

void LazyDict::SetDictionary(const ref<Dictionary>& dictionary) { dictionaryM = dictionary; }

bool LazyDict::GetType(unsigned int* typeId) {
  // This layer does not look type names up in the registry, so no form has an id here.
  (void)typeId;
  return false;
}

bool LazyDict::GetTypeName(VekString* name) {
  VekString error;
  ref<Dictionary> dictionary = DictionaryOf(error);
  return dictionary && TypeNameOfDictionary(*dictionary, name);
}

ref<Dictionary> LazyDict::DictionaryOf(VekString& error) const {
  switch (repM) {
    case REP_DICT:
      if (dictM) return dictM->GetDictionary();
      break;
    case REP_JSON:
      return Dictionary::FromJsonBytestring(bytesM, error, pMempoolM);
    case REP_DICTIONARY:
      if (dictionaryM) return dictionaryM;
      break;
    default:
      // REP_PROTOBUF, REP_OBJECT and REP_BYTESOURCE have no conversion to a tree here: they are
      // answered as an unknown representation.
      break;
  }
  error = VekString::Format(pMempoolM, "%s", kUnknownRepForDictionaryG);
  return ref<Dictionary>();
}

ref<Dictionary> LazyDict::ToDictionary(VekString& error) const { return DictionaryOf(error); }

ref<Dict> LazyDict::ToDict() const {
  if (repM == REP_DICT && dictM) return dictM;
  if (repM == REP_JSON) {
    VekString error;
    ref<Dictionary> dictionary = Dictionary::FromJsonBytestring(bytesM, error, pMempoolM);
    if (!dictionary) dictionary = MakeErrorDictionary(pMempoolM, error);
    if (!dictionary) return ref<Dict>();
    return MempoolNew<Dict>(pMempoolM, dictionary);
  }
  if (repM == REP_DICTIONARY && dictionaryM) return MempoolNew<Dict>(pMempoolM, dictionaryM);
  // Unknown representation, or a form without a conversion to a tree here (protocol-buffer bytes,
  // an object, a byte source): the error dictionary.
  ref<Dict> error = Dict::New(pMempoolM, VekString("error"));
  if (!error || !error->AddString("code", "internalError") || !error->AddString("text", "bad rep in LazyDict")) {
    return ref<Dict>();
  }
  return error;
}

template <class Out>
void LazyDict::WriteJson(Out& out, bool pretty) const {
  if (repM == REP_JSON && bytesM && !pretty) {
    out.Raw(*bytesM);
    return;
  }
  VekString error;
  ref<Dictionary> dictionary = DictionaryOf(error);
  if (dictionary) {
    out.Tree(*dictionary, pretty);
  } else if (repM == REP_JSON && bytesM) {
    out.Raw(*bytesM);  // stored text that does not parse is passed on as it is, not lost
  }
}

void LazyDict::ToJsonByteBuffer(ByteBuffer& out, bool pretty) const {
  BufferTarget target{out};
  WriteJson(target, pretty);
}

void LazyDict::ToJsonBytesink(wynbaselib::Bytesink& out, bool pretty) const {
  SinkTarget target{out};
  WriteJson(target, pretty);
}

ref<vek::ByteBuffer> LazyDict::ToJsonBytestring(bool pretty) const {
  if (repM == REP_JSON && bytesM && !pretty) return bytesM;
  ByteBuffer text(pMempoolM);
  ToJsonByteBuffer(text, pretty);
  if (text.HasFailed()) return ref<vek::ByteBuffer>();
  return vek::ByteBuffer::New(pMempoolM, text.GetData(), text.GetLength());
}

VekString LazyDict::ToJson(bool pretty) const {
  ref<vek::ByteBuffer> bytes = ToJsonBytestring(pretty);
  if (!bytes) return VekString();
  return VekString::FromUtf8Bytes(pMempoolM, bytes->GetLength(), bytes->GetData());
}

bool LazyDict::operator==(const LazyDict& other) const {
  ref<Dict> mine = ToDict();
  ref<Dict> theirs = other.ToDict();
  return mine && theirs && *mine == *theirs;
}

}  // namespace sarn

namespace sarn {

ref<SarnObject> LazyDict::ToSarnObjectOrErrorString(VekString& error) const {
  if (repM == REP_OBJECT) return objectM;
  // Only the object form converts to an object; every other form is answered as an unknown
  // representation.
  error = VekString::Format(pMempoolM, "%s", "unknown rep in LazyDict");
  return nullptr;
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
