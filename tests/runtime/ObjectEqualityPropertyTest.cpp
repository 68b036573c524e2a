// Seeded random objects (every value with a text that reads back) equal themselves and their
// copies made by Clone, by JSON and by the binary form; changing one field anywhere in a copy
// (presence flipped, a value or first element changed, a reference swapped for null, an element
// added, which seen from the other side is one removed) makes the two unequal in both orders, and
// undoing the change makes them equal again. Objects that hold byte strings are unequal to
// themselves instead.
#include <gtest/gtest.h>

#include <utility>

#include "runtime/ObjectOpsSupport.h"
#include "testutil/RandomObject.h"

using namespace sarn;

namespace {

// Whether objects of the type may hold a field of `dataType` (`isAll` false: a required or multi one).
bool Holds(unsigned typeId, unsigned dataType, bool isAll, int depth = 0) {
  const StructInfo* info = StructInfoForId(typeId);
  for (unsigned n = 0; info != nullptr && depth < 6 && n < info->nFieldInfo; ++n) {
    const FieldInfo& f = info->vFieldInfo[n];
    if (f.arity == SARN_ARITY_NONE || (!isAll && f.arity == SARN_ARITY_OPTIONAL && f.dataType == dataType)) continue;
    if (f.dataType == dataType || (f.dataType == SARN_DATA_TYPE_SUBDICT && Holds(f.refIndex, dataType, isAll, depth + 1))) return true;
  }
  return false;
}

// Applies change `kind` to `field` of `object`, or undoes it; false when it does not apply.
bool Change(SarnObject* object, const FieldInfo& field, int kind, bool isUndo, VekString& spareText, VekCore*& spareRef) {
  const auto storage = TraitsOf(field.dataType).storage;
  const bool isMulti = field.arity == SARN_ARITY_MULTI, isPresent = isUndo || IsFieldPresent(object, field);
  switch (kind) {
    case 0:
      if (field.arity != SARN_ARITY_OPTIONAL || field.flagOffset == 0) return false;
      reinterpret_cast<uint8_t*>(object)[field.flagOffset] ^= 1;
      return true;
    case 1:
    case 2: {  // the lowest byte of the first value, the highest (an enum's second) of the last
      const unsigned count = FieldAccess::Count(object, field), width = TraitsOf(field.dataType).width;
      if (storage != DataTypeTraits::STORAGE_SCALAR || !isPresent || count == 0) return false;
      const unsigned at = kind == 1 ? 0 : field.dataType == SARN_DATA_TYPE_ENUM ? 1 : width - 1;
      static_cast<uint8_t*>(const_cast<void*>(FieldAccess::ScalarAt(object, field, kind == 1 ? 0 : count - 1)))[at] ^= 1;
      return true;
    }
    case 3:
      if (isMulti || !isPresent || storage == DataTypeTraits::STORAGE_SCALAR) return false;
      if (storage == DataTypeTraits::STORAGE_STRING) std::swap(FieldRef<VekString>(object, field), spareText);
      if (storage == DataTypeTraits::STORAGE_REFERENCE) std::swap(FieldRef<VekCore*>(object, field), spareRef);
      return true;
    default:
      if (!isMulti) return false;
      if (!isUndo) {
        unsigned char zero[8] = {};
        storage == DataTypeTraits::STORAGE_SCALAR   ? FieldAccess::PutScalar(object, field, zero)
        : storage == DataTypeTraits::STORAGE_STRING ? FieldAccess::PutString(object, field, spareText)
                                                    : FieldAccess::PutReference(object, field, nullptr);
      } else {  // taking back the element added: every array removes its last element alike
        const int last = static_cast<int>(FieldAccess::Count(object, field)) - 1;
        storage == DataTypeTraits::STORAGE_SCALAR   ? FieldRef<VekGenericIntArray>(object, field).RemoveAt(last)
        : storage == DataTypeTraits::STORAGE_STRING ? FieldRef<VekStringArray>(object, field).RemoveAt(last)
                                                    : FieldRef<VekGenericArray>(object, field).RemoveAt(last);
      }
      return true;
  }
}

// Every change to every field of `target` (inside `copy`, down to `depth` more levels of objects).
void ExpectChangesSeen(const SarnObject& original, const SarnObject& copy, SarnObject* target, int depth, const std::string& what) {
  const StructInfo* info = target->GetStructInfo();
  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    const FieldInfo& field = info->vFieldInfo[n];
    if (field.arity == SARN_ARITY_NONE) continue;
    for (int kind = 0; kind < 5; ++kind) {
      VekString spareText("\x7f");
      VekCore* spareRef = nullptr;
      if (!Change(target, field, kind, false, spareText, spareRef)) continue;
      EXPECT_TRUE(original != copy && copy != original) << what << "." << FieldName(info, field) << " change " << kind;
      Change(target, field, kind, true, spareText, spareRef);
      ASSERT_TRUE(original == copy) << what << "." << FieldName(info, field) << " undone " << kind;
    }
    bool isObject = field.dataType == SARN_DATA_TYPE_KNOWN_DICT || field.dataType == SARN_DATA_TYPE_SUBDICT;
    if (depth > 0 && isObject && IsFieldPresent(target, field) && FieldAccess::Count(target, field) > 0) {
      auto* inner = static_cast<SarnObject*>(FieldAccess::ReferenceAt(target, field, 0));
      if (inner != nullptr) ExpectChangesSeen(original, copy, inner, depth - 1, what + "." + FieldName(info, field));
    }
  }
}

}  // namespace

TEST(ObjectEqualityProperty, CopiesAreEqualAndEveryChangeIsSeen) {
  VekMempool pool("property");
  {
    std::vector<unsigned> types = {346, 470, 543, 974, 1259}, known;  // known: no byte string set, no payload
    sarntest::RandomObjects random(&pool, 17, {});
    while (types.size() < 5 + 200) {
      unsigned id = static_cast<unsigned>(random.Next(Schema::nStructDefG));
      if (StructInfoForId(id) != nullptr) types.push_back(id);
    }
    for (unsigned id : types) {
      if (!Holds(id, SARN_DATA_TYPE_BYTESTRING, false) && !Holds(id, SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY, true)) known.push_back(id);
    }
    sarntest::RandomObjects objects(&pool, 2026, std::vector<unsigned>(known.begin(), known.begin() + 4), 3, false);
    for (int i = 0; i < 1200; ++i) {
      const unsigned id = i < 1000 ? types[i % 5] : types[5 + i - 1000];
      const std::string what = "object " + std::to_string(i) + " of type " + std::to_string(id);
      ref<SarnObject> made = objects.Make(id);
      if (Holds(id, SARN_DATA_TYPE_BYTESTRING, false)) {
        EXPECT_TRUE(id != 1259 || *made != *made) << what;  // a required byte string
        continue;
      }
      // Floats and ids as the dictionary texts give them back, control characters as the JSON
      // escapes that the readers keep as they are.
      ref<SarnObject> clone = made->Clone(id);
      ASSERT_TRUE(clone) << what;
      ref<SarnObject> object = objopstest::JsonCopy(&pool, clone.Get());
      ref<SarnObject> copies[] = {object, object->Clone(543), objopstest::JsonCopy(&pool, object.Get()),
                                  objopstest::BinaryCopy(&pool, object.Get())};
      for (const ref<SarnObject>& copy : copies) {
        ASSERT_TRUE(copy && *object == *copy && *copy == *object) << what << ", copy " << (&copy - copies) << "\n"
                                                                  << sarntest::Str(object->ToString(false, 0));
      }
      ExpectChangesSeen(*object, *copies[2], copies[2].Get(), 2, what);
      if (HasFatalFailure()) return;
    }
  }
  EXPECT_EQ(pool.GetLiveBlocks(), 0u);
}
