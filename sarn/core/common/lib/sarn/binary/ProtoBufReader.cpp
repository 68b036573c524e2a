// The reading half of ProtoBuf: tags, values by data type, known dicts, any-dicts and the
// version-1 envelopes. Every length is checked against the bytes that remain before anything is
// made for it; nesting is counted where objects and dictionaries open.
#include <cstdint>
#include <cstdio>
#include <cstring>

#include "sarn/binary/GoogleInt.h"
#include "sarn/binary/ProtoBuf.h"
#include "sarn/model/FieldAccess.h"
#include "sarn/objects/DictionarySarnObject.h"
#include "sarn/values/ScalarTypes.h"
#include "schema/Error.h"
#include "schema/KernoRpcRequest.h"
#include "schema/KernoRpcResponse.h"

namespace sarn {

namespace {

using Cursor = const unsigned char**;
using End = const unsigned char*;

constexpr unsigned kTypeIdCancel = 974;
constexpr unsigned kTypeIdRequest = 975;
constexpr unsigned kTypeIdResponse = 976;
constexpr unsigned kTypeIdHello = 1449;
constexpr unsigned kErrorCodeBadArgument = 3;

// The any-dict tags: all fit in one byte.
constexpr unsigned char kTagEntry = 34;
constexpr unsigned char kTagName = 50;
constexpr unsigned char kTagValue = 66;
constexpr unsigned char kTagText = 18;

// A text of `n` bytes from the input; false when the pool cannot hold it (an empty text is fine).
bool ReadText(VekMempool* pool, const unsigned char* bytes, size_t n, VekString& text) {
  text = VekString::FromUtf8Bytes(pool, n, bytes);
  return n == 0 || text.NByte() == n;
}

bool ReadBool(Cursor cursor, End end, uint8_t& value) {
  const unsigned char* start = *cursor;
  unsigned long long v;
  if (!GoogleInt::ReadGoogleU64(cursor, end, &v)) return false;
  if (v > 1) {
    *cursor = start;
    return false;
  }
  value = static_cast<uint8_t>(v);
  return true;
}

// A varint length that must fit in what remains before `end`; the part ends at `partEnd`.
bool ReadLength(Cursor cursor, End end, const unsigned char** partEnd) {
  const unsigned char* p = *cursor;
  unsigned long long length;
  if (!GoogleInt::ReadGoogleU64(&p, end, &length)) return false;
  if (length > static_cast<unsigned long long>(end - p)) return false;
  *cursor = p;
  *partEnd = p + length;
  return true;
}

// The fields of a version-1 envelope: its length, which must end exactly at `end`, then tagged
// values until `end`. Field 2, the body, is kept aside as a range; `readField(number)` reads every
// other one (wire types are not examined). Returns the failure text, or null.
template <class ReadField>
const char* ReadEnvelope(Cursor cursor, End end, const unsigned char*& bodyBegin, const unsigned char*& bodyEnd,
                         ReadField readField) {
  const unsigned char* partEnd;
  if (!ReadLength(cursor, end, &partEnd) || partEnd != end) return "wrapper did not unmarshal: length";
  while (*cursor < end) {
    unsigned int tag;
    if (!GoogleInt::ReadGoogleU32(cursor, end, &tag)) return "wrapper did not unmarshal";
    if (tag >> 3 == 2) {
      if (!ReadLength(cursor, end, &bodyEnd)) return "wrapper did not unmarshal";
      bodyBegin = *cursor;
      *cursor = bodyEnd;
    } else if (!readField(tag >> 3)) {
      return "wrapper did not unmarshal";
    }
  }
  return nullptr;
}

}  // namespace

// Counts one level of nesting for as long as it lives; IsOk is false past the limit.
class ProtoBuf::DepthGuard {
 public:
  explicit DepthGuard(const ProtoBuf& owner) : ownerM(owner) { ++ownerM.depthM; }
  ~DepthGuard() { --ownerM.depthM; }
  DepthGuard(const DepthGuard&) = delete;
  DepthGuard& operator=(const DepthGuard&) = delete;
  bool IsOk() const { return ownerM.depthM <= ownerM.limitsM.maxDepthM; }

 private:
  const ProtoBuf& ownerM;
};

ProtoBuf::ProtoBuf(VekMempool* pool, const StructInfo* const* structDefs, int count, const Limits& limits)
    : pMempoolM(pool), structDefsM(structDefs), structDefCountM(count), limitsM(limits), depthM(0) {}

bool ProtoBuf::SkipFieldValue(unsigned int wireType, Cursor cursor, End end) const {
  switch (wireType) {
    case 0: {
      unsigned long long ignored;
      return GoogleInt::ReadGoogleU64(cursor, end, &ignored);
    }
    case 1:
      if (end - *cursor < 8) return false;
      *cursor += 8;
      return true;
    case 2: {
      const unsigned char* partEnd;
      if (!ReadLength(cursor, end, &partEnd)) return false;
      *cursor = partEnd;
      return true;
    }
    default:
      return false;  // groups (3, 4) and 32-bit values (5) are not part of this form
  }
}

bool ProtoBuf::Unmarshal(const unsigned char* data, int length, unsigned int typeId, ref<SarnObject>* result) const {
  if (length < 0) return false;
  const unsigned char* cursor = data;
  return UnmarshalDict(&cursor, data + length, typeId, result);
}

bool ProtoBuf::UnmarshalDict(Cursor cursor, End end, unsigned int typeId, ref<SarnObject>* result) const {
  if (static_cast<long long>(typeId) >= structDefCountM || structDefsM[typeId] == nullptr) return false;
  DepthGuard level(*this);
  if (!level.IsOk()) return false;
  const StructInfo* info = structDefsM[typeId];
  ref<SarnObject> object = info->pFactory(pMempoolM);
  if (!object) return false;
  object->SetDebugLockOwner(0);
  const unsigned char* p = *cursor;
  if (!UnmarshalFields(info, &p, end, object.Get())) return false;
  *cursor = p;
  *result = object;
  return true;
}

bool ProtoBuf::UnmarshalFields(const StructInfo* info, Cursor cursor, End end, SarnObject* object) const {
  while (*cursor < end) {
    unsigned int tag;
    if (!GoogleInt::ReadGoogleU32(cursor, end, &tag)) return false;
    unsigned int number = tag >> 3;
    const FieldInfo* field = number < info->nFieldInfo ? &info->vFieldInfo[number] : nullptr;
    if (field == nullptr || field->arity == SARN_ARITY_NONE) {
      // Not an error: a peer with a newer schema may send fields this one does not know.
      std::printf(field == nullptr ? "field number '%u' out of range in '%s'\n" : "field number '%u' undefined in '%s'\n",
                  number, info->pName);
      if (!SkipFieldValue(tag & 7, cursor, end)) return false;
      continue;
    }
    // For a known field the data type, not the tag's wire type, decides how the value is read.
    bool isOk;
    if (field->arity == SARN_ARITY_MULTI) {
      isOk = UnmarshalOneMultiValue(field, cursor, end, object);
    } else {
      if (field->arity == SARN_ARITY_OPTIONAL) MarkFieldPresent(object, *field);
      isOk = UnmarshalOneSingleValue(field, cursor, end, object);
    }
    if (!isOk) return false;
  }
  return true;
}

bool ProtoBuf::UnmarshalOneSingleValue(const FieldInfo* field, Cursor cursor, End end, SarnObject* object) const {
  return field->arity != SARN_ARITY_MULTI && ReadValue(field, cursor, end, object);
}

bool ProtoBuf::UnmarshalOneMultiValue(const FieldInfo* field, Cursor cursor, End end, SarnObject* object) const {
  return field->arity == SARN_ARITY_MULTI && ReadValue(field, cursor, end, object);
}

// Reads one value of the field's data type and stores it (a single field) or appends it (a MULTI
// field, which fails when its array is full) through the field-access layer.
bool ProtoBuf::ReadValue(const FieldInfo* field, Cursor cursor, End end, SarnObject* object) const {
  switch (field->dataType) {
    case SARN_DATA_TYPE_BOOL: {
      uint8_t value;
      return ReadBool(cursor, end, value) && FieldAccess::PutScalar(object, *field, &value);
    }
    case SARN_DATA_TYPE_DATE:
    case SARN_DATA_TYPE_S32: {
      int value;
      return GoogleInt::ReadGoogleS32(cursor, end, &value) && FieldAccess::PutScalar(object, *field, &value);
    }
    case SARN_DATA_TYPE_DATETIME:
    case SARN_DATA_TYPE_S64: {
      long long value;
      return GoogleInt::ReadGoogleS64(cursor, end, &value) && FieldAccess::PutScalar(object, *field, &value);
    }
    case SARN_DATA_TYPE_ENUM:
    case SARN_DATA_TYPE_TIME:
    case SARN_DATA_TYPE_INT_ID:
    case SARN_DATA_TYPE_U32: {
      unsigned int value;
      return GoogleInt::ReadGoogleU32(cursor, end, &value) && FieldAccess::PutScalar(object, *field, &value);
    }
    case SARN_DATA_TYPE_LONG_ID:
    case SARN_DATA_TYPE_U64: {
      unsigned long long value;
      return GoogleInt::ReadGoogleU64(cursor, end, &value) && FieldAccess::PutScalar(object, *field, &value);
    }
    case SARN_DATA_TYPE_FLOAT: {
      if (end - *cursor < 8) return false;
      uint64_t bits = 0;
      for (int i = 7; i >= 0; --i) bits = (bits << 8) | (*cursor)[i];  // least significant byte first
      double value;
      std::memcpy(&value, &bits, sizeof value);
      *cursor += 8;
      return FieldAccess::PutScalar(object, *field, &value);
    }
    case SARN_DATA_TYPE_STRING:
    case SARN_DATA_TYPE_STRING_ID:
    case SARN_DATA_TYPE_CHANNEL_NUMBER:
    case SARN_DATA_TYPE_CURRENCY: {
      const unsigned char* partEnd;
      VekString text;
      if (!ReadLength(cursor, end, &partEnd) || !ReadText(pMempoolM, *cursor, partEnd - *cursor, text)) return false;
      *cursor = partEnd;
      if (field->dataType == SARN_DATA_TYPE_CHANNEL_NUMBER) {
        ChannelNumber value = ChannelNumber::Parse(text);
        return value != ChannelNumber::INVALID && FieldAccess::PutScalar(object, *field, &value);
      }
      if (field->dataType == SARN_DATA_TYPE_CURRENCY) {
        Currency value = Currency::Parse(text);
        return value != Currency::INVALID && FieldAccess::PutScalar(object, *field, &value);
      }
      return FieldAccess::PutString(object, *field, text);
    }
    case SARN_DATA_TYPE_BYTESTRING: {
      const unsigned char* partEnd;
      if (!ReadLength(cursor, end, &partEnd)) return false;
      ref<vek::ByteBuffer> bytes = vek::ByteBuffer::New(pMempoolM, *cursor, partEnd - *cursor);
      if (!bytes) return false;
      *cursor = partEnd;
      return FieldAccess::PutReference(object, *field, bytes.Get());
    }
    case SARN_DATA_TYPE_ANY_DICT: {
      ref<Dict> dict;
      return UnmarshalAnyDictWithLength(cursor, end, &dict) && FieldAccess::PutReference(object, *field, dict.Get());
    }
    case SARN_DATA_TYPE_KNOWN_DICT: {
      ref<SarnObject> value;
      return UnmarshalKnownDictField(cursor, end, &value) && FieldAccess::PutReference(object, *field, value.Get());
    }
    case SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY: {
      ref<LazyDict> value;
      return UnmarshalKnownDictAsLazyField(cursor, end, &value) &&
             FieldAccess::PutReference(object, *field, value.Get());
    }
    case SARN_DATA_TYPE_SUBDICT: {
      ref<SarnObject> value;
      return UnmarshalSubdict(cursor, end, field->refIndex, &value) &&
             FieldAccess::PutReference(object, *field, value.Get());
    }
    default:
      return false;
  }
}

bool ProtoBuf::UnmarshalSubdict(Cursor cursor, End end, unsigned int typeId, ref<SarnObject>* result) const {
  const unsigned char* p = *cursor;
  const unsigned char* partEnd;
  if (!ReadLength(&p, end, &partEnd) || !UnmarshalDict(&p, partEnd, typeId, result)) return false;
  *cursor = partEnd;
  return true;
}

bool ProtoBuf::UnmarshalKnownDict(const unsigned char* data, int length, ref<SarnObject>* result) const {
  if (length < 0) return false;
  const unsigned char* cursor = data;
  ref<SarnObject> object;
  if (!UnmarshalKnownDictValue(&cursor, data + length, &object) || cursor != data + length) return false;
  *result = object;
  return true;
}

bool ProtoBuf::UnmarshalKnownDictValue(Cursor cursor, End end, ref<SarnObject>* result) const {
  const unsigned char* p = *cursor;
  unsigned int tag;
  const unsigned char* partEnd;
  // The tag's field number is the type id; its wire type is not looked at.
  if (!GoogleInt::ReadGoogleU32(&p, end, &tag) || !ReadLength(&p, end, &partEnd)) return false;
  if (!UnmarshalDict(&p, partEnd, tag >> 3, result)) return false;
  *cursor = partEnd;
  return true;
}

bool ProtoBuf::UnmarshalKnownDictField(Cursor cursor, End end, ref<SarnObject>* result) const {
  const unsigned char* p = *cursor;
  const unsigned char* partEnd;
  ref<SarnObject> object;
  // The field's length must hold exactly one known-dict value: trailing bytes are malformed.
  if (!ReadLength(&p, end, &partEnd) || !UnmarshalKnownDictValue(&p, partEnd, &object) || p != partEnd) return false;
  *cursor = partEnd;
  *result = object;
  return true;
}

bool ProtoBuf::UnmarshalKnownDictAsLazyField(Cursor cursor, End end, ref<LazyDict>* result) const {
  const unsigned char* p = *cursor;
  const unsigned char* partEnd;
  if (!ReadLength(&p, end, &partEnd)) return false;
  ref<vek::ByteBuffer> bytes = vek::ByteBuffer::New(pMempoolM, p, partEnd - p);
  if (!bytes) return false;
  *result = LazyDict::FromBytestring(pMempoolM, bytes, 0);
  // Empty bytes (or a leading NUL) are no payload; any other null is a payload not made.
  if (!*result && p != partEnd && *p != 0) return false;
  *cursor = partEnd;
  return true;
}

bool ProtoBuf::UnmarshalAnyDict(Cursor cursor, End end, ref<Dict>* result) const {
  dictvalue::Type kind = dictvalue::TYPE_NONE;
  VekString text;
  ref<Dict> dict;
  if (!UnmarshalAnyDictValue(*cursor, end, kind, text, dict) || kind != dictvalue::TYPE_DICT) return false;
  *cursor = end;
  *result = dict;
  return true;
}

bool ProtoBuf::UnmarshalAnyDictWithLength(Cursor cursor, End end, ref<Dict>* result) const {
  const unsigned char* p = *cursor;
  const unsigned char* partEnd;
  if (!ReadLength(&p, end, &partEnd) || !UnmarshalAnyDict(&p, partEnd, result)) return false;
  *cursor = partEnd;
  return true;
}

bool ProtoBuf::UnmarshalAnyDictValue(const unsigned char* begin, End end, dictvalue::Type& kind, VekString& text,
                                     ref<Dict>& dict) const {
  ref<Dict> nested;
  const unsigned char* p = begin;
  while (p < end) {
    unsigned char tag = *p++;
    const unsigned char* partEnd;
    if (!ReadLength(&p, end, &partEnd)) return false;
    if (tag == kTagText) {
      // A string is the whole value: nothing may follow it and no entry may precede it.
      if (partEnd != end || nested) return false;
      if (!ReadText(pMempoolM, p, partEnd - p, text)) return false;
      kind = dictvalue::TYPE_STRING;
      return true;
    }
    if (tag != kTagEntry) return false;
    if (!nested) {
      nested = MakeDict(pMempoolM);
      if (!nested) return false;
    }
    // Each dictionary opens a level, as a JSON object does.
    DepthGuard level(*this);
    if (!level.IsOk() || !UnmarshalAnyDictField(p, partEnd, nested)) return false;
    p = partEnd;
  }
  if (!nested) {
    nested = MakeDict(pMempoolM);  // an empty value section is an empty dictionary
    if (!nested) return false;
  }
  kind = dictvalue::TYPE_DICT;
  dict = nested;
  return true;
}

bool ProtoBuf::UnmarshalAnyDictField(const unsigned char* begin, End end, const ref<Dict>& dict) const {
  VekString name;
  bool isNamed = false;
  for (const unsigned char* p = begin; p < end && !isNamed;) {
    unsigned char tag = *p++;
    const unsigned char* partEnd;
    if (!ReadLength(&p, end, &partEnd)) return false;
    if (tag == kTagName) {
      if (!ReadText(pMempoolM, p, partEnd - p, name)) return false;
      isNamed = true;
    }
    p = partEnd;
  }
  if (!isNamed) return false;
  for (const unsigned char* p = begin; p < end;) {
    unsigned char tag = *p++;
    const unsigned char* partEnd;
    if (!ReadLength(&p, end, &partEnd)) return false;
    if (tag == kTagValue) {
      dictvalue::Type kind = dictvalue::TYPE_NONE;
      VekString text;
      ref<Dict> value;
      if (!UnmarshalAnyDictValue(p, partEnd, kind, text, value)) return false;
      bool isAdded = kind == dictvalue::TYPE_STRING ? dict->AddString(name, text) : dict->AddDict(name, value);
      if (!isAdded) return false;
    } else if (tag != kTagName) {
      return false;
    }
    p = partEnd;
  }
  return true;
}

ref<SarnObject> MakeErrorObject(VekMempool* pool, const VekString& text) {
  ref<SarnObject> object = sarnschema::Error::Factory(pool);
  if (!object) return object;
  sarnschema::Error* error = static_cast<sarnschema::Error*>(object.Get());
  error->codeM = kErrorCodeBadArgument;
  error->textM = text;
  return object;
}

ref<SarnObject> ProtoBuf::UnmarshalWrapper(const unsigned char* data, int length) const {
  const unsigned char* cursor = data;
  const unsigned char* end = data + (length > 0 ? length : 0);
  unsigned int tag;
  if (!GoogleInt::ReadGoogleU32(&cursor, end, &tag)) return MakeErrorObject(pMempoolM, "does not start with valid int");
  unsigned int typeId = tag >> 3;
  switch (typeId) {
    case kTypeIdCancel:
    case kTypeIdHello: {
      ref<SarnObject> object;
      if (!UnmarshalKnownDict(data, static_cast<int>(end - data), &object)) {
        return MakeErrorObject(pMempoolM, "failed to unmarshal");
      }
      return object;
    }
    case kTypeIdRequest:
      return UnmarshalRequestWrapper(&cursor, end);
    case kTypeIdResponse:
      return UnmarshalResponseWrapper(&cursor, end);
    default:
      return MakeErrorObject(pMempoolM, VekString::Format(pMempoolM, "bad object type: %u", typeId));
  }
}

ref<SarnObject> ProtoBuf::UnmarshalRequestWrapper(Cursor cursor, End end) const {
  ref<SarnObject> object = sarnschema::KernoRpcRequest::Factory(pMempoolM);
  if (!object) return MakeErrorObject(pMempoolM, "wrapper did not unmarshal");
  auto* request = static_cast<sarnschema::KernoRpcRequest*>(object.Get());
  const unsigned char* bodyBegin = nullptr;
  const unsigned char* bodyEnd = nullptr;
  const char* failure = ReadEnvelope(cursor, end, bodyBegin, bodyEnd, [&](unsigned int number) {
    uint8_t flag = 0;
    switch (number) {
      case 1:
        return ReadBool(cursor, end, flag) && ((request->monitorFutureChangesM = flag != 0), true);
      case 3:
        return GoogleInt::ReadGoogleS32(cursor, end, &request->rpcIdM);
      case 4:
        return GoogleInt::ReadGoogleS32(cursor, end, &request->kernoVersionM);
      case 5:
        return (request->fHasPartnerIdM = true) && GoogleInt::ReadGoogleU32(cursor, end, &request->partnerIdM);
      case 6:
        return ReadBool(cursor, end, flag) && ((request->sendAndForgetM = flag != 0), (request->fHasSendAndForgetM = true));
      default:
        return false;
    }
  });
  if (failure != nullptr) return MakeErrorObject(pMempoolM, failure);
  request->requestM = LazyDict::FromSarnObject(pMempoolM, ReadBody(bodyBegin, bodyEnd, "request did not unmarshal"), 0);
  return object;
}

ref<SarnObject> ProtoBuf::UnmarshalResponseWrapper(Cursor cursor, End end) const {
  ref<SarnObject> object = sarnschema::KernoRpcResponse::Factory(pMempoolM);
  if (!object) return MakeErrorObject(pMempoolM, "wrapper did not unmarshal");
  auto* response = static_cast<sarnschema::KernoRpcResponse*>(object.Get());
  const unsigned char* bodyBegin = nullptr;
  const unsigned char* bodyEnd = nullptr;
  const char* failure = ReadEnvelope(cursor, end, bodyBegin, bodyEnd, [&](unsigned int number) {
    uint8_t flag = 0;
    switch (number) {
      case 1:
        return ReadBool(cursor, end, flag) && ((response->isFinalResponseM = flag != 0), true);
      case 3:
        return GoogleInt::ReadGoogleS32(cursor, end, &response->rpcIdM);
      default:
        return false;
    }
  });
  if (failure != nullptr) return MakeErrorObject(pMempoolM, failure);
  response->responseM = LazyDict::FromSarnObject(pMempoolM, ReadBody(bodyBegin, bodyEnd, "response did not unmarshal"), 0);
  return object;
}

ref<SarnObject> ProtoBuf::ReadBody(const unsigned char* begin, const unsigned char* end, const char* failure) const {
  ref<SarnObject> body;
  const unsigned char* p = begin;
  if (p == nullptr || !UnmarshalKnownDictValue(&p, end, &body) || p != end) body = MakeErrorObject(pMempoolM, failure);
  return body;
}

ref<Dict> ProtoBuf::DictFromSarnObject(const ref<SarnObject>& object) const {
  if (!object) return nullptr;
  DictionarySarnObject converter(pMempoolM, structDefsM, structDefCountM);
  ref<Dictionary> dictionary = converter.SarnObjectToDictionary(object.Get(), 0);
  if (!dictionary) return nullptr;
  return new (pMempoolM) Dict(dictionary);
}

}  // namespace sarn
