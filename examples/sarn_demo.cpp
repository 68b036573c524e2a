// A small tour of what the library offers so far: pools, counted objects, strings and streams.
#include <cstdio>

#include "sarn/Sarn.h"

int main() {
  VekMempool pool("demo");
  std::printf("sarn %s\n", sarn::GetLibraryVersion());
  {
    VekString greeting = VekString::Format(&pool, "hello from pool '%s'", pool.GetName());
    std::printf("%s (%zu bytes)\n", greeting.Utf8(), greeting.NByte());

    ref<vek::ByteBuffer> bytes = vek::ByteBuffer::New(&pool, "MRPC/2", 6);
    std::printf("byte string of %zu bytes, pool holds %zu bytes\n", bytes->GetLength(), pool.GetUsedBytes());

    wynbaselib::InMemoryBytestream compressed;
    {
      wynbaselib::GzipBytesink gzip(&compressed, &pool);
      for (int i = 0; i < 1000; ++i) gzip.Write("a line of text that repeats\n", 28);
      gzip.Flush();
    }
    wynbaselib::GunzipBytesource gunzip(&compressed, &pool);
    char block[512];
    size_t total = 0;
    for (size_t n; (n = gunzip.Read(block, sizeof block)) > 0;) total += n;
    std::printf("gzip: 28000 bytes -> %zu compressed -> %zu read back%s\n", compressed.GetContent().size(), total,
                gunzip.FError() ? " (error)" : "");
  }
  std::printf("pool '%s' used bytes after release: %zu (high water %zu)\n", pool.GetName(), pool.GetUsedBytes(),
              pool.GetUsedBytesHighWater());
  return 0;
}
