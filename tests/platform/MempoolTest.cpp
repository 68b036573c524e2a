// Pools: exact accounting through every allocation path, from one thread and from several,
// slabs taken and given back, thread caches handed back, large blocks growing in place, and
// the report of a pool destroyed with live blocks.
#include <algorithm>
#include <atomic>
#include <cstdlib>
#include <cstring>
#include <future>
#include <random>
#include <thread>
#include <vector>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

namespace {

#if defined(__SANITIZE_ADDRESS__)
constexpr bool kIsRecycling = false;  // no caches; slabs go back as soon as they are used up and free
#else
constexpr bool kIsRecycling = true;
#endif

uintptr_t SlabBase(const void* p) { return reinterpret_cast<uintptr_t>(p) & ~(VekMempool::kSlabBytes - 1); }

using MempoolTest = sarntest::PoolTest;

TEST_F(MempoolTest, CountsExactlyWhatCallersAskFor) {
  // Sizes on both sides of every boundary: empty, class edges, the largest small block, large.
  const size_t sizes[] = {0, 1, 15, 16, 17, 511, 512, 513, 4096, 100000};
  std::vector<void*> blocks;
  size_t expected = 0;
  for (size_t size : sizes) {
    void* p = poolM.Malloc(size);
    ASSERT_NE(p, nullptr) << size;
    EXPECT_EQ(reinterpret_cast<uintptr_t>(p) % 16, 0u) << "payload keeps malloc's alignment";
    EXPECT_TRUE(VekMempool::SizeOf(p) == size && VekMempool::PoolOf(p) == &poolM) << size;
    std::memset(p, 0xab, size);
    blocks.push_back(p);
    expected += size;
    EXPECT_EQ(poolM.GetUsedBytes(), expected);
  }
  EXPECT_TRUE(poolM.GetLiveBlocks() == blocks.size() && poolM.GetUsedBytesHighWater() == expected);
  for (void* p : blocks) {
    expected -= VekMempool::SizeOf(p);
    poolM.Free(p);
    EXPECT_EQ(poolM.GetUsedBytes(), expected);
  }
  EXPECT_TRUE(poolM.GetLiveBlocks() == 0 && poolM.GetUsedBytesHighWater() == 105681) << "high water stays at the peak";
  poolM.Free(nullptr);
  EXPECT_EQ(VekMempool::PoolOf(nullptr), nullptr);
}

// A freed block serves the next request of its class (where blocks are recycled), zeroed when it
// comes through Calloc; the next class gets a block of its own; overflowing sizes are refused.
TEST_F(MempoolTest, FreeListsRecycleAndCallocZeroes) {
  void* a = poolM.Malloc(100);
  std::memset(a, 0xff, 100);
  poolM.Free(a);
  unsigned char* z = static_cast<unsigned char*>(poolM.Calloc(4, 28));  // 112: 97..112 is a's class
  ASSERT_NE(z, nullptr);
  EXPECT_TRUE(z == a || !kIsRecycling);
  for (int i = 0; i < 112; ++i) ASSERT_EQ(z[i], 0) << i;
  EXPECT_EQ(poolM.GetUsedBytes(), 112u);
  void* c = poolM.Malloc(113);
  EXPECT_NE(c, z);
  poolM.Free(z);
  poolM.Free(c);
  EXPECT_TRUE(poolM.Calloc(SIZE_MAX / 2, 3) == nullptr && poolM.Malloc(SIZE_MAX - 4) == nullptr && poolM.GetLiveBlocks() == 0);
}

// Two threads allocate from one pool and free each other's blocks, in both directions (the
// pool's owner and threads with caches of their own): the counts come back to exactly zero, and
// in between they are exact at every point where the threads are joined.
TEST_F(MempoolTest, AccountingIsExactAcrossThreads) {
  constexpr int kRounds = 20000;
  std::vector<void*> fromOwner(kRounds), fromOther(kRounds);
  size_t ownerBytes = 0, otherBytes = 0;
  auto fill = [&](std::vector<void*>& blocks, size_t& bytes, int salt, size_t bound) {
    for (int i = 0; i < kRounds; ++i) blocks[i] = poolM.Malloc((i * salt) % bound), bytes += (i * salt) % bound;
  };
  fill(fromOwner, ownerBytes, 1, 700);
  std::thread(fill, std::ref(fromOther), std::ref(otherBytes), 7, 600).join();
  EXPECT_TRUE(poolM.GetUsedBytes() == ownerBytes + otherBytes && poolM.GetLiveBlocks() == 2u * kRounds);

  // The owner frees the other thread's blocks while a second thread frees the owner's, both
  // allocating and freeing more at the same time.
  std::atomic<bool> go{false};
  auto churn = [&](std::vector<void*>& blocks, int salt) {
    while (!go.load()) {}
    for (int i = 0; i < kRounds; ++i) {
      void* p = poolM.Malloc(static_cast<size_t>((i * salt) % 520));
      poolM.Free(blocks[i]);
      poolM.Free(p);
    }
  };
  std::thread b(churn, std::ref(fromOwner), 5);
  go = true;
  churn(fromOther, 3);
  b.join();
  EXPECT_TRUE(poolM.GetUsedBytes() == 0 && poolM.GetLiveBlocks() == 0);
  EXPECT_GE(poolM.GetUsedBytesHighWater(), ownerBytes + otherBytes);
}

// Sizes that vary inside one class, so that every block's size is its own: allocating until a
// third slab is taken, the counts are exact at every step, in address order within a slab, and
// so are PoolOf and SizeOf at a slab's first and last block; freeing in random order brings
// them back to zero and, once the cache is handed back, leaves one slab (the reserve, or the
// slab still being carved where nothing is recycled).
TEST_F(MempoolTest, SlabsAreCarvedInAddressOrderAndGivenBack) {
  for (size_t classBytes : {16u, 48u, 512u}) {
    VekMempool pool("slabs");
    std::vector<void*> blocks;
    size_t used = 0;
    while (pool.GetSlabCount() < 3) {
      size_t size = classBytes - blocks.size() % 16;
      void* p = pool.Malloc(size);
      ASSERT_NE(p, nullptr);
      std::memset(p, 0x5a, size);
      ASSERT_TRUE(blocks.empty() || SlabBase(p) != SlabBase(blocks.back()) || p > blocks.back())
          << "address order, class " << classBytes;
      blocks.push_back(p);
      used += size;
      ASSERT_EQ(pool.GetUsedBytes(), used);
    }
    ASSERT_EQ(pool.GetLiveBlocks(), blocks.size());
    size_t last = 0;  // the last block of the first slab
    while (SlabBase(blocks[last + 1]) == SlabBase(blocks[0])) ++last;
    uintptr_t lastEnd = reinterpret_cast<uintptr_t>(blocks[last]) + classBytes;
    EXPECT_TRUE(lastEnd <= SlabBase(blocks[0]) + VekMempool::kSlabBytes &&
                lastEnd + classBytes > SlabBase(blocks[0]) + VekMempool::kSlabBytes)
        << "the slab is used up to the last block that fits";
    for (size_t i : {size_t{0}, last, last + 1, blocks.size() - 1}) {
      EXPECT_TRUE(VekMempool::PoolOf(blocks[i]) == &pool && VekMempool::SizeOf(blocks[i]) == classBytes - i % 16)
          << classBytes << " block " << i;
    }
    std::shuffle(blocks.begin(), blocks.end(), std::mt19937(static_cast<unsigned>(classBytes)));
    for (void* p : blocks) {
      used -= VekMempool::SizeOf(p);
      pool.Free(p);
      ASSERT_EQ(pool.GetUsedBytes(), used);
    }
    EXPECT_EQ(pool.GetLiveBlocks(), 0u);
    pool.Trim();
    EXPECT_EQ(pool.GetSlabCount(), 1u) << classBytes;
  }
}

// A thread's cache goes back to the pool when the thread ends (its slab then is wholly free and
// beyond the reserve), and a pool destroyed while a live thread caches its blocks takes them
// back without a report; the thread then ends without touching the pool.
TEST(MempoolThreadTest, CachesAreHandedBackWhenTheThreadOrThePoolEnds) {
  if (!kIsRecycling) GTEST_SKIP() << "nothing is cached where nothing is recycled";
  auto* pool = new VekMempool("handed-back");
  std::promise<void> freed, mayEnd;
  std::thread worker([&] {
    std::vector<void*> blocks;
    while (pool->GetSlabCount() < 2) blocks.push_back(pool->Malloc(512));
    for (void* p : blocks) pool->Free(p);
    void* kept = pool->Malloc(512);
    freed.set_value();
    mayEnd.get_future().wait();
    pool->Free(kept);
  });
  freed.get_future().wait();
  EXPECT_TRUE(pool->GetLiveBlocks() == 1 && pool->GetSlabCount() == 2) << "the cache holds blocks of both slabs";
  EXPECT_EQ(pool->GetUsedBytes(), 512u) << "a live thread's bytes count before its cache moves them";
  mayEnd.set_value();
  worker.join();
  EXPECT_EQ(pool->GetSlabCount(), 1u);

  std::promise<void> cached, poolGone;
  std::thread holder([&] {
    pool->Free(pool->Malloc(100));
    cached.set_value();
    poolGone.get_future().wait();
  });
  cached.get_future().wait();
  testing::internal::CaptureStderr();
  delete pool;
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
  poolGone.set_value();
  holder.join();
}

// A destroyed pool's slabs go to the next pool made, so that a pool per message costs the C
// library nothing; threads making and destroying pools at once share that reserve.
TEST(MempoolThreadTest, SlabsPassFromDestroyedPoolsToNewOnes) {
  if (!kIsRecycling) GTEST_SKIP() << "slabs go back to the C library where nothing is recycled";
  uintptr_t given;
  {
    VekMempool pool("first");
    void* p = pool.Malloc(32);
    given = SlabBase(p);
    pool.Free(p);
  }
  // Held by the reserve, the slab is not the C library's to hand out meanwhile.
  void* other = std::aligned_alloc(VekMempool::kSlabBytes, VekMempool::kSlabBytes);
  EXPECT_NE(reinterpret_cast<uintptr_t>(other), given);
  VekMempool next("next");
  void* p = next.Malloc(200);
  EXPECT_EQ(SlabBase(p), given);
  next.Free(p);
  std::free(other);
  auto churn = [] {
    for (int i = 0; i < 500; ++i) {
      VekMempool pool("churn");
      std::vector<void*> blocks;
      for (size_t k = 0; k < 40; ++k) blocks.push_back(pool.Malloc(16 + k * 12));
      for (void* block : blocks) pool.Free(block);
    }
  };
  std::thread a(churn), b(churn);
  a.join();
  b.join();
}

// Realloc within a class stays in place; to another small class it copies (briefly holding both
// blocks); large blocks grow in place, a fifth at a time past the size where the C library maps
// pages of its own; at the end the block shrinks to a small one. Every byte written survives each
// step, and the counts follow exactly.
TEST_F(MempoolTest, ReallocKeepsBytesAndAccounting) {
  size_t size = 20;
  unsigned char* p = static_cast<unsigned char*>(poolM.Realloc(nullptr, size));
  for (size_t i = 0; i < size; ++i) p[i] = static_cast<unsigned char>(i * 7);
  EXPECT_TRUE(poolM.Realloc(p, 32) == p && poolM.GetUsedBytes() == 32) << "17..32 is one class";
  p = static_cast<unsigned char*>(poolM.Realloc(p, size = 200));
  EXPECT_EQ(poolM.GetUsedBytesHighWater(), 232u) << "the copy briefly holds both blocks";
  for (size_t i = 20; i < size; ++i) p[i] = static_cast<unsigned char>(i * 7);
  while (size < (5u << 20)) {
    size_t grown = size + size / 5;
    p = static_cast<unsigned char*>(poolM.Realloc(p, grown));
    ASSERT_NE(p, nullptr);
    for (size_t i = 0; i < size; i += 997) ASSERT_EQ(p[i], static_cast<unsigned char>(i * 7)) << size;
    ASSERT_EQ(p[size - 1], static_cast<unsigned char>((size - 1) * 7));
    for (size_t i = size; i < grown; ++i) p[i] = static_cast<unsigned char>(i * 7);
    size = grown;
    ASSERT_TRUE(poolM.GetUsedBytes() == size && VekMempool::SizeOf(p) == size) << size;
  }
  EXPECT_EQ(poolM.GetUsedBytesHighWater(), size) << "growing in place holds one block at a time";
  p = static_cast<unsigned char*>(poolM.Realloc(p, 10));
  for (size_t i = 0; i < 10; ++i) ASSERT_EQ(p[i], static_cast<unsigned char>(i * 7));
  EXPECT_TRUE(poolM.GetUsedBytes() == 10 && poolM.GetLiveBlocks() == 1);
  poolM.Free(p);
}

// The explicit form names the argument type; a named (not temporary) argument must bind.
TEST_F(MempoolTest, MempoolNewTakesANamedArgumentOfTheNamedType) {
  ref<sarn::Dictionary> dictionary = new (&poolM) sarn::Dictionary();
  ref<sarn::Dict> dict = MempoolNew<sarn::Dict, ref<sarn::Dictionary>>(&poolM, dictionary);
  EXPECT_TRUE(dict && dict->GetDictionary().Get() == dictionary.Get());
}

#if defined(__SANITIZE_ADDRESS__)
TEST(MempoolDeathTest, UseAfterFreeOfAPoolBlockIsCaught) {
  VekMempool pool("poisoned");
  volatile char* p = static_cast<char*>(pool.Malloc(48));
  pool.Free(pool.Malloc(48));  // keeps the slab in use
  void* keep = pool.Malloc(48);
  pool.Free(const_cast<char*>(p));
  EXPECT_DEATH(p[3] = 1, "use-after-poison");
  pool.Free(keep);
}
#endif

TEST(MempoolDeathTest, PoolDestroyedWithLiveBlocksIsReported) {
  [[maybe_unused]] const char* message = "VekMempool 'leaky' destroyed with 2 live blocks \\(40 bytes\\)";
  auto destroyLeaky = [] {
    auto* pool = new VekMempool("leaky");
    pool->Malloc(8);
    pool->Malloc(32);
    delete pool;
  };
#ifdef NDEBUG
  // Release builds report and go on (the blocks stay allocated).
  testing::internal::CaptureStderr();
  destroyLeaky();
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "VekMempool 'leaky' destroyed with 2 live blocks (40 bytes)\n");
#else
  EXPECT_DEATH(destroyLeaky(), message);
#endif
}

}  // namespace
