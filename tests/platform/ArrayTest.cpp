// Arrays with 16-bit counts: references held by the counted arrays, element bytes of the
// fixed-width array, order after removal, and the refusal past 65,535 elements.
#include <cstring>
#include <string>

#include "testutil/TestUtil.h"

namespace {

struct Item : VekCore {
  explicit Item(int id) : idM(id) {}
  int idM;
};

using ArrayTest = sarntest::PoolTest;

// The ids of the elements ("-" for null) and the reference counts of the given items.
std::string State(VekGenericArray& array, std::initializer_list<Item*> items) {
  std::string text;
  for (int i = 0; i < array.Count(); ++i) text += array.Get(i) ? std::to_string(static_cast<Item*>(array.Get(i))->idM) : "-";
  for (Item* item : items) text += " " + std::to_string(item->GetRefCount());
  return text;
}

TEST_F(ArrayTest, GenericArrayHoldsOneReferencePerElement) {
  ref<Item> a = new (&poolM) Item(1), b = new (&poolM) Item(2), c = new (&poolM) Item(3);
  {
    VekGenericArray array(&poolM, 2);
    ASSERT_TRUE(array.Add(a.Get()) && array.Add(b.Get()) && array.Add(nullptr) && array.Add(a.Get()));
    EXPECT_EQ(State(array, {a.Get(), b.Get(), c.Get()}), "12-1 3 2 1");
    EXPECT_TRUE(array.Remove(a.Get()) && !array.Remove(c.Get())) << "removes the first occurrence only";
    EXPECT_EQ(State(array, {a.Get(), b.Get(), c.Get()}), "2-1 2 2 1");
    EXPECT_TRUE(array.Set(1, c.Get()) && !array.Set(3, c.Get()));
    EXPECT_EQ(State(array, {a.Get(), b.Get(), c.Get()}), "231 2 2 2");
    EXPECT_TRUE(array.RemoveAt(0) && !array.RemoveAt(2));
    EXPECT_EQ(State(array, {a.Get(), b.Get(), c.Get()}), "31 2 1 2");
    array.Clear();
    EXPECT_EQ(State(array, {a.Get(), c.Get()}), " 1 1");
    ASSERT_TRUE(array.Add(c.Get()));
  }
  EXPECT_EQ(c->GetRefCount(), 1u) << "the destructor releases its elements";
}

TEST_F(ArrayTest, ArraysRefuseThe65536thElement) {
  ref<Item> item = new (&poolM) Item(0);
  VekGenericArray array(&poolM);
  for (int i = 0; i < 65535; ++i) ASSERT_TRUE(array.Add(item.Get())) << i;
  EXPECT_TRUE(!array.Add(item.Get()) && array.Count() == 65535 && array.Get(65534) == item.Get()) << "no wrap to 0";
  EXPECT_EQ(item->GetRefCount(), 65536u) << "a refused element takes no reference";
  EXPECT_TRUE(array.RemoveAt(0) && array.Add(item.Get())) << "room again after a removal";
  array.Destroy();
  EXPECT_EQ(item->GetRefCount(), 1u);

  VekGenericIntArray ints(8, &poolM, 0);
  for (uint64_t i = 0; i < 65535; ++i) ASSERT_TRUE(ints.Add(&i)) << i;
  uint64_t extra = 65535;
  EXPECT_TRUE(!ints.Add(&extra) && ints.Count() == 65535 && *static_cast<uint64_t*>(ints.Get(65534)) == 65534u);
  EXPECT_EQ(poolM.GetUsedBytes(), 65535u * 8 + sizeof(Item));
}

TEST_F(ArrayTest, IntArrayCopiesElementsOfEachWidth) {
  const uint8_t bytes[] = {1, 200, 1};
  const uint32_t words[] = {0xdeadbeef, 7, 0xdeadbeef};
  const uint64_t quads[] = {UINT64_MAX, 0, 1ull << 40};
  VekGenericIntArray one(1, &poolM, 0), four(4, &poolM, 8), eight(8, &poolM, 0);
  for (int i = 0; i < 3; ++i) ASSERT_TRUE(one.Add(&bytes[i]) && four.Add(&words[i]) && eight.Add(&quads[i]));
  EXPECT_TRUE(four.GetWidth() == 4 && *static_cast<uint8_t*>(one.Get(1)) == 200 &&
              *static_cast<uint32_t*>(four.Get(2)) == 0xdeadbeefu && *static_cast<uint64_t*>(eight.Get(0)) == UINT64_MAX);
  *static_cast<uint64_t*>(eight.Get(1)) = 99;  // Get points into the array
  EXPECT_EQ(*static_cast<uint64_t*>(eight.Get(1)), 99u);

  const uint32_t missing = 8;
  EXPECT_TRUE(four.Remove(&words[0]) && !four.Remove(&missing)) << "removes by value, first match";
  ASSERT_EQ(four.Count(), 2);
  EXPECT_EQ(std::vector<uint32_t>({*static_cast<uint32_t*>(four.Get(0)), *static_cast<uint32_t*>(four.Get(1))}),
            std::vector<uint32_t>({7, 0xdeadbeef}));
  EXPECT_TRUE(one.RemoveAt(0) && !one.RemoveAt(2) && *static_cast<uint8_t*>(one.Get(0)) == 200);
  EXPECT_EQ(VekGenericIntArray(4, nullptr, 0).GetMempool(), VekMempool::Default());
}

}  // namespace
