// SarnHashTable: the library's chained hash table, and the global name cache built on it.
//
// SarnHashTable<Key, Value, nInlineNode, nBlockBytes, hash, keyCompare, valueCompare, keyClear,
// valueClear> keeps nInlineNode nodes and 53 buckets inside the object itself; more nodes come
// in blocks of nBlockBytes from its pool, more buckets as one array from its pool. It grows
// through the primes of SarnHashTableUtil::hashTableSizesG when an addition would pass 75 % of
// the buckets, and stops growing at 12,582,917 buckets. Entries are never removed one by one;
// Clear empties the table. valueCompare is part of the table's type but no operation needs it. A node never moves, so the address of a value stays valid until
// Clear. The table stores keys as given (for const char* keys: the pointer, compared by
// content), so a key must outlive its entry. Not locked.
//
// The global name cache turns the constant C strings of the schema metadata (field names, type
// names, enum names) into shared VekStrings once. Equal names from different places share one
// string. It is created on first use, guarded by one spin lock, and destroyed by
// DestroyGlobalSarnHashTable or at process exit. Its buckets and node blocks come from a pool
// of its own, created and destroyed with it, so no caller's pool has to outlive it; the strings
// themselves are in the default pool, so copies that callers keep stay valid after the cache is
// destroyed.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <new>

#include "sarn/base/Export.h"
#include "vek/VekMempool.h"
#include "vek/VekString.h"

class SARN_EXPORT SarnHashTableUtil {
 public:
  // Bucket counts by size index.
  static const int hashTableSizesG[16];
  // The 32-bit hash of `length` bytes (lookup3's byte-wise little-endian hash with initial value
  // 0, except that the empty key is mixed too rather than returning the seed).
  static unsigned int Hash(const unsigned char* data, int length);
};

// The default operations of a key or value type.
template <class T>
struct SarnHashTableUtilTemplate {
  static bool DefaultKeyCompare(const T& a, const T& b) { return a == b; }
  static bool DefaultValueCompare(const T& a, const T& b) { return a == b; }
  static void DefaultClear(T& value) { value = T(); }
};

template <>
struct SarnHashTableUtilTemplate<const char*> {
  // 0 for a null key.
  static unsigned int DefaultHash(const char* const& key) {
    return key == nullptr ? 0 : SarnHashTableUtil::Hash(reinterpret_cast<const unsigned char*>(key),
                                                        static_cast<int>(std::strlen(key)));
  }
  // Equal when both are null, or both are non-null with equal contents.
  static bool DefaultKeyCompare(const char* const& a, const char* const& b) {
    if (a == nullptr || b == nullptr) return a == b;
    return std::strcmp(a, b) == 0;
  }
  static void DefaultClear(const char*& key) { key = nullptr; }
};

template <>
struct SarnHashTableUtilTemplate<VekString> {
  static bool DefaultValueCompare(const VekString& a, const VekString& b) { return a.FEqual(b); }
  static void DefaultClear(VekString& value) { value = VekString(); }
};

template <class Key, class Value, int nInlineNode, int nBlockBytes, unsigned int (*hash)(const Key&),
          bool (*keyCompare)(const Key&, const Key&), bool (*valueCompare)(const Value&, const Value&),
          void (*keyClear)(Key&), void (*valueClear)(Value&)>
class SarnHashTable {
 public:
  struct Block;
  struct Node {
    Block* pBlockM;  // the overflow block holding the node, null for an inline node
    union {
      uint32_t hashM;  // while in use
      Node* pPrevM;    // while free: the free list's previous link
    };
    Node* pNextM;  // while in use: the bucket chain; while free: the free list's next link
    Key keyM;
    Value valueM;
  };
  // An overflow block: this header, then kNodesPerBlock nodes.
  struct Block {
    VekMempool* pMempoolM;
    int nFreeM;
  };
  static constexpr int kInlineBuckets = 53;
  static constexpr int kNodesPerBlock = static_cast<int>((nBlockBytes - sizeof(Block)) / sizeof(Node));
  static constexpr int kLastGrowableIndex = 11;
  static_assert(kNodesPerBlock >= 1, "a block must hold a node");
  static_assert(sizeof(Block) % alignof(Node) == 0, "nodes follow the block header");

  // An empty table: 53 inline buckets, every inline node free. Null `pool`: the default pool.
  explicit SarnHashTable(VekMempool* pool)
      : pMempoolM(pool != nullptr ? pool : VekMempool::Default()), loadPercentM(75), sizeIndexM(0), nBucketM(kInlineBuckets), nEntryM(0), inlineBucketsM(),
        pBucketsM(inlineBucketsM), inlineNodesM(), pFreeM(nullptr) {
    for (int i = nInlineNode - 1; i >= 0; --i) {
      inlineNodesM[i].pBlockM = nullptr;
      PushFree(&inlineNodesM[i]);
    }
  }
  // Clears (releasing every block and bucket array); the inline nodes go with the object.
  ~SarnHashTable() { Clear(); }
  SarnHashTable(const SarnHashTable&) = delete;
  SarnHashTable& operator=(const SarnHashTable&) = delete;

  // Finds or adds the entry of `key` and sets `value` to the address of its value. True when
  // the key was present; false when the entry was added (its value is then empty). When a node
  // block cannot be allocated, `value` is null and nothing is added.
  bool Put(const Key& key, Value*& value) {
    uint32_t h = hash(key);
    for (Node* node = pBucketsM[h % nBucketM]; node != nullptr; node = node->pNextM) {
      if (node->hashM == h && keyCompare(node->keyM, key)) {
        value = &node->valueM;
        return true;
      }
    }
    // Equality, not >=: the table grows when the entry that reaches the load is about to be
    // added. A bucket array that cannot be allocated leaves the chains to lengthen instead.
    if (nEntryM == nBucketM * loadPercentM / 100 && sizeIndexM <= kLastGrowableIndex) Grow();
    Node* node = TakeFree();
    if (node == nullptr) {
      value = nullptr;
      return false;
    }
    node->hashM = h;
    node->keyM = key;
    Node*& bucket = pBucketsM[h % nBucketM];
    node->pNextM = bucket;
    bucket = node;
    ++nEntryM;
    value = &node->valueM;
    return false;
  }

  // Removes every entry and returns to the 53 inline buckets. Inline nodes stay on the free
  // list; a block whose nodes are all free again is released.
  void Clear() {
    for (int b = 0; b < nBucketM; ++b) {
      Node* node = pBucketsM[b];
      while (node != nullptr) {
        Node* next = node->pNextM;
        keyClear(node->keyM);
        valueClear(node->valueM);
        PushFree(node);
        Block* block = node->pBlockM;
        if (block != nullptr && ++block->nFreeM == kNodesPerBlock) ReleaseBlock(block);
        node = next;
      }
    }
    if (pBucketsM != inlineBucketsM) {
      pMempoolM->Free(pBucketsM);
      pBucketsM = inlineBucketsM;
      sizeIndexM = 0;
      nBucketM = kInlineBuckets;
    }
    std::memset(inlineBucketsM, 0, sizeof inlineBucketsM);
    nEntryM = 0;
  }

  VekMempool* pMempoolM;
  int loadPercentM;
  int sizeIndexM;
  int nBucketM;
  int nEntryM;
  Node* inlineBucketsM[kInlineBuckets];
  Node** pBucketsM;
  Node inlineNodesM[nInlineNode];
  Node* pFreeM;  // head of the circular, doubly linked free list

 private:
  static Node* NodesOf(Block* block) {
    return reinterpret_cast<Node*>(reinterpret_cast<unsigned char*>(block) + sizeof(Block));
  }

  void Grow() {
    int nBucket = SarnHashTableUtil::hashTableSizesG[sizeIndexM + 1];
    Node** buckets = static_cast<Node**>(pMempoolM->Calloc(static_cast<size_t>(nBucket), sizeof(Node*)));
    if (buckets == nullptr) return;
    for (int b = 0; b < nBucketM; ++b) {
      Node* node = pBucketsM[b];
      while (node != nullptr) {
        Node* next = node->pNextM;
        Node*& bucket = buckets[node->hashM % static_cast<uint32_t>(nBucket)];
        node->pNextM = bucket;
        bucket = node;
        node = next;
      }
    }
    if (pBucketsM != inlineBucketsM) pMempoolM->Free(pBucketsM);
    pBucketsM = buckets;
    ++sizeIndexM;
    nBucketM = nBucket;
  }

  void PushFree(Node* node) {
    if (pFreeM == nullptr) {
      node->pPrevM = node;
      node->pNextM = node;
    } else {
      node->pNextM = pFreeM;
      node->pPrevM = pFreeM->pPrevM;
      pFreeM->pPrevM->pNextM = node;
      pFreeM->pPrevM = node;
    }
    pFreeM = node;
  }

  void UnlinkFree(Node* node) {
    if (node->pNextM == node) {
      pFreeM = nullptr;
    } else {
      node->pPrevM->pNextM = node->pNextM;
      node->pNextM->pPrevM = node->pPrevM;
      if (pFreeM == node) pFreeM = node->pNextM;
    }
  }

  // The head of the free list; with none free, a new block whose last node is used.
  Node* TakeFree() {
    Node* node = pFreeM;
    if (node == nullptr) {
      void* memory = pMempoolM->Malloc(static_cast<size_t>(nBlockBytes));
      if (memory == nullptr) return nullptr;
      Block* block = new (memory) Block{pMempoolM, kNodesPerBlock};
      Node* nodes = NodesOf(block);
      for (int i = 0; i < kNodesPerBlock; ++i) {
        new (&nodes[i]) Node();
        nodes[i].pBlockM = block;
        PushFree(&nodes[i]);
      }
      node = &nodes[kNodesPerBlock - 1];
    }
    UnlinkFree(node);
    if (node->pBlockM != nullptr) --node->pBlockM->nFreeM;
    return node;
  }

  void ReleaseBlock(Block* block) {
    Node* nodes = NodesOf(block);
    for (int i = 0; i < kNodesPerBlock; ++i) {
      UnlinkFree(&nodes[i]);
      nodes[i].~Node();
    }
    block->pMempoolM->Free(block);
  }
};

namespace sarn {

// The instantiation behind the name cache: C-string keys, string values, 3,079 inline nodes,
// 256-byte blocks of 6 nodes.
typedef SarnHashTable<const char*, VekString, 3079, 256, SarnHashTableUtilTemplate<const char*>::DefaultHash,
                      SarnHashTableUtilTemplate<const char*>::DefaultKeyCompare,
                      SarnHashTableUtilTemplate<VekString>::DefaultValueCompare,
                      SarnHashTableUtilTemplate<const char*>::DefaultClear,
                      SarnHashTableUtilTemplate<VekString>::DefaultClear>
    SarnNameTable;

// The shared string of `name`, made on first request. `name` must stay valid while the cache
// lives (metadata strings are constant). `pool` is not used: the cache has a pool of its own.
// The address stays valid until DestroyGlobalSarnHashTable; copy the string to keep it longer.
// Thread-safe. Null only when memory runs out.
SARN_EXPORT const VekString* GetGlobalName(VekMempool* pool, const char* name);

// Destroys the name cache; the next GetGlobalName builds a new one. No other thread may still
// be using an address the cache returned.
SARN_EXPORT void DestroyGlobalSarnHashTable();

// A static instance of this destroys the name cache at process exit.
class SARN_EXPORT SarnHashTableDestructor {
 public:
  ~SarnHashTableDestructor();
};

}  // namespace sarn
