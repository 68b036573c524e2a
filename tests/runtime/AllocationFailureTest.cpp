// Every allocation of every reader and converter fails once in turn: each run must fail cleanly
// (the reader's report, a null result, false) or recover with the same result, and leave the
// pool as it found it.
#include <gtest/gtest.h>

#include <string>

#include "sarn/Sarn.h"
#include "wynbaselib/Gzip.h"
#include "testutil/AllocationFailure.h"
#include "testutil/ObjectFill.h"
#include "testutil/TestStreams.h"

using namespace sarn;
using sarntest::Outcome;
using sarntest::Str;

namespace {

constexpr unsigned kTestAllTypes = 1259;

std::string CompactJson(const DictValue& value) { return Str(value.ToJson(false)); }

std::string ObjectJson(const SarnObject* object) { return Str(JsonSarnObject(object->GetMempool()).SarnObjectToJson(object, 0)); }

// The inputs every row reads: one object with every field set, and its other forms. They live in
// the swept pool, made before the sweep, so the pool's figures include them from the start.
struct Inputs {
  explicit Inputs(VekMempool* pool) : objectM(StructInfoForId(kTestAllTypes)->pFactory(pool)) {
    sarntest::FillObject(pool, objectM.Get(), 7, 1);
    // A chain of 30 errors (each the cause of the one before) in the required knownDict field
    // (number 46): deeper than the inline stacks of the walkers and readers, so they grow too.
    ref<SarnObject> chain;
    for (int i = 0; i < 30; ++i) {
      ref<SarnObject> link = sarnschema::Error::Factory(pool);
      static_cast<sarnschema::Error*>(link.Get())->codeM = 3;  // badArgument: a code that reads back
      static_cast<sarnschema::Error*>(link.Get())->causeM = chain;
      chain = link;
    }
    FieldAccess::PutReference(objectM.Get(), StructInfoForId(kTestAllTypes)->vFieldInfo[46], chain.Get());
    jsonM = ObjectJson(objectM.Get());
    dictionaryM = DictionarySarnObject(pool, Schema::vStructDefG, Schema::nStructDefG)
                      .SarnObjectToDictionary(objectM.Get(), 0);
    ProtoBufByteOutputStream out;
    ProtoBuf(pool, Schema::vStructDefG, Schema::nStructDefG).Marshal(objectM.Get(), &out);
    protoM = sarntest::Finished(out);
  }
  ref<SarnObject> objectM;
  std::string jsonM;
  ref<Dictionary> dictionaryM;
  std::string protoM;
};

using Operation = Outcome (*)(VekMempool* pool, const Inputs& in, const std::function<void()>& endOfRun);

struct Row {
  const char* nameM;
  const char* failureM;
  Operation operationM;
};

const Row kRowsG[] = {
    {"hand-written Dictionary reader", kOutOfMemoryMessage,
     [](VekMempool* pool, const Inputs& in, const std::function<void()>& endOfRun) {
       VekString error;
       ref<Dictionary> dictionary = Dictionary::FromJson(reinterpret_cast<const unsigned char*>(in.jsonM.data()),
                                                         in.jsonM.size(), error, pool);
       endOfRun();
       return dictionary ? Outcome{true, CompactJson(*dictionary)} : Outcome{false, Str(error)};
     }},
    {"streaming parser, in two chunks", kOutOfMemoryMessage,
     [](VekMempool* pool, const Inputs& in, const std::function<void()>& endOfRun) {
       PDictionary dictionary;
       JsonParser parser(pool);
       parser.BeginParse(dictionary);
       size_t half = in.jsonM.size() / 2;
       bool isOk = parser.ParseChunk(in.jsonM.data(), half) &&
                   parser.ParseChunk(in.jsonM.data() + half, in.jsonM.size() - half) && parser.EndParse();
       endOfRun();
       return isOk ? Outcome{true, CompactJson(*dictionary)} : Outcome{false, parser.pErrorTextM};
     }},
    {"object to Dictionary", "null",
     [](VekMempool* pool, const Inputs& in, const std::function<void()>& endOfRun) {
       ref<Dictionary> dictionary = DictionarySarnObject(pool, Schema::vStructDefG, Schema::nStructDefG)
                                        .SarnObjectToDictionary(in.objectM.Get(), 0);
       endOfRun();
       return dictionary ? Outcome{true, CompactJson(*dictionary)} : Outcome{false, "null"};
     }},
    {"Dictionary to object", kOutOfMemoryMessage,
     [](VekMempool* pool, const Inputs& in, const std::function<void()>& endOfRun) {
       ref<SarnObject> object;
       VekString error;
       bool isOk = DictionarySarnObject(pool, Schema::vStructDefG, Schema::nStructDefG)
                       .DictionaryToSarnObject(in.dictionaryM, 0, object, error);
       endOfRun();
       return isOk ? Outcome{true, ObjectJson(object.Get())} : Outcome{false, Str(error)};
     }},
    {"JSON writer of objects", "empty",
     [](VekMempool* pool, const Inputs& in, const std::function<void()>& endOfRun) {
       VekString json = JsonSarnObject(pool).SarnObjectToJson(in.objectM.Get(), 0);
       endOfRun();
       return json.FEmpty() ? Outcome{false, "empty"} : Outcome{true, Str(json)};
     }},
    {"compact Dictionary writer", "failed",
     [](VekMempool* pool, const Inputs& in, const std::function<void()>& endOfRun) {
       ByteBuffer out(pool);
       in.dictionaryM->ToJson(out, JsonFormat(false));
       endOfRun();
       return out.HasFailed() ? Outcome{false, "failed"} : Outcome{true, sarntest::Contents(out)};
     }},
    {"protocol-buffer reader", "false",
     [](VekMempool* pool, const Inputs& in, const std::function<void()>& endOfRun) {
       ref<SarnObject> object;
       bool isOk = ProtoBuf(pool, Schema::vStructDefG, Schema::nStructDefG)
                       .Unmarshal(reinterpret_cast<const unsigned char*>(in.protoM.data()),
                                  static_cast<int>(in.protoM.size()), kTestAllTypes, &object);
       endOfRun();
       return isOk ? Outcome{true, ObjectJson(object.Get())} : Outcome{false, "false"};
     }},
    {"gzip out and back", "failed",
     [](VekMempool* pool, const Inputs& in, const std::function<void()>& endOfRun) {
       wynbaselib::InMemoryBytestream compressed;
       bool isOk;
       {
         wynbaselib::GzipBytesink sink(&compressed, pool);
         isOk = sink.Write(in.jsonM.data(), in.jsonM.size()) && sink.Flush();
       }
       std::string text;
       if (isOk) {
         wynbaselib::GunzipBytesource source(&compressed, pool);
         text = sarntest::ReadAll(source, 4096);
         isOk = !source.FError();
       }
       endOfRun();
       return isOk ? Outcome{true, text} : Outcome{false, "failed"};
     }},
};

TEST(AllocationFailureTest, EveryAllocationOfEveryReaderAndConverterFailsCleanly) {
  // Never destroyed: the global name cache keeps the pool of its first caller.
  static VekMempool* pool = new VekMempool("sweep");
  Inputs inputs(pool);
  for (const Row& row : kRowsG) {
    SCOPED_TRACE(row.nameM);
    long n = sarntest::SweepAllocationFailures(
        pool, [&](VekMempool* p, const std::function<void()>& endOfRun) { return row.operationM(p, inputs, endOfRun); },
        row.failureM);
    std::printf("%-34s %ld allocations\n", row.nameM, n);
  }
}

}  // namespace
