// The Dict facade: typed access by name and index over a Dictionary in which every name holds
// one value (an ArrayValue when several were added).
#include <cstdio>

#include "sarn/dict/Dict.h"
#include "sarn/dict/LazyDict.h"
#include "sarn/dict/internal/TreeWalk.h"

namespace sarn {

using internal::TreeRelease;

namespace {

// The Add overloads of the two containers for each type the facade stores.
inline bool AddTo(Dictionary& dictionary, const VekString& name, const VekString& value) {
  return dictionary.Add(name, value);
}
inline bool AddTo(Dictionary& dictionary, const VekString& name, const ref<Dictionary>& value) {
  return dictionary.Add(name, value);
}
inline bool AddTo(Dictionary& dictionary, const VekString& name, const ref<LazyDict>& value) {
  return dictionary.Add(name, value);
}
inline bool AddTo(ArrayValue& array, const VekString& value) { return array.Add(value); }
template <class T>
inline bool AddTo(ArrayValue& array, const ref<T>& value) { return array.Add(value); }

}  // namespace

Dict::Dict() : dictionaryM(new (GetMempool()) Dictionary()) {}

Dict::Dict(const ref<Dictionary>& dictionary) : dictionaryM(dictionary) {}

Dict::~Dict() { TreeRelease::Release(dictionaryM); }

ref<Dict> MakeDict(VekMempool* pool) {
  ref<Dict> dict = new (pool) Dict();
  return dict && dict->dictionaryM ? dict : ref<Dict>();
}

ref<Dict> Dict::New(VekMempool* pool, const VekString& typeName) {
  ref<Dict> dict = MakeDict(pool);
  if (dict && !typeName.FEmpty() && !dict->AddString(VekString("type"), typeName)) return ref<Dict>();
  return dict;
}

template <class T>
bool Dict::AddToDictOrArray(const VekString& name, const T& value) {
  if (!dictionaryM) return false;
  ref<DictValue> first = dictionaryM->Get(name);
  if (!first) return AddTo(*dictionaryM, name, value);
  if (first->kindM == DictValue::KIND_ARRAY) return AddTo(*static_cast<ArrayValue*>(first.Get()), value);
  // The array is complete before it replaces the value, so a failure changes nothing.
  ref<ArrayValue> array = new (pMempoolM) ArrayValue();
  if (!array || !array->Add(first) || !AddTo(*array, value)) return false;
  dictionaryM->Remove(name);
  return dictionaryM->Add(name, array);
}

template SARN_EXPORT bool Dict::AddToDictOrArray<VekString>(const VekString&, const VekString&);
template SARN_EXPORT bool Dict::AddToDictOrArray<ref<Dictionary>>(const VekString&, const ref<Dictionary>&);
template SARN_EXPORT bool Dict::AddToDictOrArray<ref<LazyDict>>(const VekString&, const ref<LazyDict>&);

bool Dict::AddString(const VekString& name, const VekString& value) { return AddToDictOrArray(name, value); }
bool Dict::AddString(const char* name, const char* value) { return AddString(VekString(name), VekString(value)); }

bool Dict::AddDict(const VekString& name, const ref<Dict>& value) {
  return !value || AddToDictOrArray(name, value->dictionaryM);
}
bool Dict::AddDict(const char* name, const ref<Dict>& value) { return AddDict(VekString(name), value); }

bool Dict::AddLazyDict(const VekString& name, const ref<LazyDict>& value) {
  return !value || AddToDictOrArray(name, value);
}
bool Dict::AddLazyDict(const char* name, const ref<LazyDict>& value) { return AddLazyDict(VekString(name), value); }

void Dict::InsertTypeZero(const VekString& typeName) { AddString(VekString("type"), typeName); }

ref<DictValue> Dict::FindValue(const VekString& name, unsigned long index) const {
  ref<DictValue> first = dictionaryM->Get(name);
  if (!first) return first;
  if (first->kindM == DictValue::KIND_ARRAY) return static_cast<ArrayValue*>(first.Get())->GetValueAt(index);
  return index == 0 ? first : ref<DictValue>();
}

dictvalue::Type Dict::GetType(const VekString& name, int index, bool& isLazy) const {
  isLazy = false;
  ref<DictValue> value = FindValue(name, static_cast<unsigned long>(index));
  if (!value) return dictvalue::TYPE_NONE;
  switch (value->kindM) {
    case DictValue::KIND_STRING:
      return dictvalue::TYPE_STRING;
    case DictValue::KIND_DICTIONARY:
      return dictvalue::TYPE_DICT;
    case DictValue::KIND_LAZY_DICT:
      isLazy = true;
      return dictvalue::TYPE_DICT;
    default:
      return dictvalue::TYPE_NONE;
  }
}

dictvalue::Type Dict::GetType(const VekString& name, int index) const {
  bool isLazy;
  return GetType(name, index, isLazy);
}

dictvalue::Type Dict::GetType(const char* name, int index) const { return GetType(VekString(name), index); }

VekString Dict::GetString(const VekString& name, int index) const {
  ref<DictValue> value = FindValue(name, static_cast<unsigned long>(index));
  if (!value || value->kindM != DictValue::KIND_STRING) return StringValue::EmptyValue(pMempoolM);
  return static_cast<StringValue*>(value.Get())->valueM;
}

VekString Dict::GetString(const char* name, int index) const { return GetString(VekString(name), index); }

ref<Dict> Dict::GetDict(const VekString& name, int index) const {
  ref<DictValue> value = FindValue(name, static_cast<unsigned long>(index));
  if (value && value->kindM == DictValue::KIND_DICTIONARY) {
    return MempoolNew<Dict>(pMempoolM, ref<Dictionary>(static_cast<Dictionary*>(value.Get())));
  }
  if (value && value->kindM == DictValue::KIND_LAZY_DICT) {
    const ref<LazyDict>& payload = static_cast<LazyDictValue*>(value.Get())->lazyDictM;
    if (payload) return payload->ToDict();
  }
  return MakeDict(pMempoolM);
}

ref<Dict> Dict::GetDict(const char* name, int index) const { return GetDict(VekString(name), index); }

ref<LazyDict> Dict::GetLazyDict(const VekString& name, int index) const {
  ref<DictValue> value = FindValue(name, static_cast<unsigned long>(index));
  if (!value) {
    std::fprintf(stderr, "Dict::GetValueFromWrapper: field %s[%d] not found", name.Utf8(), index);
    return LazyDictValue::EmptyValue(pMempoolM);
  }
  if (value->kindM == DictValue::KIND_LAZY_DICT) {
    const ref<LazyDict>& payload = static_cast<LazyDictValue*>(value.Get())->lazyDictM;
    if (payload) return payload;
  } else if (value->kindM == DictValue::KIND_DICTIONARY) {
    return LazyDict::FromDictionary(pMempoolM, ref<Dictionary>(static_cast<Dictionary*>(value.Get())), 0);
  }
  std::fprintf(stderr, "%s[%d] is neither a LazyDict nor a Dict", name.Utf8(), index);
  return LazyDictValue::EmptyValue(pMempoolM);
}

ref<LazyDict> Dict::GetLazyDict(const char* name, int index) const { return GetLazyDict(VekString(name), index); }

unsigned Dict::CountNames() const { return dictionaryM->CountNames(); }

unsigned Dict::CountValues(const VekString& name) const {
  ref<DictValue> first = dictionaryM->Get(name);
  if (!first) return 0;
  if (first->kindM == DictValue::KIND_ARRAY) return static_cast<ArrayValue*>(first.Get())->CountValues();
  return 1;
}

unsigned Dict::CountValues(const char* name) const { return CountValues(VekString(name)); }

void Dict::GetSortedNames(VekStringArray& out) const { dictionaryM->GetSortedNames(out); }

void Dict::Remove(const VekString& name) { dictionaryM->Remove(name); }
void Dict::Remove(const char* name) { Remove(VekString(name)); }

void Dict::Remove(const VekString& name, int index) {
  ref<DictValue> first = dictionaryM->Get(name);
  if (!first) return;
  if (first->kindM != DictValue::KIND_ARRAY) {
    dictionaryM->Remove(name);
    return;
  }
  ArrayValue* array = static_cast<ArrayValue*>(first.Get());
  array->Remove(static_cast<unsigned long>(index));
  if (array->CountValues() == 0) dictionaryM->Remove(name);
}

void Dict::Remove(const char* name, int index) { Remove(VekString(name), index); }

bool Dict::Equals(const Dict* other) const { return other != nullptr && dictionaryM->Equals(other->dictionaryM); }

bool Dict::Equals(const ref<Dict>& other) const {
  if (!other) return false;
  VekStringArray names(pMempoolM);
  GetSortedNames(names);
  if (names.Count() != other->CountNames()) return false;
  for (int k = 0; k < names.Count(); ++k) {
    const VekString& name = names[k];
    unsigned n = CountValues(name);
    if (other->CountValues(name) != n) return false;
    for (unsigned i = 0; i < n; ++i) {
      int index = static_cast<int>(i);
      bool isLazy;
      dictvalue::Type type = GetType(name, index, isLazy);
      if (other->GetType(name, index, isLazy) != type) return false;
      switch (type) {
        case dictvalue::TYPE_STRING:
          if (!GetString(name, index).FEqual(other->GetString(name, index))) return false;
          break;
        case dictvalue::TYPE_DICT:
          if (isLazy) {
            if (GetLazyDict(name, index) != other->GetLazyDict(name, index)) return false;
          } else if (!GetDict(name, index)->Equals(other->GetDict(name, index))) {
            return false;
          }
          break;
        case dictvalue::TYPE_NONE:
          return false;
      }
    }
  }
  return true;
}

bool Dict::operator==(const Dict& other) const { return ToString(false).FEqual(other.ToString(false)); }

VekString Dict::ToString(bool pretty) const { return dictionaryM->ToJson(pretty); }

ref<vek::ByteBuffer> Dict::ToBytestring(bool pretty) const { return dictionaryM->ToBytestring(pretty); }

void Dict::SetDebugLockOwner(VekLockId id) { dictionaryM->SetDebugLockOwner(id); }

}  // namespace sarn
