// Gzip compression over a sink and decompression over a source (zlib, gzip format).
//
// GzipBytesink compresses what is written to it into `next`. Flush ends the current gzip
// member (writes its trailer) and flushes `next`; writing after a Flush starts a new member,
// and GunzipBytesource reads concatenated members as one stream. The destructor flushes when
// bytes are pending.
//
// GunzipBytesource decompresses `source`. A corrupt stream, or one that ends before its
// trailer (an empty source included), ends the output: the bytes decoded before the fault are
// delivered, then Read returns 0 and FError() tells it from a clean end, GetErrorText() saying
// "corrupt gzip stream" or "truncated gzip stream". The source is read 16 KiB at a time.
// zlib's memory comes from `pool` when one is given, else from the C library. Nothing is thrown
// when memory runs out: a sink fails (FError), a source ends with FError() and a text saying so,
// and Duplicate returns null.
//
// Neither class is locked: each is used by one thread at a time.
#pragma once

#include <cstddef>
#include <memory>

#include "vek/VekMempool.h"
#include "wynbaselib/Bytestream.h"

namespace wynbaselib {

class GzipBytesink : public Bytesink {
 public:
  explicit GzipBytesink(Bytesink* next, VekMempool* pool = nullptr, int level = -1);
  ~GzipBytesink() override;
  GzipBytesink(const GzipBytesink&) = delete;
  GzipBytesink& operator=(const GzipBytesink&) = delete;
  bool Write(const char* data, size_t size) override;
  bool Flush() override;
  // True once zlib or `next` has failed; every later call fails too.
  bool FError() const;

 private:
  struct State;
  std::unique_ptr<State> pStateM;
};

class GunzipBytesource : public Bytesource {
 public:
  // With `isOwner` the source is deleted with this object.
  explicit GunzipBytesource(Bytesource* source, VekMempool* pool = nullptr, bool isOwner = false);
  ~GunzipBytesource() override;
  GunzipBytesource(const GunzipBytesource&) = delete;
  GunzipBytesource& operator=(const GunzipBytesource&) = delete;
  size_t Read(void* buffer, size_t size) override;
  // Duplicates the decompressor and the underlying source (null when that is not duplicable).
  Bytesource* Duplicate() override;
  bool FError() const override;
  const char* GetErrorText() const override;

 private:
  struct State;
  explicit GunzipBytesource(std::unique_ptr<State> state);
  std::unique_ptr<State> pStateM;
};

}  // namespace wynbaselib
