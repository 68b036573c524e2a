#include <atomic>
#include <cstdint>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

namespace {

using sarntest::Str;

// Reference: lookup3's hashlittle written from its published description with the classic
// mix/final macros, reading the key through 32-bit little-endian loads of a zero-padded copy.
#define REF_ROT(x, k) (((x) << (k)) | ((x) >> (32 - (k))))
#define REF_MIX(a, b, c) \
  { a -= c; a ^= REF_ROT(c, 4); c += b; b -= a; b ^= REF_ROT(a, 6); a += c; \
    c -= b; c ^= REF_ROT(b, 8); b += a; a -= c; a ^= REF_ROT(c, 16); c += b; \
    b -= a; b ^= REF_ROT(a, 19); a += c; c -= b; c ^= REF_ROT(b, 4); b += a; }
#define REF_FINAL(a, b, c) \
  { c ^= b; c -= REF_ROT(b, 14); a ^= c; a -= REF_ROT(c, 11); b ^= a; b -= REF_ROT(a, 25); \
    c ^= b; c -= REF_ROT(b, 16); a ^= c; a -= REF_ROT(c, 4); b ^= a; b -= REF_ROT(a, 14); \
    c ^= b; c -= REF_ROT(b, 24); }

uint32_t ReferenceHash(const std::string& key, bool mixEmptyKey) {
  std::string padded = key + std::string(12, '\0');
  auto word = [&](size_t at) {
    uint32_t w;
    std::memcpy(&w, padded.data() + at, 4);  // the test machine is little-endian
    return w;
  };
  uint32_t length = static_cast<uint32_t>(key.size());
  uint32_t a, b, c;
  a = b = c = 0xdeadbeef + length;
  size_t at = 0;
  while (length > 12) {
    a += word(at);
    b += word(at + 4);
    c += word(at + 8);
    REF_MIX(a, b, c);
    length -= 12;
    at += 12;
  }
  if (length == 0 && !mixEmptyKey) return c;
  // The zero padding stands in for the masked tail.
  a += word(at) & (length >= 4 ? 0xffffffffu : (1u << (8 * length)) - 1);
  if (length > 4) b += word(at + 4) & (length >= 8 ? 0xffffffffu : (1u << (8 * (length - 4))) - 1);
  if (length > 8) c += word(at + 8) & (length >= 12 ? 0xffffffffu : (1u << (8 * (length - 8))) - 1);
  REF_FINAL(a, b, c);
  return c;
}

uint32_t Hash(const std::string& key) {
  return SarnHashTableUtil::Hash(reinterpret_cast<const unsigned char*>(key.data()), static_cast<int>(key.size()));
}

TEST(SarnHashTableUtilTest, HashMatchesTheReference) {
  EXPECT_EQ(Hash("Four score and seven years ago"), 0x17770551u) << "lookup3's published value";
  EXPECT_EQ(Hash(""), ReferenceHash("", true));
  EXPECT_NE(Hash(""), 0xdeadbeefu) << "the empty key is mixed";
  EXPECT_EQ(ReferenceHash("", false), 0xdeadbeefu);
  std::string bytes;
  for (int i = 0; i < 40; ++i) bytes.push_back(static_cast<char>(0x80 + i * 37));
  for (size_t n : {1, 11, 12, 13, 24, 25, 36, 37}) {
    EXPECT_EQ(Hash(bytes.substr(0, n)), ReferenceHash(bytes.substr(0, n), true)) << n << " bytes";
    EXPECT_EQ(Hash(std::string("abcdefghijklmnopqrstuvwxyz0123456789").substr(0, n)),
              ReferenceHash(std::string("abcdefghijklmnopqrstuvwxyz0123456789").substr(0, n), true))
        << n << " letters";
  }
  EXPECT_EQ(SarnHashTableUtilTemplate<const char*>::DefaultHash(nullptr), 0u);
  const char* key = "address";
  EXPECT_EQ(SarnHashTableUtilTemplate<const char*>::DefaultHash(key), Hash("address"));
}

// A small instantiation: 2 inline nodes, so blocks are exercised early.
typedef SarnHashTable<const char*, VekString, 2, 256, SarnHashTableUtilTemplate<const char*>::DefaultHash,
                      SarnHashTableUtilTemplate<const char*>::DefaultKeyCompare,
                      SarnHashTableUtilTemplate<VekString>::DefaultValueCompare,
                      SarnHashTableUtilTemplate<const char*>::DefaultClear,
                      SarnHashTableUtilTemplate<VekString>::DefaultClear>
    SmallTable;

class SarnHashTableTest : public sarntest::PoolTest {
 protected:
  SarnHashTableTest() {
    for (int i = 0; i < 5000; ++i) keysM.push_back("key" + std::to_string(i));
  }
  std::vector<std::string> keysM;
};

TEST_F(SarnHashTableTest, PutFindsAddsAndGrowsAtThe40thEntry) {
  static_assert(SmallTable::kNodesPerBlock == 6, "six 40-byte nodes after a 16-byte header");
  SmallTable table(&poolM);
  EXPECT_EQ(table.loadPercentM, 75);
  VekString* first = nullptr;
  EXPECT_FALSE(table.Put(keysM[0].c_str(), first));
  ASSERT_NE(first, nullptr);
  EXPECT_TRUE(first->FEmpty());
  *first = VekString("zero");
  std::string sameContent = keysM[0];
  VekString* again = nullptr;
  EXPECT_TRUE(table.Put(sameContent.c_str(), again)) << "keys compare by content";
  EXPECT_EQ(again, first);
  for (int i = 1; i < 39; ++i) {
    VekString* value;
    ASSERT_FALSE(table.Put(keysM[i].c_str(), value));
  }
  EXPECT_EQ(table.nEntryM, 39);
  EXPECT_EQ(table.nBucketM, 53) << "39 entries = 53 * 75 / 100 still fit";
  EXPECT_EQ(table.pBucketsM, table.inlineBucketsM);
  VekString* value;
  EXPECT_FALSE(table.Put(keysM[39].c_str(), value));
  EXPECT_EQ(table.nBucketM, 769);
  EXPECT_EQ(table.sizeIndexM, 1);
  EXPECT_NE(table.pBucketsM, table.inlineBucketsM);
  // Every entry survives the move to the new buckets, at the same address.
  EXPECT_TRUE(table.Put(keysM[0].c_str(), again));
  EXPECT_EQ(again, first);
  EXPECT_EQ(Str(*again), "zero");
  for (int i = 0; i < 40; ++i) ASSERT_TRUE(table.Put(keysM[i].c_str(), value)) << i;
  // 769 * 75 / 100 = 576 entries before the next step.
  for (int i = 40; i < 576; ++i) table.Put(keysM[i].c_str(), value);
  EXPECT_EQ(table.nBucketM, 769);
  table.Put(keysM[576].c_str(), value);
  EXPECT_EQ(table.nBucketM, 3079);
  EXPECT_EQ(table.sizeIndexM, 2);
}

TEST_F(SarnHashTableTest, NullKeyIsAKeyOfItsOwn) {
  SmallTable table(&poolM);
  VekString* a;
  VekString* b;
  EXPECT_FALSE(table.Put(nullptr, a));
  EXPECT_FALSE(table.Put("", b));
  EXPECT_NE(a, b);
  EXPECT_TRUE(table.Put(nullptr, b));
  EXPECT_EQ(a, b);
}

TEST_F(SarnHashTableTest, BlocksAreTakenFromThePoolAndReturnedByClear) {
  SmallTable table(&poolM);
  VekString* value;
  table.Put(keysM[0].c_str(), value);
  table.Put(keysM[1].c_str(), value);
  EXPECT_EQ(poolM.GetUsedBytes(), 0u) << "two inline nodes";
  EXPECT_EQ(table.pFreeM, nullptr);
  table.Put(keysM[2].c_str(), value);
  EXPECT_EQ(poolM.GetUsedBytes(), 256u) << "one block of six nodes";
  EXPECT_NE(table.pFreeM, nullptr);
  for (int i = 3; i < 8; ++i) table.Put(keysM[i].c_str(), value);
  EXPECT_EQ(poolM.GetUsedBytes(), 256u);
  table.Put(keysM[8].c_str(), value);
  EXPECT_EQ(poolM.GetUsedBytes(), 512u);
  for (int i = 9; i < 100; ++i) {
    table.Put(keysM[i].c_str(), value);
    *value = VekString(keysM[i].c_str());
  }
  table.Clear();
  EXPECT_EQ(table.nEntryM, 0);
  EXPECT_EQ(table.nBucketM, 53);
  EXPECT_EQ(table.sizeIndexM, 0);
  EXPECT_EQ(table.pBucketsM, table.inlineBucketsM);
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
  EXPECT_FALSE(table.Put(keysM[5].c_str(), value));
  EXPECT_TRUE(value->FEmpty()) << "a reused node's value was cleared";
  EXPECT_TRUE(table.Put(keysM[5].c_str(), value));
  EXPECT_EQ(poolM.GetUsedBytes(), 0u);
}

TEST_F(SarnHashTableTest, NameTableHoldsItsInlineNodesWithoutAllocating) {
  std::unique_ptr<sarn::SarnNameTable> table(new sarn::SarnNameTable(&poolM));
  VekString* value;
  for (int i = 0; i < 3079; ++i) table->Put(keysM[i].c_str(), value);
  size_t buckets = poolM.GetUsedBytes();
  EXPECT_EQ(buckets, 12289u * sizeof(void*)) << "only the bucket array came from the pool";
  table->Put(keysM[3079].c_str(), value);
  EXPECT_EQ(poolM.GetUsedBytes(), buckets + 256);
  table.reset();
}

TEST_F(SarnHashTableTest, GlobalNameCacheSharesNamesAndIsRebuilt) {
  sarn::DestroyGlobalSarnHashTable();
  const VekString* first = sarn::GetGlobalName(&poolM, "channelIdentifier");
  ASSERT_NE(first, nullptr);
  EXPECT_EQ(Str(*first), "channelIdentifier");
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
  ASSERT_NE(rebuilt, nullptr);
  EXPECT_EQ(Str(*rebuilt), "channelIdentifier");
  EXPECT_EQ(sarn::GetGlobalName(&poolM, keysM[4000].c_str()), sarn::GetGlobalName(nullptr, keysM[4000].c_str()));
  sarn::DestroyGlobalSarnHashTable();
}

TEST_F(SarnHashTableTest, GlobalNameCacheFromTwoThreads) {
  sarn::DestroyGlobalSarnHashTable();
  std::vector<const VekString*> seen[2];
  std::atomic<bool> go(false);
  auto work = [&](int which) {
    while (!go.load()) {
    }
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
    ASSERT_EQ(fromA, fromB) << keysM[i];
    ASSERT_EQ(Str(*fromA), keysM[i]);
  }
  sarn::DestroyGlobalSarnHashTable();
}

}  // namespace
