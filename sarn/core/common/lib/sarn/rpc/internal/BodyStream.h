// BodyStream: the compressed body of a message read in settings 0 and 1, held exactly.
//
// The gzip sink writes into it while the frame is read; the payload's gunzip source later reads
// a copy of it. Copies share one content and read from their own position. Each write becomes
// one block of exactly its size (the gzip sink writes up to 16 KiB at a time), so the content
// never holds the doubling slack of a growing string: a message's body costs its gzip size
// plus a block header per 16 KiB. Blocks come from the pool; the content goes with the last copy.
//
// Thread safety: the count of copies is atomic; a copy is used by one thread at a time, and
// nobody writes once a copy is being read.
#pragma once

#include <atomic>
#include <cstddef>

#include "vek/VekMempool.h"
#include "wynbaselib/Bytestream.h"

namespace sarn {
namespace internal {

class BodyStream : public wynbaselib::Bytesource, public wynbaselib::Bytesink {
 public:
  // A stream whose content could not be made reads as empty and refuses every write.
  explicit BodyStream(VekMempool* pool);
  BodyStream(const BodyStream& other);
  BodyStream& operator=(const BodyStream&) = delete;
  ~BodyStream() override;

  size_t Read(void* buffer, size_t size) override;
  // A copy at this one's position; null when memory runs out.
  Bytesource* Duplicate() override;
  // False, keeping nothing of `data`, when the pool cannot hold another block.
  bool Write(const char* data, size_t size) override;
  bool Flush() override { return true; }
  size_t GetSize() const;

 private:
  struct Block {
    Block* pNextM;
    size_t sizeM;
    char* Data() { return reinterpret_cast<char*>(this + 1); }
  };
  struct Content {
    std::atomic<unsigned> refCountM;
    VekMempool* pMempoolM;
    Block* pFirstM;
    Block* pLastM;
    size_t sizeM;
  };

  Content* pContentM;
  Block* pBlockM;  // the block being read, null before the first
  size_t offsetM;  // bytes of it already read
};

}  // namespace internal
}  // namespace sarn
