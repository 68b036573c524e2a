// KernoRpcV2BytestreamImpl: reads one MRPC/2 frame from a byte source into a message wrapper.
//
// It is the frame parser's receiver: it asks its source for 512 bytes per Read, feeds them to
// the parser and collects the header pairs the parser has checked. Every rule of the frame
// (first line, limits, required headers and their values, nothing after the body) is the
// parser's, so reading goes on until the source returns 0: data after the frame is refused. The
// wrapper is built from the first value of each header (a frame with two Type lines is judged by
// the parser on the last and built from the first; a response built for a frame judged a
// cancel has no body, which then fails to convert with "Missing message body").
//
// The body, by laziness setting:
//   LazyUnparsed        kept gzip-compressed; a payload over a gunzip source of those bytes
//                       decompresses only when somebody asks for the body.
//   LazyValidated       checked by the streaming JSON parser (any top-level value) as it
//                       passes, then kept as in LazyUnparsed.
//   ParsedToDictionary  parsed into a Dictionary as it passes (the top level must be an object).
// Until its body is asked for, a wrapper read in the first two settings holds the body's gzip
// size plus the gunzip source's fixed state (about 23 KiB), headers aside; while reading, the
// gzip sink's state (about 300 KiB of zlib's) comes on top. The first two settings buy memory,
// not time: compressing (about 70 MB/s) is slower than parsing (110 to 130 MB/s) at every body
// size up to the limit, and on small frames zlib's set-up dominates the read, so
// ParsedToDictionary is the faster choice whenever the body's Dictionary fits in memory.
//
// Errors: the first one reported wins (the parser's, the JSON parser's, a header-line count
// over kMaxValuesPerContainer with kRpcHeaderLineLimitMessage, a gzip sink that fails with
// BodyCompressionFailedMessage, or kOutOfMemoryMessage) and replaces the caller's `error`;
// the result is then null. A successful read of a request, update or response empties `error`;
// a cancel leaves it as given.
//
// Ownership: everything built comes from the pool; the source is not owned and is read from
// its current position. One reader reads one frame: construct, Unmarshal once, destroy.
// Thread safety: none; the reader, its source and the error string belong to one thread.
#pragma once

#include <cstddef>
#include <cstdint>

#include "sarn/base/Export.h"
#include "sarn/json/JsonParser.h"
#include "sarn/rpc/KernoRpcWrapper.h"
#include "sarn/rpc/RpcV2Parser.h"
#include "wynbaselib/Bytestream.h"
#include "wynbaselib/Gzip.h"

namespace sarn {

namespace internal {
class BodyStream;
}  // namespace internal

class SARN_EXPORT KernoRpcV2BytestreamImpl : public RpcV2Parser::Callbacks {
 public:
  enum LazinessSettings : int32_t {
    LazyUnparsed = 0,
    LazyValidated = 1,
    ParsedToDictionary = 2,
  };

  static const char BodyCompressionFailedMessage[];  // "Kerno Rpc message body could not be kept compressed"
  static constexpr size_t READ_SIZE = 512;  // bytes asked of the source per Read

  KernoRpcV2BytestreamImpl(wynbaselib::Bytesource& source, VekMempool* pool, LazinessSettings laziness);
  ~KernoRpcV2BytestreamImpl() override;
  KernoRpcV2BytestreamImpl(const KernoRpcV2BytestreamImpl&) = delete;
  KernoRpcV2BytestreamImpl& operator=(const KernoRpcV2BytestreamImpl&) = delete;

  // Reads the frame; the wrapper, or null with `error` set.
  ref<KernoRpcWrapper> Unmarshal(VekString& error);
  static ref<KernoRpcWrapper> UnmarshalFromBytesource(VekMempool* pool, wynbaselib::Bytesource& source,
                                                      LazinessSettings laziness, VekString& error);

  void OnError(const char* message) override;
  void OnHeaderSize(size_t headerLength) override;
  void OnBodySize(size_t bodyLength) override;
  void OnHeaderPair(const char* key, const char* value) override;
  void OnBodyChunk(const char* data, size_t length) override;
  void OnParsingComplete() override;

  // The steps of Unmarshal. BuildRpcWrapper leaves `result` null only when memory runs out.
  void BuildRpcWrapper(ref<KernoRpcWrapper>& result);
  // Empties the caller's error text, then makes the body; a null body for a frame without one.
  bool ExtractPayload(KernoVersion version, ref<LazyDict>& body);
  // "none" and "single" as named, anything else multiple.
  void GetResponseCountValue(RequestWrapper::ResponseCount& count);

  VekMempool* pMempoolM;
  wynbaselib::Bytesource* pSourceM;
  LazinessSettings lazinessM;
  // The tree outlives the parser that writes into it, so it is declared first.
  ref<Dictionary> dictionaryM;
  JsonParser jsonParserM;
  bool errorM;
  VekString* pErrorStringM;
  ref<Dict> headersM;
  size_t bodySizeM;
  size_t headerLinesM;
  // Settings 0 and 1 only (null otherwise): the compressed body and the gzip sink writing into it.
  internal::BodyStream* pBodyStreamM;
  wynbaselib::GzipBytesink* pGzipSinkM;

 private:
  // Records the first error; later ones are consequences of it and are dropped.
  void Fail(const char* message);
  bool IsKeepingCompressed() const { return lazinessM != ParsedToDictionary; }
  bool IsParsing() const { return lazinessM != LazyUnparsed; }
};

}  // namespace sarn
