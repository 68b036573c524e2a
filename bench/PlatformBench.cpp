// Pools against the C library's malloc/free, and string creation and copying, in one binary.
//
// Small blocks are 16..512 bytes drawn from a fixed sequence, so the pool and malloc see the
// same sizes in the same order. "Pair" frees each block right after allocating it; "Ring"
// keeps 256 blocks alive and replaces one per iteration, which exercises free lists holding
// blocks of many sizes. With two threads, Pool* gives each thread its own pool, SharedPool*
// makes both use one pool (the hard case: only one thread is the pool's owner, the other goes
// through its lock), and HandOff frees on one thread what the other allocated; malloc has
// per-thread caches of its own in every case.
#include <benchmark/benchmark.h>

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "sarn/Sarn.h"

namespace {

constexpr size_t kNumSizes = 1024;
constexpr size_t kRing = 256;

const std::vector<size_t>& Sizes() {
  static const std::vector<size_t> sizes = [] {
    std::vector<size_t> v(kNumSizes);
    uint32_t x = 12345;
    for (size_t& size : v) {
      x = x * 1103515245u + 12345u;
      size = 16 + (x >> 8) % (512 - 16 + 1);
    }
    return v;
  }();
  return sizes;
}

struct PoolAllocator {
  VekMempool* pPoolM;
  void* Malloc(size_t n) { return pPoolM->Malloc(n); }
  void Free(void* p) { pPoolM->Free(p); }
};

struct CAllocator {
  void* Malloc(size_t n) { return std::malloc(n); }
  void Free(void* p) { std::free(p); }
};

VekMempool* SharedPool() {
  static VekMempool* pool = new VekMempool("bench-shared");
  return pool;
}

template <class A>
void RunPair(benchmark::State& state, A allocator) {
  const std::vector<size_t>& sizes = Sizes();
  size_t i = static_cast<size_t>(state.thread_index()) * 7;
  for (auto _ : state) {
    void* p = allocator.Malloc(sizes[i++ % kNumSizes]);
    static_cast<char*>(p)[0] = 1;
    benchmark::DoNotOptimize(p);
    allocator.Free(p);
  }
  state.SetItemsProcessed(state.iterations());
}

template <class A>
void RunRing(benchmark::State& state, A allocator) {
  const std::vector<size_t>& sizes = Sizes();
  void* ring[kRing];
  for (size_t k = 0; k < kRing; ++k) ring[k] = allocator.Malloc(sizes[k]);
  size_t i = 0;
  for (auto _ : state) {
    size_t slot = i % kRing;
    allocator.Free(ring[slot]);
    ring[slot] = allocator.Malloc(sizes[(i * 7 + 3) % kNumSizes]);
    static_cast<char*>(ring[slot])[0] = 1;
    benchmark::DoNotOptimize(ring[slot]);
    ++i;
  }
  for (size_t k = 0; k < kRing; ++k) allocator.Free(ring[k]);
  state.SetItemsProcessed(state.iterations());
}

// Each thread allocates from a pool of its own (the usual case: a caller's pool serves the
// thread that converts with it)...
void BM_PoolPair(benchmark::State& state) {
  VekMempool pool("bench");
  RunPair(state, PoolAllocator{&pool});
}
void BM_PoolRing(benchmark::State& state) {
  VekMempool pool("bench");
  RunRing(state, PoolAllocator{&pool});
}
// ...or both threads share one pool (as they share the default pool).
void BM_SharedPoolPair(benchmark::State& state) { RunPair(state, PoolAllocator{SharedPool()}); }
void BM_SharedPoolRing(benchmark::State& state) { RunRing(state, PoolAllocator{SharedPool()}); }
void BM_MallocPair(benchmark::State& state) { RunPair(state, CAllocator{}); }
void BM_MallocRing(benchmark::State& state) { RunRing(state, CAllocator{}); }

BENCHMARK(BM_PoolPair)->Threads(1)->Threads(2)->UseRealTime();
BENCHMARK(BM_SharedPoolPair)->Threads(2)->UseRealTime();
BENCHMARK(BM_MallocPair)->Threads(1)->Threads(2)->UseRealTime();
BENCHMARK(BM_PoolRing)->Threads(1)->Threads(2)->UseRealTime();
BENCHMARK(BM_SharedPoolRing)->Threads(2)->UseRealTime();
BENCHMARK(BM_MallocRing)->Threads(1)->Threads(2)->UseRealTime();

// A block made on one thread and released on another, the pattern of objects handed between
// threads: each iteration leaves a new block in a shared slot and frees what was there, which
// is mostly the other thread's block.
template <class A>
void RunHandOff(benchmark::State& state, A allocator) {
  static std::atomic<void*> slot{nullptr};
  const std::vector<size_t>& sizes = Sizes();
  size_t i = static_cast<size_t>(state.thread_index()) * 7;
  for (auto _ : state) {
    void* p = allocator.Malloc(sizes[i++ % kNumSizes]);
    static_cast<char*>(p)[0] = 1;
    void* old = slot.exchange(p, std::memory_order_acq_rel);
    if (old != nullptr) allocator.Free(old);
  }
  state.SetItemsProcessed(state.iterations());
  void* left = slot.exchange(nullptr, std::memory_order_acq_rel);
  if (left != nullptr) allocator.Free(left);
}

void BM_PoolHandOff(benchmark::State& state) { RunHandOff(state, PoolAllocator{SharedPool()}); }
void BM_MallocHandOff(benchmark::State& state) { RunHandOff(state, CAllocator{}); }
BENCHMARK(BM_PoolHandOff)->Threads(2)->UseRealTime();
BENCHMARK(BM_MallocHandOff)->Threads(2)->UseRealTime();

// A byte buffer growing to 5 MB by its own rule (a fifth at a time) from appends of 4 KiB, the
// way a writer builds a large document, against writing the same 5 MB once into memory that is
// already there (the floor).
constexpr size_t kGrowTarget = 5 << 20;
constexpr size_t kGrowChunk = 4096;

void BM_ByteBufferGrow5MB(benchmark::State& state) {
  VekMempool pool("bench-grow");
  std::vector<unsigned char> chunk(kGrowChunk, 'x');
  for (auto _ : state) {
    sarn::ByteBuffer buffer(&pool);
    for (size_t n = 0; n < kGrowTarget; n += kGrowChunk) buffer.AppendBytes(chunk.data(), kGrowChunk);
    benchmark::DoNotOptimize(buffer.GetData());
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * kGrowTarget));
}
void BM_Write5MBOnce(benchmark::State& state) {
  std::vector<unsigned char> chunk(kGrowChunk, 'x');
  std::vector<unsigned char> target(kGrowTarget);
  for (auto _ : state) {
    for (size_t n = 0; n < kGrowTarget; n += kGrowChunk) std::memcpy(target.data() + n, chunk.data(), kGrowChunk);
    benchmark::DoNotOptimize(target.data());
    benchmark::ClobberMemory();
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * kGrowTarget));
}
BENCHMARK(BM_ByteBufferGrow5MB)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_Write5MBOnce)->Unit(benchmark::kMicrosecond);

// Strings: creation from a C string (default pool), into a named pool, and copying, against
// std::string doing the same.
const char* TextOfLength(size_t n) {
  static std::string text(1024, 'x');
  return text.c_str() + text.size() - n;
}

void BM_VekStringCreate(benchmark::State& state) {
  VekMempool pool("bench-strings");
  size_t n = static_cast<size_t>(state.range(0));
  const char* text = TextOfLength(n);
  for (auto _ : state) {
    VekString s = VekString::FromUtf8Bytes(&pool, n, text);
    benchmark::DoNotOptimize(s.Utf8());
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * n));
}
void BM_VekStringFromCString(benchmark::State& state) {
  const char* text = TextOfLength(static_cast<size_t>(state.range(0)));
  for (auto _ : state) {
    VekString s(text);
    benchmark::DoNotOptimize(s.Utf8());
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * state.range(0)));
}
void BM_StdStringCreate(benchmark::State& state) {
  size_t n = static_cast<size_t>(state.range(0));
  const char* text = TextOfLength(n);
  for (auto _ : state) {
    std::string s(text, n);
    benchmark::DoNotOptimize(s.data());
  }
  state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * n));
}
void BM_VekStringCopy(benchmark::State& state) {
  VekMempool pool("bench-strings");
  size_t n = static_cast<size_t>(state.range(0));
  VekString original = VekString::FromUtf8Bytes(&pool, n, TextOfLength(n));
  for (auto _ : state) {
    VekString copy(original);
    benchmark::DoNotOptimize(copy.Utf8());
  }
}
// Copying a VekString shares its text (one count up, one down); a std::string copies the bytes.
// The like-for-like anchor is a shared pointer to a string; the byte copy is there to show what
// sharing saves.
void BM_SharedStdStringCopy(benchmark::State& state) {
  size_t n = static_cast<size_t>(state.range(0));
  auto original = std::make_shared<const std::string>(TextOfLength(n), n);
  for (auto _ : state) {
    std::shared_ptr<const std::string> copy(original);
    benchmark::DoNotOptimize(copy->data());
  }
}
void BM_StdStringCopy(benchmark::State& state) {
  size_t n = static_cast<size_t>(state.range(0));
  std::string original(TextOfLength(n), n);
  for (auto _ : state) {
    std::string copy(original);
    benchmark::DoNotOptimize(copy.data());
  }
}
BENCHMARK(BM_VekStringCreate)->Arg(12)->Arg(200);
BENCHMARK(BM_VekStringFromCString)->Arg(12)->Arg(200);
BENCHMARK(BM_StdStringCreate)->Arg(12)->Arg(200);
BENCHMARK(BM_VekStringCopy)->Arg(12)->Arg(200);
BENCHMARK(BM_SharedStdStringCopy)->Arg(12)->Arg(200);
BENCHMARK(BM_StdStringCopy)->Arg(12)->Arg(200);

}  // namespace

BENCHMARK_MAIN();
