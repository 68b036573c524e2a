// KernoRpcWrapper: one MRPC/2 message in memory, and its four kinds (request, response, cancel,
// request update).
//
// A wrapper holds the header values the protocol defines as typed members, the headers it does
// not define as optional headers (a Dict whose keys may carry several string values), and the
// body as a LazyDict, so a body that arrived as text stays text until somebody asks for it as a
// Dict, as JSON or as a schema object. A request update is a request in all but its Type header.
//
// Bodies: a request or response may be built with a null body. Such a wrapper answers its body
// operations as a cancel does (BodyToDict null, BodyToJson empty, the body writers write
// nothing), UnmarshalToSarnObject returns null ("Missing message body" in the form with an error
// text), two null bodies are equal and a null and a non-null one are not. The frame writers
// refuse such a message: no reader accepts a request or response without body bytes.
//
// Ownership: every wrapper is made in the pool given to New and is counted; it holds one
// reference to its body and to its optional headers. A Dict given as optional headers is shared,
// not copied, and SetOptionalHeaders removes the message's own keys from the caller's object
// itself. Results (header Dicts, views) are new objects in the pool the caller names.
//
// Thread safety: none taken. A wrapper may be read from several threads; UnmarshalToSarnObject
// and the optional-header operations change it.
#pragma once

#include <cstdint>

#include "sarn/base/Export.h"
#include "sarn/dict/Dict.h"
#include "sarn/dict/LazyDict.h"
#include "sarn/model/SarnObject.h"
#include "sarn/values/ByteBuffer.h"
#include "vek/VekCore.h"
#include "wynbaselib/Bytestream.h"

namespace sarn {

class SARN_EXPORT KernoRpcWrapper : public VekCore {
 public:
  KernoRpcWrapper(unsigned int rpcId, KernoVersion version);
  ~KernoRpcWrapper() override;
  KernoRpcWrapper(const KernoRpcWrapper&) = delete;
  KernoRpcWrapper& operator=(const KernoRpcWrapper&) = delete;

  // The schema type name of the body; "Cancel" for a cancel.
  virtual VekString GetTypeName() = 0;
  // The message's headers as string values in a new Dict in `pool`: its own headers first, then
  // the optional ones name by name in byte order. Null when memory runs out.
  virtual ref<Dict> HeadersToDict(VekMempool* pool) const = 0;
  // The body as a Dict; null without a body.
  virtual ref<Dict> BodyToDict();
  // The body's JSON text; empty without a body.
  virtual VekString BodyToJson(bool pretty) = 0;
  // Appends (writes) the body's JSON text; nothing without a body.
  virtual void BodyToJsonByteBuffer(ByteBuffer& out, bool pretty) = 0;
  virtual void BodyToJsonByteSink(wynbaselib::Bytesink& sink, bool pretty) = 0;
  // True only for a final response.
  virtual bool IsFinalResponse();

  // HeadersToDict with the body's Dict added under "body" when there is one.
  ref<Dict> ToDict(VekMempool* pool);
  // ToDict as compact JSON; empty when memory runs out.
  VekString ToString(VekMempool* pool);
  ref<Dictionary> HeadersToDictionary(VekMempool* pool) const;
  // Null without a body.
  ref<Dictionary> BodyToDictionary();

  uint32_t rpcIdM;
  KernoVersion schemaVersionM;
};

class SARN_EXPORT RequestWrapper : public KernoRpcWrapper {
 public:
  enum ResponseCount : int32_t {
    ResponseCountNone = 0,
    ResponseCountSingle = 1,
    ResponseCountMultiple = 2,
  };

  // A null `optionalHeaders` is replaced by a new empty Dict; a given one is shared. The content
  // type starts as "application/json".
  RequestWrapper(unsigned rpcId, const VekString& requestType, ResponseCount count, KernoVersion version,
                 const ref<LazyDict>& body, const ref<Dict>& optionalHeaders);
  // requestTypeM is the object's type name; the body holds the object under `version`.
  RequestWrapper(unsigned rpcId, ResponseCount count, KernoVersion version, const ref<SarnObject>& body,
                 const ref<Dict>& optionalHeaders);
  ~RequestWrapper() override;

  // Null when memory runs out.
  static ref<RequestWrapper> New(VekMempool* pool, unsigned rpcId, const VekString& requestType, ResponseCount count,
                                 KernoVersion version, const ref<LazyDict>& body, const ref<Dict>& optionalHeaders);
  static ref<RequestWrapper> New(VekMempool* pool, unsigned rpcId, ResponseCount count, KernoVersion version,
                                 const ref<SarnObject>& body, const ref<Dict>& optionalHeaders);

  VekString GetTypeName() override;
  ref<Dict> HeadersToDict(VekMempool* pool) const override;
  ref<Dict> BodyToDict() override;
  VekString BodyToJson(bool pretty) override;
  void BodyToJsonByteBuffer(ByteBuffer& out, bool pretty) override;
  void BodyToJsonByteSink(wynbaselib::Bytesink& sink, bool pretty) override;

  // Adds one more value under `key`; false, adding nothing, for the request's own keys
  // (RequestType, SchemaVersion, ResponseCount, Type, RpcId, Content-Type) or when memory runs out.
  bool AddOptionalHeader(const VekString& key, const VekString& value);
  // Removes the request's own keys, and a lower-case "type", from the caller's Dict itself, then
  // holds that Dict. A null Dict is replaced by a new empty one.
  void SetOptionalHeaders(ref<Dict>& headers);
  void SetOptionalHeaders(ref<Dictionary>& headers);
  ref<Dict> GetOptionalHeaders() const { return optionalHeadersM; }
  ref<Dictionary> GetOptionalHeadersDictionary() const;

  // The body as an object. On success the body is replaced by a payload holding that object
  // under schemaVersionM, so a second call does not parse again; on failure (or without a body)
  // null, and the wrapper is unchanged.
  ref<SarnObject> UnmarshalToSarnObject();

  // Rpc id, request type, response count, schema version, content type, body, optional headers.
  bool operator==(const RequestWrapper& other) const;
  bool operator!=(const RequestWrapper& other) const { return !(*this == other); }

  VekString requestTypeM;
  ResponseCount responseCountM;
  ref<LazyDict> bodyM;
  VekString contentTypeM;
  ref<Dict> optionalHeadersM;

 protected:
  // Adds the request's headers to `headers` with `type` as the Type value.
  ref<Dict> RequestHeaders(VekMempool* pool, const char* type) const;
};

class SARN_EXPORT ResponseWrapper : public KernoRpcWrapper {
 public:
  // The schema version is the body's own (0 for a null body); the type name is "response".
  ResponseWrapper(unsigned rpcId, bool isFinal, const ref<LazyDict>& body, const ref<Dict>& optionalHeaders);
  // The body holds the object under `version`; the type name is the object's.
  ResponseWrapper(unsigned rpcId, bool isFinal, const ref<SarnObject>& body, KernoVersion version,
                  const ref<Dict>& optionalHeaders);
  ~ResponseWrapper() override;

  static ref<ResponseWrapper> New(VekMempool* pool, unsigned rpcId, bool isFinal, const ref<LazyDict>& body,
                                  const ref<Dict>& optionalHeaders);
  static ref<ResponseWrapper> New(VekMempool* pool, unsigned rpcId, bool isFinal, const ref<SarnObject>& body,
                                  KernoVersion version, const ref<Dict>& optionalHeaders);

  VekString GetTypeName() override;
  ref<Dict> HeadersToDict(VekMempool* pool) const override;
  ref<Dict> BodyToDict() override;
  VekString BodyToJson(bool pretty) override;
  void BodyToJsonByteBuffer(ByteBuffer& out, bool pretty) override;
  void BodyToJsonByteSink(wynbaselib::Bytesink& sink, bool pretty) override;
  bool IsFinalResponse() override;

  // As for requests; the response's own keys are IsFinal, Type, RpcId and Content-Type.
  bool AddOptionalHeader(const VekString& key, const VekString& value);
  void SetOptionalHeaders(ref<Dict>& headers);
  void SetOptionalHeaders(ref<Dictionary>& headers);
  ref<Dict> GetOptionalHeaders() const { return optionalHeadersM; }
  ref<Dictionary> GetOptionalHeadersDictionary() const;

  // As for requests, and typeNameM becomes the object's type name.
  ref<SarnObject> UnmarshalToSarnObject();
  // Sets the body's schema version to `version` first (kept even when the conversion then
  // fails), then converts with the payload's message in `error` on failure.
  ref<SarnObject> UnmarshalToSarnObject(KernoVersion version, VekString& error);

  // Rpc id, body, content type, final flag, optional headers (not the version or type name).
  bool operator==(const ResponseWrapper& other) const;
  bool operator!=(const ResponseWrapper& other) const { return !(*this == other); }

  ref<LazyDict> bodyM;
  VekString contentTypeM;
  bool isFinalM;
  VekString typeNameM;
  ref<Dict> optionalHeadersM;
};

// No body, no optional headers, schema version 0.
class SARN_EXPORT CancelWrapper : public KernoRpcWrapper {
 public:
  explicit CancelWrapper(unsigned rpcId);
  ~CancelWrapper() override;
  // `optionalHeaders` is not kept.
  static ref<CancelWrapper> New(VekMempool* pool, unsigned rpcId, const ref<Dict>& optionalHeaders);

  VekString GetTypeName() override;
  ref<Dict> HeadersToDict(VekMempool* pool) const override;
  VekString BodyToJson(bool pretty) override;
  void BodyToJsonByteBuffer(ByteBuffer& out, bool pretty) override;
  void BodyToJsonByteSink(wynbaselib::Bytesink& sink, bool pretty) override;

  // Rpc ids only.
  bool operator==(const CancelWrapper& other) const { return rpcIdM == other.rpcIdM; }
  bool operator!=(const CancelWrapper& other) const { return !(*this == other); }
};

// A request with ResponseCountMultiple and schema version 0, sent with the Type "requestUpdate".
class SARN_EXPORT RequestUpdateWrapper : public RequestWrapper {
 public:
  RequestUpdateWrapper(unsigned rpcId, const VekString& requestType, const ref<LazyDict>& body,
                       const ref<Dict>& optionalHeaders);
  RequestUpdateWrapper(unsigned rpcId, const ref<SarnObject>& body, const ref<Dict>& optionalHeaders);
  ~RequestUpdateWrapper() override;

  static ref<RequestUpdateWrapper> New(VekMempool* pool, unsigned rpcId, const VekString& requestType,
                                       const ref<LazyDict>& body, const ref<Dict>& optionalHeaders);
  static ref<RequestUpdateWrapper> New(VekMempool* pool, unsigned rpcId, const ref<SarnObject>& body,
                                       const ref<Dict>& optionalHeaders);

  ref<Dict> HeadersToDict(VekMempool* pool) const override;
};

}  // namespace sarn
