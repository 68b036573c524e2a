// The object-to-JSON writer. One loop walks the object tree over an explicit stack of frames:
// an object frame walks one object's field table, an array frame walks the elements of one
// multi-valued field that holds objects. Values that are not schema objects are written in place;
// a nested object pushes a frame, so C-stack use does not grow with the depth of the tree. Lazy
// payloads that hold an object are walked the same way (under their own version), which writes the
// bytes the payload's own compact writer would.
//
// Numbers are formatted here without printf (same digits); texts that need no escaping are quoted
// directly, and everything else goes through the shared JSON string escaper.
#include "sarn/json/JsonSarnObject.h"

#include <cstdio>
#include <cstring>

#include "sarn/dict/Dict.h"
#include "sarn/dict/Dictionary.h"
#include "sarn/model/FieldAccess.h"
#include "sarn/values/Json.h"
#include "sarn/dict/LazyDict.h"
#include "sarn/values/ScalarTypes.h"
#include "sarn/objects/internal/ObjectText.h"
#include "sarn/values/internal/TextOut.h"
#include "sarn/values/internal/TimeText.h"
#include "sarn/base/internal/WalkStack.h"

namespace sarn {

using internal::AppendText;

namespace {

void AppendLiteral(ByteBuffer& out, const char* text) { AppendText(out, text, std::strlen(text)); }

// The JSON string form of `length` bytes of `text`.
void AppendQuoted(VekMempool* pool, const char* text, size_t length, ByteBuffer& out) {
  if (internal::IsPlainText(text, length)) {
    out.AppendByte('"');
    AppendText(out, text, length);
    out.AppendByte('"');
  } else {
    VekString copy = VekString::FromUtf8Bytes(pool, length, text);
    if (copy.FEmpty() && length != 0) return out.Fail();
    Json::StringToJson(copy, false, out);
  }
}

// A stored string, or a text made for the value: of those only an empty byte string's is empty
// (`isEmptyAllowed`), any other empty one could not be made.
void AppendQuoted(const VekString& text, ByteBuffer& out, bool isEmptyAllowed = false) {
  if (text.FEmpty() && !isEmptyAllowed) return out.Fail();
  Json::StringToJson(text, false, out);
}

// `text` holds `length` plain bytes from text[1] on; quotes them in place and appends.
void QuoteInPlace(char* text, size_t length, ByteBuffer& out) {
  text[0] = '"';
  text[length + 1] = '"';
  AppendText(out, text, length + 2);
}

bool HoldsObjects(unsigned dataType) {
  return dataType == SARN_DATA_TYPE_KNOWN_DICT || dataType == SARN_DATA_TYPE_SUBDICT ||
         dataType == SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY;
}

bool IsReferenceType(unsigned dataType) { return FieldAccess::StorageOf(dataType) == FieldAccess::STORAGE_REFERENCE; }

// The anchor of the pseudo-field "type": the last field written at `version` whose name sorts
// below "type", or -1.
int FindTypeAnchor(const StructInfo* info, KernoVersion version) {
  for (int n = static_cast<int>(info->nFieldInfo) - 1; n >= 0; --n) {
    const FieldInfo& field = info->vFieldInfo[n];
    if (FieldTakesPart(field, version) && std::strcmp(FieldName(info, field), "type") < 0) return n;
  }
  return -1;
}

}  // namespace

struct JsonSarnObject::Frame {
  const SarnObject* pObjectM;
  const StructInfo* pInfoM;   // null for an array frame
  const FieldInfo* pFieldM;   // array frame: the multi-valued field
  KernoVersion versionM;
  int anchorM;                // object frame: field number before which "type" goes, or -1
  unsigned nextM;             // object frame: next field number; array frame: next element
  bool fFirstM;               // object frame: no member written yet; array frame: no element yet
};

class JsonSarnObject::FrameStack : public internal::WalkStack<JsonSarnObject::Frame> {
 public:
  using WalkStack::WalkStack;
};

JsonSarnObject::JsonSarnObject(VekMempool* mempool)
    : pMempoolM(mempool),
      pStructDefsM(Schema::vStructDefG),
      nStructDefsM(static_cast<uint32_t>(Schema::nStructDefG)),
      nObjectIndexM(0),
      vObjectTypesM(8, nullptr, 3) {}

JsonSarnObject::~JsonSarnObject() { vObjectTypesM.Destroy(); }

VekString JsonSarnObject::SarnObjectToJson(const SarnObject* object, KernoVersion version) {
  ByteBuffer out(pMempoolM);
  SarnObjectToJson(object, version, out);
  return VekString::FromUtf8Bytes(pMempoolM, out.GetLength(), out.GetData());
}

void JsonSarnObject::SarnObjectToJson(const SarnObject* object, KernoVersion version, ByteBuffer& out) {
  FrameStack stack(pMempoolM);
  PushObject(stack, object, version, out);
  Walk(stack, out);
  if (stack.HasFailed()) out.Fail();
}

void JsonSarnObject::WriteFieldName(const char* name, ByteBuffer& out, bool& fFirst) {
  if (fFirst) {
    fFirst = false;
    out.AppendByte('"');
  } else {
    AppendText(out, ", \"", 3);
  }
  AppendLiteral(out, name);
  AppendText(out, "\": ", 3);
}

void JsonSarnObject::LazyToJson(const LazyDict* lazy, ByteBuffer& out) { lazy->ToJsonByteBuffer(out, false); }

void JsonSarnObject::SingleFieldToJson(const char* name, const FieldInfo* field, const SarnObject* object,
                                       ByteBuffer& out, bool& fFirst, KernoVersion version) {
  if (FieldAccess::StorageOf(field->dataType) == FieldAccess::STORAGE_NONE) return;
  if (IsReferenceType(field->dataType) && field->dataType != SARN_DATA_TYPE_BYTESTRING &&
      FieldAccess::ReferenceAt(object, *field, 0) == nullptr) {
    return;
  }
  WriteFieldName(name, out, fFirst);
  if (HoldsObjects(field->dataType)) {
    FrameStack stack(pMempoolM);
    PushValue(stack, *field, object, 0, version, out);
    Walk(stack, out);
  } else {
    WriteValue(*field, object, 0, out);
  }
}

void JsonSarnObject::MultiFieldToJson(const char* name, const FieldInfo* field, const SarnObject* object,
                                      ByteBuffer& out, bool& fFirst, KernoVersion version) {
  if (FieldAccess::StorageOf(field->dataType) == FieldAccess::STORAGE_NONE) return;
  unsigned count = FieldAccess::Count(object, *field);
  unsigned first = 0;
  if (IsReferenceType(field->dataType) && field->dataType != SARN_DATA_TYPE_BYTESTRING) {
    // Null elements are left out, so an array of nothing but nulls is written as no array.
    while (first < count && FieldAccess::ReferenceAt(object, *field, first) == nullptr) ++first;
  }
  if (first == count) return;
  WriteFieldName(name, out, fFirst);
  if (HoldsObjects(field->dataType)) {
    FrameStack stack(pMempoolM);
    PushArray(stack, *field, object, version, out);
    Walk(stack, out);
    return;
  }
  out.AppendByte('[');
  bool fFirstElement = true;
  for (unsigned i = first; i < count; ++i) {
    if (field->dataType == SARN_DATA_TYPE_ANY_DICT && FieldAccess::ReferenceAt(object, *field, i) == nullptr) continue;
    if (!fFirstElement) out.AppendByte(',');
    fFirstElement = false;
    WriteValue(*field, object, i, out);
  }
  out.AppendByte(']');
}

// ---- the walk ----

void JsonSarnObject::PushObject(FrameStack& stack, const SarnObject* object, KernoVersion version, ByteBuffer& out) {
  const StructInfo* info = StructDef(object->typeIdM);
  out.AppendByte('{');
  if (info == nullptr) {
    // No metadata, nothing to say about the object: an empty JSON object.
    out.AppendByte('}');
    return;
  }
  Frame& frame = stack.Push();
  frame.pObjectM = object;
  frame.pInfoM = info;
  frame.versionM = version;
  frame.anchorM = FindTypeAnchor(info, version);
  frame.fFirstM = true;
}

void JsonSarnObject::PushArray(FrameStack& stack, const FieldInfo& field, const SarnObject* object,
                               KernoVersion version, ByteBuffer& out) {
  out.AppendByte('[');
  Frame& frame = stack.Push();
  frame.pObjectM = object;
  frame.pFieldM = &field;
  frame.versionM = version;
  frame.fFirstM = true;
}

// Value `i` of an object-holding field, known to be non-null: a nested object gets a frame; a lazy
// payload that holds an object is walked in its own version; any other payload writes itself.
void JsonSarnObject::PushValue(FrameStack& stack, const FieldInfo& field, const SarnObject* object, unsigned i,
                               KernoVersion version, ByteBuffer& out) {
  VekCore* value = FieldAccess::ReferenceAt(object, field, i);
  if (field.dataType != SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY) {
    PushObject(stack, static_cast<const SarnObject*>(value), version, out);
    return;
  }
  const LazyDict* lazy = static_cast<const LazyDict*>(value);
  if (lazy->repM == LazyDict::REP_OBJECT && lazy->objectM != nullptr) {
    PushObject(stack, lazy->objectM.Get(), lazy->versionM, out);
  } else {
    LazyToJson(lazy, out);
  }
}

void JsonSarnObject::Walk(FrameStack& stack, ByteBuffer& out) {
  while (!stack.Empty()) {
    Frame& frame = stack.Top();
    if (frame.pInfoM == nullptr) {
      // Array frame: the next non-null element, or the closing bracket.
      const FieldInfo& field = *frame.pFieldM;
      unsigned count = FieldAccess::Count(frame.pObjectM, field);
      while (frame.nextM < count && FieldAccess::ReferenceAt(frame.pObjectM, field, frame.nextM) == nullptr) {
        ++frame.nextM;
      }
      if (frame.nextM == count) {
        out.AppendByte(']');
        stack.Pop();
        continue;
      }
      if (!frame.fFirstM) out.AppendByte(',');
      frame.fFirstM = false;
      unsigned i = frame.nextM++;
      PushValue(stack, field, frame.pObjectM, i, frame.versionM, out);
      continue;
    }

    const StructInfo* info = frame.pInfoM;
    if (frame.nextM == info->nFieldInfo) {
      if (frame.anchorM < 0) WriteTypeMember(info, out, frame.fFirstM);
      out.AppendByte('}');
      stack.Pop();
      continue;
    }
    unsigned n = frame.nextM++;
    const FieldInfo& field = info->vFieldInfo[n];
    if (static_cast<int>(n) == frame.anchorM) WriteTypeMember(info, out, frame.fFirstM);
    if (!FieldTakesPart(field, frame.versionM)) continue;
    const SarnObject* object = frame.pObjectM;
    const char* name = FieldName(info, field);
    if (field.arity == SARN_ARITY_MULTI) {
      if (!HoldsObjects(field.dataType)) {
        MultiFieldToJson(name, &field, object, out, frame.fFirstM, frame.versionM);
        continue;
      }
      unsigned count = FieldAccess::Count(object, field);
      unsigned first = 0;
      while (first < count && FieldAccess::ReferenceAt(object, field, first) == nullptr) ++first;
      if (first == count) continue;
      WriteFieldName(name, out, frame.fFirstM);
      KernoVersion version = frame.versionM;
      PushArray(stack, field, object, version, out);
      continue;
    }
    if (field.arity == SARN_ARITY_OPTIONAL && !IsFieldPresent(object, field)) continue;
    if (!HoldsObjects(field.dataType)) {
      SingleFieldToJson(name, &field, object, out, frame.fFirstM, frame.versionM);
      continue;
    }
    if (FieldAccess::ReferenceAt(object, field, 0) == nullptr) continue;
    WriteFieldName(name, out, frame.fFirstM);
    KernoVersion version = frame.versionM;
    PushValue(stack, field, object, 0, version, out);
  }
}

void JsonSarnObject::WriteTypeMember(const StructInfo* info, ByteBuffer& out, bool& fFirst) {
  WriteFieldName("type", out, fFirst);
  out.AppendByte('"');
  AppendLiteral(out, info->pName);
  out.AppendByte('"');
}

// ---- values that are not schema objects ----

void JsonSarnObject::WriteValue(const FieldInfo& field, const SarnObject* object, unsigned i, ByteBuffer& out) {
  switch (field.dataType) {
    case SARN_DATA_TYPE_BOOL:
      if (FieldAccess::ScalarValue<uint8_t>(object, field, i) != 0) {
        AppendText(out, "true", 4);
      } else {
        AppendText(out, "false", 5);
      }
      break;
    case SARN_DATA_TYPE_BYTESTRING: {
      // A missing byte string reads as an empty one.
      ref<vek::ByteBuffer> bytes = static_cast<vek::ByteBuffer*>(FieldAccess::ReferenceAt(object, field, i));
      if (bytes == nullptr) {
        AppendText(out, "\"\"", 2);
      } else {
        AppendQuoted(Dict::FormatBytestring(pMempoolM, bytes), out, bytes->GetLength() == 0);
      }
      break;
    }
    case SARN_DATA_TYPE_CHANNEL_NUMBER:
      AppendQuoted(FieldAccess::ScalarValue<ChannelNumber>(object, field, i).ToString(), out);
      break;
    case SARN_DATA_TYPE_CURRENCY:
      AppendQuoted(FieldAccess::ScalarValue<Currency>(object, field, i).ToString(), out);
      break;
    case SARN_DATA_TYPE_DATE: {
      Date date = FieldAccess::ScalarValue<Date>(object, field, i);
      char text[12];
      if (internal::FormatDateText(date.daysM, text + 1)) {
        QuoteInPlace(text, 10, out);
      } else {
        AppendQuoted(date.ToString(), out);
      }
      break;
    }
    case SARN_DATA_TYPE_DATETIME: {
      // Milliseconds are dropped by truncation, as a division of the signed count does.
      DateTime dateTime = FieldAccess::ScalarValue<DateTime>(object, field, i);
      char text[21];
      if (internal::FormatDateTimeText(dateTime.millisecondsM / 1000, text + 1)) {
        QuoteInPlace(text, 19, out);
      } else {
        AppendQuoted(dateTime.ToString(), out);
      }
      break;
    }
    case SARN_DATA_TYPE_TIME: {
      int64_t seconds = FieldAccess::ScalarValue<Time>(object, field, i).millisecondsM / 1000;
      char text[10];
      internal::FormatTimeOfDayText(seconds - internal::FloorDiv(seconds, 86400) * 86400, text + 1);
      QuoteInPlace(text, 8, out);
      break;
    }
    case SARN_DATA_TYPE_ANY_DICT: {
      const Dict* dict = static_cast<const Dict*>(FieldAccess::ReferenceAt(object, field, i));
      if (dict != nullptr) dict->GetDictionary()->ToJson(out, JsonFormat(false));
      break;
    }
    case SARN_DATA_TYPE_ENUM: {
      uint32_t value = FieldAccess::ScalarValue<uint32_t>(object, field, i);
      const char* name = internal::EnumText(field, value);
      if (name != nullptr) {
        AppendQuoted(pMempoolM, name, std::strlen(name), out);
      } else {
        char text[32];
        AppendQuoted(pMempoolM, text, internal::FormatInvalidEnum(value, text), out);
      }
      break;
    }
    case SARN_DATA_TYPE_FLOAT:
      AppendQuoted(Dict::FormatFloat(pMempoolM, FieldAccess::ScalarValue<double>(object, field, i)), out);
      break;
    case SARN_DATA_TYPE_INT_ID:
    case SARN_DATA_TYPE_LONG_ID:
    case SARN_DATA_TYPE_STRING_ID:
    {
      char text[internal::kIdTextRoom];
      size_t length = internal::FormatIdText(pMempoolM, pStructDefsM, nStructDefsM, field, object, i, text);
      AppendQuoted(pMempoolM, text, length, out);
      break;
    }
    case SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY: {
      const LazyDict* lazy = static_cast<const LazyDict*>(FieldAccess::ReferenceAt(object, field, i));
      if (lazy != nullptr) LazyToJson(lazy, out);
      break;
    }
    case SARN_DATA_TYPE_S64:
      internal::AppendInteger(out, FieldAccess::ScalarValue<int64_t>(object, field, i), true);
      break;
    case SARN_DATA_TYPE_S32:
      internal::AppendInteger(out, FieldAccess::ScalarValue<int32_t>(object, field, i), false);
      break;
    case SARN_DATA_TYPE_U32:
      internal::AppendInteger(out, FieldAccess::ScalarValue<uint32_t>(object, field, i), false);
      break;
    case SARN_DATA_TYPE_U64:
      internal::AppendInteger(out, FieldAccess::ScalarValue<uint64_t>(object, field, i), true);
      break;
    case SARN_DATA_TYPE_STRING:
      AppendQuoted(FieldAccess::StringAt(object, field, i), out, true);
      break;
    default:
      break;
  }
}

}  // namespace sarn
