// Base64 and byte lists on arbitrary text. Byte 0 picks the code set; the rest is the text.
// Oracles: a text that decodes re-encodes to the same length and decodes again to the same
// bytes; byte lists match strtol token by token and survive FormatBytes.
#include <cctype>
#include "DictFuzzSupport.h"

namespace {

using sarntest::Require;
using sarntest::Str;

// The byte list as the C library reads it: strtol on a NUL-terminated copy of each token.
std::string ReferenceByteList(const std::string& text) {
  std::string out;
  size_t i = 0;
  while (i < text.size()) {
    while (i < text.size() && std::strchr("\t\n\r ", text[i]) != nullptr && text[i] != '\0') ++i;
    if (i == text.size()) break;
    size_t start = i;
    while (i < text.size() && text[i] != '\0' && !std::isspace(static_cast<unsigned char>(text[i]))) ++i;
    if (i == start) {
      ++i;
      continue;
    }
    std::string token = text.substr(start, i - start);
    out.push_back(static_cast<char>(std::strtol(token.c_str(), nullptr, 16)));
  }
  return out;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0) return 0;
  VekMempool pool("fuzz");
  {
    bool isOther = data[0] & 1;
    sarn::Base64 codec(isOther ? sarn::Base64::YAHOO_CODE_SET : sarn::Base64::DEFAULT_CODE_SET,
                       isOther ? sarn::Base64::YAHOO_TERMINATOR : sarn::Base64::DEFAULT_TERMINATOR);
    ref<vek::ByteBuffer> input = vek::ByteBuffer::New(&pool, data + 1, size - 1);
    ref<vek::ByteBuffer> decoded;
    if (codec.Decode(&pool, input, decoded)) {
      Require(decoded->GetLength() <= (size - 1) / 4 * 3);
      ref<vek::ByteBuffer> encoded;
      codec.Encode(&pool, decoded, encoded);
      Require(encoded->GetLength() == size - 1);
      ref<vek::ByteBuffer> again;
      Require(codec.Decode(&pool, encoded, again));
      Require(Str(again) == Str(decoded));
    }
    VekString text = VekString::FromUtf8Bytes(&pool, size - 1, data + 1);
    if (!isOther) {
      ref<vek::ByteBuffer> viaText = sarn::DecodeBase64(&pool, text);
      Require(viaText && Str(viaText) == (decoded ? Str(decoded) : std::string()));
    }

    std::string list = Str(sarn::ParseBytes(&pool, text));
    Require(list == ReferenceByteList(Str(text)));
    Require(Str(sarn::ParseBytesToBytestring(&pool, text)) == list);
    VekString formatted = sarn::FormatBytes(&pool, text);
    Require(formatted.NByte() == 3 * text.NByte());
    Require(Str(sarn::ParseBytes(&pool, formatted)) == Str(text));
  }
  Require(pool.GetUsedBytes() == 0);
  return 0;
}
