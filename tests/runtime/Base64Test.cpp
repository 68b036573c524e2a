#include <string>

#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

namespace {

using Base64Test = sarntest::PoolTest;

using sarntest::Str;

struct Base64Pool : Base64Test {
  ref<vek::ByteBuffer> Bytes(const std::string& text) { return vek::ByteBuffer::New(&poolM, text.data(), text.size()); }
  VekString Text(const std::string& text) { return VekString::FromUtf8Bytes(&poolM, text.size(), text.data()); }
  std::string Encode(const std::string& bytes) { return Str(sarn::EncodeBase64(&poolM, Bytes(bytes))); }
  // The decoded bytes, or "<fail>" when the text does not decode (checked through both entry
  // points, which must agree).
  std::string Decode(const std::string& text) {
    ref<vek::ByteBuffer> out = vek::ByteBuffer::New(&poolM, "old", 3);
    bool fOk = sarn::Base64(sarn::Base64::DEFAULT_CODE_SET, sarn::Base64::DEFAULT_TERMINATOR).Decode(&poolM, Bytes(text), out);
    ref<vek::ByteBuffer> viaText = sarn::DecodeBase64(&poolM, Text(text));
    EXPECT_TRUE(viaText) << "DecodeBase64 never gives null";
    if (!fOk) {
      EXPECT_TRUE(Str(out) == "old" && viaText->GetLength() == 0) << "a failed decode leaves the output alone";
      return "<fail>";
    }
    EXPECT_EQ(Str(viaText), Str(out));
    return Str(out);
  }
};

TEST_F(Base64Pool, EncodesWithPaddingAndBothCodeSets) {
  std::string encoded;
  for (const char* bytes : {"", "f", "fo", "foo", "foob", "\xFB\xFF"}) encoded += Encode(bytes) + "|";
  EXPECT_EQ(encoded, "|Zg==|Zm8=|Zm9v|Zm9vYg==|+/8=|");
  std::string all;
  for (int i = 0; i < 256; ++i) all.push_back(static_cast<char>(i));
  EXPECT_EQ(Decode(Encode(all)), all);

  sarn::Base64 other(sarn::Base64::YAHOO_CODE_SET, sarn::Base64::YAHOO_TERMINATOR);
  EXPECT_FALSE(other.fBadCodeSetM);
  ref<vek::ByteBuffer> text, back;
  other.Encode(&poolM, Bytes("\xFB\xFF"), text);
  EXPECT_EQ(Str(text), "._8-");
  EXPECT_TRUE(other.Decode(&poolM, text, back) && Str(back) == "\xFB\xFF");
  EXPECT_FALSE(other.Decode(&poolM, Bytes("+/8="), back)) << "the other code set's characters";
  other.Encode(&poolM, ref<vek::ByteBuffer>(), text);
  EXPECT_EQ(text->GetLength(), 0u);
}

TEST_F(Base64Pool, DecodeAcceptsPaddingOnlyAtTheEnd) {
  for (const auto& row : sarntest::ReadTable("values/base64-decode.txt", 2)) EXPECT_EQ(Decode(row[0]), row[1]) << row[0];
}

TEST_F(Base64Pool, BadCodeSetsAreRejected) {
  std::string repeated = sarn::Base64::DEFAULT_CODE_SET;
  repeated[63] = 'A';
  std::string withTerminator = sarn::Base64::DEFAULT_CODE_SET;
  withTerminator[10] = '=';
  for (const char* codeSet : {repeated.c_str(), withTerminator.c_str(), "ABC", "", static_cast<const char*>(nullptr)}) {
    sarn::Base64 codec(codeSet, '=');
    ref<vek::ByteBuffer> out = Bytes("old"), kept = Bytes("old");
    codec.Encode(&poolM, Bytes("foo"), out);
    EXPECT_TRUE(codec.fBadCodeSetM && out->GetLength() == 0);
    EXPECT_TRUE(!codec.Decode(&poolM, Bytes("Zm9v"), kept) && Str(kept) == "old");
  }
  // A NUL terminator makes the string's own end count as the terminator.
  EXPECT_TRUE(!sarn::Base64(sarn::Base64::DEFAULT_CODE_SET, 0).fBadCodeSetM && sarn::Base64("ABC", 0).fBadCodeSetM);
}

TEST_F(Base64Pool, LargeRoundTripAllocatesOnlyTheResult) {
  std::string bytes(100001, '\0');
  for (size_t i = 0; i < bytes.size(); ++i) bytes[i] = static_cast<char>(i * 7 + (i >> 8));
  ref<vek::ByteBuffer> input = Bytes(bytes);
  size_t before = poolM.GetUsedBytes();
  ref<vek::ByteBuffer> text;
  sarn::Base64(sarn::Base64::DEFAULT_CODE_SET, '=').Encode(&poolM, input, text);
  EXPECT_TRUE(text->GetLength() == 133336 && text->GetCapacity() == 133336);
  ref<vek::ByteBuffer> back;
  ASSERT_TRUE(sarn::Base64(sarn::Base64::DEFAULT_CODE_SET, '=').Decode(&poolM, text, back));
  EXPECT_TRUE(Str(back) == bytes && back->GetCapacity() <= bytes.size() + 2 && poolM.GetUsedBytes() > before);
  text.Reset();
  back.Reset();
  EXPECT_EQ(poolM.GetUsedBytes(), before);
}

TEST_F(Base64Pool, ByteLists) {
  EXPECT_EQ(Str(sarn::FormatBytes(&poolM, Text("\x01\xAB"))) + "|" +
                Str(sarn::FormatBytes(&poolM, Text(std::string("\0\xFF", 2)))) + "|" + Str(sarn::FormatBytes(&poolM, Text(""))) +
                "|" + Str(sarn::FormatBytesFromBytestring(&poolM, Bytes("\x10"))) + "|" +
                Str(sarn::FormatBytesFromBytestring(&poolM, ref<vek::ByteBuffer>())),
            "01 AB |00 FF ||10 |");
  // Parsing byte lists is checked against the C library's own reading of each token by the
  // base64 fuzz target on its byte_list seeds.
}

}  // namespace
