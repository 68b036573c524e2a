// LazyDict: every operation of every form against one table, the byte source read through
// duplicates, feature 548 and the sink pieces, the log line, equality, and nesting past the limit.
#include <map>
#include <memory>
#include <regex>

#include "runtime/DictTestSupport.h"
#include "testutil/ObjectFill.h"

namespace {

using namespace dicttest;
using LazyDictTest = sarntest::PoolTest;

// A byte source over shared text whose duplicates each read it from the start, in pieces of at
// most `pieceM` bytes; it counts the reads of the original, the duplicates made and the deletions.
struct SourceCounts {
  int ownReadsM = 0, duplicatesM = 0, deletedM = 0;
};
class CountingSource : public wynbaselib::Bytesource {
 public:
  CountingSource(std::shared_ptr<const std::string> text, size_t piece, SourceCounts* counts, bool isOriginal = true,
                 bool canDuplicate = true)
      : textM(std::move(text)), pieceM(piece), pCountsM(counts), isOriginalM(isOriginal), canDuplicateM(canDuplicate) {}
  ~CountingSource() override { ++pCountsM->deletedM; }
  size_t Read(void* buffer, size_t size) override {
    if (isOriginalM) ++pCountsM->ownReadsM;
    size_t n = std::min({size, pieceM, textM->size() - atM});
    std::memcpy(buffer, textM->data() + atM, n);
    atM += n;
    return n;
  }
  Bytesource* Duplicate() override {
    if (!canDuplicateM) return nullptr;
    ++pCountsM->duplicatesM;
    return new CountingSource(textM, pieceM, pCountsM, false);
  }

 private:
  std::shared_ptr<const std::string> textM;
  size_t pieceM, atM = 0;
  SourceCounts* pCountsM;
  bool isOriginalM, canDuplicateM;
};

ref<LazyDict> FromSource(VekMempool* pool, const std::string& text, SourceCounts* counts, KernoVersion version,
                         size_t piece = 1, bool canDuplicate = true) {
  auto source = new CountingSource(std::make_shared<const std::string>(text), piece, counts, true, canDuplicate);
  return LazyDict::FromBytesource(pool, source, version);
}

std::string ObjectJson(VekMempool* pool, const ref<SarnObject>& object) {
  if (!object) return "null";
  ByteBuffer text(pool);
  JsonSarnObject(pool).SarnObjectToJson(object.Get(), 0, text);
  return std::string(reinterpret_cast<const char*>(text.GetData()), text.GetLength());
}

std::string Hex(const ref<vek::ByteBuffer>& bytes) {
  if (!bytes) return "null";
  std::string out;
  char digits[3];
  for (size_t i = 0; i < bytes->GetLength(); ++i) std::snprintf(digits, 3, "%02x", bytes->GetData()[i]), out += digits;
  return out.empty() ? "(empty)" : out;
}

std::string BinaryOf(VekMempool* pool, const SarnObject* object) {
  ProtoBufByteOutputStream stream;
  ProtoBuf(pool, Schema::vStructDefG, Schema::nStructDefG).MarshalKnownDict(object, &stream);
  return sarntest::Finished(stream);
}

// The worked address with a field that version 42 leaves out.
ref<SarnObject> Address(VekMempool* pool) {
  ref<SarnObject> address = sarntest::MakeWorkedAddress(pool);
  static_cast<sarnschema::Address*>(address.Get())->street2M = "Back";
  static_cast<sarnschema::Address*>(address.Get())->fHasStreet2M = true;
  return address;
}

// The payloads of the table by name: "<form><version>" for the address in each form, and the
// failing payloads.
ref<LazyDict> MakePayload(VekMempool* pool, const std::string& name, SourceCounts* counts) {
  ref<SarnObject> address = Address(pool);
  KernoVersion version = name.back() == '2' ? 42 : 0;
  std::string form = name.substr(0, name.find_first_of("0123456789"));
  ref<Dictionary> tree = DictionarySarnObject(pool, Schema::vStructDefG, Schema::nStructDefG)
                             .SarnObjectToDictionary(address.Get(), version);
  std::string json = Str(JsonSarnObject(pool).SarnObjectToJson(address.Get(), version));
  if (form == "dict") return LazyDict::FromDict(pool, MempoolNew<Dict>(pool, tree), version);
  if (form == "json") return LazyDict::FromJsonString(pool, Text(pool, json), version);
  if (form == "pb") return LazyDict::FromJsonString(pool, Text(pool, BinaryOf(pool, address.Get())), version);
  if (form == "object") return LazyDict::FromSarnObject(pool, address, version);
  if (form == "dictionary") return LazyDict::FromDictionary(pool, tree, version);
  if (form == "source") return FromSource(pool, json, counts, version);
  if (name == "badJson") return LazyDict::FromJsonString(pool, VekString("{\"type\": oops"), 0);
  if (name == "badPb") return LazyDict::FromJsonString(pool, VekString("\xfa\x0b\x09garbage"), 0);
  if (name == "noType") return LazyDict::FromDictionary(pool, Read(pool, R"({"city": "x"})"), 0);
  if (name == "unknownType") return LazyDict::FromDictionary(pool, Read(pool, R"({"type": "nosuch"})"), 0);
  if (name == "badSource") return FromSource(pool, "{\"type\": \"address\", x}", counts, 0);
  if (name == "noDuplicate") return FromSource(pool, "{}", counts, 0, 1, false);
  return LazyDict::New(pool, static_cast<LazyDict::Rep>(9), nullptr, nullptr, nullptr, nullptr, 0);
}

// One operation's result as text; also checks what the table cannot say: the four JSON writers
// agree, an object result agrees with its two siblings.
std::string RunOperation(VekMempool* pool, LazyDict& payload, const std::string& op) {
  VekString error;
  if (op == "type") {
    unsigned int id = 0;
    VekString name;
    bool hasName = payload.GetTypeName(&name);
    bool hasId = payload.GetType(&id);
    return (hasId ? std::to_string(id) : "-") + " " + (hasName ? "<" + Str(name) + ">" : "-");
  }
  if (op == "dictionary") {
    ref<Dictionary> tree = payload.ToDictionary(error);
    return tree ? Compact(tree) : "null: " + Str(error);
  }
  if (op == "dict") return Str(payload.ToDict()->ToString(false));
  if (op == "compact" || op == "pretty") {
    bool pretty = op == "pretty";
    std::string text = Str(payload.ToJsonBytestring(pretty));
    ByteBuffer buffer(pool);
    payload.ToJsonByteBuffer(buffer, pretty);
    EXPECT_EQ(std::string(reinterpret_cast<const char*>(buffer.GetData()), buffer.GetLength()), text);
    EXPECT_EQ(Str(payload.ToJson(pretty)), text);
    // Into a sink the direct writer works only with feature 548: then it agrees with the buffer.
    VekFeatures::SetEnabled(548, true);
    sarntest::StringSink sink;
    payload.ToJsonBytesink(sink, pretty);
    VekFeatures::SetEnabled(548, false);
    EXPECT_EQ(sink.textM, text);
    return text;
  }
  if (op == "sink") {
    sarntest::StringSink sink;
    payload.ToJsonBytesink(sink, false);
    return sink.textM;
  }
  if (op == "protobuf") return Hex(payload.ToProtobuf());
  // "object", under feature 548 off and on: the same result both ways.
  std::string results[2];
  for (bool isDirect : {false, true}) {
    VekFeatures::SetEnabled(548, isDirect);
    ref<SarnObject> object = payload.ToSarnObjectOrErrorString(error);
    results[isDirect] = object ? ObjectJson(pool, object) : "null: " + Str(error);
    ref<SarnObject> sure = payload.ToSarnObjectOrError();
    EXPECT_EQ(ObjectJson(pool, sure), object ? ObjectJson(pool, object) : ObjectJson(pool, MakeErrorObject(pool, error)));
    ref<SarnObject> out = sure;
    EXPECT_EQ(payload.ToSarnObject(out), static_cast<bool>(object));
    EXPECT_EQ(out.Get() == nullptr, !object);
  }
  VekFeatures::SetEnabled(548, false);
  EXPECT_EQ(results[0], results[1]) << "feature 548";
  return results[0];
}

// Which results are the payload's own members.
std::string Shared(VekMempool* pool, LazyDict& payload) {
  VekString error;
  std::string shared;
  ref<Dictionary> own = payload.dictM ? payload.dictM->GetDictionary() : payload.dictionaryM;
  if (payload.ToDict() == payload.dictM && payload.dictM) shared += "dict ";
  if (own && payload.ToDictionary(error) == own) shared += "tree ";
  if (payload.bytesM && payload.ToJsonBytestring(false) == payload.bytesM) shared += "json ";
  if (payload.bytesM && payload.ToProtobuf() == payload.bytesM) shared += "pb ";
  if (payload.objectM && payload.ToSarnObjectOrError() == payload.objectM) shared += "object ";
  (void)pool;
  return shared.empty() ? "none" : shared.substr(0, shared.size() - 1);
}

TEST_F(LazyDictTest, EveryOperationOfEveryForm) {
  for (const std::vector<std::string>& row : sarntest::ReadTable("dicts/lazy-forms.txt", 3)) {
    SCOPED_TRACE(row[0] + " " + row[1]);
    SourceCounts counts;
    {
      ref<LazyDict> payload = MakePayload(&poolM, row[0], &counts);
      LazyDict::Rep rep = payload->repM;
      const void* members[] = {payload->dictM.Get(), payload->bytesM.Get(), payload->objectM.Get(),
                               payload->pBytesourceM};
      std::string result = row[1] == "shared" ? Shared(&poolM, *payload) : RunOperation(&poolM, *payload, row[1]);
      EXPECT_EQ(result, row[2]);
      // Nothing changes but a byte source that a type query read whole.
      bool isSwitched = row[1] == "type" && rep == LazyDict::REP_BYTESOURCE && payload->repM == LazyDict::REP_DICTIONARY;
      EXPECT_EQ(payload->pBytesourceM, isSwitched ? nullptr : members[3]);
      EXPECT_TRUE(payload->repM == rep || isSwitched);
      EXPECT_TRUE(payload->dictM.Get() == members[0] && payload->bytesM.Get() == members[1] &&
                  payload->objectM.Get() == members[2]);
      if (rep == LazyDict::REP_BYTESOURCE && row[1] != "type") {
        EXPECT_FALSE(payload->dictionaryM);
      }
      EXPECT_EQ(counts.ownReadsM, 0) << "the stored source is never read";
    }
    EXPECT_EQ(counts.deletedM, counts.duplicatesM + (row[0].rfind("source", 0) == 0 || row[0].find("Source") != std::string::npos || row[0] == "noDuplicate"));
  }
}

// An address whose street takes `size` bytes, as JSON (version 0).
std::string LongAddress(VekMempool* pool, size_t size) {
  ref<SarnObject> address = Address(pool);
  static_cast<sarnschema::Address*>(address.Get())->street1M = Text(pool, std::string(size, 's'));
  return ObjectJson(pool, address);
}

TEST_F(LazyDictTest, ByteSourceIsReadThroughDuplicatesAndTypeQueriesReadItOnce) {
  SourceCounts counts;
  std::string body = LongAddress(&poolM, 20000);
  {
    ref<LazyDict> payload = FromSource(&poolM, body, &counts, 0);  // one byte per read
    EXPECT_EQ(Str(payload->ToJson(false)), Compact(Read(&poolM, body)));
    EXPECT_EQ(counts.duplicatesM, 1);
    unsigned int typeId = 0;
    VekString name;
    EXPECT_TRUE(payload->GetType(&typeId) && typeId == 191);
    EXPECT_TRUE(payload->GetTypeName(&name) && Str(name) == "address");
    EXPECT_EQ(payload->repM, LazyDict::REP_DICTIONARY);
    EXPECT_TRUE(payload->pBytesourceM == nullptr && payload->dictionaryM);
    EXPECT_EQ(counts.duplicatesM, 2) << "later type queries read nothing";
    EXPECT_EQ(counts.deletedM, 3) << "both duplicates and the source itself, once";
  }
  EXPECT_EQ(counts.deletedM, 3);
  EXPECT_EQ(counts.ownReadsM, 0);

  // A failed read keeps the form and the source, and the partial tree the reader returned.
  SourceCounts failing;
  std::string cut = "{\"type\": \"address\", \"street1\": \"" + std::string(17000, 's');
  ref<LazyDict> payload = FromSource(&poolM, cut, &failing, 0);
  VekString name;
  EXPECT_TRUE(payload->GetTypeName(&name) && Str(name) == "address");
  EXPECT_TRUE(payload->repM == LazyDict::REP_BYTESOURCE && payload->pBytesourceM && payload->dictionaryM);
  unsigned int typeId = 0;
  EXPECT_TRUE(payload->GetType(&typeId) && typeId == 191);
  EXPECT_EQ(failing.duplicatesM, 1) << "a tree once kept is not read again";
  EXPECT_EQ(Str(payload->ToJson(false)), cut) << "the bytes as they came";
}

// A sink that records the size of every Write and refuses the one numbered `failAtM` (from 1).
struct PieceSink : wynbaselib::Bytesink {
  bool Write(const char* data, size_t size) override {
    piecesM.push_back(size);
    textM.append(data, size);
    return static_cast<int>(piecesM.size()) != failAtM;
  }
  bool Flush() override { return true; }
  std::vector<size_t> piecesM;
  std::string textM;
  int failAtM = 0;
};

TEST_F(LazyDictTest, Feature548WritesACompactObjectToASinkInPieces) {
  std::string body = LongAddress(&poolM, 40000);
  ref<LazyDict> payload = LazyDict::FromSarnObject(&poolM, LazyDict::FromJsonString(&poolM, Text(&poolM, body), 0)->ToSarnObjectOrError(), 0);
  std::string tree = Str(payload->ToDict()->ToString(false));
  std::string pretty = Str(payload->ToJson(true));
  for (bool isDirect : {false, true}) {
    VekFeatures::SetEnabled(548, isDirect);
    for (int failAt : {0, 1, 2}) {
      PieceSink sink;
      sink.failAtM = failAt;
      payload->ToJsonBytesink(sink, false);
      if (isDirect) {
        std::vector<size_t> pieces = {16384, 16384, body.size() - 32768};
        pieces.resize(failAt == 0 ? 3 : failAt);
        EXPECT_EQ(sink.piecesM, pieces) << "the first Write that fails ends it";
        EXPECT_EQ(sink.textM, body.substr(0, sink.textM.size()));
      } else if (failAt == 0) {
        EXPECT_EQ(sink.textM, tree) << "through a Dictionary";
      }
    }
    sarntest::StringSink sink;
    payload->ToJsonBytesink(sink, true);
    EXPECT_EQ(sink.textM, pretty);
    EXPECT_EQ(Str(payload->ToJson(false)), body) << "the buffer writer is direct either way";
  }
  VekFeatures::SetEnabled(548, false);
}

std::vector<std::string>* gLinesG = nullptr;
void CaptureLine(int facility, int priority, const char* tag, const char* line) {
  gLinesG->push_back(std::to_string(facility) + " " + std::to_string(priority) + " " + tag + " " + line);
}

TEST(LazyDictLogTest, OneLineForEachMeasuredConversionOfTheLoggedType) {
  VekMempool pool("lazy log pool");
  std::vector<std::string> lines;
  gLinesG = &lines;
  VekLogger::Sink previous = VekLogger::SetSink(CaptureLine);
  {
    ref<SarnObject> logged = sarnschema::ChannelMapConfigInstructions::Factory(&pool);
    static_cast<sarnschema::ChannelMapConfigInstructions*>(logged.Get())->hostNameM = "host";
    static_cast<sarnschema::ChannelMapConfigInstructions*>(logged.Get())->fHasHostNameM = true;
    std::string json = ObjectJson(&pool, logged);
    SourceCounts counts;
    for (bool isDirect : {false, true}) {
      VekFeatures::SetEnabled(548, isDirect);
      for (const std::string& body : {json, ObjectJson(&pool, Address(&pool))}) {
        LazyDict::FromJsonString(&pool, Text(&pool, body), 0)->ToSarnObjectOrError();
        FromSource(&pool, body, &counts, 0, 4096)->ToSarnObjectOrError();
      }
      // Neither other forms nor other operations log.
      LazyDict::FromSarnObject(&pool, logged, 0)->ToSarnObjectOrError();
      LazyDict::FromJsonString(&pool, Text(&pool, BinaryOf(&pool, logged.Get())), 0)->ToSarnObjectOrError();
      LazyDict::FromJsonString(&pool, Text(&pool, json), 0)->ToProtobuf();
    }
    VekFeatures::SetEnabled(548, false);
    ASSERT_EQ(lines.size(), 4u);
    const std::string labels[] = {"old REP_JSON> 0", "old REP_BYTESOURCE> 0", "new REP_JSON> ", "new REP_BYTESOURCE> "};
    for (size_t i = 0; i < 4; ++i) {
      std::string expected = "0 6 LazyDict ToSarnObject " + labels[i].substr(0, labels[i].find('>')) +
                             " <channelMapConfigInstructions> " +
                             (i < 2 ? "0" : std::to_string(json.size())) + " lazy log pool usedBytes \\(\\d+/\\d+\\) " +
                             "highWater \\(\\d+/\\d+\\) elapsedTime [0-9.]+(ns|us|ms|s)";
      EXPECT_TRUE(std::regex_match(lines[i], std::regex(expected))) << lines[i];
    }
  }
  VekLogger::SetSink(previous);
  EXPECT_EQ(pool.GetUsedBytes(), 0u);
}

TEST_F(LazyDictTest, FormsHoldingTheSameObjectAreEqual) {
  SourceCounts counts;
  const char* forms[] = {"dict0", "json0", "pb0", "object0", "dictionary0", "source0"};
  for (const char* left : forms) {
    for (const char* right : forms) {
      EXPECT_TRUE(*MakePayload(&poolM, left, &counts) == *MakePayload(&poolM, right, &counts)) << left << right;
    }
    ref<LazyDict> changed = MakePayload(&poolM, "object0", &counts);
    static_cast<sarnschema::Address*>(changed->objectM.Get())->cityM = "Bergen";
    EXPECT_TRUE(*MakePayload(&poolM, left, &counts) != *changed) << left;
  }
  EXPECT_TRUE(*LazyDict::FromJsonString(&poolM, VekString("{\"type\": \"x\", \"n\": 1}"), 0) !=
              *LazyDict::FromJsonString(&poolM, VekString("{\"type\": \"x\", \"n\": \"1\"}"), 0));
}

TEST_F(LazyDictTest, FirstByteChoosesTheForm) {
  // A '{' (after blanks) is JSON, anything else protocol-buffer bytes; nothing, or a NUL first, no payload.
  std::string forms;
  for (const char* text : {"{}", " {}", "\n{}", "[1]", ""}) {
    ref<LazyDict> payload = LazyDict::FromJsonString(&poolM, VekString(text), 7);
    forms += !payload ? "none " : payload->repM == LazyDict::REP_JSON ? "json " : payload->repM == LazyDict::REP_PROTOBUF ? "pb " : "? ";
  }
  EXPECT_EQ(forms, "json json pb pb none ");
  EXPECT_FALSE(LazyDict::FromBytestring(&poolM, vek::ByteBuffer::New(&poolM, "\0{", 2), 7));
  EXPECT_FALSE(LazyDict::FromBytestring(&poolM, ref<vek::ByteBuffer>(), 7));
  ref<vek::ByteBuffer> bytes = vek::ByteBuffer::New(&poolM, "\x7B\x08\x01", 3);
  ref<LazyDict> payload = LazyDict::FromBytestring(&poolM, bytes, 9);
  EXPECT_EQ(payload->repM, LazyDict::REP_JSON) << "only the first byte decides";
  EXPECT_TRUE(payload->bytesM.Get() == bytes.Get() && payload->versionM == 9 && !payload->dictionaryM)
      << "the buffer is shared";
}

TEST_F(LazyDictTest, PayloadsInsideTreesWriteAndCompareAsPayloads) {
  ref<Dictionary> inner = Dictionary::New(&poolM, VekString("in"));
  ref<Dictionary> level3 = new (&poolM) Dictionary();
  level3->Add(VekString("p"), LazyDict::FromDictionary(&poolM, inner, 0));
  ref<ArrayValue> level2 = new (&poolM) ArrayValue();
  level2->Add(level3);
  ref<Dictionary> top = new (&poolM) Dictionary();
  top->Add(VekString("a"), level2);
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

}  // namespace

namespace {

using namespace dicttest;
using LazyNestingTest = sarntest::PoolTest;

void PrependVarint(std::string& reversed, size_t value) {
  std::string bytes;
  do {
    bytes += static_cast<char>((value & 0x7f) | (value > 0x7f ? 0x80 : 0));
    value >>= 7;
  } while (value != 0);
  reversed.append(bytes.rbegin(), bytes.rend());
}

// Protocol-buffer bytes of a kernoRpcRequest whose request holds another one, `depth` times, around
// an address: each level's bytes are the known dict (tag, length) of its fields, the lazy last.
std::string NestedRequests(VekMempool* pool, int depth) {
  std::string innermost = BinaryOf(pool, Address(pool).Get());
  std::string reversed(innermost.rbegin(), innermost.rend());
  for (int level = 0; level < depth; ++level) {
    size_t inner = reversed.size();
    PrependVarint(reversed, inner);
    reversed += std::string("\x12\x00\x20\x00\x18\x00\x08", 7);
    PrependVarint(reversed, reversed.size());  // the fields' length: everything so far
    reversed += "\x3c\xfa";
  }
  return std::string(reversed.rbegin(), reversed.rend());
}

size_t Count(const std::string& text, const std::string& what) {
  size_t n = 0;
  for (size_t at = text.find(what); at != std::string::npos; at = text.find(what, at + 1)) ++n;
  return n;
}

TEST_F(LazyNestingTest, PayloadsNestedPastTheLimitConvertOnASmallStack) {
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
    std::string binary = BinaryOf(&poolM, object.Get());
    EXPECT_EQ(Count(binary, limit), 1u);
    // The object and the 512 payloads around which the binary writer counts its levels.
    EXPECT_EQ(Count(binary, std::string("\xfa\x3c", 2)), 513u);
    EXPECT_EQ(payload->ToProtobuf(), payload->bytesM);
    EXPECT_TRUE(*payload == *LazyDict::FromSarnObject(&poolM, object, 0));
  });
}

}  // namespace
