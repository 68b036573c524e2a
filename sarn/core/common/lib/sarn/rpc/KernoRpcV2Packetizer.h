// KernoRpcV2Packetizer: tells when the first MRPC/2 frame in a growing input is complete, and how
// long it is, from the first line alone.
//
// The caller hands it everything received so far after every arrival. Once the first line has
// been judged (decidedM), the frame's length is known and only the input's length matters. A
// first line that can never become valid makes the whole input one "frame" (complete at once,
// with the first-line message in errorStringM), so the caller can pass the bad data on and be
// told why. After taking a complete frame off its buffer the caller calls Reset() and goes on
// with the rest; Reset keeps the last error text.
//
// Ownership: strings come from the pool given to the constructor. Thread safety: none; one
// packetizer serves one connection on one thread.
#pragma once

#include <cstddef>

#include "sarn/base/Export.h"
#include "vek/VekByteString.h"
#include "vek/VekCore.h"
#include "vek/VekString.h"

namespace sarn {

class SARN_EXPORT KernoRpcV2Packetizer {
 public:
  // An empty error string, then Reset().
  explicit KernoRpcV2Packetizer(VekMempool* pool);

  // Undecided and incomplete, the four lengths 0; errorStringM is kept.
  void Reset();
  // `input` is everything received so far, not only the new part.
  void UpdateInput(const VekString& input);
  // The same for bytes; once decided only the buffer's length is looked at.
  void UpdateInputBytestring(const ref<vek::ByteBuffer>& input);
  // packetLengthM when complete, else 0.
  size_t GetPacketLength() const { return completeM ? packetLengthM : 0; }

  VekMempool* pMempoolM;
  bool decidedM;
  bool completeM;
  size_t headerLengthM;
  size_t bodyLengthM;
  size_t firstLineLengthM;
  size_t packetLengthM;
  VekString errorStringM;

 private:
  void Update(const char* data, size_t size);
};

}  // namespace sarn
