#include "sarn/rpc/KernoRpcV2Packetizer.h"

#include "sarn/rpc/KernoRpcV2.h"

namespace sarn {

KernoRpcV2Packetizer::KernoRpcV2Packetizer(VekMempool* pool) : pMempoolM(pool) { Reset(); }

void KernoRpcV2Packetizer::Reset() {
  decidedM = false;
  completeM = false;
  headerLengthM = 0;
  bodyLengthM = 0;
  firstLineLengthM = 0;
  packetLengthM = 0;
}

void KernoRpcV2Packetizer::Update(const char* data, size_t size) {
  if (!decidedM) {
    if (KernoRpcV2::ParseFirstLine(pMempoolM, data, size, headerLengthM, bodyLengthM, firstLineLengthM,
                                   errorStringM)) {
      decidedM = true;
      packetLengthM = firstLineLengthM + headerLengthM + bodyLengthM;
    } else if (firstLineLengthM != 0) {
      // A first line that can never become valid: all of the input is handed on as one packet.
      decidedM = true;
      packetLengthM = size;
    } else {
      return;  // no CR LF yet within the first line's 25 bytes
    }
  }
  completeM = packetLengthM <= size;
}

void KernoRpcV2Packetizer::UpdateInput(const VekString& input) { Update(input.Utf8(), input.NByte()); }

void KernoRpcV2Packetizer::UpdateInputBytestring(const ref<vek::ByteBuffer>& input) {
  const size_t size = input ? input->GetLength() : 0;
  if (decidedM) {
    completeM = packetLengthM <= size;
  } else if (size != 0) {
    Update(reinterpret_cast<const char*>(input->GetData()), size);
  }
}

}  // namespace sarn
