// Seeded random objects (every value with a text that reads back) equal themselves and their
// copies made by Clone, by JSON and by the binary form; changing one field anywhere in a copy
// (presence flipped, the lowest byte of a first value or the highest of a last one, a single
// string or reference swapped out, an element added, which seen from the other side is one
// removed) makes the two unequal in both orders, and undoing it makes them equal again.
#include <gtest/gtest.h>

#include <cstring>
#include <utility>

#include "runtime/ObjectOpsSupport.h"
#include "testutil/RandomObject.h"

using namespace objopstest;

namespace {

// Makes change `kind` to `field` of `o`, or undoes it; false when it does not apply. `spare` is
// what a single string or reference is swapped with (both are one pointer).
bool Change(SarnObject* o, const FieldInfo& field, int kind, bool isUndo, uint64_t& spare) {
  const DataTypeTraits& traits = TraitsOf(field.dataType);
  const unsigned count = FieldAccess::Count(o, field);
  const bool isMulti = field.arity == SARN_ARITY_MULTI, isPresent = isUndo || IsFieldPresent(o, field);
  if (kind == 0 && field.arity == SARN_ARITY_OPTIONAL && field.flagOffset != 0) {
    reinterpret_cast<uint8_t*>(o)[field.flagOffset] ^= 1;
  } else if ((kind == 1 || kind == 2) && traits.storage == DataTypeTraits::STORAGE_SCALAR && isPresent && count > 0) {
    const unsigned at = kind == 1 ? 0 : field.dataType == SARN_DATA_TYPE_ENUM ? 1 : traits.width - 1;  // enums: 16 bits
    static_cast<uint8_t*>(const_cast<void*>(FieldAccess::ScalarAt(o, field, kind == 1 ? 0 : count - 1)))[at] ^= 1;
  } else if (kind == 3 && !isMulti && isPresent && traits.storage != DataTypeTraits::STORAGE_SCALAR) {
    std::swap(FieldRef<uint64_t>(o, field), spare);
  } else if (kind == 4 && isMulti && !isUndo) {
    const uint64_t zero = 0;
    traits.storage == DataTypeTraits::STORAGE_SCALAR   ? FieldAccess::PutScalar(o, field, &zero)
    : traits.storage == DataTypeTraits::STORAGE_STRING ? FieldAccess::PutString(o, field, VekString("\x7f"))
                                                       : FieldAccess::PutReference(o, field, nullptr);
  } else if (kind == 4 && isMulti) {
    traits.storage == DataTypeTraits::STORAGE_SCALAR   ? FieldRef<VekGenericIntArray>(o, field).RemoveAt(static_cast<int>(count) - 1)
    : traits.storage == DataTypeTraits::STORAGE_STRING ? FieldRef<VekStringArray>(o, field).RemoveAt(static_cast<int>(count) - 1)
                                                       : FieldRef<VekGenericArray>(o, field).RemoveAt(static_cast<int>(count) - 1);
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
    VekString text("\x7f");
    for (int kind = 0; kind < 5; ++kind) {
      uint64_t spare = 0;
      if (TraitsOf(field.dataType).storage == DataTypeTraits::STORAGE_STRING) std::memcpy(&spare, &text, sizeof spare);
      if (!Change(target, field, kind, false, spare)) continue;
      EXPECT_TRUE(original != copy && copy != original) << name << " change " << kind;
      Change(target, field, kind, true, spare);
      ASSERT_TRUE(original == copy) << name << " undone " << kind;
    }
    const bool isObject = field.dataType == SARN_DATA_TYPE_KNOWN_DICT || field.dataType == SARN_DATA_TYPE_SUBDICT;
    auto* inner = isObject && IsFieldPresent(target, field) && FieldAccess::Count(target, field) > 0 ? FieldAccess::ReferenceAt(target, field, 0) : nullptr;
    if (depth > 0 && inner != nullptr) ExpectChangesSeen(original, copy, static_cast<SarnObject*>(inner), depth - 1, name);
  }
}

}  // namespace

TEST(ObjectEqualityProperty, CopiesAreEqualAndEveryChangeIsSeen) {
  VekMempool pool("property");
  {
    std::vector<unsigned> types = {346, 470, 543, 974, 1259};
    for (sarntest::RandomObjects draw(&pool, 17, {}); types.size() < 5 + 200;) {
      const unsigned id = static_cast<unsigned>(draw.Next(Schema::nStructDefG));
      if (StructInfoForId(id) != nullptr) types.push_back(id);
    }
    // Known dicts hold objects of the first four (no byte string set, no payload).
    sarntest::RandomObjects objects(&pool, 2026, {346, 470, 543, 974}, 3, false);
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
      auto jsonCopy = [&](const ref<SarnObject>& o) { return o ? FromJson(&pool, Str(JsonSarnObject(&pool).SarnObjectToJson(o.Get(), 0))) : o; };
      ref<SarnObject> object = jsonCopy(made->Clone(id));
      ref<SarnObject> copies[] = {object, object ? object->Clone(543) : object, jsonCopy(object), object ? BinaryCopy(&pool, object.Get()) : object};
      for (const ref<SarnObject>& copy : copies) {
        ASSERT_TRUE(copy && *object == *copy && *copy == *object) << what << ", copy " << (&copy - copies) << ": " << Str(made->ToString(false, 0));
      }
      ExpectChangesSeen(*object, *copies[2], copies[2].Get(), 2, what);
      if (HasFatalFailure()) return;
    }
  }
  EXPECT_EQ(pool.GetLiveBlocks(), 0u);
}
