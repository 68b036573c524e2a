// Seeded random objects (every value with a text that reads back) equal themselves and their
// copies made by Clone, by JSON and by the binary form; changing one field anywhere in a copy
// (presence flipped, the lowest byte of a first value or the highest of a last one, a single
// string or reference swapped out, an element added, which seen from the other side is one
// removed) makes the two unequal in both orders, and undoing it makes them equal again.
#include <gtest/gtest.h>

#include <utility>

#include "runtime/ObjectOpsSupport.h"
#include "testutil/RandomObject.h"

using namespace sarn;
using objopstest::Holds;
using Storage = DataTypeTraits::Storage;

namespace {

// Makes change `kind` to `field` of `object`, or undoes it; false when it does not apply.
bool Change(SarnObject* o, const FieldInfo& field, int kind, bool isUndo, VekString& text, VekCore*& reference) {
  const Storage storage = TraitsOf(field.dataType).storage;
  const unsigned count = FieldAccess::Count(o, field), width = TraitsOf(field.dataType).width;
  const bool isMulti = field.arity == SARN_ARITY_MULTI, isPresent = isUndo || IsFieldPresent(o, field);
  if (kind == 0 && field.arity == SARN_ARITY_OPTIONAL && field.flagOffset != 0) {
    reinterpret_cast<uint8_t*>(o)[field.flagOffset] ^= 1;
  } else if ((kind == 1 || kind == 2) && storage == DataTypeTraits::STORAGE_SCALAR && isPresent && count > 0) {
    const unsigned at = kind == 1 ? 0 : field.dataType == SARN_DATA_TYPE_ENUM ? 1 : width - 1;  // enums: 16 bits
    static_cast<uint8_t*>(const_cast<void*>(FieldAccess::ScalarAt(o, field, kind == 1 ? 0 : count - 1)))[at] ^= 1;
  } else if (kind == 3 && !isMulti && isPresent && storage == DataTypeTraits::STORAGE_STRING) {
    std::swap(FieldRef<VekString>(o, field), text);
  } else if (kind == 3 && !isMulti && isPresent && storage == DataTypeTraits::STORAGE_REFERENCE) {
    std::swap(FieldRef<VekCore*>(o, field), reference);
  } else if (kind == 4 && isMulti && !isUndo) {
    const uint64_t zero = 0;
    if (storage == DataTypeTraits::STORAGE_SCALAR) FieldAccess::PutScalar(o, field, &zero);
    if (storage == DataTypeTraits::STORAGE_STRING) FieldAccess::PutString(o, field, text);
    if (storage == DataTypeTraits::STORAGE_REFERENCE) FieldAccess::PutReference(o, field, nullptr);
  } else if (kind == 4 && isMulti) {
    if (storage == DataTypeTraits::STORAGE_SCALAR) FieldRef<VekGenericIntArray>(o, field).RemoveAt(static_cast<int>(count) - 1);
    if (storage == DataTypeTraits::STORAGE_STRING) FieldRef<VekStringArray>(o, field).RemoveAt(static_cast<int>(count) - 1);
    if (storage == DataTypeTraits::STORAGE_REFERENCE) FieldRef<VekGenericArray>(o, field).RemoveAt(static_cast<int>(count) - 1);
  } else {
    return false;
  }
  return true;
}

// Every change to every field of `target` inside `copy`, and of its first nested objects down to `depth` levels.
void ExpectChangesSeen(const SarnObject& original, const SarnObject& copy, SarnObject* target, int depth, const std::string& what) {
  const StructInfo* info = target->GetStructInfo();
  for (unsigned n = 0; n < info->nFieldInfo; ++n) {
    const FieldInfo& field = info->vFieldInfo[n];
    const std::string name = what + "." + (field.arity == SARN_ARITY_NONE ? "" : FieldName(info, field));
    for (int kind = 0; kind < 5; ++kind) {
      VekString text("\x7f");
      VekCore* reference = nullptr;
      if (!Change(target, field, kind, false, text, reference)) continue;
      EXPECT_TRUE(original != copy && copy != original) << name << " change " << kind;
      Change(target, field, kind, true, text, reference);
      ASSERT_TRUE(original == copy) << name << " undone " << kind;
    }
    const bool isObject = field.dataType == SARN_DATA_TYPE_KNOWN_DICT || field.dataType == SARN_DATA_TYPE_SUBDICT;
    if (depth > 0 && isObject && IsFieldPresent(target, field) && FieldAccess::Count(target, field) > 0 &&
        FieldAccess::ReferenceAt(target, field, 0) != nullptr) {
      ExpectChangesSeen(original, copy, static_cast<SarnObject*>(FieldAccess::ReferenceAt(target, field, 0)), depth - 1, name);
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
      const unsigned id = static_cast<unsigned>(random.Next(Schema::nStructDefG));
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
