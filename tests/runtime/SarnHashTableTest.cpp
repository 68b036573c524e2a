#include <algorithm>
#include <atomic>
#include <cstring>
#include <cstdint>
#include <memory>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

namespace {

using sarntest::Str;

// Reference: lookup3's hashlittle written from its published description, reading the key
// through 32-bit little-endian loads of a zero-padded copy. Each round of mix and final is
// x -= y, x ^= rot(y, k), y += z (mix) or x ^= y, x -= rot(y, k) (final) over rotating roles.
uint32_t ReferenceHash(const std::string& key) {
  auto rot = [](uint32_t x, int k) { return (x << k) | (x >> (32 - k)); };
  std::string padded = key + std::string(12, '\0');
  uint32_t length = static_cast<uint32_t>(key.size());
  uint32_t v[3] = {0xdeadbeef + length, 0xdeadbeef + length, 0xdeadbeef + length};  // a, b, c
  auto add = [&](size_t at, uint32_t n) {  // the next n <= 12 bytes into a, b and c
    for (int i = 0; i < 3; ++i) {
      uint32_t w;
      std::memcpy(&w, padded.data() + at + 4 * i, 4);  // the test machine is little-endian
      int bytes = std::max(0, std::min(4, static_cast<int>(n) - 4 * i));
      v[i] += w & (bytes == 4 ? 0xffffffffu : (1u << (8 * bytes)) - 1);
    }
  };
  size_t at = 0;
  for (; length > 12; length -= 12, at += 12) {
    add(at, 12);
    const int kRot[] = {4, 6, 8, 16, 19, 4};
    for (int i = 0; i < 6; ++i) {
      uint32_t &x = v[i % 3], &y = v[(i + 2) % 3], &z = v[(i + 1) % 3];
      x -= y, x ^= rot(y, kRot[i]), y += z;
    }
  }
  add(at, length);  // the zero padding stands in for the masked tail
  const int kRot[] = {14, 11, 25, 16, 4, 14, 24};
  for (int i = 0; i < 7; ++i) {
    uint32_t &x = v[(2 + i) % 3], &y = v[(1 + i) % 3];
    x ^= y, x -= rot(y, kRot[i]);
  }
  return v[2];
}

uint32_t Hash(const std::string& key) {
  return SarnHashTableUtil::Hash(reinterpret_cast<const unsigned char*>(key.data()), static_cast<int>(key.size()));
}

TEST(SarnHashTableUtilTest, HashMatchesTheReference) {
  EXPECT_EQ(Hash("Four score and seven years ago"), 0x17770551u) << "lookup3's published value";
  EXPECT_NE(Hash(""), 0xdeadbeefu) << "the empty key is mixed, unlike lookup3's";
  // Every length up to three blocks and a bit, over random bytes (high bits included).
  std::mt19937 random(5);
  std::string key;
  for (size_t n = 0; n <= 40; key.push_back(static_cast<char>(random())), ++n) {
    EXPECT_EQ(Hash(key), ReferenceHash(key)) << n << " bytes";
  }
  EXPECT_TRUE(SarnHashTableUtilTemplate<const char*>::DefaultHash(nullptr) == 0 &&
              SarnHashTableUtilTemplate<const char*>::DefaultHash("address") == Hash("address"));
}

// A small instantiation: 2 inline nodes, so blocks are exercised early.
typedef SarnHashTable<const char*, VekString, 2, 256, SarnHashTableUtilTemplate<const char*>::DefaultHash,
                      SarnHashTableUtilTemplate<const char*>::DefaultKeyCompare,
                      SarnHashTableUtilTemplate<VekString>::DefaultValueCompare,
                      SarnHashTableUtilTemplate<const char*>::DefaultClear,
                      SarnHashTableUtilTemplate<VekString>::DefaultClear>
    SmallTable;

struct SarnHashTableTest : sarntest::PoolTest {
  SarnHashTableTest() {
    for (int i = 0; i < 5000; ++i) keysM.push_back("key" + std::to_string(i));
  }
  std::vector<std::string> keysM;
};

TEST_F(SarnHashTableTest, PutFindsAddsAndGrowsAtTheLoadLimit) {
  static_assert(SmallTable::kNodesPerBlock == 6, "six 40-byte nodes after a 16-byte header");
  SmallTable table(&poolM);
  auto shape = [&table] {
    return std::to_string(table.nEntryM) + " in " + std::to_string(table.nBucketM) + " step " +
           std::to_string(table.sizeIndexM) + (table.pBucketsM == table.inlineBucketsM ? " inline" : "");
  };
  EXPECT_EQ(table.loadPercentM, 75);
  VekString* first = nullptr;
  VekString* value = nullptr;
  EXPECT_FALSE(table.Put(keysM[0].c_str(), first));
  ASSERT_TRUE(first != nullptr && first->FEmpty());
  *first = VekString("zero");
  std::string sameContent = keysM[0];
  EXPECT_TRUE(table.Put(sameContent.c_str(), value) && value == first) << "keys compare by content";
  // 53 * 75 / 100 = 39 entries fit the inline buckets, 769 * 75 / 100 = 576 the next step.
  for (int i = 1; i < 39; ++i) ASSERT_FALSE(table.Put(keysM[i].c_str(), value));
  EXPECT_EQ(shape(), "39 in 53 step 0 inline");
  EXPECT_TRUE(!table.Put(keysM[39].c_str(), value) && shape() == "40 in 769 step 1") << shape();
  // Every entry survives the move to the new buckets, at the same address.
  EXPECT_TRUE(table.Put(keysM[0].c_str(), value) && value == first && Str(*value) == "zero");
  for (int i = 0; i < 40; ++i) ASSERT_TRUE(table.Put(keysM[i].c_str(), value)) << i;
  for (int i = 40; i < 576; ++i) table.Put(keysM[i].c_str(), value);
  EXPECT_EQ(shape(), "576 in 769 step 1");
  table.Put(keysM[576].c_str(), value);
  EXPECT_EQ(shape(), "577 in 3079 step 2");
  // The null key is a key of its own, apart from the empty one.
  VekString *null1, *null2, *empty;
  EXPECT_FALSE(table.Put(nullptr, null1));
  EXPECT_FALSE(table.Put("", empty));
  EXPECT_TRUE(table.Put(nullptr, null2) && null1 == null2 && null1 != empty);
}

TEST_F(SarnHashTableTest, BlocksAreTakenFromThePoolAndReturnedByClear) {
  SmallTable table(&poolM);
  VekString* value;
  std::vector<size_t> used;  // after 2 (the inline nodes), 3, 8 and 9 entries
  for (int i = 0; i < 100; ++i) {
    table.Put(keysM[i].c_str(), value);
    *value = VekString(keysM[i].c_str());
    if (i == 1 || i == 2 || i == 7 || i == 8) used.push_back(poolM.GetUsedBytes());
  }
  EXPECT_EQ(used, std::vector<size_t>({0, 256, 256, 512})) << "blocks of six nodes";
  table.Clear();
  EXPECT_EQ(std::vector<int>({table.nEntryM, table.nBucketM, table.sizeIndexM, table.pBucketsM == table.inlineBucketsM}),
            std::vector<int>({0, 53, 0, 1}));
  EXPECT_EQ(poolM.GetUsedBytes(), 0u) << "every block and bucket array went back";
  // The two inline nodes are free again, and the table works as new.
  int nFree = 0;
  SmallTable::Node* node = table.pFreeM;
  do {
    ++nFree;
    EXPECT_EQ(node->pBlockM, nullptr);
    node = node->pNextM;
  } while (node != table.pFreeM);
  EXPECT_EQ(nFree, 2);
  EXPECT_TRUE(!table.Put(keysM[5].c_str(), value) && value->FEmpty()) << "a reused node's value was cleared";
  EXPECT_TRUE(table.Put(keysM[5].c_str(), value) && poolM.GetUsedBytes() == 0);
}

TEST_F(SarnHashTableTest, NameTableHoldsItsInlineNodesWithoutAllocating) {
  std::unique_ptr<sarn::SarnNameTable> table(new sarn::SarnNameTable(&poolM));
  VekString* value;
  for (int i = 0; i < 3079; ++i) table->Put(keysM[i].c_str(), value);
  size_t buckets = poolM.GetUsedBytes();
  EXPECT_EQ(buckets, 12289u * sizeof(void*)) << "only the bucket array came from the pool";
  table->Put(keysM[3079].c_str(), value);
  EXPECT_EQ(poolM.GetUsedBytes(), buckets + 256);
}

TEST_F(SarnHashTableTest, GlobalNameCacheSharesNamesAndIsRebuilt) {
  sarn::DestroyGlobalSarnHashTable();
  const VekString* first = sarn::GetGlobalName(&poolM, "channelIdentifier");
  ASSERT_TRUE(first != nullptr && Str(*first) == "channelIdentifier");
  std::string other = "channelIdentifier";
  EXPECT_EQ(sarn::GetGlobalName(&poolM, other.c_str()), first) << "equal names share one string";
  VekString kept = *first;
  // Far more names than inline nodes: the caller's pool is never touched.
  for (const std::string& key : keysM) ASSERT_EQ(Str(*sarn::GetGlobalName(&poolM, key.c_str())), key);
  EXPECT_EQ(poolM.GetUsedBytes(), 0u);
  sarn::DestroyGlobalSarnHashTable();
  sarn::DestroyGlobalSarnHashTable();
  EXPECT_EQ(Str(kept), "channelIdentifier") << "a copy outlives the cache";
  const VekString* rebuilt = sarn::GetGlobalName(&poolM, "channelIdentifier");
  ASSERT_TRUE(rebuilt != nullptr && Str(*rebuilt) == "channelIdentifier");
  EXPECT_EQ(sarn::GetGlobalName(&poolM, keysM[4000].c_str()), sarn::GetGlobalName(nullptr, keysM[4000].c_str()));
  sarn::DestroyGlobalSarnHashTable();
}

TEST_F(SarnHashTableTest, GlobalNameCacheFromTwoThreads) {
  sarn::DestroyGlobalSarnHashTable();
  std::vector<const VekString*> seen[2];
  std::atomic<bool> go(false);
  auto work = [&](int which) {
    while (!go.load()) {}
    // The two threads walk the names in opposite orders so that they create and find the
    // same entries at the same time.
    for (int round = 0; round < 3; ++round) {
      for (size_t i = 0; i < keysM.size(); ++i) {
        size_t at = which == 0 ? i : keysM.size() - 1 - i;
        const VekString* name = sarn::GetGlobalName(nullptr, keysM[at].c_str());
        if (round == 0) seen[which].push_back(name);
      }
    }
  };
  std::thread a(work, 0);
  std::thread b(work, 1);
  go.store(true);
  a.join();
  b.join();
  for (size_t i = 0; i < keysM.size(); ++i) {
    const VekString* fromA = seen[0][i];
    const VekString* fromB = seen[1][keysM.size() - 1 - i];
    ASSERT_TRUE(fromA == fromB && Str(*fromA) == keysM[i]) << keysM[i];
  }
  sarn::DestroyGlobalSarnHashTable();
}

}  // namespace
