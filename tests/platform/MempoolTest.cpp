// Pools: exact accounting through every allocation path, from one thread and from several,
// and the report of a pool destroyed with live blocks.
#include <atomic>
#include <cstring>
#include <thread>
#include <vector>

#include "testutil/TestUtil.h"

namespace {

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
    EXPECT_EQ(VekMempool::SizeOf(p), size);
    EXPECT_EQ(VekMempool::PoolOf(p), &poolM);
    std::memset(p, 0xab, size);
    blocks.push_back(p);
    expected += size;
    EXPECT_EQ(poolM.GetUsedBytes(), expected);
  }
  EXPECT_EQ(poolM.GetLiveBlocks(), blocks.size());
  EXPECT_EQ(poolM.GetUsedBytesHighWater(), expected);
  for (void* p : blocks) {
    expected -= VekMempool::SizeOf(p);
    poolM.Free(p);
    EXPECT_EQ(poolM.GetUsedBytes(), expected);
  }
  EXPECT_EQ(poolM.GetLiveBlocks(), 0u);
  EXPECT_EQ(poolM.GetUsedBytesHighWater(), 105681u) << "high water stays at the peak";
  poolM.Free(nullptr);
  EXPECT_EQ(VekMempool::PoolOf(nullptr), nullptr);
}

TEST_F(MempoolTest, ReallocKeepsBytesAndAccountingAcrossClasses) {
  char* p = static_cast<char*>(poolM.Realloc(nullptr, 20));
  ASSERT_NE(p, nullptr);
  for (int i = 0; i < 20; ++i) p[i] = static_cast<char>(i);
  // Same class (17..32): stays in place.
  char* q = static_cast<char*>(poolM.Realloc(p, 32));
  EXPECT_EQ(q, p);
  EXPECT_EQ(poolM.GetUsedBytes(), 32u);
  // Up to another small class, then to a large block, then back down to a small one.
  for (size_t size : {200u, 5000u, 10u}) {
    q = static_cast<char*>(poolM.Realloc(q, size));
    ASSERT_NE(q, nullptr);
    EXPECT_EQ(poolM.GetUsedBytes(), size);
    EXPECT_EQ(poolM.GetLiveBlocks(), 1u);
    for (int i = 0; i < 10; ++i) ASSERT_EQ(q[i], static_cast<char>(i)) << "after growing to " << size;
  }
  EXPECT_EQ(poolM.GetUsedBytesHighWater(), 5000u + 200u) << "the copy briefly holds both blocks";
  poolM.Free(q);
}

TEST_F(MempoolTest, CallocZeroesRecycledBlocksAndRefusesOverflow) {
  void* p = poolM.Malloc(48);
  std::memset(p, 0xff, 48);
  poolM.Free(p);
  unsigned char* z = static_cast<unsigned char*>(poolM.Calloc(6, 8));
  ASSERT_NE(z, nullptr);
  for (int i = 0; i < 48; ++i) ASSERT_EQ(z[i], 0) << i;
  EXPECT_EQ(poolM.GetUsedBytes(), 48u);
  poolM.Free(z);
  EXPECT_EQ(poolM.Calloc(SIZE_MAX / 2, 3), nullptr);
  EXPECT_EQ(poolM.Malloc(SIZE_MAX - 4), nullptr);
  EXPECT_EQ(poolM.GetLiveBlocks(), 0u);
}

TEST_F(MempoolTest, FreeListsRecycleBlocksOfTheSameClass) {
#if defined(__SANITIZE_ADDRESS__)
  GTEST_SKIP() << "the sanitizer build returns every block to the C library";
#endif
  void* a = poolM.Malloc(100);
  poolM.Free(a);
  void* b = poolM.Malloc(112);  // 97..112 is a's class
  EXPECT_EQ(b, a);
  void* c = poolM.Malloc(113);  // the next class gets a block of its own
  EXPECT_NE(c, a);
  poolM.Free(b);
  poolM.Free(c);
}

// Two threads allocate from one pool and free each other's blocks: the counts come back to
// exactly zero, and in between they are exact at every point where the threads are joined.
TEST_F(MempoolTest, AccountingIsExactAcrossThreads) {
  constexpr int kRounds = 20000;
  std::vector<void*> fromOwner(kRounds), fromOther(kRounds);
  size_t ownerBytes = 0, otherBytes = 0;
  for (int i = 0; i < kRounds; ++i) {
    fromOwner[i] = poolM.Malloc(static_cast<size_t>(i % 700));
    ownerBytes += static_cast<size_t>(i % 700);
  }
  std::thread other([&] {
    for (int i = 0; i < kRounds; ++i) {
      fromOther[i] = poolM.Malloc(static_cast<size_t>((i * 7) % 600));
      otherBytes += static_cast<size_t>((i * 7) % 600);
    }
  });
  other.join();
  EXPECT_EQ(poolM.GetUsedBytes(), ownerBytes + otherBytes);
  EXPECT_EQ(poolM.GetLiveBlocks(), 2u * kRounds);

  // Two more threads free those blocks (one thread's blocks each) while allocating and freeing
  // more; the owner thread allocates and frees at the same time.
  std::atomic<bool> go{false};
  auto churn = [&](std::vector<void*>& blocks, int salt) {
    while (!go.load()) {
    }
    for (int i = 0; i < kRounds; ++i) {
      void* p = poolM.Malloc(static_cast<size_t>((i * salt) % 520));
      poolM.Free(blocks[i]);
      poolM.Free(p);
    }
  };
  std::thread a(churn, std::ref(fromOther), 3);
  std::thread b(churn, std::ref(fromOwner), 5);
  go = true;
  for (int i = 0; i < kRounds; ++i) poolM.Free(poolM.Malloc(static_cast<size_t>(i % 530)));  // the owner too
  a.join();
  b.join();
  EXPECT_EQ(poolM.GetUsedBytes(), 0u);
  EXPECT_EQ(poolM.GetLiveBlocks(), 0u);
  EXPECT_GE(poolM.GetUsedBytesHighWater(), ownerBytes + otherBytes);
}

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
