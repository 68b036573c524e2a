// Arrays with 16-bit counts: references held by the counted arrays, element bytes of the
// fixed-width array, order after removal, and the refusal past 65,535 elements.
#include <cstring>

#include "testutil/TestUtil.h"

namespace {

class Item : public VekCore {
 public:
  explicit Item(int id) : idM(id) {}
  int idM;
};

using ArrayTest = sarntest::PoolTest;

TEST_F(ArrayTest, GenericArrayHoldsOneReferencePerElement) {
  ref<Item> a = new (&poolM) Item(1);
  ref<Item> b = new (&poolM) Item(2);
  ref<Item> c = new (&poolM) Item(3);
  {
    VekGenericArray array(&poolM, 2);
    ASSERT_TRUE(array.Add(a.Get()) && array.Add(b.Get()) && array.Add(nullptr) && array.Add(a.Get()));
    EXPECT_EQ(array.Count(), 4);
    EXPECT_EQ(a->GetRefCount(), 3u);
    EXPECT_EQ(array.Get(2), nullptr);
    EXPECT_EQ(array.Get(1), b.Get());

    EXPECT_TRUE(array.Remove(a.Get())) << "removes the first occurrence only";
    EXPECT_EQ(a->GetRefCount(), 2u);
    EXPECT_EQ(array.Get(0), b.Get());
    EXPECT_EQ(array.Get(2), a.Get());
    EXPECT_FALSE(array.Remove(c.Get()));
    EXPECT_TRUE(array.Set(1, c.Get()));
    EXPECT_EQ(c->GetRefCount(), 2u);
    EXPECT_FALSE(array.Set(3, c.Get()));
    EXPECT_EQ(c->GetRefCount(), 2u);
    EXPECT_TRUE(array.RemoveAt(0));
    EXPECT_EQ(b->GetRefCount(), 1u);
    EXPECT_FALSE(array.RemoveAt(2));
    ASSERT_EQ(array.Count(), 2);
    EXPECT_EQ(array.Get(0), c.Get());
    EXPECT_EQ(array.Get(1), a.Get());
    array.Clear();
    EXPECT_EQ(array.Count(), 0);
    EXPECT_EQ(c->GetRefCount(), 1u);
    ASSERT_TRUE(array.Add(c.Get()));
  }
  EXPECT_EQ(c->GetRefCount(), 1u) << "the destructor releases its elements";
}

TEST_F(ArrayTest, GenericArrayRefusesThe65536thElement) {
  ref<Item> item = new (&poolM) Item(0);
  VekGenericArray array(&poolM);
  for (int i = 0; i < 65535; ++i) ASSERT_TRUE(array.Add(item.Get())) << i;
  EXPECT_EQ(array.Count(), 65535);
  EXPECT_FALSE(array.Add(item.Get()));
  EXPECT_EQ(array.Count(), 65535) << "no wrap to 0";
  EXPECT_EQ(item->GetRefCount(), 65536u) << "a refused element takes no reference";
  EXPECT_EQ(array.Get(65534), item.Get());
  EXPECT_TRUE(array.RemoveAt(0));
  EXPECT_TRUE(array.Add(item.Get())) << "room again after a removal";
  array.Destroy();
  EXPECT_EQ(item->GetRefCount(), 1u);
}

TEST_F(ArrayTest, IntArrayCopiesElementsOfEachWidth) {
  const uint8_t bytes[] = {1, 200, 1};
  const uint32_t words[] = {0xdeadbeef, 7, 0xdeadbeef};
  const uint64_t quads[] = {UINT64_MAX, 0, 1ull << 40};
  VekGenericIntArray one(1, &poolM, 0), four(4, &poolM, 8), eight(8, &poolM, 0);
  for (int i = 0; i < 3; ++i) {
    ASSERT_TRUE(one.Add(&bytes[i]) && four.Add(&words[i]) && eight.Add(&quads[i]));
  }
  EXPECT_EQ(four.GetWidth(), 4);
  EXPECT_EQ(*static_cast<uint8_t*>(one.Get(1)), 200);
  EXPECT_EQ(*static_cast<uint32_t*>(four.Get(2)), 0xdeadbeefu);
  EXPECT_EQ(*static_cast<uint64_t*>(eight.Get(0)), UINT64_MAX);
  *static_cast<uint64_t*>(eight.Get(1)) = 99;  // Get points into the array
  EXPECT_EQ(*static_cast<uint64_t*>(eight.Get(1)), 99u);

  EXPECT_TRUE(four.Remove(&words[0])) << "removes by value, first match";
  ASSERT_EQ(four.Count(), 2);
  EXPECT_EQ(*static_cast<uint32_t*>(four.Get(0)), 7u);
  EXPECT_EQ(*static_cast<uint32_t*>(four.Get(1)), 0xdeadbeefu);
  const uint32_t missing = 8;
  EXPECT_FALSE(four.Remove(&missing));
  EXPECT_TRUE(one.RemoveAt(0));
  EXPECT_FALSE(one.RemoveAt(2));
  EXPECT_EQ(*static_cast<uint8_t*>(one.Get(0)), 200);

  VekGenericIntArray defaultPool(4, nullptr, 0);
  EXPECT_EQ(defaultPool.GetMempool(), VekMempool::Default());
}

TEST_F(ArrayTest, IntArrayRefusesThe65536thElement) {
  VekGenericIntArray array(8, &poolM, 0);
  for (uint64_t i = 0; i < 65535; ++i) ASSERT_TRUE(array.Add(&i)) << i;
  uint64_t extra = 65535;
  EXPECT_FALSE(array.Add(&extra));
  EXPECT_EQ(array.Count(), 65535);
  EXPECT_EQ(*static_cast<uint64_t*>(array.Get(65534)), 65534u);
  EXPECT_EQ(poolM.GetUsedBytes(), 65535u * 8);
}

TEST_F(ArrayTest, TypedArrayOnTheStackAndWithNew) {
  ref<Item> a = new (&poolM) Item(10);
  VekArray<Item> onStack(&poolM);
  EXPECT_TRUE(onStack.Add(a));
  EXPECT_TRUE(onStack.Add(new (&poolM) Item(11)));  // the array holds the only reference
  EXPECT_EQ(onStack.Count(), 2);
  EXPECT_EQ(onStack[1]->idM, 11);
  EXPECT_EQ(onStack.Get(0), a.Get());
  auto* onHeap = new VekArray<Item>(&poolM);
  EXPECT_TRUE(onHeap->Add(a));
  EXPECT_EQ(a->GetRefCount(), 3u);
  EXPECT_TRUE(onHeap->Remove(a.Get()));
  EXPECT_FALSE(onHeap->Remove(a.Get()));
  delete onHeap;
  EXPECT_TRUE(onStack.RemoveAt(1));
  EXPECT_EQ(onStack.Count(), 1);
  onStack.Clear();
  EXPECT_EQ(a->GetRefCount(), 1u);
}

}  // namespace
