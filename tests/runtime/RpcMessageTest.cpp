// Messages: the wrappers, the four writers, the string reader, the packetizer and the byte-source
// reader, driven by the tables under tests/data/rpc/. A wrapper is built from a one-line recipe and
// shown as one line (Describe), so that every reader and setting is held to the same text. Then
// the conversion to and from version-1 envelopes, from a table, and what it shares.
#include "runtime/ObjectOpsSupport.h"
#include "testutil/AllocationFailure.h"

namespace {

using namespace sarn;
using sarntest::Str;
using Impl = KernoRpcV2BytestreamImpl;
using rpcfuzz::Body;
using rpcfuzz::BodyText;

const Impl::LazinessSettings kSettings[] = {Impl::LazyUnparsed, Impl::LazyValidated, Impl::ParsedToDictionary};

std::string Frame(const std::string& text) {  // "block##body" gets its first line
  const size_t at = text.find("##");
  if (text.rfind("MRPC/", 0) == 0 || at == std::string::npos) return text;
  return "MRPC/2 " + std::to_string(at) + " " + std::to_string(text.size() - at - 2) + "\r\n" + text.substr(0, at) +
         text.substr(at + 2);
}

struct RpcMessageTest : sarntest::PoolTest {
  VekString S(const std::string& text) { return VekString::FromUtf8Bytes(&poolM, text.size(), text.data()); }

  // "request RPC TYPE COUNT VERSION BODY", "update RPC TYPE BODY", "response RPC FINAL VERSION BODY",
  // "cancel RPC": BODY is JSON to the end of the line, "null", or "object" (a kernoCurrentTimeGet).
  ref<KernoRpcWrapper> Build(const std::string& recipe) {
    std::istringstream in(recipe);
    std::string kind, type, count, body;
    unsigned rpc = 0;
    int version = 0, isFinal = 0;
    in >> kind >> rpc;
    if (kind == "request") in >> type >> count >> version;
    if (kind == "update") in >> type;
    if (kind == "response") in >> isFinal >> version;
    std::getline(in >> std::ws, body);
    body.erase(body.find_last_not_of(' ') + 1);
    auto n = RequestWrapper::ResponseCount(count == "single" ? 1 : count == "multiple" ? 2 : 0);
    ref<SarnObject> object = sarnschema::KernoCurrentTimeGet::Factory(&poolM);
    if (body.rfind("len ", 0) == 0) body = "{\"a\": \"" + std::string(std::stoul(body.substr(4)) - 9, 'x') + "\"}";
    ref<LazyDict> payload = body == "null" ? nullptr : LazyDict::FromJsonString(&poolM, S(body), version);
    if (kind == "cancel") return CancelWrapper::New(&poolM, rpc, nullptr);
    if (body == "object" && kind == "request") return RequestWrapper::New(&poolM, rpc, n, version, object, nullptr);
    if (body == "object" && kind == "update") return RequestUpdateWrapper::New(&poolM, rpc, object, nullptr);
    if (body == "object") return ResponseWrapper::New(&poolM, rpc, isFinal, object, version, nullptr);
    if (kind == "request") return RequestWrapper::New(&poolM, rpc, S(type), n, version, payload, nullptr);
    if (kind == "update") return RequestUpdateWrapper::New(&poolM, rpc, S(type), payload, nullptr);
    return ResponseWrapper::New(&poolM, rpc, isFinal, payload, nullptr);
  }

  std::string Describe(const ref<KernoRpcWrapper>& w) { return rpcfuzz::Describe(&poolM, w); }

  // The four writers on one message: the frame when all wrote it, else what each appended
  // to "prior", having left the buffer, the string and the sink untouched.
  std::string WriteAll(const ref<KernoRpcWrapper>& w, bool isSinkFailing = false, bool pretty = false) {
    ByteBuffer buffer(&poolM);
    buffer.AppendString("keep");
    VekString text = "keep", errors[3] = {"prior", "prior", "prior"};
    sarntest::StringSink sink;
    sink.fFailM = isSinkFailing;
    const bool ok[] = {KernoRpcV2::MarshalToString(w, buffer, errors[0], &poolM, pretty),
                       KernoRpcV2::MarshalToString(w, text, errors[1], &poolM, pretty),
                       KernoRpcV2::MarshalToBytesink(w, sink, errors[2], &poolM, pretty)};
    const std::string frame = Str(KernoRpcV2::MarshalToString(&poolM, w, pretty));
    if (ok[0] && ok[1] && ok[2] && Str(text) == frame && sink.textM == frame && !frame.empty() &&
        std::string(reinterpret_cast<const char*>(buffer.GetData()), buffer.GetLength()) == "keep" + frame) {
      return frame;
    }
    EXPECT_EQ(std::string(reinterpret_cast<const char*>(buffer.GetData()), buffer.GetLength()), ok[0] ? "keep" + frame : "keep");
    EXPECT_EQ(Str(text), ok[1] ? frame : "keep");
    if (!isSinkFailing) {
      EXPECT_EQ(sink.textM, ok[2] ? frame : "");
    }
    return Str(errors[0]) + " / " + Str(errors[1]) + " / " + Str(errors[2]) + " / [" + frame + "]";
  }

  // Reader 0 is the string reader keeping the body, 1 parsing it; 2 to 4 the byte-source reader
  // in settings 0 to 2, fed `chunk` bytes per Read (0: whole). `error` starts as "prior".
  ref<KernoRpcWrapper> Read(int reader, const std::string& frame, VekString& error, size_t chunk = 0) {
    error = "prior";
    if (reader < 2) return KernoRpcV2::UnmarshalFromString(&poolM, S(frame), reader == 1, error);
    sarntest::TestSource source(chunk == 0 ? std::vector<std::string_view>{frame} : sarntest::FixedChunks(frame, chunk));
    return Impl::UnmarshalFromBytesource(&poolM, source, kSettings[reader - 2], error);
  }
  std::string ReadText(int reader, const std::string& frame, size_t chunk = 0) {
    VekString error;
    ref<KernoRpcWrapper> w = Read(reader, frame, error, chunk);
    return w ? Describe(w) + (error == "prior" ? " (kept)" : error.FEmpty() ? "" : " error=" + Str(error))
             : "error " + Str(error);
  }

  // "recipe ; op ; op ...": the wrapper after the ops, and what each op answered.
  ref<KernoRpcWrapper> Apply(const std::string& script, std::string& answers) {
    std::istringstream ops(script);
    std::string recipe, op;
    std::getline(ops, recipe, ';');
    ref<KernoRpcWrapper> w = Build(recipe);
    auto* q = dynamic_cast<RequestWrapper*>(w.Get());
    auto* r = dynamic_cast<ResponseWrapper*>(w.Get());
    ref<SarnObject> last;
    while (std::getline(ops >> std::ws, op, ';')) {
      std::istringstream in(op);
      std::string verb, key, value;
      in >> verb >> key >> value;
      if (verb == "add") answers += (q ? q->AddOptionalHeader(S(key), S(value)) : r->AddOptionalHeader(S(key), S(value))) ? "1 " : "0 ";
      for (long i = 0; verb == "repeat" && i < std::stol(value); ++i) (q ? q->AddOptionalHeader(S(key), S("v")) : r->AddOptionalHeader(S(key), S("v")));
      if (verb == "addn") q->AddOptionalHeader(S(key), S(std::string(std::stoul(value), 'v')));
      if (verb == "ct") (q ? q->contentTypeM : r->contentTypeM) = S(key);
      if (verb == "tn") r->typeNameM = S(key);
      if (verb == "set" || verb == "setd") {  // key: a=1&type=x&..., or "-" for null
        ref<Dict> given = key == "-" ? nullptr : MakeDict(&poolM);
        std::istringstream pairs(key);
        for (std::string pair; given && std::getline(pairs, pair, '&');) given->AddString(S(pair.substr(0, pair.find('='))), S(pair.substr(pair.find('=') + 1)));
        ref<Dictionary> tree = given ? given->GetDictionary() : nullptr;
        if (verb == "set") q ? q->SetOptionalHeaders(given) : r->SetOptionalHeaders(given);
        if (verb == "setd") q ? q->SetOptionalHeaders(tree) : r->SetOptionalHeaders(tree);
        ref<Dict> held = q ? q->GetOptionalHeaders() : r->GetOptionalHeaders();
        answers += (given ? Str(given->ToString(false)) : "-") + (held == given ? " shared " : held ? " new " : " null ");
      }
      if (verb == "unmarshal" || verb == "unmarshalv") {
        VekString error;
        ref<SarnObject> object = verb == "unmarshalv" ? r->UnmarshalToSarnObject(std::stoi(key), error)
                                 : q ? q->UnmarshalToSarnObject() : r->UnmarshalToSarnObject();
        answers += (object ? Str(object->GetTypeName()) + (object == last ? " again" : "") : "null " + Str(error)) +
                   " v" + (Body(w) ? std::to_string(Body(w)->versionM) : "-") + " ";
        last = object;
      }
    }
    return w;
  }
};

TEST_F(RpcMessageTest, WrapperOperations) {
  for (const auto& row : sarntest::ReadTable("rpc/wrappers.txt", 2)) {
    std::string answers;
    ref<KernoRpcWrapper> w = Apply(row[0], answers);
    EXPECT_EQ(Describe(w) + " | " + answers + "| " + Str(w->ToString(&poolM)), row[1]) << row[0];
  }
  for (const auto& row : sarntest::ReadTable("rpc/equality.txt", 3)) {
    std::string ignored;
    EXPECT_EQ(objopstest::SameWrapper(Apply(row[0], ignored), Apply(row[1], ignored)) ? "equal" : "unequal", row[2]) << row[0] << " / " << row[1];
  }
}

TEST_F(RpcMessageTest, WritersAndRoundTrips) {
  for (const auto& row : sarntest::ReadTable("rpc/frames.txt", 3)) {
    for (bool pretty : {false, true}) {
      std::string ignored;
      ref<KernoRpcWrapper> w = Apply(row[0], ignored);
      const std::string expected = Frame(row[pretty ? 2 : 1]);
      EXPECT_EQ(WriteAll(w, false, pretty), expected) << row[0];
      // Chunked reads are the readers' table; here each reader reads the whole frame.
      for (int reader = 0; reader < 5; ++reader) {
        VekString error;
        ref<KernoRpcWrapper> back = Read(reader, expected, error);
        ASSERT_TRUE(back) << Str(error) << " reader " << reader << ": " << expected;
        if (reader == 2 || reader == 3) {  // kept compressed: the body's bytes come back exactly
          EXPECT_EQ(Body(back) ? BodyText(Body(back)) : "", expected.substr(expected.find("\r\n\r\n") + 4));
        }
        EXPECT_TRUE(objopstest::SameWrapper(w, back)) << reader << " " << expected;
        EXPECT_EQ(WriteAll(back, false, pretty), expected) << reader;
      }
    }
  }
}

TEST_F(RpcMessageTest, Readers) {
  // frame => string reader => byte-source reader in settings 0, 1, 2 ("=": as the field before)
  EXPECT_EQ(ReadText(1, Frame("RpcId: 1\r\nType: response\r\n\r\n##{\"a\": }")), "error Cannot convert JSON to Dict: Empty scalar value for Object field a Failed to parse value for key a");
  for (const auto& row : sarntest::ReadTable("rpc/readers.txt", 5)) {
    const std::string frame = Frame(row[0]);
    std::string expected = row[1];
    EXPECT_EQ(ReadText(0, frame), expected) << row[0];
    for (int setting = 0; setting < 3; ++setting) {
      if (row[2 + setting] != "=") expected = row[2 + setting];
      for (size_t chunk : {size_t(1), size_t(7), size_t(512), size_t(0)}) {
        EXPECT_EQ(ReadText(2 + setting, frame, chunk), expected) << row[0] << " setting " << setting << " chunk " << chunk;
      }
    }
  }
}

TEST_F(RpcMessageTest, WriterLimitsAndRefusals) {
  for (const auto& row : sarntest::ReadTable("rpc/writer-limits.txt", 2)) {
    std::string ignored;
    const std::string got = WriteAll(Apply(row[0], ignored), row[0].find("failing") != std::string::npos);
    EXPECT_EQ(got.rfind("MRPC/2 ", 0) == 0 ? "ok" : got, row[1]) << row[0];
  }
  // The readers refuse more header lines than the platform's arrays hold, rather than drop any.
  for (size_t lines : {size_t(65535), size_t(65536)}) {
    std::string block = "RpcId: 1\r\nType: response\r\n";
    for (size_t i = 2; i < lines; ++i) block += "X: v\r\n";
    const std::string frame = Frame(block + "\r\n##{}");
    for (int reader : {0, 2, 4}) {
      const std::string got = ReadText(reader, frame);
      EXPECT_EQ(got.rfind("error", 0) == 0 ? got : "accepted",
                lines == 65535 ? "accepted" : "error Kerno Rpc frame holds more than 65535 header lines.");
    }
  }
}

TEST_F(RpcMessageTest, Packetizer) {
  const std::string frame = Frame(sarntest::ReadTable("rpc/frames.txt", 3)[0][1]), junk = "GET / HTTP/1.1\r\n\r\n";
  for (bool isBytes : {false, true}) {
    KernoRpcV2Packetizer packetizer(&poolM);
    auto update = [&](const std::string& input) {
      isBytes ? packetizer.UpdateInputBytestring(vek::ByteBuffer::New(&poolM, input.data(), input.size()))
              : packetizer.UpdateInput(S(input));
      return std::to_string(packetizer.decidedM) + std::to_string(packetizer.completeM) + " " +
             std::to_string(packetizer.GetPacketLength()) + " " + Str(packetizer.errorStringM);
    };
    for (size_t n = 0; n <= frame.size(); ++n) {  // decided at the first CR LF, complete only when whole
      EXPECT_EQ(update(frame.substr(0, n)), (n < 15 ? "00 0 " : n < 181 ? "10 0 " : "11 181 ")) << n;
    }
    std::string input = frame + frame + frame.substr(0, 20);
    for (const char* expected : {"11 181 ", "11 181 ", "10 0 "}) {
      EXPECT_EQ(update(input), expected);
      input.erase(0, packetizer.GetPacketLength());
      packetizer.Reset();
    }
    EXPECT_EQ(update(junk + "x"), "11 19 First line of message does not start with 'MRPC/2'");
    packetizer.Reset();
    EXPECT_EQ(update("MRPC/2 1"), "00 0 First line of message does not start with 'MRPC/2'");
  }
  size_t length = 0;
  VekString error = "prior";
  EXPECT_FALSE(KernoRpcV2::IsCompleteString(&poolM, S(frame.substr(0, 10)), length, error));
  EXPECT_TRUE(KernoRpcV2::IsCompleteString(&poolM, S(frame + "xyz"), length, error));
  EXPECT_EQ(std::to_string(length) + Str(error), "181");
  EXPECT_TRUE(KernoRpcV2::IsCompleteString(&poolM, S(std::string(30, 'x')), length, error));
  EXPECT_EQ(std::to_string(length) + Str(error), "30First line too long");
}

// The worked frame split in two at every position is the message fuzz target's split_* seeds.
TEST_F(RpcMessageTest, ByteSourceReaderFailuresAndLargeBodies) {
  const std::string frame = Frame(sarntest::ReadTable("rpc/frames.txt", 3)[0][1]);
  for (int reader = 2; reader < 5; ++reader) {
    // A pool that fails at any allocation fails the read (a body never decompresses short).
    sarntest::SweepAllocationFailures(&poolM, [&](VekMempool*, const std::function<void()>& endOfRun) {
      VekString error;
      ref<KernoRpcWrapper> w = Read(reader, frame, error);
      endOfRun();
      return sarntest::Outcome{static_cast<bool>(w), w ? Describe(w) : Str(error)};
    }, "");
  }
  // A 5 MB body stays compressed until asked for, and comes back exactly.
  const size_t before = poolM.GetUsedBytes();
  const std::string body = "{\"a\": \"" + std::string(5242880 - 9, 'x') + "\"}";
  VekString error;
  ref<KernoRpcWrapper> w = Read(2, Frame("RpcId: 1\r\nType: response\r\n\r\n##" + body), error);
  EXPECT_LT(poolM.GetUsedBytes() - before, 64u * 1024);
  EXPECT_TRUE(dynamic_cast<wynbaselib::GunzipBytesource*>(Body(w)->pBytesourceM) != nullptr);
  EXPECT_TRUE(BodyText(Body(w)) == body);
}

using namespace objopstest;

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
