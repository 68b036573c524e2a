// A relay: MRPC/2 frames from standard input to standard output, requests and responses marked
// with the optional header "X-Relayed-By: sarn-relay". Bodies pass byte for byte and are never
// parsed. Build it beside the library or on its own against an installed tree.
#include <unistd.h>

#include <cstdio>
#include <string>

#include "sarn/Sarn.h"

int main() {
  VekMempool pool("relay");
  int status = 0;
  {
    wynbaselib::FdBytesink out(1);
    std::string pending;
    bool isEnd = false;
    while (!isEnd || !pending.empty()) {
      //! [relay]
      // The packetizer tells when the buffer holds a whole frame; the string reader keeps
      // the body as the text it received.
      sarn::KernoRpcV2Packetizer packetizer(&pool);
      if (!pending.empty()) packetizer.UpdateInput(VekString::FromUtf8Bytes(&pool, pending.size(), pending.data()));
      size_t length = packetizer.GetPacketLength();
      if (length == 0) {
        char block[4096];
        ssize_t n = isEnd ? 0 : read(0, block, sizeof block);
        if (n > 0) pending.append(block, static_cast<size_t>(n));
        if (n <= 0 && isEnd) break;  // a frame cut short at the end is dropped
        isEnd = n <= 0;
        continue;
      }
      VekString error;
      ref<sarn::KernoRpcWrapper> message = sarn::KernoRpcV2::UnmarshalFromString(
          &pool, VekString::FromUtf8Bytes(&pool, length, pending.data()), false, error);
      pending.erase(0, length);
      if (!message) {
        std::fprintf(stderr, "relay: frame refused: %s\n", error.Utf8());
        status = 1;
        continue;
      }
      ref<sarn::LazyDict> body;
      if (auto* request = dynamic_cast<sarn::RequestWrapper*>(message.Get())) {
        request->AddOptionalHeader("X-Relayed-By", "sarn-relay");
        body = request->bodyM;
      } else if (auto* response = dynamic_cast<sarn::ResponseWrapper*>(message.Get())) {
        response->AddOptionalHeader("X-Relayed-By", "sarn-relay");
        body = response->bodyM;
      }
      // A body whose first byte is neither '{' nor a space is taken for protocol-buffer bytes;
      // held as JSON text again, it is written out exactly as it came.
      if (body && body->repM == sarn::LazyDict::REP_PROTOBUF) body->repM = sarn::LazyDict::REP_JSON;
      if (!sarn::KernoRpcV2::MarshalToBytesink(message, out, error, &pool, false)) {
        std::fprintf(stderr, "relay: %s\n", error.Utf8());
        status = 1;
      }
      //! [relay]
    }
  }
  return status;
}
