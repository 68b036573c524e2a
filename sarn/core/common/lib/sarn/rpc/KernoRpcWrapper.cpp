// The message wrappers: construction, headers, optional headers, body views and equality.
#include "sarn/rpc/KernoRpcWrapper.h"

#include <cstring>

#include "sarn/base/Limits.h"
#include "sarn/rpc/RpcV2Parser.h"
#include "sarn/rpc/internal/HeaderNames.h"

namespace sarn {

namespace {

using Keys = RpcV2Parser::HeaderKeys;

// The keys a request or response keeps as typed members: optional headers never carry them.
// The lower-case "type" is stripped from a request's headers only (a request body's own type key
// must not come back as a header), so it is refused by SetOptionalHeaders but not by
// AddOptionalHeader.
const char* const kRequestOwnKeysG[] = {Keys::RequestType, Keys::SchemaVersion, Keys::ResponseCount,
                                        Keys::Type,        Keys::RpcId,         Keys::ContentType};
const char* const kResponseOwnKeysG[] = {Keys::IsFinal, Keys::Type, Keys::RpcId, Keys::ContentType};

template <size_t N>
bool IsOneOf(const char* const (&keys)[N], const VekString& key) {
  for (const char* own : keys) {
    if (key.FEqual(own)) return true;
  }
  return false;
}

// Removes the own keys from the caller's Dict itself. A frame just read usually holds nothing
// but own keys: the Dict then gets an empty table in one step, instead of one rebuild of its
// table per removal.
void StripKeys(Dict& headers, std::initializer_list<const VekString*> keys) {
  const ref<Dictionary> table = headers.GetDictionary();
  unsigned nOwn = 0;
  for (const VekString* key : keys) nOwn += table->CountValues(*key);
  if (nOwn == 0) return;
  ref<Dictionary> empty = nOwn == table->CountNames() ? Dictionary::New(headers.GetMempool(), VekString()) : nullptr;
  if (empty) {
    headers.dictionaryM = empty;
    return;
  }
  for (const VekString* key : keys) headers.Remove(*key);
}

// The shared step of both kinds' SetOptionalHeaders: a given Dict is stripped of the message's
// own keys and held; a null one is replaced by a new empty Dict (kept as it was when memory runs
// out).
void AdoptHeaders(VekMempool* pool, ref<Dict>& held, ref<Dict>& given,
                  std::initializer_list<const VekString*> ownKeys) {
  if (!given) {
    ref<Dict> fresh = MakeDict(pool);
    if (fresh) held = fresh;
    return;
  }
  StripKeys(*given, ownKeys);
  held = given;
}

VekString Text(VekMempool* pool, const char* text) { return VekString::FromUtf8Bytes(pool, std::strlen(text), text); }

// A pool that cannot make a string gives an empty one: a value that cannot be empty coming back
// empty means memory ran out.
bool AddText(Dict& headers, const VekString& name, const VekString& value, bool canBeEmpty = false) {
  return (canBeEmpty || !value.FEmpty()) && headers.AddString(name, value);
}

// Every value of every optional header, names in byte order, values in stored order.
bool CopyOptionalHeaders(Dict& to, const ref<Dict>& from) {
  if (!from) return true;
  VekStringArray names(to.GetMempool());
  from->GetSortedNames(names);
  for (int i = 0; i < names.Count(); ++i) {
    const unsigned n = from->CountValues(names[i]);
    for (unsigned j = 0; j < n; ++j) {
      if (!to.AddString(names[i], from->GetString(names[i], static_cast<int>(j)))) return false;
    }
  }
  return true;
}

bool BodiesEqual(const ref<LazyDict>& a, const ref<LazyDict>& b) {
  if (!a || !b) return !a && !b;
  return *a == *b;
}

bool HeadersEqual(const ref<Dict>& a, const ref<Dict>& b) {
  if (!a || !b) return !a && !b;
  return *a == *b;
}

ref<Dict> OrNewDict(VekMempool* pool, const ref<Dict>& headers) { return headers ? headers : MakeDict(pool); }

const char kMissingBodyG[] = "Missing message body";

}  // namespace

// ---- KernoRpcWrapper ------------------------------------------------------------------------

KernoRpcWrapper::KernoRpcWrapper(unsigned int rpcId, KernoVersion version) : rpcIdM(rpcId), schemaVersionM(version) {}
KernoRpcWrapper::~KernoRpcWrapper() {}

ref<Dict> KernoRpcWrapper::BodyToDict() { return nullptr; }
bool KernoRpcWrapper::IsFinalResponse() { return false; }

ref<Dict> KernoRpcWrapper::ToDict(VekMempool* pool) {
  ref<Dict> headers = HeadersToDict(pool);
  if (!headers) return headers;
  ref<Dict> body = BodyToDict();
  if (body && !headers->AddDict("body", body)) return nullptr;
  return headers;
}

VekString KernoRpcWrapper::ToString(VekMempool* pool) {
  ref<Dict> all = ToDict(pool);
  return all ? all->ToString(false) : VekString();
}

ref<Dictionary> KernoRpcWrapper::HeadersToDictionary(VekMempool* pool) const {
  ref<Dict> headers = HeadersToDict(pool);
  return headers ? headers->GetDictionary() : nullptr;
}

ref<Dictionary> KernoRpcWrapper::BodyToDictionary() {
  ref<Dict> body = BodyToDict();
  return body ? body->GetDictionary() : nullptr;
}

// ---- RequestWrapper -------------------------------------------------------------------------

RequestWrapper::RequestWrapper(unsigned rpcId, const VekString& requestType, ResponseCount count, KernoVersion version,
                               const ref<LazyDict>& body, const ref<Dict>& optionalHeaders)
    : KernoRpcWrapper(rpcId, version),
      requestTypeM(requestType),
      responseCountM(count),
      bodyM(body),
      contentTypeM(RpcV2Parser::ContentTypeValues::ApplicationJson),
      optionalHeadersM(OrNewDict(pMempoolM, optionalHeaders)) {}

RequestWrapper::RequestWrapper(unsigned rpcId, ResponseCount count, KernoVersion version, const ref<SarnObject>& body,
                               const ref<Dict>& optionalHeaders)
    : KernoRpcWrapper(rpcId, version),
      requestTypeM(body ? body->GetTypeName() : VekString()),
      responseCountM(count),
      bodyM(body ? LazyDict::FromSarnObject(pMempoolM, body, version) : nullptr),
      contentTypeM(RpcV2Parser::ContentTypeValues::ApplicationJson),
      optionalHeadersM(OrNewDict(pMempoolM, optionalHeaders)) {}

RequestWrapper::~RequestWrapper() {}

ref<RequestWrapper> RequestWrapper::New(VekMempool* pool, unsigned rpcId, const VekString& requestType,
                                        ResponseCount count, KernoVersion version, const ref<LazyDict>& body,
                                        const ref<Dict>& optionalHeaders) {
  ref<RequestWrapper> request = new (pool) RequestWrapper(rpcId, requestType, count, version, body, optionalHeaders);
  return request && request->optionalHeadersM ? request : nullptr;
}

ref<RequestWrapper> RequestWrapper::New(VekMempool* pool, unsigned rpcId, ResponseCount count, KernoVersion version,
                                        const ref<SarnObject>& body, const ref<Dict>& optionalHeaders) {
  ref<RequestWrapper> request = new (pool) RequestWrapper(rpcId, count, version, body, optionalHeaders);
  return request && request->optionalHeadersM && (request->bodyM || !body) ? request : nullptr;
}

VekString RequestWrapper::GetTypeName() { return requestTypeM; }

ref<Dict> RequestWrapper::RequestHeaders(VekMempool* pool, const char* type) const {
  static const char* const kCountTextsG[] = {RpcV2Parser::ResponseCountValues::None,
                                             RpcV2Parser::ResponseCountValues::Single,
                                             RpcV2Parser::ResponseCountValues::Multiple};
  const unsigned count = static_cast<unsigned>(responseCountM);
  const internal::HeaderNames& n = internal::HeaderNames::Get();
  ref<Dict> headers = MakeDict(pool);
  if (!headers || !AddText(*headers, n.typeM, Text(pool, type)) ||
      !AddText(*headers, n.rpcIdM, Dict::FormatU32(pool, rpcIdM)) ||
      !AddText(*headers, n.schemaVersionM, Dict::FormatU32(pool, static_cast<unsigned>(schemaVersionM))) ||
      !AddText(*headers, n.responseCountM,
               Text(pool, count < 3 ? kCountTextsG[count] : RpcV2Parser::ResponseCountValues::Multiple)) ||
      !AddText(*headers, n.contentTypeM, Text(pool, RpcV2Parser::ContentTypeValues::ApplicationJson)) ||
      !AddText(*headers, n.requestTypeM, requestTypeM, true) || !CopyOptionalHeaders(*headers, optionalHeadersM)) {
    return nullptr;
  }
  return headers;
}

ref<Dict> RequestWrapper::HeadersToDict(VekMempool* pool) const {
  return RequestHeaders(pool, RpcV2Parser::TypeValues::Request);
}

ref<Dict> RequestWrapper::BodyToDict() { return bodyM ? bodyM->ToDict() : nullptr; }
VekString RequestWrapper::BodyToJson(bool pretty) { return bodyM ? bodyM->ToJson(pretty) : VekString(); }
void RequestWrapper::BodyToJsonByteBuffer(ByteBuffer& out, bool pretty) {
  if (bodyM) bodyM->ToJsonByteBuffer(out, pretty);
}
void RequestWrapper::BodyToJsonByteSink(wynbaselib::Bytesink& sink, bool pretty) {
  if (bodyM) bodyM->ToJsonBytesink(sink, pretty);
}

bool RequestWrapper::AddOptionalHeader(const VekString& key, const VekString& value) {
  return !IsOneOf(kRequestOwnKeysG, key) && optionalHeadersM->AddString(key, value);
}

void RequestWrapper::SetOptionalHeaders(ref<Dict>& headers) {
  const internal::HeaderNames& n = internal::HeaderNames::Get();
  AdoptHeaders(pMempoolM, optionalHeadersM, headers,
               {&n.requestTypeM, &n.schemaVersionM, &n.responseCountM, &n.typeM, &n.lowerTypeM, &n.rpcIdM,
                &n.contentTypeM});
}

void RequestWrapper::SetOptionalHeaders(ref<Dictionary>& headers) {
  ref<Dict> wrapped = headers ? MempoolNew<Dict, ref<Dictionary>>(pMempoolM, headers) : nullptr;
  if (headers && !wrapped) return;  // out of memory: the headers stay as they were
  SetOptionalHeaders(wrapped);
}

ref<Dictionary> RequestWrapper::GetOptionalHeadersDictionary() const { return optionalHeadersM->GetDictionary(); }

ref<SarnObject> RequestWrapper::UnmarshalToSarnObject() {
  ref<SarnObject> object;
  if (!bodyM || !bodyM->ToSarnObject(object)) return nullptr;
  ref<LazyDict> parsed = LazyDict::FromSarnObject(pMempoolM, object, schemaVersionM);
  if (!parsed) return nullptr;
  bodyM = parsed;
  return object;
}

bool RequestWrapper::operator==(const RequestWrapper& other) const {
  return rpcIdM == other.rpcIdM && requestTypeM == other.requestTypeM && responseCountM == other.responseCountM &&
         schemaVersionM == other.schemaVersionM && contentTypeM == other.contentTypeM &&
         BodiesEqual(bodyM, other.bodyM) && HeadersEqual(optionalHeadersM, other.optionalHeadersM);
}

// ---- ResponseWrapper ------------------------------------------------------------------------

ResponseWrapper::ResponseWrapper(unsigned rpcId, bool isFinal, const ref<LazyDict>& body,
                                 const ref<Dict>& optionalHeaders)
    : KernoRpcWrapper(rpcId, body ? body->versionM : 0),
      bodyM(body),
      contentTypeM(RpcV2Parser::ContentTypeValues::ApplicationJson),
      isFinalM(isFinal),
      typeNameM(RpcV2Parser::TypeValues::Response),
      optionalHeadersM(OrNewDict(pMempoolM, optionalHeaders)) {}

ResponseWrapper::ResponseWrapper(unsigned rpcId, bool isFinal, const ref<SarnObject>& body, KernoVersion version,
                                 const ref<Dict>& optionalHeaders)
    : KernoRpcWrapper(rpcId, version),
      bodyM(body ? LazyDict::FromSarnObject(pMempoolM, body, version) : nullptr),
      contentTypeM(RpcV2Parser::ContentTypeValues::ApplicationJson),
      isFinalM(isFinal),
      typeNameM(body ? body->GetTypeName() : VekString(RpcV2Parser::TypeValues::Response)),
      optionalHeadersM(OrNewDict(pMempoolM, optionalHeaders)) {}

ResponseWrapper::~ResponseWrapper() {}

ref<ResponseWrapper> ResponseWrapper::New(VekMempool* pool, unsigned rpcId, bool isFinal, const ref<LazyDict>& body,
                                          const ref<Dict>& optionalHeaders) {
  ref<ResponseWrapper> response = new (pool) ResponseWrapper(rpcId, isFinal, body, optionalHeaders);
  return response && response->optionalHeadersM ? response : nullptr;
}

ref<ResponseWrapper> ResponseWrapper::New(VekMempool* pool, unsigned rpcId, bool isFinal, const ref<SarnObject>& body,
                                          KernoVersion version, const ref<Dict>& optionalHeaders) {
  ref<ResponseWrapper> response = new (pool) ResponseWrapper(rpcId, isFinal, body, version, optionalHeaders);
  return response && response->optionalHeadersM && (response->bodyM || !body) ? response : nullptr;
}

VekString ResponseWrapper::GetTypeName() { return typeNameM; }

ref<Dict> ResponseWrapper::HeadersToDict(VekMempool* pool) const {
  const internal::HeaderNames& n = internal::HeaderNames::Get();
  ref<Dict> headers = MakeDict(pool);
  if (!headers || !AddText(*headers, n.typeM, Text(pool, RpcV2Parser::TypeValues::Response)) ||
      !AddText(*headers, n.rpcIdM, Dict::FormatU32(pool, rpcIdM)) ||
      !AddText(*headers, n.isFinalM, Dict::FormatBool(pool, isFinalM)) ||
      !AddText(*headers, n.contentTypeM, contentTypeM, true) || !CopyOptionalHeaders(*headers, optionalHeadersM)) {
    return nullptr;
  }
  return headers;
}

ref<Dict> ResponseWrapper::BodyToDict() { return bodyM ? bodyM->ToDict() : nullptr; }
VekString ResponseWrapper::BodyToJson(bool pretty) { return bodyM ? bodyM->ToJson(pretty) : VekString(); }
void ResponseWrapper::BodyToJsonByteBuffer(ByteBuffer& out, bool pretty) {
  if (bodyM) bodyM->ToJsonByteBuffer(out, pretty);
}
void ResponseWrapper::BodyToJsonByteSink(wynbaselib::Bytesink& sink, bool pretty) {
  if (bodyM) bodyM->ToJsonBytesink(sink, pretty);
}
bool ResponseWrapper::IsFinalResponse() { return isFinalM; }

bool ResponseWrapper::AddOptionalHeader(const VekString& key, const VekString& value) {
  return !IsOneOf(kResponseOwnKeysG, key) && optionalHeadersM->AddString(key, value);
}

void ResponseWrapper::SetOptionalHeaders(ref<Dict>& headers) {
  const internal::HeaderNames& n = internal::HeaderNames::Get();
  AdoptHeaders(pMempoolM, optionalHeadersM, headers, {&n.isFinalM, &n.typeM, &n.rpcIdM, &n.contentTypeM});
}

void ResponseWrapper::SetOptionalHeaders(ref<Dictionary>& headers) {
  ref<Dict> wrapped = headers ? MempoolNew<Dict, ref<Dictionary>>(pMempoolM, headers) : nullptr;
  if (headers && !wrapped) return;
  SetOptionalHeaders(wrapped);
}

ref<Dictionary> ResponseWrapper::GetOptionalHeadersDictionary() const { return optionalHeadersM->GetDictionary(); }

ref<SarnObject> ResponseWrapper::UnmarshalToSarnObject() {
  ref<SarnObject> object;
  if (!bodyM || !bodyM->ToSarnObject(object)) return nullptr;
  ref<LazyDict> parsed = LazyDict::FromSarnObject(pMempoolM, object, schemaVersionM);
  if (!parsed) return nullptr;
  bodyM = parsed;
  typeNameM = object->GetTypeName();
  return object;
}

ref<SarnObject> ResponseWrapper::UnmarshalToSarnObject(KernoVersion version, VekString& error) {
  if (!bodyM) {
    error = Text(pMempoolM, kMissingBodyG);
    return nullptr;
  }
  bodyM->versionM = version;
  ref<SarnObject> object = bodyM->ToSarnObjectOrErrorString(error);
  if (!object) return nullptr;
  ref<LazyDict> parsed = LazyDict::FromSarnObject(pMempoolM, object, schemaVersionM);
  if (!parsed) {
    error = Text(pMempoolM, kOutOfMemoryMessage);
    return nullptr;
  }
  bodyM = parsed;
  typeNameM = object->GetTypeName();
  return object;
}

bool ResponseWrapper::operator==(const ResponseWrapper& other) const {
  return rpcIdM == other.rpcIdM && BodiesEqual(bodyM, other.bodyM) && contentTypeM == other.contentTypeM &&
         isFinalM == other.isFinalM && HeadersEqual(optionalHeadersM, other.optionalHeadersM);
}

// ---- CancelWrapper --------------------------------------------------------------------------

CancelWrapper::CancelWrapper(unsigned rpcId) : KernoRpcWrapper(rpcId, 0) {}
CancelWrapper::~CancelWrapper() {}

ref<CancelWrapper> CancelWrapper::New(VekMempool* pool, unsigned rpcId, const ref<Dict>&) {
  return ref<CancelWrapper>(new (pool) CancelWrapper(rpcId));
}

VekString CancelWrapper::GetTypeName() { return "Cancel"; }

ref<Dict> CancelWrapper::HeadersToDict(VekMempool* pool) const {
  const internal::HeaderNames& n = internal::HeaderNames::Get();
  ref<Dict> headers = MakeDict(pool);
  if (!headers || !AddText(*headers, n.typeM, Text(pool, RpcV2Parser::TypeValues::Cancel)) ||
      !AddText(*headers, n.rpcIdM, Dict::FormatU32(pool, rpcIdM))) {
    return nullptr;
  }
  return headers;
}

VekString CancelWrapper::BodyToJson(bool) { return VekString(); }
void CancelWrapper::BodyToJsonByteBuffer(ByteBuffer&, bool) {}
void CancelWrapper::BodyToJsonByteSink(wynbaselib::Bytesink&, bool) {}

// ---- RequestUpdateWrapper -------------------------------------------------------------------

RequestUpdateWrapper::RequestUpdateWrapper(unsigned rpcId, const VekString& requestType, const ref<LazyDict>& body,
                                           const ref<Dict>& optionalHeaders)
    : RequestWrapper(rpcId, requestType, ResponseCountMultiple, 0, body, optionalHeaders) {}

RequestUpdateWrapper::RequestUpdateWrapper(unsigned rpcId, const ref<SarnObject>& body,
                                           const ref<Dict>& optionalHeaders)
    : RequestWrapper(rpcId, ResponseCountMultiple, 0, body, optionalHeaders) {}

RequestUpdateWrapper::~RequestUpdateWrapper() {}

ref<RequestUpdateWrapper> RequestUpdateWrapper::New(VekMempool* pool, unsigned rpcId, const VekString& requestType,
                                                    const ref<LazyDict>& body, const ref<Dict>& optionalHeaders) {
  ref<RequestUpdateWrapper> update = new (pool) RequestUpdateWrapper(rpcId, requestType, body, optionalHeaders);
  return update && update->optionalHeadersM ? update : nullptr;
}

ref<RequestUpdateWrapper> RequestUpdateWrapper::New(VekMempool* pool, unsigned rpcId, const ref<SarnObject>& body,
                                                    const ref<Dict>& optionalHeaders) {
  ref<RequestUpdateWrapper> update = new (pool) RequestUpdateWrapper(rpcId, body, optionalHeaders);
  return update && update->optionalHeadersM && (update->bodyM || !body) ? update : nullptr;
}

// The request's headers, with the Type value "requestUpdate" in the place of "request".
ref<Dict> RequestUpdateWrapper::HeadersToDict(VekMempool* pool) const {
  return RequestHeaders(pool, RpcV2Parser::TypeValues::RequestUpdate);
}

}  // namespace sarn
