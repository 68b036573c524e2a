#include "sarn/rpc/KernoRpcV2BytestreamImpl.h"

#include <cstring>
#include <new>

#include "sarn/base/Limits.h"
#include "sarn/rpc/internal/BodyStream.h"
#include "sarn/rpc/internal/HeaderNames.h"

namespace sarn {

const char KernoRpcV2BytestreamImpl::BodyCompressionFailedMessage[] =
    "Kerno Rpc message body could not be kept compressed";

namespace {
using Keys = RpcV2Parser::HeaderKeys;
inline const internal::HeaderNames& Names() { return internal::HeaderNames::Get(); }
}  // namespace

KernoRpcV2BytestreamImpl::KernoRpcV2BytestreamImpl(wynbaselib::Bytesource& source, VekMempool* pool,
                                                   LazinessSettings laziness)
    : pMempoolM(pool),
      pSourceM(&source),
      lazinessM(laziness),
      jsonParserM(pool),
      errorM(false),
      pErrorStringM(nullptr),
      headersM(MakeDict(pool)),
      bodySizeM(0),
      headerLinesM(0),
      pBodyStreamM(nullptr),
      pGzipSinkM(nullptr) {
  if (IsKeepingCompressed()) {
    pBodyStreamM = new (std::nothrow) internal::BodyStream(pool);
    if (pBodyStreamM != nullptr) pGzipSinkM = new (std::nothrow) wynbaselib::GzipBytesink(pBodyStreamM);
  }
  if (lazinessM == LazyValidated) jsonParserM.BeginParse();
  if (lazinessM == ParsedToDictionary) jsonParserM.BeginParse(dictionaryM);
}

KernoRpcV2BytestreamImpl::~KernoRpcV2BytestreamImpl() {
  delete pGzipSinkM;
  delete pBodyStreamM;
}

ref<KernoRpcWrapper> KernoRpcV2BytestreamImpl::UnmarshalFromBytesource(VekMempool* pool,
                                                                       wynbaselib::Bytesource& source,
                                                                       LazinessSettings laziness, VekString& error) {
  KernoRpcV2BytestreamImpl reader(source, pool, laziness);
  return reader.Unmarshal(error);
}

ref<KernoRpcWrapper> KernoRpcV2BytestreamImpl::Unmarshal(VekString& error) {
  ref<KernoRpcWrapper> result;
  pErrorStringM = &error;
  if (!headersM || (IsKeepingCompressed() && pGzipSinkM == nullptr)) Fail(kOutOfMemoryMessage);
  {
    RpcV2Parser parser(*this);
    char buffer[READ_SIZE];
    while (!errorM) {
      const size_t n = pSourceM->Read(buffer, sizeof buffer);
      if (n == 0 || !parser.ParseChunk(buffer, n)) break;
    }
    parser.EndParse();
  }  // the parser's destructor ends the input once more; a repeated error is dropped
  if (!errorM) BuildRpcWrapper(result);
  if (!result && !errorM) Fail(kOutOfMemoryMessage);
  pErrorStringM = nullptr;
  return errorM ? nullptr : result;
}

void KernoRpcV2BytestreamImpl::Fail(const char* message) {
  if (errorM) return;
  errorM = true;
  if (pErrorStringM != nullptr) *pErrorStringM = VekString::FromUtf8Bytes(pMempoolM, std::strlen(message), message);
}

void KernoRpcV2BytestreamImpl::OnError(const char* message) { Fail(message); }
void KernoRpcV2BytestreamImpl::OnHeaderSize(size_t) {}
void KernoRpcV2BytestreamImpl::OnBodySize(size_t bodyLength) { bodySizeM = bodyLength; }

void KernoRpcV2BytestreamImpl::OnHeaderPair(const char* key, const char* value) {
  if (errorM) return;
  // Every pair is one more value in the platform's arrays: refuse the frame rather than drop one.
  if (++headerLinesM > kMaxValuesPerContainer) return Fail(kRpcHeaderLineLimitMessage);
  const size_t keyLength = std::strlen(key), valueLength = std::strlen(value);
  const VekString keyText = VekString::FromUtf8Bytes(pMempoolM, keyLength, key);
  const VekString valueText = VekString::FromUtf8Bytes(pMempoolM, valueLength, value);
  // A string the pool could not make comes back empty.
  if (keyText.NByte() != keyLength || valueText.NByte() != valueLength || !headersM->AddString(keyText, valueText)) {
    Fail(kOutOfMemoryMessage);
  }
}

void KernoRpcV2BytestreamImpl::OnBodyChunk(const char* data, size_t length) {
  if (errorM) return;
  if (IsParsing() && !jsonParserM.ParseChunk(data, length)) return Fail(jsonParserM.pErrorTextM);
  // A sink that fails must fail the read: a body that decompresses short is never handed out.
  if (IsKeepingCompressed() && !pGzipSinkM->Write(data, length)) Fail(BodyCompressionFailedMessage);
}

void KernoRpcV2BytestreamImpl::OnParsingComplete() {
  if (errorM) return;
  if (IsParsing() && !jsonParserM.EndParse()) return Fail(jsonParserM.pErrorTextM);
  if (IsKeepingCompressed() && !pGzipSinkM->Flush()) Fail(BodyCompressionFailedMessage);
}

void KernoRpcV2BytestreamImpl::GetResponseCountValue(RequestWrapper::ResponseCount& count) {
  const VekString text = headersM->GetString(Names().responseCountM, 0);
  if (text.FEqual(RpcV2Parser::ResponseCountValues::None)) {
    count = RequestWrapper::ResponseCountNone;
  } else if (text.FEqual(RpcV2Parser::ResponseCountValues::Single)) {
    count = RequestWrapper::ResponseCountSingle;
  } else {
    count = RequestWrapper::ResponseCountMultiple;
  }
}

bool KernoRpcV2BytestreamImpl::ExtractPayload(KernoVersion version, ref<LazyDict>& body) {
  if (pErrorStringM != nullptr) *pErrorStringM = VekString();
  // A body length of 0 reaches here only for a frame the parser judged a cancel (by its last
  // Type line) while its first Type line names another kind: that message has no body.
  if (bodySizeM == 0) return true;
  if (!IsKeepingCompressed()) {
    body = LazyDict::FromDictionary(pMempoolM, dictionaryM, version);
    return static_cast<bool>(body);
  }
  internal::BodyStream* copy = new (std::nothrow) internal::BodyStream(*pBodyStreamM);
  if (copy == nullptr) return false;
  // The payload owns the gunzip source, which owns its copy of the compressed bytes.
  wynbaselib::GunzipBytesource* source = new (std::nothrow) wynbaselib::GunzipBytesource(copy, nullptr, true);
  if (source == nullptr) {
    delete copy;
    return false;
  }
  body = LazyDict::FromBytesource(pMempoolM, source, version);
  return static_cast<bool>(body);
}

void KernoRpcV2BytestreamImpl::BuildRpcWrapper(ref<KernoRpcWrapper>& result) {
  const VekString contentType = headersM->GetString(Names().contentTypeM, 0);
  const VekString type = headersM->GetString(Names().typeM, 0);
  const unsigned rpcId = Dict::ParseU32(pMempoolM, headersM->GetString(Names().rpcIdM, 0).Utf8());
  const KernoVersion version =
      static_cast<KernoVersion>(Dict::ParseU32(pMempoolM, headersM->GetString(Names().schemaVersionM, 0).Utf8()));
  ref<LazyDict> body;
  if (type.FEqual(RpcV2Parser::TypeValues::Cancel)) {
    result = CancelWrapper::New(pMempoolM, rpcId, nullptr);
    return;
  }
  if (!ExtractPayload(version, body)) return;
  if (type.FEqual(RpcV2Parser::TypeValues::Request)) {
    RequestWrapper::ResponseCount count;
    GetResponseCountValue(count);
    ref<RequestWrapper> request = RequestWrapper::New(pMempoolM, rpcId, headersM->GetString(Names().requestTypeM, 0),
                                                      count, version, body, nullptr);
    if (!request) return;
    request->contentTypeM = contentType;
    request->SetOptionalHeaders(headersM);
    result = request;
  } else if (type.FEqual(RpcV2Parser::TypeValues::RequestUpdate)) {
    ref<RequestUpdateWrapper> update =
        RequestUpdateWrapper::New(pMempoolM, rpcId, headersM->GetString(Names().requestTypeM, 0), body, nullptr);
    if (!update) return;
    update->contentTypeM = contentType;
    update->SetOptionalHeaders(headersM);
    result = update;
  } else {
    const bool isFinal = headersM->GetString(Names().isFinalM, 0).FEqual("true");
    ref<ResponseWrapper> response = ResponseWrapper::New(pMempoolM, rpcId, isFinal, body, nullptr);
    if (!response) return;
    response->contentTypeM = contentType;
    response->SetOptionalHeaders(headersM);
    result = response;
  }
}

}  // namespace sarn
