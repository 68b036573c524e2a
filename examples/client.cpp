// A client's round trip: a kernoCurrentTimeGet request built from an object goes to standard
// output as an MRPC/2 frame; the responses are read from standard input until the final one,
// and each body's object is printed on standard error. Joined to `sarn-mock --stdio` (by a pipe
// one way and a FIFO the other) it talks to the mock service. Build it beside the library or on
// its own against an installed tree (find_package(sarn)).
#include <unistd.h>

#include <cstdio>
#include <string>

#include "sarn/Sarn.h"

namespace {

// Reads standard input until `pending` holds one whole frame; its length, or 0 at the end of
// the input. The packetizer only looks at the bytes; the reader below checks them.
size_t NextFrame(VekMempool* pool, std::string& pending) {
  sarn::KernoRpcV2Packetizer packetizer(pool);
  for (;;) {
    if (!pending.empty()) {
      packetizer.UpdateInput(VekString::FromUtf8Bytes(pool, pending.size(), pending.data()));
      if (packetizer.GetPacketLength() != 0) return packetizer.GetPacketLength();
    }
    char block[4096];
    ssize_t n = read(0, block, sizeof block);
    if (n <= 0) return 0;
    pending.append(block, static_cast<size_t>(n));
  }
}

}  // namespace

int main() {
  VekMempool pool("client");
  int status = 1;
  {
    //! [send]
    // The request is built from an object: its type names the request, and the body is
    // written from the object at schema version 42 when the frame is marshalled.
    ref<sarn::SarnObject> get = sarnschema::KernoCurrentTimeGet::Factory(&pool);
    ref<sarn::KernoRpcWrapper> request = sarn::RequestWrapper::New(
        &pool, 1, sarn::RequestWrapper::ResponseCountSingle, 42, get, ref<sarn::Dict>());
    wynbaselib::FdBytesink out(1);
    VekString error;
    if (!sarn::KernoRpcV2::MarshalToBytesink(request, out, error, &pool, false)) {
      std::fprintf(stderr, "client: %s\n", error.Utf8());
      return 1;
    }
    //! [send]

    //! [receive]
    // Each response frame is delimited, then read by the byte-source reader, which checks
    // the frame and (validated) its JSON; the body becomes an object only when asked.
    std::string pending;
    for (size_t length; (length = NextFrame(&pool, pending)) != 0; pending.erase(0, length)) {
      wynbaselib::InMemoryBytestream frame(pending.data(), length);
      ref<sarn::KernoRpcWrapper> message = sarn::KernoRpcV2BytestreamImpl::UnmarshalFromBytesource(
          &pool, frame, sarn::KernoRpcV2BytestreamImpl::LazyValidated, error);
      auto* response = dynamic_cast<sarn::ResponseWrapper*>(message.Get());
      if (response == nullptr) {
        std::fprintf(stderr, "client: refused: %s\n", message ? "not a response" : error.Utf8());
        break;
      }
      ref<sarn::SarnObject> body = response->UnmarshalToSarnObject(42, error);
      if (!body) {
        std::fprintf(stderr, "client: body refused: %s\n", error.Utf8());
        break;
      }
      sarn::DictionarySarnObject converter(&pool, sarn::Schema::vStructDefG, sarn::Schema::nStructDefG);
      std::fprintf(stderr, "%s\n", converter.SarnObjectToDictionary(body.Get(), 42)->ToJson(true).Utf8());
      if (response->IsFinalResponse()) {
        status = 0;
        break;
      }
    }
    //! [receive]
  }
  return status;
}
