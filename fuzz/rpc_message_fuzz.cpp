// The message readers. Byte 0: the byte-source reader's setting (low bits, modulo 3) and, in bit
// 7, whether the rest is a frame as it stands or parts assembled into a frame of the writers'
// form; bytes 1 and 2: two chunk sizes used in turn (0 for 1). Oracles: the byte-source reader gives the
// same verdict and message whole and in chunks; on assembled frames what it accepts the string
// reader accepts too, with the same kind, members, optional headers and body bytes; every
// accepted wrapper written again reads back equal.
#include "DictFuzzSupport.h"
#include "RpcFuzzSupport.h"

namespace {

using namespace sarn;
using sarntest::Require;
using sarntest::Str;

// Messages may keep their pool's blocks between inputs; one pool lives as long as the process.
VekMempool* const pPoolG = new VekMempool("rpc_message_fuzz");

// Each own header once, names in byte order, no blanks around a key, and one optional header.
std::string Assemble(const std::string& rest) {
  std::string parts[8];
  size_t at = 0;
  for (int i = 0; i < 7 && at <= rest.size(); ++i) {
    size_t end = rest.find('\n', at);
    parts[i] = rest.substr(at, end == std::string::npos ? std::string::npos : end - at);
    at = end == std::string::npos ? rest.size() + 1 : end + 1;
  }
  parts[7] = at <= rest.size() ? rest.substr(at) : "";
  for (int i = 1; i < 7; ++i) {
    for (char& c : parts[i]) c = c == '\r' || c == '\n' || c == '\0' || (i == 5 && (c == ':' || c <= ' ')) ? 'x' : c;
    if (parts[i].find_first_not_of(" \t\v\f") == std::string::npos) parts[i] += 'v';
  }
  // A body the string reader keeps as text: the payload takes other first bytes for binary.
  if (!parts[7].empty() && parts[7][0] != '{') parts[7].insert(0, " ");
  static const char* const kTypes[] = {"request", "requestUpdate", "response", "cancel"};
  const int kind = parts[0].empty() ? 0 : parts[0][0] & 3;
  std::string block = (parts[0].size() > 1 ? "Content-Type: application/json\r\n" : "");
  if (kind == 2) block += "IsFinal: " + parts[3] + "\r\n";
  if (kind < 2) block += "RequestType: " + parts[3] + "\r\nResponseCount: " + parts[4] + "\r\n";
  block += "RpcId: " + parts[1] + "\r\n";
  if (kind < 2) block += "SchemaVersion: " + parts[2] + "\r\n";
  block += std::string("Type: ") + kTypes[kind] + "\r\n" + "X-" + parts[5] + ": " + parts[6] + "\r\n\r\n";
  return "MRPC/2 " + std::to_string(block.size()) + " " + std::to_string(parts[7].size()) + "\r\n" + block + parts[7];
}

// Written again and read back by the reader that read it, a wrapper must come back equal.
// Bodies the payload holds as binary are not written back as they came, and a message read
// without a Content-Type is written with one (requests) or with an empty one (responses).
void RequireRoundTrip(const ref<KernoRpcWrapper>& w, int setting) {
  VekString frame, error, contentType = "-";
  ref<LazyDict> body = rpcfuzz::Body(w, &contentType);
  if ((body && body->repM == LazyDict::REP_PROTOBUF) || contentType.FEmpty()) return;
  if (!KernoRpcV2::MarshalToString(w, frame, error, pPoolG, false)) return;  // a body that writes nothing
  if (setting < 0) return Require(rpcfuzz::SameWrapper(w, KernoRpcV2::UnmarshalFromString(pPoolG, frame, false, error)));
  sarntest::TestSource source({Str(frame)});
  auto laziness = static_cast<KernoRpcV2BytestreamImpl::LazinessSettings>(setting);
  Require(rpcfuzz::SameWrapper(w, KernoRpcV2BytestreamImpl::UnmarshalFromBytesource(pPoolG, source, laziness, error)));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size < 3) return 0;
  const auto setting = static_cast<KernoRpcV2BytestreamImpl::LazinessSettings>((data[0] & 0x7f) % 3);
  const std::string rest(reinterpret_cast<const char*>(data + 3), size - 3);
  const std::string frame = (data[0] & 0x80) != 0 ? Assemble(rest) : rest;
  std::vector<std::string_view> chunks;
  for (size_t at = 0, turn = 0; at < frame.size(); ++turn) {
    size_t n = std::min<size_t>(data[1 + turn % 2] == 0 ? 1 : data[1 + turn % 2], frame.size() - at);
    chunks.push_back(std::string_view(frame).substr(at, n));
    at += n;
  }
  VekString wholeError, chunkError, stringError;
  sarntest::TestSource whole({frame}), pieces(chunks);
  ref<KernoRpcWrapper> read = KernoRpcV2BytestreamImpl::UnmarshalFromBytesource(pPoolG, whole, setting, wholeError);
  ref<KernoRpcWrapper> again = KernoRpcV2BytestreamImpl::UnmarshalFromBytesource(pPoolG, pieces, setting, chunkError);
  Require(Str(wholeError) == Str(chunkError) && !read == !again);
  if (read) Require(rpcfuzz::Describe(pPoolG, read) == rpcfuzz::Describe(pPoolG, again));
  ref<KernoRpcWrapper> text = KernoRpcV2::UnmarshalFromString(pPoolG, VekString::FromUtf8Bytes(pPoolG, frame.size(), frame.data()), false, stringError);
  if (read && (data[0] & 0x80) != 0) {
    Require(text && rpcfuzz::Describe(pPoolG, read, setting != 2) == rpcfuzz::Describe(pPoolG, text, setting != 2));
  }
  if (text) RequireRoundTrip(text, -1);
  if (read) RequireRoundTrip(read, setting);
  return 0;
}
