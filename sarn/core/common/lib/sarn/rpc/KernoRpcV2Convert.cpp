// Version conversion between the MRPC/2 wrappers and the version-1 envelope objects. Bodies and
// headers are handed over as references: an envelope holds the wrapper's LazyDict and Dict, and a
// wrapper holds the envelope's. Only a request's body changes form on the way back, because the
// request type must be read out of it.
#include "sarn/rpc/KernoRpcV2.h"

#include <typeinfo>

#include "schema/KernoRpcCancel.h"
#include "schema/KernoRpcHello.h"
#include "schema/KernoRpcRequest.h"
#include "schema/KernoRpcRequestUpdate.h"
#include "schema/KernoRpcResponse.h"

namespace sarn {
namespace {

// A new envelope of type T in `pool`, or null when the pool is exhausted.
template <class T>
T* NewEnvelope(VekMempool* pool, ref<SarnObject>& out) {
  out = T::Factory(pool);
  return static_cast<T*>(out.Get());
}

// The request type and the Dict-form body of a version-1 request's payload under `version`; false
// when the payload gives no Dict or its Dict has no "type" text.
bool RequestBody(VekMempool* pool, const ref<LazyDict>& payload, KernoVersion version, VekString& type,
                 ref<LazyDict>& body) {
  if (!payload) return false;
  ref<Dict> dict = payload->ToDict();
  if (!dict) return false;
  type = dict->GetString("type", 0);
  if (type.FEmpty()) return false;
  body = LazyDict::FromDict(pool, dict, static_cast<unsigned short>(version));
  return static_cast<bool>(body);
}

// The wrapper as a T when it is one: the four classes themselves by their type_info (a pointer
// comparison, where a dynamic_cast down a chain of four costs more than the envelope's own
// allocation), classes derived from them by dynamic_cast.
template <class T>
T* As(KernoRpcWrapper* wrapper, const std::type_info& kind, bool isOwnClass) {
  if (isOwnClass) return kind == typeid(T) ? static_cast<T*>(wrapper) : nullptr;
  return dynamic_cast<T*>(wrapper);
}

}  // namespace

ref<SarnObject> KernoRpcV2::KernoRpcV2ToV1(VekMempool* pool, const ref<KernoRpcWrapper>& message) {
  ref<SarnObject> out;
  KernoRpcWrapper* wrapper = message.Get();
  if (wrapper == nullptr) return out;
  const std::type_info& kind = typeid(*wrapper);
  const bool isOwn = kind == typeid(RequestUpdateWrapper) || kind == typeid(RequestWrapper) ||
                     kind == typeid(ResponseWrapper) || kind == typeid(CancelWrapper);
  if (auto* update = As<RequestUpdateWrapper>(wrapper, kind, isOwn)) {
    if (auto* v1 = NewEnvelope<sarnschema::KernoRpcRequestUpdate>(pool, out)) {
      v1->rpcIdM = static_cast<int32_t>(update->rpcIdM);
      v1->requestM = update->bodyM;
      v1->headersM = update->optionalHeadersM;
    }
  } else if (auto* request = As<RequestWrapper>(wrapper, kind, isOwn)) {
    if (auto* v1 = NewEnvelope<sarnschema::KernoRpcRequest>(pool, out)) {
      v1->rpcIdM = static_cast<int32_t>(request->rpcIdM);
      v1->monitorFutureChangesM = request->responseCountM == RequestWrapper::ResponseCountMultiple;
      v1->sendAndForgetM = request->responseCountM == RequestWrapper::ResponseCountNone;
      v1->fHasSendAndForgetM = true;
      v1->headersM = request->optionalHeadersM;
      v1->kernoVersionM = request->schemaVersionM;
      v1->requestM = request->bodyM;
    }
  } else if (auto* response = As<ResponseWrapper>(wrapper, kind, isOwn)) {
    if (auto* v1 = NewEnvelope<sarnschema::KernoRpcResponse>(pool, out)) {
      v1->rpcIdM = static_cast<int32_t>(response->rpcIdM);
      v1->responseM = response->bodyM;
      v1->isFinalResponseM = response->IsFinalResponse();
      v1->headersM = response->optionalHeadersM;
    }
  } else if (auto* cancel = As<CancelWrapper>(wrapper, kind, isOwn)) {
    if (auto* v1 = NewEnvelope<sarnschema::KernoRpcCancel>(pool, out)) v1->rpcIdM = static_cast<int32_t>(cancel->rpcIdM);
  }
  return out;
}

ref<KernoRpcWrapper> KernoRpcV2::KernoRpcV1ToV2Wrapper(VekMempool* pool, const ref<SarnObject>& object) {
  if (!object) return ref<KernoRpcWrapper>();
  VekString type;
  ref<LazyDict> body;
  switch (object->GetTypeId()) {
    case sarnschema::KernoRpcCancel::TYPE_ID: {
      auto* v1 = static_cast<sarnschema::KernoRpcCancel*>(object.Get());
      return CancelWrapper::New(pool, static_cast<unsigned>(v1->rpcIdM), v1->headersM);
    }
    case sarnschema::KernoRpcRequest::TYPE_ID: {
      auto* v1 = static_cast<sarnschema::KernoRpcRequest*>(object.Get());
      if (!RequestBody(pool, v1->requestM, v1->kernoVersionM, type, body)) return ref<KernoRpcWrapper>();
      RequestWrapper::ResponseCount count = v1->fHasSendAndForgetM && v1->sendAndForgetM ? RequestWrapper::ResponseCountNone
                                            : v1->monitorFutureChangesM ? RequestWrapper::ResponseCountMultiple
                                                                        : RequestWrapper::ResponseCountSingle;
      return RequestWrapper::New(pool, static_cast<unsigned>(v1->rpcIdM), type, count, v1->kernoVersionM, body,
                                 v1->headersM);
    }
    case sarnschema::KernoRpcResponse::TYPE_ID: {
      auto* v1 = static_cast<sarnschema::KernoRpcResponse*>(object.Get());
      if (!v1->responseM) return ref<KernoRpcWrapper>();
      return ResponseWrapper::New(pool, static_cast<unsigned>(v1->rpcIdM), v1->isFinalResponseM, v1->responseM,
                                  v1->headersM);
    }
    case sarnschema::KernoRpcHello::TYPE_ID:
      return RequestWrapper::New(pool, 0, RequestWrapper::ResponseCountNone, 7, object, ref<Dict>());
    case sarnschema::KernoRpcRequestUpdate::TYPE_ID: {
      auto* v1 = static_cast<sarnschema::KernoRpcRequestUpdate*>(object.Get());
      if (!v1->requestM || !RequestBody(pool, v1->requestM, v1->requestM->versionM, type, body)) {
        return ref<KernoRpcWrapper>();
      }
      return RequestUpdateWrapper::New(pool, static_cast<unsigned>(v1->rpcIdM), type, body, v1->headersM);
    }
    default:
      return ref<KernoRpcWrapper>();
  }
}

}  // namespace sarn
