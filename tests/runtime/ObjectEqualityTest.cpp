// Equality by its rules, from a table, and depth compared without C stack.
#include <gtest/gtest.h>

#include "runtime/ObjectOpsSupport.h"

using namespace objopstest;

// Rows: subject => one side => the other => equal or unequal, compared both ways. A subject
// "type.field" compares that field's storage through SingleFieldEquals or MultiFieldEquals (sides
// as Side takes them) where both sides have the field, then, for a type without byte strings, the
// whole objects, which must agree and allocate nothing unless they hold free-form or lazy fields;
// a bare type compares whole objects read from JSON ('=': the same object).
TEST(ObjectEquality, RulesFromTable) {
  VekMempool pool("rules");
  for (const auto& row : sarntest::ReadTable("objects/equality.txt", 4)) {
    const std::string what = row[0] + ": " + row[1] + " against " + row[2];
    const bool isEqual = row[3] == "equal", isObjects = row[0].find('.') == std::string::npos;
    const FieldInfo* f = nullptr;
    ref<SarnObject> a = isObjects ? FromJson(&pool, row[1]) : Side(&pool, row[0], row[1], f);
    ref<SarnObject> b = row[2] == "=" ? a : isObjects ? FromJson(&pool, row[2]) : Side(&pool, row[0], row[2], f);
    ASSERT_TRUE(a && b) << what;
    if (!isObjects && IsFieldPresent(a.Get(), *f) && IsFieldPresent(b.Get(), *f)) {
      auto equals = f->arity == SARN_ARITY_MULTI ? &SarnObject::MultiFieldEquals : &SarnObject::SingleFieldEquals;
      EXPECT_EQ(equals(f, FieldStorage(a.Get(), *f), FieldStorage(b.Get(), *f)), isEqual) << what;
      EXPECT_EQ(equals(f, FieldStorage(b.Get(), *f), FieldStorage(a.Get(), *f)), isEqual) << what;
    }
    if (!isObjects && Holds(a->GetTypeId(), SARN_DATA_TYPE_BYTESTRING, true)) continue;
    pool.FailAllocationAfter(1000000);
    EXPECT_TRUE((*a == *b) == isEqual && (*b != *a) != isEqual) << what;
    const bool isPlain = !Holds(a->GetTypeId(), SARN_DATA_TYPE_ANY_DICT, true) && !Holds(a->GetTypeId(), SARN_DATA_TYPE_KNOWN_DICT_AS_LAZY, true);
    EXPECT_TRUE(isObjects || !isPlain || pool.GetFailCountdown() == 1000000) << what << ": allocations made by a comparison";
    pool.FailAllocationAfter(-1);
  }
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
}

// Depth compares without C stack; arrays are read with their own element widths.
TEST(ObjectEquality, DepthAndArrayWidths) {
  VekMempool pool("deep");
  VekGenericIntArray narrow(4, &pool, 0), wide(8, &pool, 0);
  for (uint64_t value : {uint64_t{7}, uint64_t{0xFFFFFFFF}}) narrow.Add(&value), wide.Add(&value);
  const FieldInfo* ints = FieldNamed(StructInfoForId(1259), "intMulti");
  EXPECT_TRUE(SarnObject::MultiFieldEquals(ints, &narrow, &wide) && SarnObject::MultiFieldEquals(ints, &wide, &narrow));
  EXPECT_FALSE(SarnObject::MultiFieldEquals(FieldNamed(StructInfoForId(1259), "floatMulti"), &narrow, &wide));
  const int depth = 10 * JsonLimits::kDefaultMaxDepth;
  ref<SarnObject> a = Nest(&pool, depth, "bottom"), b = Nest(&pool, depth, "bottom"), c = Nest(&pool, depth, "other");
  sarntest::RunOnStack(256 * 1024, [&] { EXPECT_TRUE(*a == *b && *a != *c && *c != *a); });
}
