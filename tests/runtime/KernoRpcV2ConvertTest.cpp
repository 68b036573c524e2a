// Version conversion from a table (each envelope to a wrapper, the wrapper back to an envelope,
// that envelope through the binary form and round again), then what is shared rather than copied
// and the envelope reader's refusal of a converted envelope.
#include <gtest/gtest.h>

#include "runtime/ObjectOpsSupport.h"

using namespace objopstest;

namespace {

// The wrapper's ToString, then " v" and its schema version, then "/" and its body's.
std::string Summary(VekMempool* pool, const ref<KernoRpcWrapper>& w) {
  const ref<LazyDict> body = rpcfuzz::Body(w);
  if (!w) return "null";
  return Str(w->ToString(pool)) + " v" + std::to_string(w->schemaVersionM) + (body ? "/" + std::to_string(body->versionM) : "");
}

}  // namespace

// Rows: an envelope as JSON (its body at version 33) => the wrapper it gives => the envelope that
// wrapper gives, as the text of ToString ("-": none), which must come through the binary form equal
// and give back a wrapper equal to the first.
TEST(KernoRpcV2Convert, EnvelopesAndWrappersBothWays) {
  VekMempool pool("convert");
  for (const auto& row : sarntest::ReadTable("rpc/version-conversion.txt", 3)) {
    ref<SarnObject> v1 = row[0] == "null" ? nullptr : FromJson(&pool, row[0]);
    const FieldInfo* body = v1 ? FieldNamed(v1->GetStructInfo(), v1->GetTypeId() == 976 ? "response" : "request") : nullptr;
    if (body != nullptr && FieldAccess::ReferenceAt(v1.Get(), *body, 0) != nullptr) FieldRef<ref<LazyDict>>(v1.Get(), *body)->versionM = 33;
    ref<KernoRpcWrapper> wrapper = KernoRpcV2::KernoRpcV1ToV2Wrapper(&pool, v1);
    EXPECT_EQ(Summary(&pool, wrapper), row[1]) << row[0];
    ref<SarnObject> back = KernoRpcV2::KernoRpcV2ToV1(&pool, wrapper);
    EXPECT_EQ(back ? Str(back->ToString(false, 0)) : "-", row[2]) << row[0];
    EXPECT_TRUE(!back || (*BinaryCopy(&pool, back.Get()) == *back && SameWrapper(KernoRpcV2::KernoRpcV1ToV2Wrapper(&pool, back), wrapper))) << row[0];
  }
  const FieldInfo* f;
  ref<KernoRpcWrapper> bad = KernoRpcV2::KernoRpcV1ToV2Wrapper(&pool, Side(&pool, "kernoRpcRequest.request", "json:{\"type\": ", f));
  EXPECT_EQ(Str(bad->GetTypeName()), "error");
  EXPECT_TRUE(!KernoRpcV2::KernoRpcV2ToV1(&pool, nullptr) && !KernoRpcV2::KernoRpcV1ToV2Wrapper(&pool, nullptr));
}

TEST(KernoRpcV2Convert, BodiesAndHeadersAreSharedNotCopied) {
  VekMempool pool("shared");
  ref<LazyDict> body = LazyDict::FromJsonString(&pool, VekString(("{\"type\": \"success\", \"message\": \"" + std::string(1 << 20, 'x') + "\"}").c_str()), 42);
  ref<Dict> headers = Dict::New(&pool, VekString());
  ref<KernoRpcWrapper> request = RequestWrapper::New(&pool, 1, VekString("success"), RequestWrapper::ResponseCountSingle, 42, body, headers);
  ref<SarnObject> response = sarnschema::KernoRpcResponse::Factory(&pool);
  static_cast<sarnschema::KernoRpcResponse*>(response.Get())->responseM = body;
  static_cast<sarnschema::KernoRpcResponse*>(response.Get())->headersM = headers;
  const size_t used = pool.GetUsedBytes();
  ref<SarnObject> v1 = KernoRpcV2::KernoRpcV2ToV1(&pool, request);
  ref<KernoRpcWrapper> v2 = KernoRpcV2::KernoRpcV1ToV2Wrapper(&pool, response);
  EXPECT_LT(pool.GetUsedBytes() - used, 1024u);
  auto* v1Request = static_cast<sarnschema::KernoRpcRequest*>(v1.Get());
  auto* v2Response = static_cast<ResponseWrapper*>(v2.Get());
  EXPECT_TRUE(v1Request->requestM == body && v1Request->headersM == headers && v2Response->bodyM == body && v2Response->optionalHeadersM == headers);
  // An envelope with headers, refused by the envelope reader.
  const std::string bytes = sarntest::KnownDictBytes(&pool, v1.Get());
  ref<SarnObject> read = ProtoBuf(&pool, Schema::vStructDefG, Schema::nStructDefG).UnmarshalWrapper(reinterpret_cast<const unsigned char*>(bytes.data()), static_cast<int>(bytes.size()));
  EXPECT_EQ(Str(static_cast<sarnschema::Error*>(read.Get())->textM), "wrapper did not unmarshal");
}
