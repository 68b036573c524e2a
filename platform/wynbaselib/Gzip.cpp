#include "wynbaselib/Gzip.h"

#include <zlib.h>

#include <cstring>
#include <new>

namespace wynbaselib {

namespace {

constexpr size_t kChunk = 16384;
constexpr int kGzipWindowBits = 15 + 16;  // +16: gzip header and trailer instead of zlib's
const char kOutOfMemoryText[] = "out of memory in gzip decoder";

voidpf PoolAlloc(voidpf opaque, uInt items, uInt size) {
  return static_cast<VekMempool*>(opaque)->Calloc(items, size);
}

void PoolFree(voidpf opaque, voidpf address) { static_cast<VekMempool*>(opaque)->Free(address); }

void SetAllocator(z_stream& stream, VekMempool* pool) {
  if (pool != nullptr) {
    stream.zalloc = PoolAlloc;
    stream.zfree = PoolFree;
    stream.opaque = pool;
  } else {
    stream.zalloc = Z_NULL;
    stream.zfree = Z_NULL;
    stream.opaque = Z_NULL;
  }
}

}  // namespace

struct GzipBytesink::State {
  z_stream streamM;
  Bytesink* pNextM;
  bool isOpenM = false;     // deflateInit done
  bool isPendingM = false;  // bytes written since the last member ended
  bool wasMemberWrittenM = false;
  bool isErrorM = false;
  int levelM;
  VekMempool* pMempoolM;
  unsigned char outM[kChunk];

  bool Open() {
    if (isOpenM) return true;
    std::memset(&streamM, 0, sizeof streamM);
    SetAllocator(streamM, pMempoolM);
    if (deflateInit2(&streamM, levelM, Z_DEFLATED, kGzipWindowBits, 8, Z_DEFAULT_STRATEGY) != Z_OK) {
      isErrorM = true;
      return false;
    }
    isOpenM = true;
    return true;
  }

  bool Pump(int flush) {
    do {
      streamM.next_out = outM;
      streamM.avail_out = kChunk;
      int status = deflate(&streamM, flush);
      if (status == Z_STREAM_ERROR) {
        isErrorM = true;
        return false;
      }
      size_t produced = kChunk - streamM.avail_out;
      if (produced != 0 && !pNextM->Write(reinterpret_cast<const char*>(outM), produced)) {
        isErrorM = true;
        return false;
      }
      if (flush == Z_FINISH && status == Z_STREAM_END) return true;
    } while (streamM.avail_out == 0 || (flush == Z_FINISH));
    return true;
  }

  void Close() {
    if (isOpenM) deflateEnd(&streamM);
    isOpenM = false;
  }
};

// The state comes from the C++ heap without an exception: a sink (or source) whose state could
// not be made is failed from the start.
GzipBytesink::GzipBytesink(Bytesink* next, VekMempool* pool, int level) : pStateM(new (std::nothrow) State) {
  if (!pStateM) return;
  pStateM->pNextM = next;
  pStateM->levelM = level;
  pStateM->pMempoolM = pool;
}

GzipBytesink::~GzipBytesink() {
  if (!pStateM) return;
  if (pStateM->isPendingM && !pStateM->isErrorM) Flush();
  pStateM->Close();
}

bool GzipBytesink::Write(const char* data, size_t size) {
  if (!pStateM) return false;
  State& s = *pStateM;
  if (s.isErrorM) return false;
  if (size == 0) return true;
  if (!s.Open()) return false;
  s.isPendingM = true;
  while (size > 0) {
    uInt piece = size > 0x40000000 ? 0x40000000 : static_cast<uInt>(size);
    s.streamM.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(data));
    s.streamM.avail_in = piece;
    if (!s.Pump(Z_NO_FLUSH)) return false;
    data += piece;
    size -= piece;
  }
  return true;
}

bool GzipBytesink::Flush() {
  if (!pStateM) return false;
  State& s = *pStateM;
  if (s.isErrorM) return false;
  // A sink flushed before anything was written still holds one (empty) member, so that its
  // output is a valid gzip stream; later flushes without new bytes add nothing.
  if (s.isPendingM || !s.wasMemberWrittenM) {
    if (!s.Open()) return false;
    s.streamM.next_in = nullptr;
    s.streamM.avail_in = 0;
    if (!s.Pump(Z_FINISH)) return false;
    s.Close();
    s.isPendingM = false;
    s.wasMemberWrittenM = true;
  }
  if (!s.pNextM->Flush()) {
    s.isErrorM = true;
    return false;
  }
  return true;
}

bool GzipBytesink::FError() const { return !pStateM || pStateM->isErrorM; }

struct GunzipBytesource::State {
  z_stream streamM;
  Bytesource* pSourceM = nullptr;
  bool isOwnerM = false;
  bool isOpenM = false;
  bool isEndM = false;
  bool isMemberDoneM = false;  // the last member ended; only more input starts another
  bool isSourceDoneM = false;  // the source returned 0: it is not asked again
  const char* pErrorM = nullptr;
  VekMempool* pMempoolM = nullptr;
  unsigned char inM[kChunk];

  ~State() {
    if (isOpenM) inflateEnd(&streamM);
    if (isOwnerM) delete pSourceM;
  }

  bool Open() {
    std::memset(&streamM, 0, sizeof streamM);
    SetAllocator(streamM, pMempoolM);
    if (inflateInit2(&streamM, kGzipWindowBits) != Z_OK) {
      pErrorM = "cannot initialise gzip decoder";
      return false;
    }
    isOpenM = true;
    return true;
  }

  bool Refill() {
    size_t n = pSourceM->Read(inM, kChunk);
    streamM.next_in = inM;
    streamM.avail_in = static_cast<uInt>(n);
    return n != 0;
  }
};

GunzipBytesource::GunzipBytesource(Bytesource* source, VekMempool* pool, bool isOwner)
    : pStateM(new (std::nothrow) State) {
  if (!pStateM) {
    if (isOwner) delete source;
    return;
  }
  pStateM->pSourceM = source;
  pStateM->isOwnerM = isOwner;
  pStateM->pMempoolM = pool;
  pStateM->Open();
}

GunzipBytesource::GunzipBytesource(std::unique_ptr<State> state) : pStateM(std::move(state)) {}

GunzipBytesource::~GunzipBytesource() {}

size_t GunzipBytesource::Read(void* buffer, size_t size) {
  if (!pStateM) return 0;
  State& s = *pStateM;
  if (s.isEndM || s.pErrorM != nullptr || !s.isOpenM || size == 0) return 0;
  if (size > 0x40000000) size = 0x40000000;
  s.streamM.next_out = static_cast<Bytef*>(buffer);
  s.streamM.avail_out = static_cast<uInt>(size);
  while (s.streamM.avail_out == size) {
    if (s.streamM.avail_in == 0 && !s.isSourceDoneM && !s.Refill()) s.isSourceDoneM = true;
    if (s.isMemberDoneM) {
      // Between members: the end of the source is a clean end, more bytes start a member.
      if (s.streamM.avail_in == 0) {
        s.isEndM = true;
        break;
      }
      inflateReset(&s.streamM);
      s.isMemberDoneM = false;
    }
    // Called even when the source is exhausted: zlib may still hold decoded bytes (the rest
    // of a match) that did not fit in the caller's last buffer.
    int status = inflate(&s.streamM, Z_NO_FLUSH);
    if (status == Z_STREAM_END) {
      s.isMemberDoneM = true;
    } else if (status == Z_BUF_ERROR && s.streamM.avail_in == 0) {
      // No progress without more input.
      if (s.isSourceDoneM) {
        s.pErrorM = "truncated gzip stream";
        break;
      }
    } else if (status == Z_MEM_ERROR) {
      s.pErrorM = kOutOfMemoryText;
      break;
    } else if (status != Z_OK) {
      s.pErrorM = "corrupt gzip stream";
      break;
    }
  }
  // What was decoded before a fault is delivered (the next Read returns 0 and FError says
  // why), so the output never depends on how the caller sizes its reads.
  return size - s.streamM.avail_out;
}

Bytesource* GunzipBytesource::Duplicate() {
  if (!pStateM) return nullptr;
  State& s = *pStateM;
  Bytesource* source = s.pSourceM->Duplicate();
  if (source == nullptr) return nullptr;
  std::unique_ptr<State> copy(new (std::nothrow) State);
  if (!copy) {
    delete source;
    return nullptr;
  }
  copy->pSourceM = source;
  copy->isOwnerM = true;
  copy->pMempoolM = s.pMempoolM;
  copy->isEndM = s.isEndM;
  copy->isMemberDoneM = s.isMemberDoneM;
  copy->isSourceDoneM = s.isSourceDoneM;
  copy->pErrorM = s.pErrorM;
  if (s.isOpenM) {
    std::memset(&copy->streamM, 0, sizeof copy->streamM);
    if (inflateCopy(&copy->streamM, &s.streamM) != Z_OK) {
      delete source;
      copy->isOwnerM = false;
      return nullptr;
    }
    copy->isOpenM = true;
    // Pending input lives in this object's buffer: copy it and point the copy at its own.
    size_t pending = s.streamM.avail_in;
    if (pending != 0) std::memcpy(copy->inM, s.streamM.next_in, pending);
    copy->streamM.next_in = copy->inM;
    copy->streamM.avail_in = static_cast<uInt>(pending);
  }
  return new (std::nothrow) GunzipBytesource(std::move(copy));
}

bool GunzipBytesource::FError() const { return !pStateM || pStateM->pErrorM != nullptr; }

const char* GunzipBytesource::GetErrorText() const {
  if (!pStateM) return kOutOfMemoryText;
  return pStateM->pErrorM != nullptr ? pStateM->pErrorM : "";
}

}  // namespace wynbaselib
