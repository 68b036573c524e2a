// LazyDict: every operation of every form against one table (the byte source read through
// duplicates, feature 548 and the sink pieces, the log line, equality, and the payload inside an
// object written as JSON, converted to a Dictionary and marshalled, and in version-1 envelopes),
// random envelopes nesting payloads of every form through the binary form, and nesting past the limit.
#include <regex>

#include "runtime/DictTestSupport.h"
#include "runtime/ObjectOpsSupport.h"
#include "testutil/RandomObject.h"

namespace {

using namespace dicttest;
using LazyDictTest = sarntest::PoolTest;

// Byte sources deliver one byte per read and count duplicates, deletions and reads of the original.
using SourceCounts = sarntest::PieceSource::Counters;

using objopstest::ObjectJson;

using sarntest::KnownDictBytes;
using sarntest::ReadKnownDict;

std::string Hex(const std::string& bytes) {
  std::string out;
  char digits[3];
  for (unsigned char c : bytes) std::snprintf(digits, 3, "%02x", c), out += digits;
  return out.empty() ? "(empty)" : out;
}

// The worked address with its optional second street, with a street of `street1` bytes, or in another city.
ref<SarnObject> Address(VekMempool* pool, size_t street1 = 0, const std::string& city = "Oslo") {
  const std::string street = street1 == 0 ? "Main St 1" : std::string(street1, 's');
  return objopstest::FromJson(pool, R"({"type": "address", "addressId": "vask:ds.7", "city": ")" + city + R"(", "country": "NO", )"
                                    R"("levelOfDetail": "high", "postalCode": "0150", "street1": ")" + street + R"(", "street2": "Back"})");
}

// The payloads of the table by name: "<form><version>" for the address (or `object`) in each form, and others.
ref<LazyDict> MakePayload(VekMempool* pool, const std::string& name, SourceCounts* counts, ref<SarnObject> object = nullptr) {
  ref<SarnObject> address = object ? object : Address(pool, name == "longSource" ? 20000 : name == "longObject" ? 40000 : 0);
  if (name.rfind("logged", 0) == 0) address = objopstest::FromJson(pool, R"({"type": "channelMapConfigInstructions", "hostName": "host"})");
  KernoVersion version = name.back() == '2' ? 42 : 0;
  std::string form = name.substr(0, name.find_first_of("0123456789"));
  ref<Dictionary> tree = DictionarySarnObject(pool, Schema::vStructDefG, Schema::nStructDefG)
                             .SarnObjectToDictionary(address.Get(), version);
  std::string json = ObjectJson(pool, address, version);
  auto source = [&](const std::string& text, bool canDuplicate) {
    return LazyDict::FromBytesource(pool, new sarntest::PieceSource(text, 1, counts, canDuplicate), version);
  };
  if (form == "dict") return LazyDict::FromDict(pool, MempoolNew<Dict>(pool, tree), version);
  if (form == "json" || name == "logged") return LazyDict::FromJsonString(pool, Text(pool, json), version);
  if (form == "pb") return LazyDict::FromJsonString(pool, Text(pool, KnownDictBytes(pool, address.Get())), version);
  if (form == "object" || name == "longObject") return LazyDict::FromSarnObject(pool, address, version);
  if (form == "dictionary") return LazyDict::FromDictionary(pool, tree, version);
  if (form == "source" || name == "longSource" || name == "loggedSource") return source(json, true);
  if (name == "captured") {  // the body of a request read by the direct object reader
    std::string text = "{\"type\": \"kernoRpcRequest\", \"request\": " + json + "}";
    ref<SarnObject> request;
    VekString error;
    JsonSarnObject(pool).JsonToSarnObject(reinterpret_cast<const unsigned char*>(text.data()),
                                          static_cast<int>(text.size()), 0, &request, error);
    return static_cast<sarnschema::KernoRpcRequest*>(request.Get())->requestM;
  }
  if (name == "cutSource") return source("{\"type\": \"address\", \"street1\": \"" + std::string(17000, 's'), true);
  if (name == "badSource") return source("{\"type\": \"address\", x}", true);
  if (name == "noDuplicate") return source("{}", false);
  if (name == "badJson") return LazyDict::FromJsonString(pool, VekString("{\"type\": oops"), 0);
  if (name == "badPb") return LazyDict::FromJsonString(pool, VekString("\xfa\x0b\x09garbage"), 0);
  if (name == "noType") return LazyDict::FromDictionary(pool, Read(pool, R"({"city": "x"})"), 0);
  if (name == "unknownType") return LazyDict::FromDictionary(pool, Read(pool, R"({"type": "nosuch"})"), 0);
  if (name == "bareNumber") return LazyDict::FromJsonString(pool, VekString("{\"type\": \"x\", \"n\": 1}"), 0);
  if (name == "quotedNumber") return LazyDict::FromJsonString(pool, VekString("{\"type\": \"x\", \"n\": \"1\"}"), 0);
  if (name == "otherCity") return LazyDict::FromSarnObject(pool, Address(pool, 0, "Bergen"), 0);
  return LazyDict::New(pool, static_cast<LazyDict::Rep>(9), nullptr, nullptr, nullptr, nullptr, 0);
}

// A sink that records the size of every Write and refuses the one numbered `failAtM` (from 1).
struct PieceSink : wynbaselib::Bytesink {
  bool Write(const char* data, size_t size) override {
    // Writes of a few bytes each (a tree's writer) are only counted.
    piecesM = ++nWriteM > 4 ? std::to_string(nWriteM) + " writes" : piecesM + (piecesM.empty() ? "" : ",") + std::to_string(size);
    textM.append(data, size);
    return nWriteM != failAtM;
  }
  bool Flush() override { return true; }
  std::string piecesM, textM;
  int nWriteM = 0, failAtM = 0;
};

std::string* gLogG = nullptr;
void CaptureLine(int facility, int priority, const char* tag, const char* line) {
  // The figures and the time vary from run to run; the rest of the line is exact.
  *gLogG += std::to_string(facility) + " " + std::to_string(priority) + " " + tag + " " +
            std::regex_replace(line, std::regex(R"(\((\d+)/(\d+)\)|elapsedTime [0-9.]+(ns|us|ms|s)$)"), "#") + "; ";
}

std::string WithFeature(bool isDirect, const std::function<std::string()>& work) {
  VekFeatures::SetEnabled(548, isDirect);
  std::string result = work();
  VekFeatures::SetEnabled(548, false);
  return result;
}

// One operation's result as text; also checks what the table cannot say: the four JSON writers
// agree, an object result agrees with its two siblings, under feature 548 off and on.
std::string RunOperation(VekMempool* pool, const ref<LazyDict>& payload, const std::string& op, SourceCounts& counts) {
  VekString error;
  if (op == "type") {
    unsigned int id = 0;
    VekString name;
    bool hasName = payload->GetTypeName(&name), hasId = payload->GetType(&id);
    return (hasId ? std::to_string(id) : "-") + " " + (hasName ? "<" + Str(name) + ">" : "-");
  }
  if (op == "dictionary") {
    ref<Dictionary> tree = payload->ToDictionary(error);
    return tree ? Compact(tree) : "null: " + Str(error);
  }
  if (op == "dict") return Str(payload->ToDict()->ToString(false));
  if (op == "compact" || op == "pretty") {
    bool pretty = op == "pretty";
    std::string text = Str(payload->ToJsonBytestring(pretty));
    ByteBuffer buffer(pool);
    payload->ToJsonByteBuffer(buffer, pretty);
    EXPECT_EQ(std::string(reinterpret_cast<const char*>(buffer.GetData()), buffer.GetLength()), text);
    EXPECT_EQ(Str(payload->ToJson(pretty)), text);
    // Into a sink the direct writer works only with feature 548: then it agrees with the buffer.
    EXPECT_EQ(WithFeature(true, [&] {
                PieceSink sink;
                payload->ToJsonBytesink(sink, pretty);
                return sink.textM;
              }), text);
    return text;
  }
  if (op == "sink") {  // the pieces with 548 on, whole and stopped at the 2nd Write; the text with it off
    PieceSink sink, whole, stopped;
    payload->ToJsonBytesink(sink, false);
    stopped.failAtM = 2;
    WithFeature(true, [&] { return payload->ToJsonBytesink(whole, false), payload->ToJsonBytesink(stopped, false), ""; });
    return whole.piecesM + " | " + stopped.piecesM + " | " + sink.textM;
  }
  if (op == "protobuf") return Hex(Str(payload->ToProtobuf()));
  if (op == "log") {  // one conversion with feature 548 off, one with it on
    std::string log;
    gLogG = &log;
    VekLogger::Sink previous = VekLogger::SetSink(CaptureLine);
    WithFeature(false, [&] { return payload->ToSarnObjectOrError(), ""; });
    WithFeature(true, [&] { return payload->ToSarnObjectOrError(), ""; });
    VekLogger::SetSink(previous);
    return log.empty() ? "none" : log;
  }
  if (op == "object") {
    std::string results[2];
    for (bool isDirect : {false, true}) {
      results[isDirect] = WithFeature(isDirect, [&] {
        ref<SarnObject> object = payload->ToSarnObjectOrErrorString(error);
        ref<SarnObject> sure = payload->ToSarnObjectOrError(), out = sure;
        EXPECT_EQ(ObjectJson(pool, sure), ObjectJson(pool, object ? object : MakeErrorObject(pool, error)));
        EXPECT_EQ(payload->ToSarnObject(out), static_cast<bool>(object));
        EXPECT_EQ(out.Get(), object.Get() ? out.Get() : nullptr);
        return object ? ObjectJson(pool, object) : "null: " + Str(error);
      });
    }
    return results[0] == results[1] ? results[0] : results[0] + " | 548: " + results[1];
  }
  if (op == "shared") {  // which results are the payload's own members
    ref<Dictionary> own = payload->dictM ? payload->dictM->GetDictionary() : payload->dictionaryM;
    std::string shared = std::string(payload->dictM && payload->ToDict() == payload->dictM ? "dict " : "") +
                         (own && payload->ToDictionary(error) == own ? "tree " : "") +
                         (payload->bytesM && payload->ToJsonBytestring(false) == payload->bytesM ? "json " : "") +
                         (payload->bytesM && payload->ToProtobuf() == payload->bytesM ? "pb " : "") +
                         (payload->objectM && payload->ToSarnObjectOrError() == payload->objectM ? "object " : "");
    return shared.empty() ? "none" : shared.substr(0, shared.size() - 1);
  }
  if (op == "equal") {
    std::string equal;
    SourceCounts others;
    for (const char* other : {"dict0", "json0", "pb0", "object0", "dictionary0", "source0", "bareNumber", "quotedNumber", "otherCity"}) {
      if (*payload == *MakePayload(pool, other, &others)) equal += std::string(equal.empty() ? "" : " ") + other;
    }
    return equal.empty() ? "none" : equal;
  }
  if (op == "typeTwice") {  // the byte source's switch: what stays after two type queries
    RunOperation(pool, payload, "type", counts);
    RunOperation(pool, payload, "type", counts);
    return "rep " + std::to_string(payload->repM) + (payload->pBytesourceM ? ", source" : "") +
           (payload->dictionaryM ? ", tree" : "") + ", duplicates " + std::to_string(counts.nDuplicatedM) +
           ", deleted " + std::to_string(counts.nDeletedM);
  }
  if (op.rfind("wrapper", 0) == 0) {  // the body of a version-1 envelope: its bytes | what the envelope reader reads
    ref<SarnObject> envelope = StructInfoForId(std::stoul(op.substr(7)))->pFactory(pool), object;
    const FieldInfo& body = envelope->GetStructInfo()->vFieldInfo[2];  // in each of the three
    FieldAccess::PutReference(envelope.Get(), body, payload.Get());
    std::string bytes = KnownDictBytes(pool, envelope.Get());
    ref<SarnObject> read = ProtoBuf(pool, Schema::vStructDefG, Schema::nStructDefG)
                               .UnmarshalWrapper(reinterpret_cast<const unsigned char*>(bytes.data()), static_cast<int>(bytes.size()));
    // As a known dict the body stays unparsed bytes that convert to the payload's object.
    ref<SarnObject> back = ReadKnownDict(pool, bytes);
    auto* unparsed = static_cast<LazyDict*>(FieldAccess::ReferenceAt(back.Get(), body, 0));
    EXPECT_TRUE(unparsed->repM == LazyDict::REP_PROTOBUF && *unparsed->ToSarnObjectOrError() == *payload->ToSarnObjectOrError());
    EXPECT_TRUE(!payload->ToSarnObject(object) || *back == *envelope);
    return Hex(bytes) + " | " + (KnownDictBytes(pool, read.Get()) == bytes ? "same" : ObjectJson(pool, read));
  }
  // The payload in a request: written as JSON; converted to a Dictionary (the payload shared)
  // and back. (Marshalled, it is the envelope 975 above.)
  ref<SarnObject> request = sarnschema::KernoRpcRequest::Factory(pool);
  static_cast<sarnschema::KernoRpcRequest*>(request.Get())->requestM = payload;
  if (op == "inJson") return ObjectJson(pool, request, payload->versionM);
  DictionarySarnObject converter(pool, Schema::vStructDefG, Schema::nStructDefG);
  ref<Dictionary> tree = converter.SarnObjectToDictionary(request.Get(), payload->versionM);  // inDictionary
  ref<SarnObject> back;
  EXPECT_TRUE(converter.DictionaryToSarnObject(tree, payload->versionM, back, error));
  EXPECT_EQ(static_cast<sarnschema::KernoRpcRequest*>(back.Get())->requestM.Get(), payload.Get()) << "shared";
  return Compact(tree);
}

TEST_F(LazyDictTest, EveryOperationOfEveryForm) {
  for (const std::vector<std::string>& row : sarntest::ReadTable("lazy/forms.txt", 3)) {
    SCOPED_TRACE(row[0] + " " + row[1]);
    SourceCounts counts;
    {
      ref<LazyDict> payload = MakePayload(&poolM, row[0], &counts);
      LazyDict::Rep rep = payload->repM;
      const void* members[] = {payload->dictM.Get(), payload->bytesM.Get(), payload->objectM.Get(), payload->pBytesourceM};
      std::string result = RunOperation(&poolM, payload, row[1], counts);
      if (result.size() > 400) result = result.substr(0, 40) + "... (" + std::to_string(result.size()) + " bytes)";
      EXPECT_EQ(result, row[2]);
      // Nothing changes but a byte source that a type query read whole; nothing reads the source itself.
      bool isQuery = row[1].rfind("type", 0) == 0, isSwitched = isQuery && payload->repM != rep;
      EXPECT_TRUE(payload->dictM.Get() == members[0] && payload->bytesM.Get() == members[1] &&
                  payload->objectM.Get() == members[2] && payload->pBytesourceM == (isSwitched ? nullptr : members[3]));
      EXPECT_TRUE(payload->repM == rep || (rep == LazyDict::REP_BYTESOURCE && payload->repM == LazyDict::REP_DICTIONARY));
      EXPECT_TRUE(rep != LazyDict::REP_BYTESOURCE || isQuery || !payload->dictionaryM);
      EXPECT_EQ(counts.nOwnReadsM, 0);
    }
    EXPECT_EQ(counts.nDeletedM, counts.nDuplicatedM + (row[0].find("ource") != std::string::npos || row[0] == "noDuplicate"));
  }
}

// Random envelopes (their bodies success, cancel or envelopes again), every payload replaced, the
// innermost first, by the next form holding its object: marshalled and read back they are equal
// (payloads compared by their trees), write the same bytes again, and the payload read is unparsed.
TEST_F(LazyDictTest, RandomEnvelopesWithPayloadsInEveryFormTravelUnparsed) {
  sarntest::RandomObjects random(&poolM, 615, {543, 974, 975, 976, 2238}, 3, false);
  random.isWithControlsM = false;
  SourceCounts counts;
  int nextForm = 0;
  // Of these types the three envelopes hold a payload, each as field 2 (null past the depth).
  auto lazy = [](SarnObject* o) {
    return o->GetTypeId() >= 975 ? static_cast<LazyDict*>(FieldAccess::ReferenceAt(o, o->GetStructInfo()->vFieldInfo[2], 0)) : nullptr;
  };
  std::function<void(SarnObject*)> reform = [&](SarnObject* o) {
    if (!lazy(o)) return;
    ref<SarnObject> inner = lazy(o)->ToSarnObjectOrError();
    reform(inner.Get());
    static const char* const kForms[] = {"dict0", "json0", "pb0", "object0", "dictionary0", "source0"};
    FieldAccess::PutReference(o, o->GetStructInfo()->vFieldInfo[2], MakePayload(&poolM, kForms[nextForm++ % 6], &counts, inner).Get());
  };
  for (int i = 0; i < 300 && !HasFatalFailure(); ++i) {
    ref<SarnObject> object = random.Make(i % 3 == 2 ? 2238 : 975 + i % 3);
    reform(object.Get());
    std::string bytes = KnownDictBytes(&poolM, object.Get());
    ref<SarnObject> back = ReadKnownDict(&poolM, bytes);
    ASSERT_TRUE(back && *back == *object && *object == *back && KnownDictBytes(&poolM, back.Get()) == bytes) << i;
    ASSERT_EQ(lazy(back.Get()) ? lazy(back.Get())->repM : LazyDict::REP_PROTOBUF, LazyDict::REP_PROTOBUF) << i;
  }
  EXPECT_GT(nextForm, 600);
}

TEST_F(LazyDictTest, FirstByteChoosesTheForm) {
  // A '{' (after spaces) is JSON, anything else protocol-buffer bytes; nothing, or a NUL first, no
  // payload. Only the first byte decides, and a byte string is shared.
  std::string forms;
  for (const std::string& text : std::vector<std::string>{"{}", " {}", "\n{}", "[1]", "", "\x7B\x08\x01", std::string("\0{", 2)}) {
    ref<vek::ByteBuffer> bytes = vek::ByteBuffer::New(&poolM, text.data(), text.size());
    for (ref<LazyDict> payload : {LazyDict::FromJsonString(&poolM, Text(&poolM, text), 9), LazyDict::FromBytestring(&poolM, bytes, 9)}) {
      forms += !payload ? "none " : payload->repM == LazyDict::REP_JSON ? "json " : payload->repM == LazyDict::REP_PROTOBUF ? "pb " : "? ";
      EXPECT_TRUE(!payload || (payload->versionM == 9 && !payload->dictionaryM));
    }
    EXPECT_TRUE(text.empty() || text[0] == '\0' || LazyDict::FromBytestring(&poolM, bytes, 9)->bytesM.Get() == bytes.Get());
  }
  EXPECT_EQ(forms, "json json json json pb pb pb pb none none json json none none ");
  EXPECT_FALSE(LazyDict::FromBytestring(&poolM, ref<vek::ByteBuffer>(), 7));
}

TEST_F(LazyDictTest, PayloadsInsideTreesWriteAndCompareAsPayloads) {
  ref<Dictionary> inner = Dictionary::New(&poolM, VekString("in"));
  ref<Dictionary> top = Read(&poolM, R"({"a": [{}]})");
  auto* level3 = static_cast<Dictionary*>(static_cast<ArrayValue*>(top->Get(VekString("a")).Get())->GetValueAt(0).Get());
  level3->Add(VekString("p"), LazyDict::FromDictionary(&poolM, inner, 0));
  // The payload's own indentation starts again at depth 0.
  EXPECT_EQ(Pretty(top),
            "{\n    \"a\": [\n        {\n            \"p\": {\n    \"type\": \"in\"\n}\n        }\n    ]\n}");
  EXPECT_EQ(Compact(top), R"({"a": [{"p": {"type": "in"}}]})");

  ref<LazyDictValue> x = new (&poolM) LazyDictValue(LazyDict::FromJsonString(&poolM, VekString("{\"type\": \"in\"}"), 0));
  ref<LazyDictValue> y = new (&poolM) LazyDictValue(LazyDict::FromDictionary(&poolM, inner, 0));
  EXPECT_TRUE(x->Equals(y));
  EXPECT_FALSE(x->Equals(inner));
  ref<LazyDictValue> empty = new (&poolM) LazyDictValue();
  EXPECT_FALSE(x->Equals(empty));
  EXPECT_TRUE(empty->Equals(ref<LazyDictValue>(new (&poolM) LazyDictValue())));
  EXPECT_EQ(Compact(empty), "null");
  EXPECT_EQ(Str(LazyDictValue::EmptyValue(&poolM)->ToJson(false)), "{}");
}

// Protocol-buffer bytes of a kernoRpcRequest whose request holds another one, `depth` times, around
// an address: each level's bytes are the known dict (tag, length) of its fields, the lazy last.
std::string NestedRequests(VekMempool* pool, int depth) {
  objopstest::InsideOut bytes(KnownDictBytes(pool, Address(pool).Get()));
  for (int level = 0; level < depth; ++level) {
    bytes.Prepend(std::string("\x08\x00\x18\x00\x20\x00\x12", 7) + sarntest::Varint(bytes.reversedM.size()));
    bytes.Prepend("\xfa\x3c" + sarntest::Varint(bytes.reversedM.size()));
  }
  return bytes.Bytes();
}

size_t Count(const std::string& text, const std::string& what) {
  size_t n = 0;
  for (size_t at = text.find(what); at != std::string::npos; at = text.find(what, at + 1)) ++n;
  return n;
}

TEST_F(LazyDictTest, PayloadsNestedPastTheLimitConvertOnASmallStack) {
  const std::string limit = "Lazy payload nesting exceeds the depth limit of 512 levels.";
  sarntest::RunOnStack(256 * 1024, [&] {
    std::string bytes = NestedRequests(&poolM, 100000);
    ref<LazyDict> payload = LazyDict::FromJsonString(&poolM, Text(&poolM, bytes), 0);
    unsigned int typeId = 0;
    EXPECT_TRUE(payload->GetType(&typeId) && typeId == 975);
    // Each writer converts the payloads inside one another until a limit falls; there the
    // "error" object stands for the rest.
    for (bool pretty : {false, true}) {
      std::string text = Str(payload->ToJson(pretty));
      size_t levels = Count(text, "kernoRpcRequest");
      EXPECT_TRUE(levels > 8 && levels <= 512) << levels;
      EXPECT_EQ(Count(text, limit), 1u);
      EXPECT_EQ(text.find("address"), std::string::npos);
    }
    ref<SarnObject> object = payload->ToSarnObjectOrError();
    ASSERT_EQ(Str(object->GetTypeName()), "kernoRpcRequest");
    std::string binary = KnownDictBytes(&poolM, object.Get());
    EXPECT_EQ(Count(binary, limit), 1u);
    // The object and the 512 payloads around which the binary writer counts its levels.
    EXPECT_EQ(Count(binary, std::string("\xfa\x3c", 2)), 513u);
    EXPECT_EQ(payload->ToProtobuf(), payload->bytesM);
    EXPECT_TRUE(*payload == *LazyDict::FromSarnObject(&poolM, object, 0));
  });
}

}  // namespace
