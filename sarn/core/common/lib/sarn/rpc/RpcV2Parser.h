// RpcV2Parser: the incremental parser of one MRPC/2 frame, and the protocol's vocabulary.
//
// A frame is a first line "MRPC/2 <header length> <body length>" ending in CR LF (at most 25
// bytes), a header block of exactly <header length> bytes made of "Key: value" lines ending in
// CR LF (each at most 1,024 bytes), and exactly <body length> bytes of JSON body.
//
// The caller feeds the frame in chunks of any size (a chunk may split it anywhere, even inside
// CR LF); the parser checks the first line, every header line and the declared lengths as they
// arrive and reports what it finds through a `Callbacks` receiver: the two lengths, each header
// pair that passed its check, each piece of the body, the end of the frame, or one error.
//
// Ownership and memory: the parser allocates nothing and belongs to no pool; it lives on the
// caller's stack. It never copies the body: `OnBodyChunk` points into the caller's chunk. Only
// the line being assembled is cached, in a fixed buffer inside the parser, and header pairs
// point into that buffer. Every pointer handed to a callback is valid only during the call. The
// receiver is not owned and must outlive the parser (the destructor may still call it).
//
// Threads: none inside. One parser is used by one thread at a time and parses one frame; there
// is no reset. Callbacks run on the caller's thread inside ParseChunk, EndParse or the destructor.
#pragma once

#include <cstddef>
#include <cstdint>

#include "sarn/base/Export.h"

namespace sarn {

class SARN_EXPORT RpcV2Parser {
 public:
  // The protocol's constant texts. A class cannot hold a namespace, so each group is a struct
  // used as one: RpcV2Parser::HeaderKeys::RpcId reads as the text "RpcId".
  struct SARN_EXPORT HeaderKeys {
    static const char RpcId[];          // "RpcId"
    static const char SchemaVersion[];  // "SchemaVersion"
    static const char Type[];           // "Type"
    static const char RequestType[];    // "RequestType"
    static const char ResponseCount[];  // "ResponseCount"
    static const char ContentType[];    // "Content-Type"
    static const char IsFinal[];        // "IsFinal"
  };
  struct SARN_EXPORT TypeValues {
    static const char Request[];        // "request"
    static const char Response[];       // "response"
    static const char Cancel[];         // "cancel"
    static const char RequestUpdate[];  // "requestUpdate"
  };
  struct SARN_EXPORT ResponseCountValues {
    static const char Single[];    // "single"
    static const char Multiple[];  // "multiple"
    static const char None[];      // "none"
  };
  struct SARN_EXPORT ContentTypeValues {
    static const char ApplicationJson[];  // "application/json"
  };
  // The texts passed to Callbacks::OnError, each starting with "RpcV2Parser: ".
  struct SARN_EXPORT ErrorMessages {
    static const char InvalidFirstLine[];
    static const char InvalidFirstLineSize[];
    static const char InvalidHeaderSize[];
    static const char InvalidBodySize[];
    static const char InvalidHeaderLine[];
    static const char OutOfMemory[];  // a header line longer than LINE_LIMIT
    static const char InvalidRpcIdValue[];
    static const char InvalidContentType[];
    static const char InvalidResponseCountValue[];
    static const char InvalidTypeValue[];
    static const char MissingRpcId[];
    static const char MissingType[];
    static const char MissingResponseCount[];
    static const char MissingRequestType[];
    static const char MissingBody[];
    static const char UnexpectedBody[];
    static const char UnexpectedData[];
    static const char UnexpectedEndOfFirstLine[];
    static const char UnexpectedEndOfHeader[];
    static const char UnexpectedEndOfBody[];
    static const char BodySizeMismatch[];  // for readers that count the body themselves; never reported here
  };

  // The fixed limits of the frame format (writers check them too).
  static constexpr size_t FIRST_LINE_LIMIT = 25;          // bytes of the first line, CR LF included
  static constexpr size_t LINE_LIMIT = 1024;              // bytes of one header line, CR LF included
  static constexpr size_t HEADER_LENGTH_LIMIT = 1048576;  // the header block is 1 to this many bytes
  static constexpr size_t BODY_LENGTH_LIMIT = 5242880;    // the body is 0 to this many bytes

  // The receiver. The parser reads no answer from any callback.
  class SARN_EXPORT Callbacks {
   public:
    // One of the ErrorMessages texts; nothing is reported after it.
    virtual void OnError(const char* message) = 0;
    virtual void OnHeaderSize(size_t headerLength) = 0;
    virtual void OnBodySize(size_t bodyLength) = 0;
    // NUL-terminated and trimmed of white space; both point into the parser's line buffer.
    virtual void OnHeaderPair(const char* key, const char* value) = 0;
    // A piece of the body inside the caller's chunk; never empty.
    virtual void OnBodyChunk(const char* data, size_t length) = 0;
    // The last body byte has been passed on. A frame without a body (a cancel) ends without it.
    virtual void OnParsingComplete() = 0;
    virtual ~Callbacks();
  };

  enum State {
    StateFirstLine = 0,
    StateHeader = 1,
    StateHeaderDone = 2,
    StateBody = 3,
    StateError = 4,
    StateDone = 5,
  };

  enum MessageType : int32_t {
    MessageTypeNone = 0,
    MessageTypeCancel = 1,
    MessageTypeRequest = 2,
    MessageTypeRequestUpdate = 3,
    MessageTypeResponse = 4,
  };

  // Starts in StateFirstLine with every length and counter 0. `callbacks` must outlive the parser.
  explicit RpcV2Parser(Callbacks& callbacks);
  // Calls EndParse(): destroying a parser in the middle of a frame reports the matching
  // "Unexpected end" error to the receiver.
  virtual ~RpcV2Parser();

  RpcV2Parser(const RpcV2Parser&) = delete;
  RpcV2Parser& operator=(const RpcV2Parser&) = delete;

  // Consumes the whole chunk, or stops at an error. False when an error has been reported in
  // this call or earlier; true otherwise, also when the frame is not yet complete.
  bool ParseChunk(const char* data, size_t length);

  // The caller has no more input. Reports UnexpectedEndOfFirstLine, UnexpectedEndOfHeader or
  // UnexpectedEndOfBody and returns false when the frame stopped in that part; otherwise (header
  // block just judged, error, done) reports nothing and returns true. The state is not changed.
  bool EndParse();

  // The steps of ParseChunk; callers use ParseChunk. Each step returns the next state and
  // reports its own error (returning StateError).
  State ProcessFirstLine(const char*& cursor, const char* end);
  State ProcessHeaderLine(const char*& cursor, const char* end);
  State ValidateHeaderData();
  State ProcessBodyChunk(const char*& cursor, const char* end);
  // Checks one header pair and counts the keys that must be present; false after reporting.
  bool ValidateHeaderPair(const char* key, const char* value);
  // Copies bytes from `cursor` into the line buffer until the cached bytes end in CR LF, `max`
  // bytes have been copied, the chunk is used up or LINE_LIMIT bytes are cached.
  void CacheUntilCrLfOrMax(const char*& cursor, const char* end, size_t max);

  Callbacks* pCallbacksM;
  State stateM;
  char lineBufferM[LINE_LIMIT + 1];  // the line being assembled and room for a NUL after it
  size_t lineLengthM;
  size_t headerLengthM;
  size_t bodyLengthM;
  size_t headerBytesReadM;  // bytes of the header block in completed lines
  size_t bodyBytesReadM;    // bytes passed to OnBodyChunk
  size_t rpcIdCountM;
  MessageType messageTypeM;
  size_t requestTypeCountM;
  size_t responseCountCountM;

 private:
#define SARN_RPCV2_HIDDEN __attribute__((visibility("hidden")))
  // The bodies of the steps, called directly by ParseChunk.
  SARN_RPCV2_HIDDEN State DoProcessFirstLine(const char*& cursor, const char* end);
  SARN_RPCV2_HIDDEN State DoProcessHeaderLine(const char*& cursor, const char* end);
  SARN_RPCV2_HIDDEN State DoValidateHeaderData();
  SARN_RPCV2_HIDDEN State DoProcessBodyChunk(const char*& cursor, const char* end);
  SARN_RPCV2_HIDDEN bool DoValidateHeaderPair(const char* key, const char* value);
  SARN_RPCV2_HIDDEN void DoCacheUntilCrLfOrMax(const char*& cursor, const char* end, size_t max);
  SARN_RPCV2_HIDDEN bool CacheEndsInCrLf() const;
  SARN_RPCV2_HIDDEN State Fail(const char* message);
#undef SARN_RPCV2_HIDDEN
};

}  // namespace sarn
