// The writing half of ProtoBuf: tags from record indexes, values by data type, nested objects and
// dictionaries in sections of the output stream, whose lengths Finish fills in.
#include <cstdint>
#include <cstring>

#include "sarn/binary/GoogleInt.h"
#include "sarn/binary/ProtoBuf.h"
#include "sarn/model/FieldAccess.h"
#include "sarn/values/ScalarTypes.h"

namespace sarn {

namespace {

using Out = ProtoBufByteOutputStream;

// Wire type by data type code: 0 varint, 1 eight bytes, 2 length-delimited.
constexpr unsigned char kWireType[21] = {0, 2, 2, 2, 0, 0, 2, 0, 1, 0, 0, 2, 2, 2, 2, 0, 0, 2, 0, 0, 0};

unsigned WireTypeOf(unsigned dataType) { return dataType < sizeof kWireType ? kWireType[dataType] : 0; }

bool IsReference(unsigned dataType) {
  return FieldAccess::StorageOf(dataType) == FieldAccess::STORAGE_REFERENCE;
}

void WriteText(const VekString& text, Out* out) { out->WriteString(text); }

}  // namespace

void ProtoBuf::Marshal(const SarnObject* object, Out* out) const { MarshalDict(object, out); }

void ProtoBuf::MarshalDict(const SarnObject* object, Out* out) const {
  const StructInfo* info = object != nullptr && object->GetTypeId() < static_cast<uint32_t>(structDefCountM)
                               ? structDefsM[object->GetTypeId()]
                               : nullptr;
  if (info != nullptr) MarshalFields(info, object, out);
}

void ProtoBuf::MarshalFields(const StructInfo* info, const SarnObject* object, Out* out) const {
  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    const FieldInfo* field = &info->vFieldInfo[n];
    if (field->arity == SARN_ARITY_NONE || field->dataType > SARN_DATA_TYPE_U64) continue;
    unsigned int tag = n * 8 + WireTypeOf(field->dataType);
    if (field->arity == SARN_ARITY_MULTI) {
      MarshalMultiField(static_cast<int>(tag), field, object, out);
      continue;
    }
    if (!IsFieldPresent(object, *field)) continue;
    // A null reference is skipped even when the field is REQUIRED: an empty value would not read
    // back as null.
    if (IsReference(field->dataType) && FieldAccess::ReferenceAt(object, *field, 0) == nullptr) continue;
    GoogleInt::WriteGoogleU32(tag, out);
    MarshalSingleField(field, object, out);
  }
}

void ProtoBuf::MarshalMultiField(int tag, const FieldInfo* field, const SarnObject* object, Out* out) const {
  unsigned count = FieldAccess::Count(object, *field);
  for (unsigned i = 0; i < count; ++i) {
    if (IsReference(field->dataType) && FieldAccess::ReferenceAt(object, *field, i) == nullptr) continue;
    GoogleInt::WriteGoogleU32(static_cast<unsigned int>(tag), out);
    WriteValue(field, object, i, out);
  }
}

void ProtoBuf::MarshalSingleField(const FieldInfo* field, const SarnObject* object, Out* out) const {
  WriteValue(field, object, 0, out);
}

void ProtoBuf::WriteValue(const FieldInfo* field, const SarnObject* object, unsigned i, Out* out) const {
  switch (field->dataType) {
    case SARN_DATA_TYPE_BOOL:
      GoogleInt::WriteGoogleU32(FieldAccess::ScalarValue<uint8_t>(object, *field, i) != 0 ? 1 : 0, out);
      return;
    case SARN_DATA_TYPE_DATE:
    case SARN_DATA_TYPE_S32:
      GoogleInt::WriteGoogleS32(FieldAccess::ScalarValue<int32_t>(object, *field, i), out);
      return;
    case SARN_DATA_TYPE_DATETIME:
    case SARN_DATA_TYPE_S64:
      GoogleInt::WriteGoogleS64(FieldAccess::ScalarValue<int64_t>(object, *field, i), out);
      return;
    case SARN_DATA_TYPE_ENUM:
    case SARN_DATA_TYPE_TIME:
    case SARN_DATA_TYPE_INT_ID:
    case SARN_DATA_TYPE_U32:
      GoogleInt::WriteGoogleU32(FieldAccess::ScalarValue<uint32_t>(object, *field, i), out);
      return;
    case SARN_DATA_TYPE_LONG_ID:
    case SARN_DATA_TYPE_U64:
      GoogleInt::WriteGoogleU64(FieldAccess::ScalarValue<uint64_t>(object, *field, i), out);
      return;
    case SARN_DATA_TYPE_FLOAT: {
      uint64_t bits = FieldAccess::ScalarValue<uint64_t>(object, *field, i);
      for (int k = 0; k < 8; ++k, bits >>= 8) out->WriteByte(static_cast<unsigned char>(bits));
      return;
    }
    case SARN_DATA_TYPE_CHANNEL_NUMBER:
      WriteText(FieldAccess::ScalarValue<ChannelNumber>(object, *field, i).ToString(), out);
      return;
    case SARN_DATA_TYPE_CURRENCY:
      WriteText(FieldAccess::ScalarValue<Currency>(object, *field, i).ToString(), out);
      return;
    case SARN_DATA_TYPE_STRING:
    case SARN_DATA_TYPE_STRING_ID:
      WriteText(FieldAccess::StringAt(object, *field, i), out);
      return;
    default:
      break;
  }
  VekCore* value = FieldAccess::ReferenceAt(object, *field, i);
  switch (field->dataType) {
    case SARN_DATA_TYPE_BYTESTRING: {
      const vek::ByteBuffer* bytes = static_cast<const vek::ByteBuffer*>(value);
      out->StartSection();
      if (bytes != nullptr) out->WriteBytes(bytes->GetData(), bytes->GetLength());
      out->EndSection();
      return;
    }
    case SARN_DATA_TYPE_ANY_DICT:
      MarshalAnyDictWithLength(static_cast<Dict*>(value), out);
      return;
    case SARN_DATA_TYPE_KNOWN_DICT:
      MarshalKnownDictField(static_cast<const SarnObject*>(value), out);
      return;
    case SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY:
      MarshalKnownDictAsLazyField(static_cast<const LazyDict*>(value), out);
      return;
    case SARN_DATA_TYPE_SUBDICT:
      MarshalSubdict(static_cast<const SarnObject*>(value), out);
      return;
    default:
      return;
  }
}

void ProtoBuf::MarshalSubdict(const SarnObject* object, Out* out) const {
  out->StartSection();
  MarshalDict(object, out);
  out->EndSection();
}

void ProtoBuf::MarshalKnownDictValue(const SarnObject* object, Out* out) const {
  GoogleInt::WriteGoogleU32((object != nullptr ? object->GetTypeId() : 0) * 8 + 2, out);
  MarshalSubdict(object, out);
}

void ProtoBuf::MarshalKnownDict(const SarnObject* object, Out* out) const { MarshalKnownDictValue(object, out); }

void ProtoBuf::MarshalKnownDictField(const SarnObject* object, Out* out) const {
  out->StartSection();
  MarshalKnownDictValue(object, out);
  out->EndSection();
}

void ProtoBuf::MarshalKnownDictAsLazyField(const LazyDict* payload, Out* out) const {
  ref<SarnObject> object = payload != nullptr ? payload->ToSarnObjectOrError() : ref<SarnObject>();
  MarshalKnownDictField(object.Get(), out);
}

// Dictionaries recurse once per nesting level, as their JSON writer does; the readers bound how
// deep a tree can be.
void ProtoBuf::MarshalAnyDict(Dict* dict, Out* out) const {
  if (dict == nullptr) return;
  VekStringArray names(pMempoolM);
  dict->GetSortedNames(names);
  for (int n = 0; n < names.Count(); ++n) {
    out->AppendByte(34);
    out->StartSection();
    MarshalAnyDictField(dict, names[n], out);
    out->EndSection();
  }
}

void ProtoBuf::MarshalAnyDictWithLength(Dict* dict, Out* out) const {
  out->StartSection();
  MarshalAnyDict(dict, out);
  out->EndSection();
}

void ProtoBuf::MarshalAnyDictField(Dict* dict, const VekString& name, Out* out) const {
  out->AppendByte(50);
  out->WriteString(name);
  unsigned count = dict->CountValues(name);
  for (unsigned i = 0; i < count; ++i) {
    out->AppendByte(66);
    out->StartSection();
    MarshalAnyDictValue(dict, name, i, out);
    out->EndSection();
  }
}

void ProtoBuf::MarshalAnyDictValue(Dict* dict, const VekString& name, unsigned long index, Out* out) const {
  switch (dict->GetType(name, static_cast<int>(index))) {
    case dictvalue::TYPE_STRING:
      out->AppendByte(18);
      out->WriteString(dict->GetString(name, static_cast<int>(index)));
      return;
    case dictvalue::TYPE_DICT: {
      ref<Dict> nested = dict->GetDict(name, static_cast<int>(index));
      MarshalAnyDict(nested.Get(), out);
      return;
    }
    default:
      return;  // any other value is an empty value section
  }
}

}  // namespace sarn
