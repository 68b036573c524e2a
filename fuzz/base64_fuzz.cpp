// Base64 and byte lists on arbitrary text. Byte 0 picks the code set; the rest is the text.
// Oracles: a text that decodes re-encodes to the same length and decodes again to the same
// bytes; byte lists match strtol token by token and survive FormatBytes.
#include <climits>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>

#include "sarn/Sarn.h"

namespace {

void Check(bool condition) {
  if (!condition) std::abort();
}

std::string Bytes(const ref<vek::ByteBuffer>& b) { return std::string(reinterpret_cast<const char*>(b->GetData()), b->GetLength()); }
std::string Bytes(const VekString& s) { return std::string(s.Utf8(), s.NByte()); }

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
      Check(decoded->GetLength() <= (size - 1) / 4 * 3);
      ref<vek::ByteBuffer> encoded;
      codec.Encode(&pool, decoded, encoded);
      Check(encoded->GetLength() == size - 1);
      ref<vek::ByteBuffer> again;
      Check(codec.Decode(&pool, encoded, again));
      Check(Bytes(again) == Bytes(decoded));
    }
    VekString text = VekString::FromUtf8Bytes(&pool, size - 1, data + 1);
    if (!isOther) {
      ref<vek::ByteBuffer> viaText = sarn::DecodeBase64(&pool, text);
      Check(viaText && Bytes(viaText) == (decoded ? Bytes(decoded) : std::string()));
    }

    std::string list = Bytes(sarn::ParseBytes(&pool, text));
    Check(list == ReferenceByteList(Bytes(text)));
    Check(Bytes(sarn::ParseBytesToBytestring(&pool, text)) == list);
    VekString formatted = sarn::FormatBytes(&pool, text);
    Check(formatted.NByte() == 3 * text.NByte());
    Check(Bytes(sarn::ParseBytes(&pool, formatted)) == Bytes(text));
  }
  Check(pool.GetUsedBytes() == 0);
  return 0;
}
