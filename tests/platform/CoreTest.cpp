// Counted objects: the counted new, the pool an object remembers, ref/nonRef semantics,
// concurrent counting, and the layout the schema's objects rely on.
#include <atomic>
#include <stdexcept>
#include <thread>
#include <type_traits>

#include "testutil/TestUtil.h"

namespace {

std::atomic<int> destroyedG{0};

struct Leaf : VekCore {
  explicit Leaf(int value = 0) : valueM(value) {}
  ~Leaf() override { ++destroyedG; }
  void Set(int value) { valueM = value; }
  int valueM;
};

struct Branch : Leaf {
  explicit Branch(const ref<Leaf>& child) : Leaf(1), childM(child) {}
  ref<Leaf> childM;
};

struct Throwing : VekCore {
  explicit Throwing(int) { throw std::runtime_error("no"); }
};

struct CoreTest : sarntest::PoolTest {
  void SetUp() override { destroyedG = 0; }
};

TEST_F(CoreTest, CountedNewStartsAtZeroAndLastReferenceFreesIntoThePool) {
  Leaf* raw = new (&poolM) Leaf(7);
  EXPECT_TRUE(raw->GetRefCount() == 0 && raw->GetMempool() == &poolM && poolM.GetUsedBytes() == sizeof(Leaf));
  {
    ref<Leaf> first = raw;
    EXPECT_EQ(raw->GetRefCount(), 1u);
    ref<Leaf> second = first;
    ref<VekCore> base = second;  // upcast shares the count
    nonRef<Leaf> borrowed = first;  // does not count
    EXPECT_EQ(borrowed.Get(), raw);
    ref<Leaf> moved = std::move(second);
    EXPECT_EQ(second, nullptr);
    ref<Leaf>& alias = first;
    first = alias;  // self-assignment keeps the object alive
    EXPECT_EQ(raw->GetRefCount(), 3u);
  }
  EXPECT_TRUE(destroyedG == 1 && poolM.GetUsedBytes() == 0);

  const ref<Leaf> p = MempoolNew<Leaf>(&poolM, 3);
  p->Set(4);  // a const ref still gives a mutable object
  (*p).Set(5);
  EXPECT_EQ(p.Get()->valueM, 5);
  static_assert(std::is_same<decltype(p.Get()), Leaf*>::value, "Get gives T*");
  static_assert(!std::is_convertible<ref<Leaf>, bool>::value, "bool conversion is explicit");
  static_assert(!std::is_convertible<ref<VekCore>, ref<Leaf>>::value, "no implicit downcast");
  ref<VekCore> same = p;
  ref<Leaf> other = new (&poolM) Leaf;
  EXPECT_TRUE(p && p != nullptr && nullptr != p && same == p && other != p);
  other = nullptr;
  EXPECT_FALSE(other);
  other = p.Get();  // from a raw pointer: takes a reference
  EXPECT_EQ(p->GetRefCount(), 3u);
  other.Reset();
  EXPECT_EQ(p->GetRefCount(), 2u);
}

TEST_F(CoreTest, EachObjectKeepsItsOwnPoolWhenNewsNest) {
  // The argument's counted new runs between the outer object's allocation and its constructor.
  VekMempool other("other");
  {
    ref<Branch> branch = new (&poolM) Branch(new (&other) Leaf(2));
    EXPECT_TRUE(branch->GetMempool() == &poolM && branch->childM->GetMempool() == &other &&
                poolM.GetUsedBytes() == sizeof(Branch) && other.GetUsedBytes() == sizeof(Leaf));
  }
  EXPECT_EQ(other.GetUsedBytes(), 0u);
  // An object not made with the counted new belongs to the default pool.
  Leaf onStack;
  ref<Leaf> nullPool = new (nullptr) Leaf;
  EXPECT_TRUE(onStack.GetMempool() == VekMempool::Default() && nullPool->GetMempool() == VekMempool::Default());
}

TEST_F(CoreTest, ConstructorThatThrowsReturnsItsMemory) {
  EXPECT_THROW(new (&poolM) Throwing(1), std::runtime_error);
  EXPECT_EQ(poolM.GetUsedBytes(), 0u);
  // The abandoned allocation leaves nothing behind for the next object at that address.
  VekMempool other("other");
  ref<Leaf> next = new (&other) Leaf;
  EXPECT_EQ(next->GetMempool(), &other);
}

// Two threads take and drop references to one object as fast as they can: the final count is
// exact and the object is destroyed once, by whichever reference goes last.
TEST_F(CoreTest, ConcurrentUpAndDownRefsAreExact) {
  constexpr int kRounds = 200000;
  ref<Leaf> shared = new (&poolM) Leaf;
  auto hammer = [&] {
    for (int i = 0; i < kRounds; ++i) {
      ref<Leaf> copy = shared;
      shared->UpRef();
      shared->DownRef();
    }
  };
  std::thread a(hammer), b(hammer);
  a.join();
  b.join();
  EXPECT_TRUE(shared->GetRefCount() == 1 && destroyedG == 0);

  // Many objects, each released by both threads at once.
  constexpr int kObjects = 20000;
  std::atomic<Leaf*> handOff{nullptr};
  std::thread releaser([&] {
    for (int i = 0; i < kObjects; ++i) {
      Leaf* p;
      while ((p = handOff.exchange(nullptr)) == nullptr) {}
      p->DownRef();
    }
  });
  for (int i = 0; i < kObjects; ++i) {
    Leaf* p = new (&poolM) Leaf;
    p->UpRef();
    p->UpRef();
    while (handOff.load() != nullptr) {}
    handOff.store(p);
    p->DownRef();
  }
  releaser.join();
  EXPECT_EQ(destroyedG, kObjects);
  shared = nullptr;
  EXPECT_EQ(destroyedG, kObjects + 1);
}

TEST(CoreLayoutTest, DerivedFirst32BitMemberSitsAtByte20) {
  struct Derived : VekCore {
    uint32_t firstM;
    uint32_t secondM;
  };
  Derived d;
  const char* base = reinterpret_cast<const char*>(&d);
  EXPECT_TRUE(reinterpret_cast<const char*>(&d.firstM) - base == 20 && reinterpret_cast<const char*>(&d.secondM) - base == 24);
  EXPECT_EQ(d.ZoCastHelper(&d), nullptr) << "an unknown class key is no match";
}

}  // namespace
