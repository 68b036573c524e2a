// Objects to Dictionary trees and back.
//
// Object to Dictionary runs one loop over an explicit stack: an object frame walks a field table,
// an array frame the elements of a multi-valued field of objects. Each nested dictionary is added
// to its parent (or the parent's array) as soon as it is made and filled afterwards, which gives
// the same tree as converting the child first, since values are shared by reference.
//
// Dictionary to object recurses once per nested dictionary, and the recursion is bounded: the
// depth (counted like the JSON readers count containers: the top dictionary is 1, an array or a
// dictionary inside it 2, and so on) may not pass the readers' limit. Error texts are joined with
// "%s%s" in the order the failures unwind, innermost first.
#include "sarn/objects/DictionarySarnObject.h"

#include <cstdio>
#include <cstring>

#include "sarn/dict/Dict.h"
#include "sarn/model/FieldAccess.h"
#include "sarn/dict/LazyDict.h"
#include "sarn/base/Limits.h"
#include "sarn/model/SarnHashTable.h"
#include "sarn/values/ScalarTypes.h"
#include "sarn/model/StructInfoMap.h"
#include "sarn/objects/internal/ObjectText.h"
#include "sarn/values/internal/TimeText.h"
#include "sarn/base/internal/WalkStack.h"

namespace sarn {

static_assert(sizeof(ChannelNumber) == 8 && sizeof(Currency) == 8 && sizeof(DateTime) == 8 && sizeof(Date) == 4 &&
                  sizeof(Time) == 4,
              "scalar value types have the widths the object layout gives them");

namespace {

bool HoldsObjects(unsigned dataType) {
  return dataType == SARN_DATA_TYPE_KNOWN_DICT || dataType == SARN_DATA_TYPE_SUBDICT;
}

void Append(VekMempool* pool, VekString& error, const char* piece) {
  error = VekString::Format(pool, "%s%s", error.Utf8(), piece);
}

void Append(VekMempool* pool, VekString& error, const char* piece, const char* more) {
  error = VekString::Format(pool, "%s%s%s", error.Utf8(), piece, more);
}

void Replace(VekMempool* pool, VekString& error, const char* message) {
  error = VekString::FromUtf8Bytes(pool, std::strlen(message), message);
}

ref<DictValue> Quoted(VekMempool* pool, const VekString& text) { return MempoolNew<StringValue>(pool, text); }

// MakeValue leaves out a missing free-form dictionary or payload; any other null value is an
// allocation that failed.
bool IsNullLeftOut(const FieldInfo& field) {
  return field.dataType == SARN_DATA_TYPE_ANY_DICT || field.dataType == SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY;
}

// For the texts that are never empty (dates, times, enums, channel numbers, currencies): empty
// only when memory ran out, and then no value at all rather than an empty one.
ref<DictValue> QuotedText(VekMempool* pool, const VekString& text) {
  return text.FEmpty() ? ref<DictValue>() : Quoted(pool, text);
}

// A store into an object fails only for lack of memory: a source array holds no more elements
// than a field's array can.
bool Stored(bool isStored, VekMempool* pool, VekString& error) {
  if (!isStored) Append(pool, error, kOutOfMemoryMessage);
  return isStored;
}

const VekString& CachedName(VekMempool* pool, const char* name) { return *GetGlobalName(pool, name); }

}  // namespace

struct DictionarySarnObject::Frame {
  const SarnObject* pObjectM;
  const StructInfo* pInfoM;
  Dictionary* pDictionaryM;   // the dictionary being filled (array frame: the one holding the array)
  const FieldInfo* pFieldM;   // array frame only: the multi-valued field of objects
  const VekString* pNameM;    // array frame only: its name
  ArrayValue* pArrayM;        // array frame only: made at the first element
  KernoVersion versionM;
  unsigned nextM;             // next field number, or next element
};

class DictionarySarnObject::FrameStack : public internal::WalkStack<DictionarySarnObject::Frame> {
 public:
  using WalkStack::WalkStack;
};

DictionarySarnObject::DictionarySarnObject(VekMempool* pool, const StructInfo* const* structDefs, int count)
    : pMempoolM(pool), structDefsM(structDefs), structDefCountM(count), depthM(0), maxDepthM(JsonLimits::kDefaultMaxDepth) {}

// ---- object to Dictionary ----

ref<Dictionary> DictionarySarnObject::SarnObjectToDictionary(const SarnObject* object, KernoVersion version) {
  // Nested calls (a field's objects) keep the outer call's failure and add their own.
  bool wasOutBefore = wasOutOfMemoryM;
  wasOutOfMemoryM = false;
  FrameStack stack(pMempoolM);
  ref<Dictionary> result = PushObject(stack, object, version);
  Walk(stack);
  bool isFailed = wasOutOfMemoryM || !result || stack.HasFailed();
  wasOutOfMemoryM = wasOutBefore || isFailed;
  return isFailed ? ref<Dictionary>() : result;
}

ref<Dictionary> DictionarySarnObject::PushObject(FrameStack& stack, const SarnObject* object, KernoVersion version) {
  unsigned id = object->typeIdM;
  const StructInfo* info = id < static_cast<unsigned>(structDefCountM) ? structDefsM[id] : nullptr;
  if (info == nullptr) return Dictionary::New(pMempoolM, VekString());
  ref<Dictionary> dictionary = Dictionary::New(pMempoolM, CachedName(pMempoolM, info->pName));
  if (!dictionary) {
    wasOutOfMemoryM = true;
    return dictionary;
  }
  Frame& frame = stack.Push();
  frame.pObjectM = object;
  frame.pInfoM = info;
  frame.pDictionaryM = dictionary.Get();
  frame.versionM = version;
  return dictionary;
}

// A child dictionary that could not be attached is gone already: its frame must not be filled.
void DictionarySarnObject::DropPushed(FrameStack& stack, unsigned depth) {
  wasOutOfMemoryM = true;
  if (stack.Count() > depth) stack.Pop();
}

void DictionarySarnObject::Walk(FrameStack& stack) {
  while (!stack.Empty()) {
    Frame& frame = stack.Top();
    if (frame.pFieldM != nullptr) {
      const FieldInfo& field = *frame.pFieldM;
      unsigned count = FieldAccess::Count(frame.pObjectM, field);
      const SarnObject* child = nullptr;
      while (frame.nextM < count && child == nullptr) {
        child = static_cast<const SarnObject*>(FieldAccess::ReferenceAt(frame.pObjectM, field, frame.nextM++));
      }
      if (child == nullptr) {
        stack.Pop();
        continue;
      }
      if (frame.pArrayM == nullptr) {
        ref<ArrayValue> array = new (pMempoolM) ArrayValue();
        if (!frame.pDictionaryM->Add(*frame.pNameM, array)) {
          wasOutOfMemoryM = true;
          stack.Pop();
          continue;
        }
        frame.pArrayM = array.Get();
      }
      ArrayValue* array = frame.pArrayM;
      unsigned depth = stack.Count();
      if (!array->Add(PushObject(stack, child, frame.versionM))) DropPushed(stack, depth);
      continue;
    }

    const StructInfo* info = frame.pInfoM;
    if (frame.nextM == info->nFieldInfo) {
      stack.Pop();
      continue;
    }
    const FieldInfo* field = FieldForVersion(info, frame.nextM++, frame.versionM);
    if (field == nullptr) continue;
    const SarnObject* object = frame.pObjectM;
    const VekString& name = CachedName(pMempoolM, FieldName(info, *field));
    if (field->arity == SARN_ARITY_MULTI) {
      if (HoldsObjects(field->dataType)) {
        Frame parent = frame;
        Frame& array = stack.Push();
        array.pObjectM = object;
        array.pDictionaryM = parent.pDictionaryM;
        array.pFieldM = field;
        array.pNameM = &name;
        array.versionM = parent.versionM;
      } else {
        ref<Dictionary> dictionary = frame.pDictionaryM;
        MultiFieldToDict(name, field, object, dictionary, frame.versionM);
      }
      continue;
    }
    if (field->arity == SARN_ARITY_OPTIONAL && !IsFieldPresent(object, *field)) continue;
    if (HoldsObjects(field->dataType)) {
      const SarnObject* child = static_cast<const SarnObject*>(FieldAccess::ReferenceAt(object, *field, 0));
      if (child == nullptr) continue;
      Dictionary* parent = frame.pDictionaryM;
      unsigned depth = stack.Count();
      if (!parent->Add(name, PushObject(stack, child, frame.versionM))) DropPushed(stack, depth);
    } else {
      ref<Dictionary> dictionary = frame.pDictionaryM;
      SingleFieldToDict(name, field, object, dictionary, frame.versionM);
    }
  }
}

void DictionarySarnObject::SingleFieldToDict(const VekString& name, const FieldInfo* field, const SarnObject* object,
                                             ref<Dictionary>& dictionary, KernoVersion version) {
  ref<DictValue> value;
  if (HoldsObjects(field->dataType)) {
    const SarnObject* child = static_cast<const SarnObject*>(FieldAccess::ReferenceAt(object, *field, 0));
    if (child != nullptr) value = SarnObjectToDictionary(child, version);
  } else {
    value = MakeValue(*field, object, 0);
    if (!value && !IsNullLeftOut(*field)) wasOutOfMemoryM = true;
  }
  if (value != nullptr && !dictionary->Add(name, value)) wasOutOfMemoryM = true;
}

void DictionarySarnObject::MultiFieldToDict(const VekString& name, const FieldInfo* field, const SarnObject* object,
                                            ref<Dictionary>& dictionary, KernoVersion version) {
  ref<ArrayValue> array = new (pMempoolM) ArrayValue();
  if (!array) {
    wasOutOfMemoryM = true;
    return;
  }
  unsigned count = FieldAccess::Count(object, *field);
  for (unsigned i = 0; i < count; ++i) {
    ref<DictValue> value;
    if (HoldsObjects(field->dataType)) {
      const SarnObject* child = static_cast<const SarnObject*>(FieldAccess::ReferenceAt(object, *field, i));
      if (child != nullptr) value = SarnObjectToDictionary(child, version);
    } else {
      value = MakeValue(*field, object, i);
      if (!value && !IsNullLeftOut(*field)) wasOutOfMemoryM = true;
    }
    if (value != nullptr && !array->Add(value)) wasOutOfMemoryM = true;
  }
  if (array->CountValues() != 0 && !dictionary->Add(name, array)) wasOutOfMemoryM = true;
}

ref<DictValue> DictionarySarnObject::MakeValue(const FieldInfo& field, const SarnObject* object, unsigned i) {
  VekMempool* pool = pMempoolM;
  switch (field.dataType) {
    case SARN_DATA_TYPE_BOOL:
      return StringValue::Make(FieldAccess::ScalarValue<uint8_t>(object, field, i) != 0, pool);
    case SARN_DATA_TYPE_BYTESTRING: {
      // A missing byte string reads as an empty one.
      ref<vek::ByteBuffer> bytes = static_cast<vek::ByteBuffer*>(FieldAccess::ReferenceAt(object, field, i));
      if (bytes == nullptr) return Quoted(pool, VekString());
      return StringValue::Make(bytes, pool);
    }
    case SARN_DATA_TYPE_CHANNEL_NUMBER:
      return QuotedText(pool, FieldAccess::ScalarValue<ChannelNumber>(object, field, i).ToString());
    case SARN_DATA_TYPE_CURRENCY:
      return QuotedText(pool, FieldAccess::ScalarValue<Currency>(object, field, i).ToString());
    case SARN_DATA_TYPE_DATE: {
      Date date = FieldAccess::ScalarValue<Date>(object, field, i);
      char text[10];
      if (!internal::FormatDateText(date.daysM, text)) return QuotedText(pool, date.ToString());
      return QuotedText(pool, VekString::FromUtf8Bytes(pool, sizeof text, text));
    }
    case SARN_DATA_TYPE_DATETIME: {
      DateTime dateTime = FieldAccess::ScalarValue<DateTime>(object, field, i);
      char text[19];
      if (!internal::FormatDateTimeText(dateTime.millisecondsM / 1000, text)) return QuotedText(pool, dateTime.ToString());
      return QuotedText(pool, VekString::FromUtf8Bytes(pool, sizeof text, text));
    }
    case SARN_DATA_TYPE_TIME: {
      int64_t seconds = FieldAccess::ScalarValue<Time>(object, field, i).millisecondsM / 1000;
      char text[8];
      internal::FormatTimeOfDayText(seconds - internal::FloorDiv(seconds, 86400) * 86400, text);
      return QuotedText(pool, VekString::FromUtf8Bytes(pool, sizeof text, text));
    }
    case SARN_DATA_TYPE_ANY_DICT: {
      const Dict* dict = static_cast<const Dict*>(FieldAccess::ReferenceAt(object, field, i));
      if (dict == nullptr) return nullptr;
      return dict->GetDictionary();
    }
    case SARN_DATA_TYPE_ENUM:
      return QuotedText(pool, EnumToString(field, FieldAccess::ScalarValue<uint32_t>(object, field, i)));
    case SARN_DATA_TYPE_FLOAT:
      return StringValue::Make(FieldAccess::ScalarValue<double>(object, field, i), pool);
    case SARN_DATA_TYPE_INT_ID:
    case SARN_DATA_TYPE_LONG_ID:
    case SARN_DATA_TYPE_STRING_ID:
      return Quoted(pool, IdToString(field, object, i));
    case SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY: {
      LazyDict* lazy = static_cast<LazyDict*>(FieldAccess::ReferenceAt(object, field, i));
      if (lazy == nullptr) return nullptr;
      return MempoolNew<LazyDictValue>(pool, ref<LazyDict>(lazy));
    }
    case SARN_DATA_TYPE_S64:
      return StringValue::Make(static_cast<long long>(FieldAccess::ScalarValue<int64_t>(object, field, i)), pool);
    case SARN_DATA_TYPE_S32:
      return StringValue::Make(static_cast<int>(FieldAccess::ScalarValue<int32_t>(object, field, i)), pool);
    case SARN_DATA_TYPE_STRING:
      return Quoted(pool, FieldAccess::StringAt(object, field, i));
    case SARN_DATA_TYPE_U32:
      return StringValue::Make(static_cast<unsigned int>(FieldAccess::ScalarValue<uint32_t>(object, field, i)), pool);
    case SARN_DATA_TYPE_U64:
      return StringValue::Make(
          static_cast<unsigned long long>(FieldAccess::ScalarValue<uint64_t>(object, field, i)), pool);
    default:
      return nullptr;
  }
}

VekString DictionarySarnObject::EnumToString(const FieldInfo& field, uint32_t value) {
  const char* name = internal::EnumText(field, value);
  if (name != nullptr) return CachedName(pMempoolM, name);
  char text[32];
  size_t length = internal::FormatInvalidEnum(value, text);
  return VekString::FromUtf8Bytes(pMempoolM, length, text);
}

VekString DictionarySarnObject::IdToString(const FieldInfo& field, const SarnObject* object, unsigned i) {
  char text[internal::kIdTextRoom];
  size_t length = internal::FormatIdText(pMempoolM, structDefsM, static_cast<uint32_t>(structDefCountM), field,
                                         object, i, text);
  VekString result = VekString::FromUtf8Bytes(pMempoolM, length, text);
  if (result.FEmpty() && length != 0) wasOutOfMemoryM = true;
  return result;
}

// ---- Dictionary to object ----

bool DictionarySarnObject::DictionaryToSarnObject(const ref<Dictionary>& dictionary, KernoVersion version,
                                                  ref<SarnObject>& out, VekString& error, const JsonLimits& limits) {
  int saved = maxDepthM;
  maxDepthM = limits.maxDepthM;
  bool ok = DictionaryToSarnObject(dictionary, version, out, error);
  maxDepthM = saved;
  return ok;
}

bool DictionarySarnObject::DictionaryToSarnObject(const ref<Dictionary>& dictionary, KernoVersion version,
                                                  ref<SarnObject>& out, VekString& error) {
  VekMempool* pool = pMempoolM;
  if (version != 0 && (version < Schema::firstSchemaVersionG || version > Schema::lastSchemaVersionG)) {
    error = VekString::Format(pool, "%s%s%d", error.Utf8(),
                              "Unmarshaling to SarnObject: given kerno version is out of range used in code generation: ",
                              version);
    return false;
  }
  if (depthM >= maxDepthM) {
    // A tree built by hand can be deeper than any the readers accept; the walk recurses per level.
    error = VekString::Format(pool, "%sDictionary nesting exceeds the depth limit of %d levels.", error.Utf8(),
                              maxDepthM);
    return false;
  }
  VekString typeName = dictionary->GetString(CachedName(pool, "type"));
  if (typeName.NByte() == 0) {
    Append(pool, error, "Dictionary has no 'type' field.");
    return false;
  }
  const StructInfo* info = StructInfoMap::LookupStructByName(typeName.Utf8());
  if (info == nullptr) {
    Append(pool, error, "no such structure type: ", typeName.Utf8());
    return false;
  }
  ref<SarnObject> object = info->pFactory(pool);
  if (!object) return Stored(false, pool, error);
  object->SetDebugLockOwner(0);

  struct DepthGuard {
    explicit DepthGuard(int& depth) : depthM(depth) { ++depthM; }
    ~DepthGuard() { --depthM; }
    int& depthM;
  } guard(depthM);

  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    const FieldInfo* field = FieldForVersion(info, n, version);
    if (field == nullptr) continue;
    const char* name = FieldName(info, *field);
    ref<DictValue> value = dictionary->Get(CachedName(pool, name));
    if (value == nullptr) {
      if (version != 0 && field->arity == SARN_ARITY_REQUIRED) {
        Append(pool, error, "Required field not set: ", name);
        return false;
      }
      continue;
    }
    if (field->arity == SARN_ARITY_MULTI) {
      bool ok = true;
      if (value->kindM == DictValue::KIND_ARRAY) {
        const ArrayValue* array = static_cast<const ArrayValue*>(value.Get());
        // The elements sit one level below the array.
        DepthGuard elements(depthM);
        unsigned count = array->CountValues();
        for (unsigned i = 0; i < count && ok; ++i) {
          ok = DictToMultiField(field, array->GetValueAt(i), object.Get(), error, version);
        }
      } else {
        ok = DictToMultiField(field, value, object.Get(), error, version);
      }
      if (!ok) {
        Append(pool, error, ". Bad multi field: ", name);
        return false;
      }
      continue;
    }
    if (field->arity == SARN_ARITY_OPTIONAL) MarkFieldPresent(object.Get(), *field);
    bool ok;
    if (value->kindM == DictValue::KIND_ARRAY) {
      const ArrayValue* array = static_cast<const ArrayValue*>(value.Get());
      if (array->CountValues() != 1) {
        Append(pool, error, "Cannot convert array to single field: ", name);
        return false;
      }
      DepthGuard element(depthM);
      ok = DictToSingleField(field, array->GetValueAt(0), object.Get(), error, version);
    } else {
      ok = DictToSingleField(field, value, object.Get(), error, version);
    }
    if (!ok) {
      Append(pool, error, ". Bad single field: ", name);
      return false;
    }
  }
  out = object;
  return true;
}

bool DictionarySarnObject::DictToSingleField(const FieldInfo* field, const ref<DictValue>& value, SarnObject* object,
                                             VekString& error, KernoVersion version) {
  return ReadValue(*field, value, object, error, version, false);
}

bool DictionarySarnObject::DictToMultiField(const FieldInfo* field, const ref<DictValue>& value, SarnObject* object,
                                            VekString& error, KernoVersion version) {
  return ReadValue(*field, value, object, error, version, true);
}

// One value into a single field or onto an array; the two differ only in some messages. Array
// appends cannot overflow here: a source ArrayValue holds at most as many elements as a field's
// array can.
bool DictionarySarnObject::ReadValue(const FieldInfo& field, const ref<DictValue>& value, SarnObject* object,
                                     VekString& error, KernoVersion version, bool fMulti) {
  VekMempool* pool = pMempoolM;
  const unsigned dataType = field.dataType;
  const bool fString = value->kindM == DictValue::KIND_STRING;
  const StringValue* string = fString ? static_cast<const StringValue*>(value.Get()) : nullptr;
  const char* badText =
      fMulti ? "Dictionary string cannot be converted to requested data type in SarnObject array" : "Cannot convert field";

  switch (dataType) {
    case SARN_DATA_TYPE_BOOL:
    case SARN_DATA_TYPE_BYTESTRING:
    case SARN_DATA_TYPE_CHANNEL_NUMBER:
    case SARN_DATA_TYPE_CURRENCY:
    case SARN_DATA_TYPE_DATE:
    case SARN_DATA_TYPE_DATETIME:
    case SARN_DATA_TYPE_TIME:
    case SARN_DATA_TYPE_FLOAT:
    case SARN_DATA_TYPE_S64:
    case SARN_DATA_TYPE_S32:
    case SARN_DATA_TYPE_U32:
    case SARN_DATA_TYPE_U64:
      if (!fString) {
        Replace(pool, error, "Dictionary field is not a single string");
        return false;
      }
      break;
    case SARN_DATA_TYPE_STRING:
      if (!fString) {
        Append(pool, error, "Dictionary field is not a single string");
        return false;
      }
      break;
    case SARN_DATA_TYPE_ENUM:
    case SARN_DATA_TYPE_INT_ID:
    case SARN_DATA_TYPE_LONG_ID:
    case SARN_DATA_TYPE_STRING_ID:
      if (!fString) {
        Append(pool, error, "Field must be a single string");
        return false;
      }
      break;
    default:
      break;
  }
  const char* badItem = fMulti ? "Bad value in field: " : "Cannot convert value for the field.";

  switch (dataType) {
    case SARN_DATA_TYPE_BOOL: {
      bool parsed;
      if (!string->GetValue(parsed)) break;
      uint8_t stored = parsed ? 1 : 0;
      return Stored(FieldAccess::PutScalar(object, field, &stored), pool, error);
    }
    case SARN_DATA_TYPE_BYTESTRING: {
      ref<vek::ByteBuffer> bytes;
      if (!string->GetValue(bytes)) return Stored(false, pool, error);
      return Stored(FieldAccess::PutReference(object, field, bytes.Get()), pool, error);
    }
    case SARN_DATA_TYPE_CHANNEL_NUMBER: {
      ChannelNumber parsed = ChannelNumber::Parse(string->GetValue());
      return Stored(FieldAccess::PutScalar(object, field, &parsed), pool, error);
    }
    case SARN_DATA_TYPE_CURRENCY: {
      Currency parsed = Currency::Parse(string->GetValue());
      return Stored(FieldAccess::PutScalar(object, field, &parsed), pool, error);
    }
    case SARN_DATA_TYPE_DATE: {
      Date parsed = Date::Parse(string->GetValue());
      return Stored(FieldAccess::PutScalar(object, field, &parsed), pool, error);
    }
    case SARN_DATA_TYPE_DATETIME: {
      DateTime parsed = DateTime::Parse(string->GetValue());
      return Stored(FieldAccess::PutScalar(object, field, &parsed), pool, error);
    }
    case SARN_DATA_TYPE_TIME: {
      Time parsed = Time::Parse(string->GetValue());
      return Stored(FieldAccess::PutScalar(object, field, &parsed), pool, error);
    }
    case SARN_DATA_TYPE_FLOAT: {
      double parsed;
      if (!string->GetValue(parsed)) break;
      return Stored(FieldAccess::PutScalar(object, field, &parsed), pool, error);
    }
    case SARN_DATA_TYPE_S64: {
      long long parsed;
      if (!string->GetValue(parsed)) break;
      return Stored(FieldAccess::PutScalar(object, field, &parsed), pool, error);
    }
    case SARN_DATA_TYPE_S32: {
      int parsed;
      if (!string->GetValue(parsed)) break;
      return Stored(FieldAccess::PutScalar(object, field, &parsed), pool, error);
    }
    case SARN_DATA_TYPE_U32: {
      unsigned int parsed;
      if (!string->GetValue(parsed)) break;
      return Stored(FieldAccess::PutScalar(object, field, &parsed), pool, error);
    }
    case SARN_DATA_TYPE_U64: {
      unsigned long long parsed;
      if (!string->GetValue(parsed)) break;
      return Stored(FieldAccess::PutScalar(object, field, &parsed), pool, error);
    }
    case SARN_DATA_TYPE_STRING:
      return Stored(FieldAccess::PutString(object, field, string->GetValue()), pool, error);
    case SARN_DATA_TYPE_ENUM: {
      uint32_t number;
      if (!StringToEnum(field, string->GetValue(), error, number)) {
        Append(pool, error, badItem);
        return false;
      }
      return Stored(FieldAccess::PutScalar(object, field, &number), pool, error);
    }
    case SARN_DATA_TYPE_INT_ID: {
      unsigned int id;
      if (!StringToIntId(pool, &field, string->GetValue(), error, id)) {
        Append(pool, error, badItem);
        return false;
      }
      return Stored(FieldAccess::PutScalar(object, field, &id), pool, error);
    }
    case SARN_DATA_TYPE_LONG_ID: {
      unsigned long long id;
      if (!StringToLongId(pool, &field, string->GetValue(), error, id)) {
        Append(pool, error, badItem);
        return false;
      }
      return Stored(FieldAccess::PutScalar(object, field, &id), pool, error);
    }
    case SARN_DATA_TYPE_STRING_ID: {
      VekString id;
      if (!StringToStringId(pool, &field, string->GetValue(), error, id)) {
        Append(pool, error, badItem);
        return false;
      }
      return Stored(FieldAccess::PutString(object, field, id), pool, error);
    }
    case SARN_DATA_TYPE_ANY_DICT: {
      if (value->kindM != DictValue::KIND_DICTIONARY) {
        Append(pool, error, "Field must be a Dictionary");
        return false;
      }
      ref<Dict> dict = MempoolNew<Dict>(pool, ref<Dictionary>(static_cast<Dictionary*>(value.Get())));
      if (!dict) return Stored(false, pool, error);
      return Stored(FieldAccess::PutReference(object, field, dict.Get()), pool, error);
    }
    case SARN_DATA_TYPE_KNOWN_DICT:
    case SARN_DATA_TYPE_SUBDICT: {
      if (value->kindM != DictValue::KIND_DICTIONARY) {
        Append(pool, error, "Field must be a Dictionary");
        return false;
      }
      ref<SarnObject> inner;
      if (!DictionaryToSarnObject(ref<Dictionary>(static_cast<Dictionary*>(value.Get())), version, inner, error)) {
        Append(pool, error, fMulti ? " Can't convert inner Dictionary to SarnObject" : ". Can't unmarshal inner Dictionary");
        return false;
      }
      return Stored(FieldAccess::PutReference(object, field, inner.Get()), pool, error);
    }
    case SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY: {
      ref<LazyDict> lazy;
      if (!DictValueToLazyDict(value, lazy, error, pool, version)) return false;
      return Stored(FieldAccess::PutReference(object, field, lazy.Get()), pool, error);
    }
    default: {
      char code[16];
      std::snprintf(code, sizeof code, "%u", dataType);
      Append(pool, error, "unhandled data type: ", code);
      return false;
    }
  }
  // A scalar text that does not convert.
  Replace(pool, error, badText);
  return false;
}

bool DictionarySarnObject::StringToEnum(const FieldInfo& field, const VekString& text, VekString& error,
                                        uint32_t& value) {
  unsigned int number;
  if (!EnumNameNumber(field.refIndex, text.Utf8(), number)) {
    Append(pMempoolM, error, "bad enum item name");
    return false;
  }
  value = number;
  return true;
}

bool DictionarySarnObject::SkipIdPrefix(VekMempool* pool, const FieldInfo* field, const VekString& text,
                                        VekString& error, size_t& prefixLength) {
  const StructInfo* target = StructInfoForId(field->refIndex);
  if (target == nullptr) {
    Append(pool, error, "no struct for id");
    return false;
  }
  const char* prefix = target->pIdPrefix != nullptr ? target->pIdPrefix : "";
  size_t length = std::strlen(prefix);
  if (text.NByte() < length || std::memcmp(text.Utf8(), prefix, length) != 0) {
    Append(pool, error, "wrong prefix on id");
    return false;
  }
  prefixLength = length;
  return true;
}

void DictionarySarnObject::AppendBadPrefix(VekMempool* pool, const VekString& text, VekString& error) {
  Append(pool, error, "bad prefix: ", text.Utf8());
}

bool DictionarySarnObject::StringToIntId(VekMempool* pool, const FieldInfo* field, const VekString& text,
                                         VekString& error, unsigned int& out) {
  size_t skip;
  if (!SkipIdPrefix(pool, field, text, error, skip)) {
    AppendBadPrefix(pool, text, error);
    return false;
  }
  out = Dict::ParseU32(pool, text.Utf8() + skip);
  return true;
}

bool DictionarySarnObject::StringToLongId(VekMempool* pool, const FieldInfo* field, const VekString& text,
                                          VekString& error, unsigned long long& out) {
  size_t skip;
  if (!SkipIdPrefix(pool, field, text, error, skip)) {
    AppendBadPrefix(pool, text, error);
    return false;
  }
  out = Dict::ParseLongId(pool, text.Utf8() + skip);
  return true;
}

bool DictionarySarnObject::StringToStringId(VekMempool* pool, const FieldInfo* field, const VekString& text,
                                            VekString& error, VekString& out) {
  size_t skip;
  if (!SkipIdPrefix(pool, field, text, error, skip)) {
    AppendBadPrefix(pool, text, error);
    return false;
  }
  out = skip == 0 ? text : VekString::FromUtf8Bytes(pool, text.NByte() - skip, text.Utf8() + skip);
  if (out.FEmpty() && text.NByte() != skip) {
    Append(pool, error, kOutOfMemoryMessage);
    return false;
  }
  return true;
}

bool DictionarySarnObject::DictValueToLazyDict(const ref<DictValue>& value, ref<LazyDict>& out, VekString& error,
                                               VekMempool* pool, KernoVersion version) {
  if (value->kindM == DictValue::KIND_LAZY_DICT) {
    out = static_cast<const LazyDictValue*>(value.Get())->GetValue();
    return true;
  }
  if (value->kindM == DictValue::KIND_DICTIONARY) {
    out = LazyDict::FromDictionary(pool, ref<Dictionary>(static_cast<Dictionary*>(value.Get())), version);
    return true;
  }
  Append(pool, error, "Field must be a LazyDict or a Dictionary");
  return false;
}

}  // namespace sarn
