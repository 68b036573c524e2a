// A tour of the library: a frame received in pieces, its JSON body read into a Dictionary,
// converted to a typed object, changed, and written back as JSON text; all from one pool,
// which is empty again at the end.
#include <cstdio>
#include <string>

#include "sarn/Sarn.h"

namespace {

// Collects what the frame parser reports.
class FrameCollector : public sarn::RpcV2Parser::Callbacks {
 public:
  void OnError(const char* message) override { errorM = message; }
  void OnHeaderSize(size_t headerLength) override { std::printf("  header block: %zu bytes\n", headerLength); }
  void OnBodySize(size_t bodyLength) override { std::printf("  body: %zu bytes\n", bodyLength); }
  void OnHeaderPair(const char* key, const char* value) override { std::printf("  header %s = %s\n", key, value); }
  void OnBodyChunk(const char* data, size_t length) override { bodyM.append(data, length); }
  void OnParsingComplete() override { isCompleteM = true; }

  std::string bodyM;
  std::string errorM;
  bool isCompleteM = false;
};

}  // namespace

int main() {
  std::printf("sarn %s\n", sarn::GetLibraryVersion());
  VekMempool pool("demo");
  int status = 0;
  {
    // 1. A frame arrives in 7-byte pieces.
    std::string body =
        "{\"type\": \"address\", \"city\": \"Oslo\", \"country\": \"NO\", \"postalCode\": \"0150\", "
        "\"state\": \"\", \"street1\": \"Main St 1\", \"levelOfDetail\": \"high\"}";
    std::string headers =
        "Content-Type: application/json\r\nRequestType: address\r\nResponseCount: single\r\n"
        "RpcId: 7\r\nSchemaVersion: 42\r\nType: request\r\n\r\n";
    std::string frame =
        "MRPC/2 " + std::to_string(headers.size()) + " " + std::to_string(body.size()) + "\r\n" + headers + body;
    std::printf("frame of %zu bytes:\n", frame.size());
    FrameCollector collector;
    {
      sarn::RpcV2Parser parser(collector);
      for (size_t at = 0; at < frame.size(); at += 7) {
        size_t n = frame.size() - at < 7 ? frame.size() - at : 7;
        if (!parser.ParseChunk(frame.data() + at, n)) break;
      }
      parser.EndParse();
    }
    if (!collector.isCompleteM) {
      std::printf("frame refused: %s\n", collector.errorM.c_str());
      return 1;
    }

    // 2. The body becomes a Dictionary, then a typed object at schema version 42.
    VekString error;
    ref<sarn::Dictionary> tree = sarn::Dictionary::FromJson(
        reinterpret_cast<const unsigned char*>(collector.bodyM.data()), collector.bodyM.size(), error, &pool);
    ref<sarn::SarnObject> object;
    sarn::DictionarySarnObject converter(&pool, sarn::Schema::vStructDefG, sarn::Schema::nStructDefG);
    if (!tree || !converter.DictionaryToSarnObject(tree, 42, object, error)) {
      std::printf("body refused: %s\n", error.Utf8());
      status = 1;
    } else {
      auto* address = static_cast<sarnschema::Address*>(object.Get());
      std::printf("object of type '%s', city %s\n", object->GetTypeName().Utf8(), address->cityM.Utf8());

      // 3. Change it and write it back, compact and as a pretty tree.
      address->cityM = VekString::FromUtf8Bytes(&pool, 6, "Bergen");
      sarn::JsonSarnObject writer(&pool);
      std::printf("compact: %s\n", writer.SarnObjectToJson(object.Get(), 42).Utf8());
      std::printf("pretty:\n%s\n", converter.SarnObjectToDictionary(object.Get(), 42)->ToJson(true).Utf8());
    }
  }
  std::printf("pool '%s': %zu bytes in use after release (high water %zu)\n", pool.GetName(), pool.GetUsedBytes(),
              pool.GetUsedBytesHighWater());
  return status;
}
