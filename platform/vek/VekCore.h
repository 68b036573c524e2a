// VekCore: the reference-counted base object, and its counted pointer ref<T>.
//
// Objects are made in a pool with the counted new and start with a count of 0; the first
// ref<T> takes the first reference:
//     ref<Thing> p = new (pool) Thing(args...);
// The counted new never throws: when the pool cannot supply the bytes the new-expression is null
// (no constructor runs, no argument is leaked by the object), so every caller checks the result.
// The last DownRef() runs the virtual destructor and returns the memory to the object's pool.
// Counts change atomically, so references may be taken and dropped on several threads; the
// object itself is not locked.
//
// Layout (the schema's object layout relies on it): the virtual table pointer, the pool
// pointer and a 32-bit count, so a derived class's first 32-bit member sits at byte 20.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <new>
#include <utility>

#include "vek/VekMempool.h"

class VekCore {
 public:
  VekCore();
  virtual ~VekCore();
  VekCore(const VekCore&) = delete;
  VekCore& operator=(const VekCore&) = delete;

  // The counted new: the object remembers `pool` and is freed back to it. Null when memory
  // runs out; being noexcept, the new-expression then skips the constructor and is null too.
  static void* operator new(size_t size, VekMempool* pool) noexcept;
  static void operator delete(void* p);
  // Called only when a constructor throws after the counted new.
  static void operator delete(void* p, VekMempool* pool) noexcept;

  VekMempool* GetMempool() const { return pMempoolM; }
  void UpRef() const { refCountM.fetch_add(1, std::memory_order_relaxed); }
  // UpRef with a plain store instead of a locked instruction, for an object that no other
  // thread can reach yet (a reader attaching the nodes it has just made to its own new tree).
  void UpRefUnshared() const {
    refCountM.store(refCountM.load(std::memory_order_relaxed) + 1, std::memory_order_relaxed);
  }
  // Drops one reference; the last one destroys the object. The sole holder needs no locked
  // instruction: with the count at 1 nobody else can take a reference any more.
  void DownRef() const {
    if (refCountM.load(std::memory_order_acquire) == 1 || refCountM.fetch_sub(1, std::memory_order_acq_rel) == 1) {
      delete this;
    }
  }
  uint32_t GetRefCount() const { return refCountM.load(std::memory_order_relaxed); }

  // The platform's cast helper: answers whether the object is of the class identified by
  // `classKey`. VekCore knows only itself; nothing in the library overrides it.
  virtual const void* ZoCastHelper(const void* classKey) const;

 protected:
  VekMempool* pMempoolM;
  mutable std::atomic<uint32_t> refCountM;
};

static_assert(sizeof(void*) == 8, "64-bit platform expected");

namespace vekinternal {
// A derived class whose first member is 32 bits wide: it fits in VekCore's tail padding
// (bytes 20..23) only when VekCore's data ends at byte 20, so the derived object stays 24 bytes.
struct VekCoreLayoutProbe : VekCore {
  uint32_t firstM;
};
}  // namespace vekinternal
static_assert(sizeof(VekCore) == 24 && alignof(VekCore) == 8, "VekCore is vtable, pool, 32-bit count");
static_assert(sizeof(vekinternal::VekCoreLayoutProbe) == 24, "a derived class's first 32-bit member sits at byte 20");

// Counted pointer, shallow-const like std::shared_ptr.
template <class T>
class ref {
 public:
  ref() : pM(nullptr) {}
  ref(std::nullptr_t) : pM(nullptr) {}
  ref(T* p) : pM(p) {
    if (pM != nullptr) pM->UpRef();
  }
  ref(const ref& other) : pM(other.pM) {
    if (pM != nullptr) pM->UpRef();
  }
  ref(ref&& other) noexcept : pM(other.pM) { other.pM = nullptr; }
  template <class U, class = typename std::enable_if<std::is_convertible<U*, T*>::value>::type>
  ref(const ref<U>& other) : pM(other.Get()) {
    if (pM != nullptr) pM->UpRef();
  }
  ~ref() {
    if (pM != nullptr) pM->DownRef();
  }
  ref& operator=(const ref& other) {
    T* old = pM;
    pM = other.pM;
    if (pM != nullptr) pM->UpRef();
    if (old != nullptr) old->DownRef();
    return *this;
  }
  ref& operator=(ref&& other) noexcept {
    if (this != &other) {
      T* old = pM;
      pM = other.pM;
      other.pM = nullptr;
      if (old != nullptr) old->DownRef();
    }
    return *this;
  }
  ref& operator=(T* p) { return *this = ref(p); }
  ref& operator=(std::nullptr_t) {
    Reset();
    return *this;
  }

  T* Get() const { return pM; }
  T* operator->() const { return pM; }
  T& operator*() const { return *pM; }
  explicit operator bool() const { return pM != nullptr; }
  void Reset() {
    T* old = pM;
    pM = nullptr;
    if (old != nullptr) old->DownRef();
  }

 private:
  T* pM;
};

template <class T, class U>
bool operator==(const ref<T>& a, const ref<U>& b) { return a.Get() == b.Get(); }
template <class T, class U>
bool operator!=(const ref<T>& a, const ref<U>& b) { return a.Get() != b.Get(); }
template <class T>
bool operator==(const ref<T>& a, std::nullptr_t) { return a.Get() == nullptr; }
template <class T>
bool operator==(std::nullptr_t, const ref<T>& a) { return a.Get() == nullptr; }
template <class T>
bool operator!=(const ref<T>& a, std::nullptr_t) { return a.Get() != nullptr; }
template <class T>
bool operator!=(std::nullptr_t, const ref<T>& a) { return a.Get() != nullptr; }

// Non-owning pointer with the same interface; the holder guarantees the object lives.
template <class T>
class nonRef {
 public:
  nonRef() : pM(nullptr) {}
  nonRef(std::nullptr_t) : pM(nullptr) {}
  nonRef(T* p) : pM(p) {}
  template <class U, class = typename std::enable_if<std::is_convertible<U*, T*>::value>::type>
  nonRef(const ref<U>& other) : pM(other.Get()) {}
  template <class U, class = typename std::enable_if<std::is_convertible<U*, T*>::value>::type>
  nonRef(const nonRef<U>& other) : pM(other.Get()) {}
  T* Get() const { return pM; }
  T* operator->() const { return pM; }
  T& operator*() const { return *pM; }
  explicit operator bool() const { return pM != nullptr; }
  bool operator==(const nonRef& other) const { return pM == other.pM; }
  bool operator!=(const nonRef& other) const { return pM != other.pM; }
  bool operator==(std::nullptr_t) const { return pM == nullptr; }
  bool operator!=(std::nullptr_t) const { return pM != nullptr; }

 private:
  T* pM;
};

static_assert(sizeof(ref<VekCore>) == sizeof(void*), "ref<T> is one pointer");
static_assert(sizeof(nonRef<VekCore>) == sizeof(void*), "nonRef<T> is one pointer");

// Allocates a T in `pool` from one constructor argument; null when memory runs out. The argument
// is taken by constant reference so that the explicit form MempoolNew<Dict, ref<Dictionary>>(pool,
// dictionary) accepts a named argument.
template <class T, class A>
ref<T> MempoolNew(VekMempool* pool, const A& arg) {
  return ref<T>(new (pool) T(arg));
}
