// A lazy payload made from the input and asked for everything, with feature 548 off and on.
// Byte 0 chooses the form: 0 the rest as JSON text or protocol-buffer bytes (LazyDict's own
// first-byte rule), otherwise a byte source handing the rest out in pieces of that many bytes.
// Oracle: no crash, leak or hang; ToSarnObjectOrError never null; ToProtobuf always reads back as
// a known dict; the form unchanged but for a type query's switch; and a byte source answers like a
// JSON payload of the same bytes whenever both JSON readers make the same tree of them.
#include "DictFuzzSupport.h"

namespace {

using namespace sarn;
using sarntest::PieceSource;
using sarntest::Require;
using sarntest::Str;

// Everything a payload answers, as text; each form's type queries last, since they may switch it.
std::string Answers(VekMempool* pool, LazyDict& payload) {
  LazyDict::Rep rep = payload.repM;
  VekString error;
  ref<Dictionary> tree = payload.ToDictionary(error);
  std::string out = (tree ? Str(tree->ToJson(false)) : Str(error)) + "|" + Str(payload.ToDict()->ToString(false));
  out += "|" + Str(payload.ToJson(true));
  ref<vek::ByteBuffer> bytes = payload.ToProtobuf();
  // Stored protocol-buffer bytes are handed back as they are, read or not.
  Require(bytes && (rep == LazyDict::REP_PROTOBUF || sarntest::ReadKnownDict(pool, Str(bytes))));
  out += "|" + Str(bytes);
  for (bool isDirect : {false, true}) {
    VekFeatures::SetEnabled(548, isDirect);
    ref<SarnObject> object = payload.ToSarnObjectOrError();
    Require(object != nullptr);
    sarntest::StringSink sink;
    payload.ToJsonBytesink(sink, false);
    out += "|" + Str(JsonSarnObject(pool).SarnObjectToJson(object.Get(), 0));
  }
  VekFeatures::SetEnabled(548, false);
  Require(payload.repM == rep && payload == payload);
  unsigned int typeId = 0;
  VekString name;
  bool hasId = payload.GetType(&typeId), hasName = payload.GetTypeName(&name);
  Require(payload.repM == rep || (rep == LazyDict::REP_BYTESOURCE && payload.repM == LazyDict::REP_DICTIONARY));
  return out + "|" + (hasId ? std::to_string(typeId) : "-") + (hasName ? Str(name) : "-");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static const bool isQuiet = (VekLogger::SetSink([](int, int, const char*, const char*) {}), true);
  (void)isQuiet;
  if (size < 1) return 0;
  std::string text(reinterpret_cast<const char*>(data) + 1, size - 1);
  VekMempool pool("fuzz");
  {
    ref<LazyDict> fromBytes = LazyDict::FromBytestring(&pool, vek::ByteBuffer::New(&pool, text.data(), text.size()), 0);
    if (data[0] == 0) {
      if (fromBytes) Answers(&pool, *fromBytes);
    } else {
      ref<LazyDict> fromSource = LazyDict::FromBytesource(&pool, new PieceSource(text, data[0]), 0);
      std::string answers = Answers(&pool, *fromSource);
      // Where both readers make the same tree, the two payloads answer alike but for the JSON
      // text itself, which stored JSON passes on as it came.
      VekString error;
      ref<Dictionary> byHand = fromBytes && fromBytes->repM == LazyDict::REP_JSON ? fromBytes->ToDictionary(error) : nullptr;
      wynbaselib::Bytesource* duplicate = new PieceSource(text, 512);
      ref<Dictionary> streamed = Dictionary::FromJsonBytesource(duplicate, error, &pool);
      if (byHand && streamed && error.FEmpty() && Str(byHand->ToJson(false)) == Str(streamed->ToJson(false))) {
        Require(answers == Answers(&pool, *fromBytes));
      }
    }
  }
  Require(pool.GetUsedBytes() == 0);
  return 0;
}
