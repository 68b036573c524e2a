// KernoRpcV2: message wrappers to MRPC/2 frames and whole frames held in a string back to wrappers.
//
// Frames as written: "MRPC/2 <header length> <body length>" and CR LF; then, for every header
// name in byte order and every value under it in stored order, "name: value" and CR LF; one empty
// line (CR LF, counted in the header length); then the body's JSON text (nothing for a cancel).
// All lengths count bytes. The four writers share one frame writer: each checks the body
// (at most BODY_LENGTH_LIMIT bytes, and some bytes unless the message is a cancel) and then the
// header block (at most HEADER_LENGTH_LIMIT bytes and kMaxValuesPerContainer lines) before the
// first byte goes out, so a refused message leaves the caller's buffer or string as it was and
// the sink without a Write.
//
// The string reader works on the whole frame at once with messages of its own. It is more lenient
// than the byte-source reader (KernoRpcV2BytestreamImpl): a header length of 0, a first line of
// any length that ends in CR LF, any RpcId text (not digits: rpc id 0), keys kept untrimmed, and
// text after the body ignored. Positions are byte positions: the header block and the body are
// exactly the next header-length and body-length bytes, wherever that cuts a multi-byte
// character, and a size check fails only when the text is too short.
//
// Messages: the writers append theirs to `error`; the readers replace what `error` holds, except
// "Invalid header line: ", which is appended. Running out of memory fails the call with
// kOutOfMemoryMessage (appended by writers, replacing in readers) or a failed output buffer.
//
// Thread safety: all operations are static and keep nothing between calls.
#pragma once

#include <cstddef>

#include "sarn/base/Export.h"
#include "sarn/rpc/KernoRpcWrapper.h"

namespace sarn {

class SARN_EXPORT KernoRpcV2 {
 public:
  static const char BodyTooLargeMessage[];     // "Kerno Rpc message body is too large."
  static const char HeadersTooLargeMessage[];  // "Kerno Rpc headers are too large"
  static const char HeaderWriteFailedMessage[];  // "Failed to write headers"
  static const char MissingBodyMessage[];      // "Missing message body"

  // Appends the frame to `out`; false with a message appended to `error`, `out` unchanged.
  static bool MarshalToString(const ref<KernoRpcWrapper>& message, ByteBuffer& out, VekString& error,
                              VekMempool* pool, bool pretty);
  // The same into a fresh buffer: on success `out` is the frame, on failure it is left as it was.
  static bool MarshalToString(const ref<KernoRpcWrapper>& message, VekString& out, VekString& error, VekMempool* pool,
                              bool pretty);
  // The frame, or the empty string on failure (the message is dropped).
  static VekString MarshalToString(VekMempool* pool, const ref<KernoRpcWrapper>& message, bool pretty);
  // Writes the frame to the sink and flushes it. The body is written twice to the message's
  // JSON writer: once to count it, once to send it. False, with "Failed to write headers"
  // appended, when the sink refuses the header block (the body is then not sent).
  static bool MarshalToBytesink(const ref<KernoRpcWrapper>& message, wynbaselib::Bytesink& sink, VekString& error,
                                VekMempool* pool, bool pretty);

  // The message of the frame at the start of `text` (anything after its body is ignored); null
  // with `error` set. With `parseBodyNow` the body is parsed into a Dictionary at once, else it
  // is kept as JSON text.
  static ref<KernoRpcWrapper> UnmarshalFromString(VekMempool* pool, const VekString& text, bool parseBodyNow,
                                                  VekString& error);
  // True when `text` starts with a whole frame, or with a first line that can never become
  // valid; `length` is then the frame's length in bytes (all of `text` for a bad first line) and
  // `error` the first line's message (empty when it was good).
  static bool IsCompleteString(VekMempool* pool, const VekString& text, size_t& length, VekString& error);

  // The first-line check of the string reader and the packetizer, on the first `size` bytes at
  // `text`. False without a message (and `firstLineLength` 0) while no CR LF has arrived within
  // 25 bytes; false with a message, replacing `error`, for a line that cannot become valid.
  // `firstLineLength` counts the line with its CR LF (all of `text` for an overlong one).
  static bool ParseFirstLine(VekMempool* pool, const char* text, size_t size, size_t& headerLength,
                             size_t& bodyLength, size_t& firstLineLength, VekString& error);
  // The wrapper a header Dict names, with `body` as its body; null with `error` replaced. The
  // request, request update and response take the received Content-Type and keep what is left
  // of `headers`, after their own keys are removed from it, as their optional headers.
  static ref<KernoRpcWrapper> BuildWrapperFromHeaders(VekMempool* pool, ref<Dict>& headers, const char* body,
                                                      size_t bodyLength, bool parseBodyNow, VekString& error);
  // The body as a payload under `version`: kept as JSON text, or parsed at once; false with
  // "Missing message body" for an empty body (or one starting with a NUL byte, which a payload
  // cannot hold as text) and "Cannot convert JSON to Dict: " and the reader's message.
  static bool BodyToLazyDict(VekMempool* pool, const char* body, size_t bodyLength, bool parseBodyNow,
                             KernoVersion version, ref<LazyDict>& out, VekString& error);

  // Version conversion (KernoRpcV2Convert.cpp): wrappers to the version-1 envelope objects and
  // back, sharing bodies and headers instead of copying them, so a change inside a shared Dict is
  // seen on both sides. Results are made in `pool`; neither reports errors.
  //
  // To version 1: a request update (tested first, being a request too) gives a kernoRpcRequestUpdate,
  // a request a kernoRpcRequest (kernoVersion the wrapper's schema version, sendAndForget always
  // present: true for ResponseCountNone, monitorFutureChanges true for ResponseCountMultiple; a
  // count outside the three is taken as ResponseCountSingle), a response a kernoRpcResponse
  // (kernoVersion unset), a cancel a kernoRpcCancel with its rpc id only; null for a null message or
  // another kind. Headers are the wrapper's optional headers Dict, which a request or response
  // always has (perhaps empty): the protocol-buffer envelope readers refuse an envelope with a
  // headers field, so converted envelopes travel in binary through the generic known-dict path. A
  // wrapper without body gives an envelope whose body field is unset (the binary writer skips it).
  //
  // To version 2, by type id: 974 a CancelWrapper; 975 a RequestWrapper, 2238 a
  // RequestUpdateWrapper, each with a new Dict-form body made from the old body's Dict under the
  // object's kernoVersion (975) or the old body's own version (2238), the request type being that
  // Dict's first "type" text; 976 a ResponseWrapper over the object's own body (the wrapper's
  // schema version is the body's; the object's kernoVersion is not used); 1449 a request of its
  // own type with rpc id 0, schema version 7, ResponseCountNone and the object as its body. The
  // response count: sendAndForget present and true gives ResponseCountNone, else
  // monitorFutureChanges gives ResponseCountMultiple or ResponseCountSingle. Null for a null
  // object, any other type id, a request, request update or response without body, and a request
  // or request update whose body gives no Dict or a Dict without a "type" text (no request can be
  // sent without a request type). A body of malformed JSON is not refused: its Dict is the
  // payload's "error" dictionary, so the request's type is "error".
  static ref<SarnObject> KernoRpcV2ToV1(VekMempool* pool, const ref<KernoRpcWrapper>& message);
  static ref<KernoRpcWrapper> KernoRpcV1ToV2Wrapper(VekMempool* pool, const ref<SarnObject>& object);
};

}  // namespace sarn
