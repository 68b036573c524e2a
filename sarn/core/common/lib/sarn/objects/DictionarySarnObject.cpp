// Objects to Dictionary trees and back.
//
// Object to Dictionary is the Dictionary side of the shared object walk: each nested dictionary
// is added to its parent (or the parent's array) as soon as it is made and filled afterwards,
// which gives the same tree as converting the child first, since values are shared by reference.
// Value texts come from the shared FormatFieldText, so they are the JSON writer's texts.
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
#include "sarn/model/internal/ObjectWalk.h"
#include "sarn/objects/internal/ObjectText.h"

namespace sarn {

namespace {

void Append(VekMempool* pool, VekString& error, const char* piece) {
  error = VekString::Format(pool, "%s%s", error.Utf8(), piece);
}

void Append(VekMempool* pool, VekString& error, const char* piece, const char* more) {
  error = VekString::Format(pool, "%s%s%s", error.Utf8(), piece, more);
}

void Replace(VekMempool* pool, VekString& error, const char* message) {
  error = VekString::FromUtf8Bytes(pool, std::strlen(message), message);
}

// A store into an object fails only for lack of memory: a source array holds no more elements
// than a field's array can.
bool Stored(bool isStored, VekMempool* pool, VekString& error) {
  if (!isStored) Append(pool, error, kOutOfMemoryMessage);
  return isStored;
}

// The shared string of a metadata name; null only when the name cache's own pool runs out, which
// fails the conversion like any other allocation.
const VekString* CachedName(VekMempool* pool, const char* name) { return GetGlobalName(pool, name); }

// Per object: the dictionary being filled, and the key and array of the field being visited.
struct DictionaryFrameData {
  Dictionary* pDictionaryM;
  const VekString* pKeyM;
  ArrayValue* pArrayM;
};

}  // namespace

class DictionarySarnObject::Builder {
 public:
  using FrameData = DictionaryFrameData;
  using Walk = internal::ObjectWalk<Builder, internal::WalkVersions::OLDER_RECORDS>;
  using Frame = Walk::Frame;
  using Child = Walk::Child;

  explicit Builder(DictionarySarnObject& converter)
      : converterM(converter),
        walkM(converter.pMempoolM, converter.structDefsM, static_cast<uint32_t>(converter.structDefCountM)) {}

  Walk& GetWalk() { return walkM; }
  ref<Dictionary>& Result() { return resultM; }

  // Memory that runs out anywhere fails the whole conversion (a null result, never a tree with a
  // value missing): the hooks that cannot stop the walk note it, and the next value stops it.
  bool WasOutOfMemory() const { return wasOutOfMemoryM; }

  void BeginObject(Frame& frame, Frame* parent) {
    VekMempool* pool = converterM.pMempoolM;
    const VekString* typeName = frame.pInfoM != nullptr ? CachedName(pool, frame.pInfoM->pName) : nullptr;
    ref<Dictionary> dictionary;
    if (frame.pInfoM == nullptr || typeName != nullptr)
      dictionary = Dictionary::New(pool, typeName != nullptr ? *typeName : VekString());
    frame.dataM.pDictionaryM = dictionary.Get();
    if (!dictionary) {
      wasOutOfMemoryM = true;
    } else if (parent == nullptr) {
      resultM = dictionary;
    } else if (!Put(*parent, dictionary)) {
      // The parent did not take it, so it is gone when `dictionary` goes: nothing may fill it.
      frame.dataM.pDictionaryM = nullptr;
    }
  }

  void BeginField(Frame& frame) {
    VekMempool* pool = converterM.pMempoolM;
    frame.dataM.pArrayM = nullptr;
    if (frame.pNameM != nullptr) {
      frame.dataM.pKeyM = CachedName(pool, frame.pNameM);
      if (frame.dataM.pKeyM == nullptr) {
        wasOutOfMemoryM = true;
        return;
      }
    }
    if (frame.pFieldM->arity == SARN_ARITY_MULTI && !wasOutOfMemoryM) {
      // The walk reports only fields with a value to add, so the array is never left empty.
      ref<ArrayValue> array = new (pool) ArrayValue();
      if (!array || !frame.dataM.pDictionaryM->Add(*frame.dataM.pKeyM, array)) {
        wasOutOfMemoryM = true;
        return;
      }
      frame.dataM.pArrayM = array.Get();
    }
  }

  bool Value(Frame& frame, unsigned i, Child& child) {
    if (wasOutOfMemoryM) return false;
    const FieldInfo& field = *frame.pFieldM;
    // A lazy payload is kept as it is (shared, not converted); other objects become dictionaries.
    if (TraitsOf(field.dataType).isHoldingObjects && field.dataType != SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY) {
      child.pObjectM = static_cast<const SarnObject*>(FieldAccess::ReferenceAt(frame.pObjectM, field, i));
      child.versionM = frame.versionM;
      return true;
    }
    ref<DictValue> value = converterM.MakeValue(field, frame.pObjectM, i);
    if (value == nullptr) {
      // The walk passes over null references; of the rest only a free-form dictionary without a
      // tree has nothing to add. Any other null is memory that ran out.
      if (field.dataType == SARN_DATA_TYPE_ANY_DICT) return true;
      wasOutOfMemoryM = true;
      return false;
    }
    return Put(frame, value);
  }

  void EndField(Frame&) {}
  void EndObject(Frame&) {}

 private:
  // Adds `value` for the field `frame` is visiting: to its array, or under its key; false (and
  // noted) when memory ran out.
  bool Put(Frame& frame, const ref<DictValue>& value) {
    bool isAdded = frame.dataM.pArrayM != nullptr ? frame.dataM.pArrayM->Add(value)
                                                   : frame.dataM.pDictionaryM->Add(*frame.dataM.pKeyM, value);
    if (!isAdded) wasOutOfMemoryM = true;
    return isAdded;
  }

  DictionarySarnObject& converterM;
  Walk walkM;
  ref<Dictionary> resultM;
  bool wasOutOfMemoryM = false;
};

DictionarySarnObject::DictionarySarnObject(VekMempool* pool, const StructInfo* const* structDefs, int count)
    : pMempoolM(pool), structDefsM(structDefs), structDefCountM(count), depthM(0), maxDepthM(JsonLimits::kDefaultMaxDepth) {}

// ---- object to Dictionary ----

ref<Dictionary> DictionarySarnObject::SarnObjectToDictionary(const SarnObject* object, KernoVersion version) {
  Builder builder(*this);
  bool isWalked = builder.GetWalk().Run(builder, object, version, DictionaryFrameData());
  if (!isWalked || builder.WasOutOfMemory()) return ref<Dictionary>();
  return builder.Result();
}

// Both run the walk over the one field, adding to `dictionary` under `name`.
void DictionarySarnObject::SingleFieldToDict(const VekString& name, const FieldInfo* field, const SarnObject* object,
                                             ref<Dictionary>& dictionary, KernoVersion version) {
  Builder builder(*this);
  DictionaryFrameData data = {dictionary.Get(), &name, nullptr};
  builder.GetWalk().RunField(builder, object, *field, nullptr, version, data);
}

void DictionarySarnObject::MultiFieldToDict(const VekString& name, const FieldInfo* field, const SarnObject* object,
                                            ref<Dictionary>& dictionary, KernoVersion version) {
  SingleFieldToDict(name, field, object, dictionary, version);
}

// A value of a field with a text form, quoted as in JSON except FLOAT, which a dictionary keeps
// bare (its writer still quotes a float whose text is not a bare token); a free-form dictionary
// shared; a lazy payload wrapped, not converted.
ref<DictValue> DictionarySarnObject::MakeValue(const FieldInfo& field, const SarnObject* object, unsigned i) {
  VekMempool* pool = pMempoolM;
  const DataTypeTraits& traits = TraitsOf(field.dataType);
  if (traits.isWithText) {
    internal::FieldText text;
    internal::FormatFieldText(pool, structDefsM, static_cast<uint32_t>(structDefCountM), field, object, i, text);
    if (text.isFailedM) return nullptr;
    ref<StringValue> value;
    if (text.pStringM != nullptr) {
      value = new (pool) StringValue(*text.pStringM);
    } else if (text.isNameM) {
      const VekString* name = CachedName(pool, text.pBytesM);
      if (name == nullptr) return nullptr;
      value = new (pool) StringValue(*name);
    } else {
      VekString copy = VekString::FromUtf8Bytes(pool, text.nLengthM, text.pBytesM);
      if (copy.FEmpty() && text.nLengthM != 0) return nullptr;
      value = new (pool) StringValue(copy);
    }
    if (value == nullptr) return nullptr;
    value->needQuotesM = traits.isQuotedInJson && field.dataType != SARN_DATA_TYPE_FLOAT;
    return value;
  }
  VekCore* reference = FieldAccess::ReferenceAt(object, field, i);
  if (reference == nullptr) return nullptr;
  switch (field.dataType) {
    case SARN_DATA_TYPE_ANY_DICT:
      return static_cast<const Dict*>(reference)->GetDictionary();
    case SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY:
      return MempoolNew<LazyDictValue>(pool, ref<LazyDict>(static_cast<LazyDict*>(reference)));
    default:
      return nullptr;
  }
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
  const VekString* typeKey = CachedName(pool, "type");
  if (typeKey == nullptr) return Stored(false, pool, error);
  VekString typeName = dictionary->GetString(*typeKey);
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
    const VekString* key = CachedName(pool, name);
    if (key == nullptr) return Stored(false, pool, error);
    ref<DictValue> value = dictionary->Get(*key);
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
                                     VekString& error, KernoVersion version, bool isMulti) {
  VekMempool* pool = pMempoolM;
  const unsigned dataType = field.dataType;
  const bool isString = value->kindM == DictValue::KIND_STRING;
  const StringValue* string = isString ? static_cast<const StringValue*>(value.Get()) : nullptr;
  const char* badText =
      isMulti ? "Dictionary string cannot be converted to requested data type in SarnObject array" : "Cannot convert field";

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
      if (!isString) {
        Replace(pool, error, "Dictionary field is not a single string");
        return false;
      }
      break;
    case SARN_DATA_TYPE_STRING:
      if (!isString) {
        Append(pool, error, "Dictionary field is not a single string");
        return false;
      }
      break;
    case SARN_DATA_TYPE_ENUM:
    case SARN_DATA_TYPE_INT_ID:
    case SARN_DATA_TYPE_LONG_ID:
    case SARN_DATA_TYPE_STRING_ID:
      if (!isString) {
        Append(pool, error, "Field must be a single string");
        return false;
      }
      break;
    default:
      break;
  }
  const char* badItem = isMulti ? "Bad value in field: " : "Cannot convert value for the field.";

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
        Append(pool, error, isMulti ? " Can't convert inner Dictionary to SarnObject" : ". Can't unmarshal inner Dictionary");
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

bool DictionarySarnObject::SkipIdPrefix(VekMempool* pool, const FieldInfo* field, const char* text, size_t n,
                                        VekString& error, size_t& prefixLength) {
  const StructInfo* target = StructInfoForId(field->refIndex);
  if (target == nullptr) {
    Append(pool, error, "no struct for id");
  } else {
    const char* prefix = target->pIdPrefix != nullptr ? target->pIdPrefix : "";
    size_t length = std::strlen(prefix);
    if (n >= length && std::memcmp(text, prefix, length) == 0) {
      prefixLength = length;
      return true;
    }
    Append(pool, error, "wrong prefix on id");
  }
  AppendBadPrefix(pool, text, n, error);
  return false;
}

void DictionarySarnObject::AppendBadPrefix(VekMempool* pool, const char* text, size_t n, VekString& error) {
  // The text is shown as a C string: up to its first NUL.
  error = VekString::Format(pool, "%sbad prefix: %.*s", error.Utf8(), static_cast<int>(strnlen(text, n)), text);
}

// The number after the prefix goes through Dict's parsers, which read a C string: the bytes up to
// the first NUL, copied next to a NUL of their own (on the stack when short, as ids are).
// A text that is already a C string (`isTerminated`) is read where it is.
template <class T>
static bool ParseIdNumber(VekMempool* pool, const char* text, size_t n, bool isTerminated,
                          T (*parse)(VekMempool*, const char*), VekString& error, T& out) {
  if (isTerminated) {
    out = parse(pool, text);
    return true;
  }
  n = strnlen(text, n);
  char small[64];
  if (n < sizeof small) {
    std::memcpy(small, text, n);
    small[n] = '\0';
    out = parse(pool, small);
    return true;
  }
  VekString copy = VekString::FromUtf8Bytes(pool, n, text);
  if (copy.FEmpty()) {
    Append(pool, error, kOutOfMemoryMessage);
    return false;
  }
  out = parse(pool, copy.Utf8());
  return true;
}

bool DictionarySarnObject::StringToIntId(VekMempool* pool, const FieldInfo* field, const char* text, size_t n,
                                         VekString& error, unsigned int& out, const VekString* whole) {
  size_t skip;
  return SkipIdPrefix(pool, field, text, n, error, skip) &&
         ParseIdNumber(pool, text + skip, n - skip, whole != nullptr, &Dict::ParseU32, error, out);
}

bool DictionarySarnObject::StringToIntId(VekMempool* pool, const FieldInfo* field, const VekString& text,
                                         VekString& error, unsigned int& out) {
  return StringToIntId(pool, field, text.Utf8(), text.NByte(), error, out, &text);
}

bool DictionarySarnObject::StringToLongId(VekMempool* pool, const FieldInfo* field, const char* text, size_t n,
                                          VekString& error, unsigned long long& out, const VekString* whole) {
  size_t skip;
  return SkipIdPrefix(pool, field, text, n, error, skip) &&
         ParseIdNumber(pool, text + skip, n - skip, whole != nullptr, &Dict::ParseLongId, error, out);
}

bool DictionarySarnObject::StringToLongId(VekMempool* pool, const FieldInfo* field, const VekString& text,
                                          VekString& error, unsigned long long& out) {
  return StringToLongId(pool, field, text.Utf8(), text.NByte(), error, out, &text);
}

bool DictionarySarnObject::StringToStringId(VekMempool* pool, const FieldInfo* field, const char* text, size_t n,
                                            VekString& error, VekString& out, const VekString* whole) {
  size_t skip;
  if (!SkipIdPrefix(pool, field, text, n, error, skip)) return false;
  out = skip == 0 && whole != nullptr ? *whole : VekString::FromUtf8Bytes(pool, n - skip, text + skip);
  if (out.FEmpty() && n != skip) {
    Append(pool, error, kOutOfMemoryMessage);
    return false;
  }
  return true;
}

bool DictionarySarnObject::StringToStringId(VekMempool* pool, const FieldInfo* field, const VekString& text,
                                            VekString& error, VekString& out) {
  return StringToStringId(pool, field, text.Utf8(), text.NByte(), error, out, &text);
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
