// The writing half of ProtoBuf: the binary side of the shared object walk. Tags come from record
// indexes and the wire types of the data-type traits, values are written by data type, and nested
// objects and dictionaries go into sections of the output stream, whose lengths Finish fills in.
// A nested object's sections are opened when its value is met and closed when the walk leaves it.
#include <cstdint>
#include <cstring>

#include "sarn/binary/ProtoBuf.h"
#include "sarn/binary/internal/Varint.h"
#include "sarn/dict/DictValue.h"
#include "sarn/dict/Dictionary.h"
#include "sarn/dict/internal/LazyDictSupport.h"
#include "sarn/model/FieldAccess.h"
#include "sarn/model/internal/ObjectWalk.h"
#include "sarn/values/ScalarTypes.h"

namespace sarn {

namespace {

using Out = ProtoBufByteOutputStream;

// Per object: the sections its value opened, to be closed after its fields, and the tag its
// field's values are written with (a one-field walk may be given one, or none).
struct ProtoBufFrameData {
  int64_t tagM;
  unsigned nSectionsM;
  int64_t fieldTagM;  // the tag of the field being visited
  int lazyLevelsM;    // payloads converted around this object, each inside the one before
};

constexpr int64_t kTagOfRecord = -1; // the tag follows from the field number and the wire type
constexpr int64_t kNoTag = -2;       // the value alone

ProtoBufFrameData Sections(unsigned n) { return ProtoBufFrameData{kTagOfRecord, n, kNoTag, 0}; }

// The tag and sections of a known dict: the type id (0 for no object) as a known-dict tag, then
// the fields in a section.
void OpenKnownDictValue(const SarnObject* object, Out* out) {
  internal::AppendVarint((object != nullptr ? object->GetTypeId() : 0u) * 8 + 2, out);
  out->StartSection();
}

}  // namespace

class ProtoBuf::Writer {
 public:
  using FrameData = ProtoBufFrameData;
  using Walk = internal::ObjectWalk<Writer, internal::WalkVersions::CURRENT_RECORDS>;
  using Frame = Walk::Frame;
  using Child = Walk::Child;

  Writer(const ProtoBuf& codec, Out* out)
      : codecM(codec),
        outM(out),
        walkM(codec.pMempoolM, codec.structDefsM, static_cast<uint32_t>(codec.structDefCountM)) {}

  // Walks `object` (fields of `info`) and closes the sections in `data` after it.
  void Run(const SarnObject* object, const StructInfo* info, const FrameData& data) {
    if (!walkM.Run(*this, object, info, 0, data)) Fail();
  }
  void Run(const SarnObject* object, const FrameData& data) { Run(object, walkM.InfoOf(object), data); }
  void RunField(const FieldInfo& field, const SarnObject* object, int64_t tag) {
    FrameData data{tag, 0, kNoTag, 0};
    if (!walkM.RunField(*this, object, field, nullptr, 0, data)) Fail();
  }

  void BeginObject(Frame&, Frame*) {}
  void BeginField(Frame& frame) {
    int64_t tag = frame.dataM.tagM;
    if (tag == kTagOfRecord) {
      tag = static_cast<int64_t>(frame.nFieldM) * 8 + TraitsOf(frame.pFieldM->dataType).wireType;
    }
    frame.dataM.fieldTagM = tag;
  }
  void EndField(Frame&) {}
  void EndObject(Frame& frame) {
    for (unsigned k = 0; k < frame.dataM.nSectionsM; ++k) outM->EndSection();
  }

  bool Value(Frame& frame, unsigned i, Child& child) {
    const FieldInfo& field = *frame.pFieldM;
    const SarnObject* object = frame.pObjectM;
    // A null byte string is left out even when REQUIRED: an empty value would not read back as null.
    if (field.dataType == SARN_DATA_TYPE_BYTESTRING && FieldAccess::ReferenceAt(object, field, i) == nullptr) {
      return true;
    }
    int64_t tag = frame.dataM.fieldTagM;
    if (tag != kNoTag) internal::AppendVarint(static_cast<unsigned int>(tag), outM);
    switch (field.dataType) {
      case SARN_DATA_TYPE_BOOL:
        internal::AppendVarint(FieldAccess::ScalarValue<uint8_t>(object, field, i) != 0 ? 1u : 0u, outM);
        return true;
      case SARN_DATA_TYPE_DATE:
      case SARN_DATA_TYPE_S32:
        internal::AppendZigZag32(FieldAccess::ScalarValue<int32_t>(object, field, i), outM);
        return true;
      case SARN_DATA_TYPE_DATETIME:
      case SARN_DATA_TYPE_S64:
        internal::AppendZigZag64(FieldAccess::ScalarValue<int64_t>(object, field, i), outM);
        return true;
      case SARN_DATA_TYPE_ENUM:
      case SARN_DATA_TYPE_TIME:
      case SARN_DATA_TYPE_INT_ID:
      case SARN_DATA_TYPE_U32:
        internal::AppendVarint(FieldAccess::ScalarValue<uint32_t>(object, field, i), outM);
        return true;
      case SARN_DATA_TYPE_LONG_ID:
      case SARN_DATA_TYPE_U64:
        internal::AppendVarint(FieldAccess::ScalarValue<uint64_t>(object, field, i), outM);
        return true;
      case SARN_DATA_TYPE_FLOAT: {
        uint64_t bits = FieldAccess::ScalarValue<uint64_t>(object, field, i);
        for (int k = 0; k < 8; ++k, bits >>= 8) outM->WriteByte(static_cast<unsigned char>(bits));
        return true;
      }
      case SARN_DATA_TYPE_CHANNEL_NUMBER:
        outM->WriteString(FieldAccess::ScalarValue<ChannelNumber>(object, field, i).ToString());
        return true;
      case SARN_DATA_TYPE_CURRENCY:
        outM->WriteString(FieldAccess::ScalarValue<Currency>(object, field, i).ToString());
        return true;
      case SARN_DATA_TYPE_STRING:
      case SARN_DATA_TYPE_STRING_ID:
        outM->WriteString(FieldAccess::StringAt(object, field, i));
        return true;
      default:
        break;
    }
    VekCore* value = FieldAccess::ReferenceAt(object, field, i);
    switch (field.dataType) {
      case SARN_DATA_TYPE_BYTESTRING: {
        const vek::ByteBuffer* bytes = static_cast<const vek::ByteBuffer*>(value);
        outM->StartSection();
        outM->WriteBytes(bytes->GetData(), bytes->GetLength());
        outM->EndSection();
        return true;
      }
      case SARN_DATA_TYPE_ANY_DICT:
        codecM.MarshalAnyDictWithLength(static_cast<Dict*>(value), outM);
        return true;
      case SARN_DATA_TYPE_SUBDICT:
        outM->StartSection();
        Descend(frame, child, static_cast<const SarnObject*>(value), 1);
        return true;
      case SARN_DATA_TYPE_KNOWN_DICT:
        outM->StartSection();
        OpenKnownDictValue(static_cast<const SarnObject*>(value), outM);
        Descend(frame, child, static_cast<const SarnObject*>(value), 2);
        return true;
      case SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY: {
        // A payload that cannot be converted gives an error object, which is then what is written.
        // Payloads nested in payloads are converted here one after another, not one inside
        // another, so the levels around each are counted for it.
        ref<SarnObject> inner;
        {
          internal::LazyNesting around(frame.dataM.lazyLevelsM);
          inner = static_cast<const LazyDict*>(value)->ToSarnObjectOrError();
        }
        outM->StartSection();
        OpenKnownDictValue(inner.Get(), outM);
        if (inner == nullptr) {
          outM->EndSection();
          outM->EndSection();
          return true;
        }
        inner->UpRef();
        Descend(frame, child, inner.Get(), 2);
        ++child.dataM.lazyLevelsM;
        child.isOwnedM = true;
        return true;
      }
      default:
        return true;
    }
  }

 private:
  static void Descend(const Frame& frame, Child& child, const SarnObject* object, unsigned nSections) {
    child.pObjectM = object;
    child.dataM = Sections(nSections);
    child.dataM.lazyLevelsM = frame.dataM.lazyLevelsM;
  }
  // The stack could not grow: the stream's own out-of-memory state, so that Finish gives nothing.
  void Fail() { outM->bytesM.isOutOfMemoryM = true; }

  const ProtoBuf& codecM;
  Out* outM;
  Walk walkM;
};

void ProtoBuf::Marshal(const SarnObject* object, Out* out) const { MarshalDict(object, out); }

void ProtoBuf::MarshalDict(const SarnObject* object, Out* out) const {
  Writer writer(*this, out);
  writer.Run(object, Sections(0));
}

void ProtoBuf::MarshalFields(const StructInfo* info, const SarnObject* object, Out* out) const {
  Writer writer(*this, out);
  writer.Run(object, info, Sections(0));
}

void ProtoBuf::MarshalMultiField(int tag, const FieldInfo* field, const SarnObject* object, Out* out) const {
  Writer writer(*this, out);
  writer.RunField(*field, object, static_cast<unsigned int>(tag));
}

void ProtoBuf::MarshalSingleField(const FieldInfo* field, const SarnObject* object, Out* out) const {
  // The caller has written the tag, so a null reference still needs a value: an empty one.
  if (FieldAccess::StorageOf(field->dataType) == FieldAccess::STORAGE_REFERENCE &&
      FieldAccess::ReferenceAt(object, *field, 0) == nullptr) {
    if (TraitsOf(field->dataType).isHoldingObjects && field->dataType != SARN_DATA_TYPE_SUBDICT) {
      MarshalKnownDictField(nullptr, out);
    } else {
      out->StartSection();
      out->EndSection();
    }
    return;
  }
  Writer writer(*this, out);
  writer.RunField(*field, object, kNoTag);
}

void ProtoBuf::MarshalSubdict(const SarnObject* object, Out* out) const {
  out->StartSection();
  Writer writer(*this, out);
  writer.Run(object, Sections(1));
}

void ProtoBuf::MarshalKnownDictValue(const SarnObject* object, Out* out) const {
  OpenKnownDictValue(object, out);
  Writer writer(*this, out);
  writer.Run(object, Sections(1));
}

void ProtoBuf::MarshalKnownDict(const SarnObject* object, Out* out) const { MarshalKnownDictValue(object, out); }

void ProtoBuf::MarshalKnownDictField(const SarnObject* object, Out* out) const {
  out->StartSection();
  OpenKnownDictValue(object, out);
  Writer writer(*this, out);
  writer.Run(object, Sections(2));
}

void ProtoBuf::MarshalKnownDictAsLazyField(const LazyDict* payload, Out* out) const {
  ref<SarnObject> object = payload != nullptr ? payload->ToSarnObjectOrError() : ref<SarnObject>();
  MarshalKnownDictField(object.Get(), out);
}

// Any-dicts are written straight from their trees: one lookup per name instead of one per
// question asked of the facade (count, kind, text), and no facade made per nested dictionary.
// Dictionaries recurse once per nesting level, as their JSON writer does; the readers bound how
// deep a tree can be.
namespace {

void WriteDictionaryEntries(const Dictionary* dictionary, VekMempool* pool, Out* out);

// One value section's content: a string part, a nested dictionary's entries directly, or nothing
// for any other kind.
void WriteDictValue(const DictValue* value, VekMempool* pool, Out* out) {
  if (value == nullptr) return;
  switch (value->kindM) {
    case DictValue::KIND_STRING:
      out->AppendByte(18);
      out->WriteString(static_cast<const StringValue*>(value)->valueM);
      return;
    case DictValue::KIND_DICTIONARY:
      WriteDictionaryEntries(static_cast<const Dictionary*>(value), pool, out);
      return;
    case DictValue::KIND_LAZY_DICT: {
      const ref<LazyDict>& payload = static_cast<const LazyDictValue*>(value)->lazyDictM;
      if (!payload) return;
      ref<Dict> nested = payload->ToDict();
      if (nested) WriteDictionaryEntries(nested->GetDictionary().Get(), pool, out);
      return;
    }
    default:
      return;
  }
}

void WriteValueSection(const DictValue* value, VekMempool* pool, Out* out) {
  out->AppendByte(66);
  out->StartSection();
  WriteDictValue(value, pool, out);
  out->EndSection();
}

// One entry's content: the name, then a value section per value stored under it, in order.
void WriteEntryContent(const Dictionary* dictionary, const VekString& name, VekMempool* pool, Out* out) {
  out->AppendByte(50);
  out->WriteString(name);
  ref<DictValue> first = dictionary->Get(name);
  if (!first) return;
  if (first->kindM != DictValue::KIND_ARRAY) {
    WriteValueSection(first.Get(), pool, out);
    return;
  }
  const ArrayValue* values = static_cast<const ArrayValue*>(first.Get());
  unsigned count = values->CountValues();
  for (unsigned i = 0; i < count; ++i) WriteValueSection(values->GetValueAt(i).Get(), pool, out);
}

void WriteDictionaryEntries(const Dictionary* dictionary, VekMempool* pool, Out* out) {
  if (dictionary == nullptr) return;
  VekStringArray names(pool);
  dictionary->GetSortedNames(names);
  for (int n = 0; n < names.Count(); ++n) {
    out->AppendByte(34);
    out->StartSection();
    WriteEntryContent(dictionary, names[n], pool, out);
    out->EndSection();
  }
}

}  // namespace

void ProtoBuf::MarshalAnyDict(Dict* dict, Out* out) const {
  if (dict != nullptr) WriteDictionaryEntries(dict->GetDictionary().Get(), pMempoolM, out);
}

void ProtoBuf::MarshalAnyDictWithLength(Dict* dict, Out* out) const {
  out->StartSection();
  MarshalAnyDict(dict, out);
  out->EndSection();
}

void ProtoBuf::MarshalAnyDictField(Dict* dict, const VekString& name, Out* out) const {
  WriteEntryContent(dict->GetDictionary().Get(), name, pMempoolM, out);
}

void ProtoBuf::MarshalAnyDictValue(Dict* dict, const VekString& name, unsigned long index, Out* out) const {
  WriteDictValue(dict->FindValue(name, index).Get(), pMempoolM, out);
}

}  // namespace sarn
