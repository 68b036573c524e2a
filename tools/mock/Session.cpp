// One connection: frames in, canned responses out, every event logged.
#include <poll.h>
#include <unistd.h>

#include <cerrno>

#include "Mock.h"

namespace sarnmock {
namespace {

bool WriteAll(int fd, const char* data, size_t size) {
  while (size > 0) {
    ssize_t n = write(fd, data, size);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) return false;
    data += n;
    size -= static_cast<size_t>(n);
  }
  return true;
}

class Session {
 public:
  Session(Settings& settings, unsigned connection, int inFd, int outFd)
      : settingsM(settings), connectionM(connection), inFdM(inFd), outFdM(outFd), poolM("connection") {}

  void Run() {
    settingsM.log.Line(connectionM, "open");
    size_t length;
    while (NextFrame(length) && Answer(length)) pendingM.erase(0, length);
    settingsM.log.Line(connectionM, "close");
  }

 private:
  // Buffers the next whole frame, and never more than it: once the first line gives the
  // frame's length, only the bytes it still lacks are read. False when the connection ends.
  bool NextFrame(size_t& length) {
    sarn::KernoRpcV2Packetizer packetizer(&poolM);
    for (;;) {
      if (!pendingM.empty() && !packetizer.decidedM) {
        size_t look = pendingM.size() < 64 ? pendingM.size() : 64;
        packetizer.UpdateInput(VekString::FromUtf8Bytes(&poolM, look, pendingM.data()));
      }
      if (packetizer.decidedM) {
        if (!packetizer.errorStringM.FEmpty()) return Error(packetizer.errorStringM.Utf8());
        length = packetizer.packetLengthM;
        if (pendingM.size() >= length) return true;
      }
      pollfd wait = {inFdM, POLLIN, 0};
      int ready = poll(&wait, 1, settingsM.idleTimeoutSeconds * 1000);
      if (ready < 0 && errno == EINTR) continue;
      if (ready == 0) return Error("idle for more than " + std::to_string(settingsM.idleTimeoutSeconds) + " s");
      char block[65536];
      size_t want = packetizer.decidedM ? length - pendingM.size() : 64;
      ssize_t n = read(inFdM, block, want < sizeof block ? want : sizeof block);
      if (n < 0 && errno == EINTR) continue;
      if (n <= 0) return pendingM.empty() ? false : Error("the connection ended inside a frame");
      pendingM.append(block, static_cast<size_t>(n));
    }
  }

  bool Error(const std::string& message) {
    settingsM.log.Line(connectionM, "error", message);
    return false;
  }

  std::string Text(const VekString& text) { return std::string(text.Utf8(), text.NByte()); }

  // Reads the buffered frame and answers it; false when the connection is to close.
  bool Answer(size_t length) {
    wynbaselib::InMemoryBytestream source(pendingM.data(), length);
    VekString error;
    ref<sarn::KernoRpcWrapper> message = sarn::KernoRpcV2BytestreamImpl::UnmarshalFromBytesource(
        &poolM, source, sarn::KernoRpcV2BytestreamImpl::LazyUnparsed, error);
    if (!message) return Error(error.Utf8());
    settingsM.log.Line(connectionM, "in", Text(message->ToString(&poolM)));
    auto* request = dynamic_cast<sarn::RequestWrapper*>(message.Get());
    // Cancels, request updates and responses are logged, not answered.
    if (request == nullptr || dynamic_cast<sarn::RequestUpdateWrapper*>(request) != nullptr) return true;
    if (request->responseCountM == sarn::RequestWrapper::ResponseCountNone) return true;
    std::string type = Text(request->requestTypeM);
    const std::vector<std::string>* bodies = settingsM.table.Find(type);
    if (bodies == nullptr) return Send(request, NoCannedResponse(type), true);
    size_t count = request->responseCountM == sarn::RequestWrapper::ResponseCountSingle ? 1 : bodies->size();
    for (size_t i = 0; i < count; ++i) {
      if (!Send(request, (*bodies)[i], i + 1 == count)) return false;
    }
    return true;
  }

  // The error body of a request type without canned bodies, written by the library (which
  // escapes whatever the peer sent as the type).
  std::string NoCannedResponse(const std::string& type) {
    ref<sarn::Dictionary> body = sarn::Dictionary::New(&poolM, "error");
    body->Add("code", VekString("internalError"));
    std::string text = "sarn-mock: no canned response for '" + type + "'";
    body->Add("text", VekString::FromUtf8Bytes(&poolM, text.size(), text.data()));
    return Text(body->ToJson(false));
  }

  // One response carrying the request's rpc id, its schema version as the optional header
  // SchemaVersion, and `body` unchanged, held as JSON text whatever its first byte.
  bool Send(sarn::RequestWrapper* request, const std::string& body, bool isFinal) {
    ref<sarn::LazyDict> payload =
        sarn::LazyDict::New(&poolM, sarn::LazyDict::REP_JSON, ref<sarn::Dict>(),
                            vek::ByteBuffer::New(&poolM, body.data(), body.size()), ref<sarn::SarnObject>(), nullptr,
                            request->schemaVersionM);
    ref<sarn::ResponseWrapper> response =
        sarn::ResponseWrapper::New(&poolM, request->rpcIdM, isFinal, payload, ref<sarn::Dict>());
    response->AddOptionalHeader(sarn::RpcV2Parser::HeaderKeys::SchemaVersion,
                                VekString::Format(&poolM, "%d", request->schemaVersionM));
    sarn::ByteBuffer frame(&poolM);
    VekString error;
    ref<sarn::KernoRpcWrapper> wrapper = response;
    if (!sarn::KernoRpcV2::MarshalToString(wrapper, frame, error, &poolM, false)) return Error(error.Utf8());
    settingsM.log.Line(connectionM, "out", Text(response->ToString(&poolM)));
    return WriteAll(outFdM, reinterpret_cast<const char*>(frame.GetData()), frame.GetLength()) ||
           Error("the peer stopped reading");
  }

  Settings& settingsM;
  unsigned connectionM;
  int inFdM, outFdM;
  VekMempool poolM;
  std::string pendingM;
};

}  // namespace

void Serve(Settings& settings, unsigned connection, int inFd, int outFd) {
  Session(settings, connection, inFd, outFd).Run();
}

}  // namespace sarnmock
