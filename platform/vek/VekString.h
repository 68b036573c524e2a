// VekString: an immutable, reference-counted UTF-8 string, one pointer wide.
//
// Copies share one representation (VekStringRepN) whose count changes atomically, so strings
// may be copied across threads. The empty string holds no representation at all. The bytes
// are not checked for UTF-8 validity and may contain NUL; Utf8() is always NUL-terminated.
// Positions (FindString, Left, Right, Middle, AdvancePos, GetCharacterPos) are byte
// positions, and a position never exceeds NByte().
//
// VekStringArray: an ordered list of strings with a 16-bit count (at most 65,535 strings).
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "vek/VekMempool.h"
#include "vek/VekSpinLock.h"

// The shared representation: count, length, pool, then the bytes and a NUL.
//
// A representation is a block of its own, or embedded in a larger block that its maker
// allocated (a value and its text in one block, say; see VekString::Embed). The pool word
// says which: pools are aligned to 64 bytes, so its low six bits hold the representation's
// distance from its block's start in units of 8 bytes, 0 for a block of its own. Freeing the
// representation frees that block.
struct VekStringRepN {
  static constexpr uintptr_t kOffsetMask = 63;
  static constexpr size_t kMaxEmbedOffset = kOffsetMask * 8;

  std::atomic<uint32_t> refCountM;
  uint32_t nByteM;
  uintptr_t poolAndOffsetM;
  char* Data() { return reinterpret_cast<char*>(this + 1); }
  const char* Data() const { return reinterpret_cast<const char*>(this + 1); }
  VekMempool* Pool() const { return reinterpret_cast<VekMempool*>(poolAndOffsetM & ~kOffsetMask); }
  void FreeBlock() {
    Pool()->Free(reinterpret_cast<char*>(this) - (poolAndOffsetM & kOffsetMask) * 8);
  }
};
static_assert(alignof(VekMempool) >= VekStringRepN::kOffsetMask + 1, "a pool's address leaves six low bits free");

class VekString {
 public:
  VekString() : pRepM(nullptr) {}
  // Copies a NUL-terminated text into the default pool; null gives the empty string.
  VekString(const char* text);
  VekString(const VekString& other) : pRepM(other.pRepM) {
    if (pRepM != nullptr) pRepM->refCountM.fetch_add(1, std::memory_order_relaxed);
  }
  VekString(VekString&& other) noexcept : pRepM(other.pRepM) { other.pRepM = nullptr; }
  ~VekString() { Release(); }
  // Copies and releases are inline: readers and trees make and drop texts by the million, and a
  // call into this library for each costs more than the work.
  VekString& operator=(const VekString& other) {
    // Take the representation before releasing ours: `other` may be this very string.
    VekStringRepN* rep = other.pRepM;
    if (rep != nullptr) rep->refCountM.fetch_add(1, std::memory_order_relaxed);
    Release();
    pRepM = rep;
    return *this;
  }
  VekString& operator=(VekString&& other) noexcept {
    if (this != &other) {
      Release();
      pRepM = other.pRepM;
      other.pRepM = nullptr;
    }
    return *this;
  }

  // Copies `nByte` bytes (which may include NUL) into `pool` (null: the default pool).
  static VekString FromUtf8Bytes(VekMempool* pool, size_t nByte, const void* bytes);
  // Places a representation of `nByte` bytes (copied from `bytes`, then a NUL) `offset` bytes
  // into `block`, a block of `pool` that the caller allocated with room for it; `offset` is a
  // multiple of 8 of at most VekStringRepN::kMaxEmbedOffset, and nByte is not 0. From then on
  // the representation owns the block: the block is freed when the last reference to the
  // representation goes. It starts with two references, the string returned and one kept by
  // the caller for the bytes before the representation, given up with DropEmbedded (the block
  // then outlives the caller's part for as long as a copy of the text lives).
  static VekString Embed(VekMempool* pool, void* block, size_t offset, size_t nByte, const void* bytes);
  static void DropEmbedded(VekStringRepN* rep) { ReleaseRep(rep); }
  // A copy whose count is raised with a plain store instead of a locked instruction, for a text
  // that no other thread can reach yet (a reader's cache of the keys of the tree it is building).
  VekString CopyUnshared() const {
    VekString copy;
    copy.pRepM = pRepM;
    if (pRepM != nullptr) {
      pRepM->refCountM.store(pRepM->refCountM.load(std::memory_order_relaxed) + 1, std::memory_order_relaxed);
    }
    return copy;
  }
  // Empties the string and hands its reference to the caller, with the representation (null
  // for the empty string): the count is left as it is.
  VekStringRepN* Detach() {
    VekStringRepN* rep = pRepM;
    pRepM = nullptr;
    return rep;
  }
  // printf-style formatting into `pool`.
  static VekString Format(VekMempool* pool, const char* format, ...) __attribute__((format(printf, 2, 3)));

  const char* Utf8() const { return pRepM != nullptr ? pRepM->Data() : ""; }
  size_t NByte() const { return pRepM != nullptr ? pRepM->nByteM : 0; }
  bool FEmpty() const { return pRepM == nullptr; }
  // Byte-for-byte equality.
  bool FEqual(const VekString& other) const;
  bool FEqual(const char* text) const;
  bool operator==(const VekString& other) const { return FEqual(other); }
  bool operator!=(const VekString& other) const { return !FEqual(other); }
  bool operator==(const char* text) const { return FEqual(text); }
  bool operator!=(const char* text) const { return !FEqual(text); }

  // Byte position of the first occurrence of `needle` at or after `startPos`, or -1.
  // An empty needle is found at startPos (when startPos <= NByte()).
  long FindString(const VekString& needle, long startPos = 0) const;
  long FindString(const char* needle, long startPos = 0) const;
  // The bytes before position `pos`.
  VekString Left(long pos) const;
  // The bytes from position `pos` to the end.
  VekString Right(long pos) const;
  // The bytes from `startPos` up to (not including) `endPos`.
  VekString Middle(long startPos, long endPos) const;
  // The position `count` bytes after `pos`, clamped to NByte().
  long AdvancePos(long pos, long count) const;
  // The position of the byte with index `index`, clamped to NByte().
  long GetCharacterPos(long index) const;

  // The shared representation (null for the empty string), for hash tables that key by it.
  VekStringRepN* GetRep() const { return pRepM; }
  VekMempool* GetMempool() const { return pRepM != nullptr ? pRepM->Pool() : nullptr; }

 private:
  static VekStringRepN* NewRep(VekMempool* pool, size_t nByte);
  VekString Slice(long startPos, long endPos) const;
  void Release() {
    VekStringRepN* rep = pRepM;
    pRepM = nullptr;
    if (rep != nullptr) ReleaseRep(rep);
  }
  static void ReleaseRep(VekStringRepN* rep) {
    // The sole holder frees without a locked instruction (nobody else can copy it any more).
    if (rep->refCountM.load(std::memory_order_acquire) == 1 ||
        rep->refCountM.fetch_sub(1, std::memory_order_acq_rel) == 1) {
      rep->FreeBlock();
    }
  }
  VekStringRepN* pRepM;
};
static_assert(sizeof(VekString) == sizeof(void*), "VekString is one pointer");

class VekStringArray {
 public:
  static constexpr uint16_t kMaxCount = 65535;
  explicit VekStringArray(VekMempool* pool);
  ~VekStringArray() { Destroy(); }
  VekStringArray(const VekStringArray&) = delete;
  VekStringArray& operator=(const VekStringArray&) = delete;

  // Appends a copy (a shared reference) of `text`. Returns false, changing nothing, when the
  // array already holds 65,535 strings or memory runs out.
  bool Add(const VekString& text);
  uint16_t Count() const { return countM; }
  // i must be below Count().
  const VekString& Get(int i) const { return vDataM[i]; }
  const VekString& operator[](int i) const { return vDataM[i]; }
  void Set(int i, const VekString& text) { vDataM[i] = text; }
  // Removes element i (later ones move down); false when i is out of range.
  bool RemoveAt(int i);
  // Removes the first element equal to `text`; false when there is none.
  bool Remove(const VekString& text);
  // Sorts by the bytes of the strings (strcmp order, shorter prefix first).
  void Sort();
  void Clear();
  // Clears and frees the storage; the array stays usable.
  void Destroy();
  void SetDebugLockOwner(VekLockId id) { lockOwnerM = id; }
  VekLockId GetDebugLockOwner() const { return lockOwnerM; }
  VekMempool* GetMempool() const { return pMempoolM; }

 private:
  bool Grow();
  VekMempool* pMempoolM;
  VekString* vDataM;
  uint16_t countM;
  uint16_t capacityM;
  VekLockId lockOwnerM;
};
static_assert(sizeof(VekStringArray) == 24 && alignof(VekStringArray) == 8, "VekStringArray layout");
