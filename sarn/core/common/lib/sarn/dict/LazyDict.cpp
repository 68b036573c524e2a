// LazyDict: construction, type queries, the byte source, and the conversions to trees and JSON.
// The conversions to objects and protocol-buffer bytes are in LazyDictConvert.cpp.
//
// Every conversion first decides the form it answers as (LazyForm): the payload's own, a bad one
// when the member of its form is missing, or the "error" object when it runs nested too deep.
// The switches below then only look at that form.
#include "sarn/dict/LazyDict.h"

#include <cstring>

#include "sarn/base/Limits.h"
#include "sarn/binary/ProtoBuf.h"
#include "sarn/dict/internal/LazyDictSupport.h"
#include "sarn/dict/internal/TreeWalk.h"
#include "sarn/model/StructInfoMap.h"
#include "sarn/objects/DictionarySarnObject.h"
#include "vek/VekServices.h"

namespace sarn {

using internal::TreeRelease;

const char kLazyDictNoDuplicateMessage[] = "Byte source cannot be duplicated.";

namespace internal {

thread_local int LazyNesting::depthG = 0;
thread_local const char* LazyNesting::pOutermostG = nullptr;

LazyForm FormOf(const LazyDict& payload, const LazyNesting& nesting) {
  LazyForm form{payload.repM, ref<SarnObject>()};
  if (nesting.IsTooDeep()) {
    form.repM = LazyDict::REP_OBJECT;
    form.objectM = MakeErrorObject(payload.GetMempool(),
                                   VekString::Format(payload.GetMempool(), kLazyDictDepthLimitFormat,
                                                     Limits::kDefaultMaxDepth));
    if (!form.objectM) form.repM = kBadRep;
    return form;
  }
  bool isHeld = false;
  switch (payload.repM) {
    case LazyDict::REP_DICT:
      isHeld = payload.dictM && payload.dictM->GetDictionary();
      break;
    case LazyDict::REP_JSON:
    case LazyDict::REP_PROTOBUF:
      isHeld = static_cast<bool>(payload.bytesM);
      break;
    case LazyDict::REP_OBJECT:
      isHeld = static_cast<bool>(payload.objectM);
      form.objectM = payload.objectM;
      break;
    case LazyDict::REP_DICTIONARY:
      isHeld = static_cast<bool>(payload.dictionaryM);
      break;
    case LazyDict::REP_BYTESOURCE:
      isHeld = payload.pBytesourceM != nullptr;
      break;
  }
  if (!isHeld) form.repM = kBadRep;
  return form;
}

bool ReadBytesource(const LazyDict& payload, ref<Dictionary>& out, VekString& error) {
  wynbaselib::Bytesource* duplicate = payload.pBytesourceM->Duplicate();
  if (duplicate == nullptr) {
    out.Reset();
    error = VekString::Format(payload.GetMempool(), "%s", kLazyDictNoDuplicateMessage);
    return false;
  }
  VekString message;
  out = Dictionary::FromJsonBytesource(duplicate, message, payload.GetMempool());  // deletes the duplicate
  if (out && message.FEmpty()) return true;
  error = message.FEmpty() ? VekString::Format(payload.GetMempool(), "%s", kOutOfMemoryMessage) : message;
  return false;
}

ref<Dictionary> JsonToDictionaryOrError(const LazyDict& payload) {
  VekString error;
  ref<Dictionary> dictionary = Dictionary::FromJsonBytestring(payload.bytesM, error, payload.GetMempool());
  return dictionary ? dictionary : MakeErrorDictionary(payload.GetMempool(), error);
}

ref<Dictionary> TreeOf(const LazyDict& payload, const LazyForm& form, VekString& error, bool isErrorTree) {
  VekMempool* pool = payload.GetMempool();
  ref<Dictionary> tree;
  switch (form.repM) {
    case LazyDict::REP_DICT:
      return payload.dictM->GetDictionary();
    case LazyDict::REP_JSON:
      if (isErrorTree) return JsonToDictionaryOrError(payload);
      return Dictionary::FromJsonBytestring(payload.bytesM, error, pool);
    case LazyDict::REP_PROTOBUF:
    case LazyDict::REP_OBJECT: {
      ref<SarnObject> object = form.repM == LazyDict::REP_OBJECT ? form.objectM : ProtobufToObject(payload);
      if (object) tree = DictionarySarnObject(pool, Schema::vStructDefG, Schema::nStructDefG)
                             .SarnObjectToDictionary(object.Get(), payload.versionM);
      if (!tree) error = VekString::Format(pool, "%s", kOutOfMemoryMessage);
      return tree;
    }
    case LazyDict::REP_DICTIONARY:
      return payload.dictionaryM;
    case LazyDict::REP_BYTESOURCE:
      if (ReadBytesource(payload, tree, error)) return tree;
      return isErrorTree ? MakeErrorDictionary(pool, error) : ref<Dictionary>();
    default:
      error = VekString::Format(pool, "%s", "LazyDict to Dictionary: unknown representation in LazyDict");
      return ref<Dictionary>();
  }
}

}  // namespace internal

using internal::FormOf;
using internal::LazyForm;

namespace internal {

ref<Dict> DictOf(const LazyDict& payload, const LazyForm& form) {
  if (form.repM == LazyDict::REP_DICT) return payload.dictM;
  VekMempool* pool = payload.GetMempool();
  VekString error;
  ref<Dictionary> tree = TreeOf(payload, form, error, true);
  if (tree) return MempoolNew<Dict>(pool, tree);
  if (form.repM != kBadRep) return ref<Dict>();  // out of memory
  ref<Dict> bad = Dict::New(pool, VekString("error"));
  if (!bad || !bad->AddString("code", "internalError") || !bad->AddString("text", "bad rep in LazyDict")) {
    return ref<Dict>();
  }
  return bad;
}

void WriteComparableJson(const LazyDict& payload, ByteBuffer& out) {
  LazyNesting nesting;  // held while the payloads inside are written, so that they count
  ref<Dict> dict = DictOf(payload, FormOf(payload, nesting));
  if (!dict) return out.Fail();
  TreeWalk::WriteComparable(*dict->GetDictionary(), out);
}

}  // namespace internal

using internal::LazyNesting;

namespace {

// Output adaptors, so that the buffer and sink writers share one switch.
struct BufferTarget {
  ByteBuffer& bufferM;
  bool Raw(const unsigned char* data, size_t length) { return bufferM.AppendBytes(data, length); }
  void Tree(const Dictionary& dictionary, bool pretty) { dictionary.ToJson(bufferM, JsonFormat(pretty)); }
  void Object(const LazyDict& payload, const SarnObject* object, bool pretty) {
    internal::ObjectToJson(payload, object, bufferM, pretty);
  }
};

struct SinkTarget {
  wynbaselib::Bytesink& sinkM;
  bool Raw(const unsigned char* data, size_t length) {
    return sinkM.Write(reinterpret_cast<const char*>(data), length);
  }
  void Tree(const Dictionary& dictionary, bool pretty) { dictionary.ToJson(sinkM, JsonFormat(pretty)); }
  void Object(const LazyDict& payload, const SarnObject* object, bool pretty) {
    internal::ObjectToJson(payload, object, sinkM, pretty);
  }
};

// The bytes of a fresh duplicate of the source, copied as they come.
template <class Out>
void CopySource(wynbaselib::Bytesource* source, Out& out) {
  wynbaselib::Bytesource* duplicate = source->Duplicate();
  if (duplicate == nullptr) return;
  unsigned char block[4096];
  for (;;) {
    size_t n = duplicate->Read(block, sizeof block);
    if (n == 0 || !out.Raw(block, n)) break;
  }
  delete duplicate;
}

bool TypeNameOfDictionary(const Dictionary& dictionary, VekString* name) {
  static const VekString kType("type");
  if (dictionary.CountValues(kType) == 0) return false;
  if (name != nullptr) *name = dictionary.GetString(kType);
  return true;
}

// The registry's name lookup finds the slot that a scan of the table by name would (names are
// unique); the slot's index is the id.
bool TypeIdOfDictionary(const Dictionary& dictionary, unsigned int* typeId) {
  static const VekString kType("type");
  VekString name = dictionary.GetString(kType);
  if (name.FEmpty()) return false;
  const StructInfo* info = StructInfoMap::LookupStructByName(name.Utf8());
  if (info == nullptr || std::strlen(info->pName) != name.NByte()) return false;
  for (int slot = 0; slot < Schema::nStructDefG; ++slot) {
    if (Schema::vStructDefG[slot] == info) {
      if (typeId != nullptr) *typeId = static_cast<unsigned int>(slot);
      return true;
    }
  }
  return false;
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

bool LazyDict::GetDictionaryFromBytesource(ref<Dictionary>& out) const {
  if (repM != REP_BYTESOURCE || pBytesourceM == nullptr) {
    VekAssertFail("GetDictionaryFromBytesource: repM == REP_BYTESOURCE && pBytesourceM != nullptr", __FILE__);
  }
  VekString error;
  return internal::ReadBytesource(*this, out, error);
}

void LazyDict::BuildDictionaryFromBytesource() {
  if (dictionaryM) return;
  if (!GetDictionaryFromBytesource(dictionaryM)) return;
  repM = REP_DICTIONARY;
  delete pBytesourceM;
  pBytesourceM = nullptr;
}

namespace {

// The two type queries differ only in what they read off the object or the tree they find.
template <class FromObject, class FromTree>
bool AnswerTypeQuery(LazyDict& payload, FromObject fromObject, FromTree fromTree) {
  internal::LazyNesting nesting;
  LazyForm form = FormOf(payload, nesting);
  switch (form.repM) {
    case LazyDict::REP_PROTOBUF:
    case LazyDict::REP_OBJECT: {
      ref<SarnObject> object =
          form.repM == LazyDict::REP_OBJECT ? form.objectM : internal::ProtobufToObject(payload);
      return object && fromObject(*object);
    }
    case LazyDict::REP_BYTESOURCE:
      payload.BuildDictionaryFromBytesource();
      return payload.dictionaryM && fromTree(*payload.dictionaryM);
    default: {
      VekString error;
      ref<Dictionary> tree = internal::TreeOf(payload, form, error, false);
      return tree && fromTree(*tree);
    }
  }
}

}  // namespace

bool LazyDict::GetType(unsigned int* typeId) {
  return AnswerTypeQuery(
      *this,
      [typeId](const SarnObject& object) {
        if (typeId != nullptr) *typeId = object.GetTypeId();
        return true;
      },
      [typeId](const Dictionary& tree) { return TypeIdOfDictionary(tree, typeId); });
}

bool LazyDict::GetTypeName(VekString* name) {
  return AnswerTypeQuery(
      *this,
      [name](const SarnObject& object) {
        if (name != nullptr) *name = object.GetTypeName();
        return true;
      },
      [name](const Dictionary& tree) { return TypeNameOfDictionary(tree, name); });
}

ref<Dictionary> LazyDict::ToDictionary(VekString& error) const {
  LazyNesting nesting;
  return internal::TreeOf(*this, FormOf(*this, nesting), error, false);
}

ref<Dict> LazyDict::ToDict() const {
  LazyNesting nesting;
  return internal::DictOf(*this, FormOf(*this, nesting));
}

template <class Out>
void LazyDict::WriteJson(Out& out, bool pretty) const {
  LazyNesting nesting;
  LazyForm form = FormOf(*this, nesting);
  VekString error;
  switch (form.repM) {
    case REP_JSON:
      if (!pretty) {
        out.Raw(bytesM->GetData(), bytesM->GetLength());
        return;
      }
      if (ref<Dictionary> tree = internal::TreeOf(*this, form, error, false)) {
        out.Tree(*tree, true);
      } else {
        out.Raw(bytesM->GetData(), bytesM->GetLength());  // stored text that does not parse goes out as it came
      }
      return;
    case REP_PROTOBUF:
      if (ref<SarnObject> object = internal::ProtobufToObject(*this)) out.Object(*this, object.Get(), pretty);
      return;
    case REP_OBJECT:
      out.Object(*this, form.objectM.Get(), pretty);
      return;
    case REP_BYTESOURCE:
      if (ref<Dictionary> tree = internal::TreeOf(*this, form, error, false)) {
        out.Tree(*tree, pretty);
      } else {
        CopySource(pBytesourceM, out);  // what the reader refused goes out as it came
      }
      return;
    case REP_DICT:
    case REP_DICTIONARY:
      out.Tree(*internal::TreeOf(*this, form, error, false), pretty);
      return;
    default:
      return;
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
  if (repM == REP_JSON && bytesM && !pretty && !LazyNesting::IsNextTooDeep()) return bytesM;
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
  ByteBuffer mine(pMempoolM), theirs(pMempoolM);
  internal::WriteComparableJson(*this, mine);
  internal::WriteComparableJson(other, theirs);
  return !mine.HasFailed() && !theirs.HasFailed() && mine.GetLength() == theirs.GetLength() &&
         (mine.GetLength() == 0 || std::memcmp(mine.GetData(), theirs.GetData(), mine.GetLength()) == 0);
}

}  // namespace sarn
