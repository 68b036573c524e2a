// Gzip over sinks and sources: round trips in small reads, members, corrupt and truncated
// input told apart from a clean end, duplicates, and failing sinks.
#include <memory>
#include <string>

#include "testutil/TestUtil.h"
#include "wynbaselib/Gzip.h"

namespace {

using wynbaselib::Bytesource;
using wynbaselib::GunzipBytesource;
using wynbaselib::GzipBytesink;
using wynbaselib::InMemoryBytestream;
using sarntest::ReadAll;

// Text that compresses, with enough variety to need several deflate blocks.
std::string SampleText(size_t n) {
  std::string text;
  uint32_t x = 1;
  while (text.size() < n) {
    x = x * 1664525u + 1013904223u;
    text += "line " + std::to_string(x % 1000) + (x & 0x10000 ? " alpha\n" : " beta, gamma\n");
  }
  text.resize(n);
  return text;
}

std::string Gzip(const std::string& text, size_t writeSize = 1000) {
  InMemoryBytestream out;
  GzipBytesink sink(&out);
  for (size_t at = 0; at < text.size(); at += writeSize) {
    EXPECT_TRUE(sink.Write(text.data() + at, std::min(writeSize, text.size() - at)));
  }
  EXPECT_TRUE(sink.Flush());
  return out.GetContent();
}

struct Gunzipped {
  std::string textM;
  bool isErrorM;
  std::string errorM;
};

Gunzipped Gunzip(const std::string& compressed, size_t block) {
  InMemoryBytestream in(compressed);
  GunzipBytesource source(&in);
  Gunzipped result{ReadAll(source, block), source.FError(), source.GetErrorText()};  // in this order
  char c;
  EXPECT_EQ(source.Read(&c, 1), 0u) << "stays at its end";
  return result;
}

using GzipTest = sarntest::PoolTest;

TEST_F(GzipTest, FlushEndsMembersThatReadBackAsOneStream) {
  InMemoryBytestream out;
  {
    GzipBytesink sink(&out);
    ASSERT_TRUE(sink.Flush());  // nothing written yet: one empty member, a valid stream
    ASSERT_TRUE(out.GetContent().size() == 20 && sink.Flush());
    EXPECT_EQ(out.GetContent().size(), 20u) << "a second flush adds nothing";
    ASSERT_TRUE(sink.Write("first ", 6) && sink.Write("", 0) && sink.Flush() && sink.Write("second", 6));
  }  // the destructor ends the pending member
  Gunzipped back = Gunzip(out.GetContent(), 4);
  EXPECT_TRUE(back.textM == "first second" && !back.isErrorM);

  InMemoryBytestream untouched;
  { GzipBytesink sink(&untouched); }
  EXPECT_EQ(untouched.GetContent(), "") << "a sink never written nor flushed writes nothing";
}

TEST_F(GzipTest, TruncationAtEveryPositionIsAnErrorWithAPrefixOfTheText) {
  const std::string text = SampleText(3000);
  const std::string bytes = Gzip(text) + Gzip("tail");
  const size_t firstMember = Gzip(text).size();
  for (size_t cut = 0; cut <= bytes.size(); ++cut) {
    Gunzipped part = Gunzip(bytes.substr(0, cut), 1 << 16);
    bool isClean = cut == firstMember || cut == bytes.size();
    EXPECT_EQ(part.isErrorM, !isClean) << "cut at " << cut;
    EXPECT_EQ(part.errorM, isClean ? "" : "truncated gzip stream") << "cut at " << cut;
    EXPECT_EQ(part.textM, (text + "tail").substr(0, part.textM.size())) << "cut at " << cut;
    EXPECT_TRUE(cut != firstMember || part.textM == text);
  }
}

TEST_F(GzipTest, CorruptionIsToldFromTruncation) {
  const std::string text = SampleText(5000);
  const std::string good = Gzip(text);
  auto corrupt = [&](size_t at, char value) {
    std::string bad = good;
    bad[at] = value;
    return Gunzip(bad, 512);
  };
  // Each damage: the error, and the text decoded before it (nothing invented).
  const std::pair<Gunzipped, std::string> cases[] = {
      {corrupt(0, 0x1e), ""},
      {corrupt(good.size() - 8, static_cast<char>(good[good.size() - 8] ^ 1)), text},  // CRC
      {corrupt(good.size() - 1, static_cast<char>(good.back() ^ 0x40)), text},         // length
      {Gunzip(good + "junk", 512), text},
  };
  for (const auto& [result, decoded] : cases) {
    EXPECT_TRUE(result.isErrorM && result.errorM == "corrupt gzip stream") << result.errorM;
    EXPECT_EQ(result.textM, decoded);
  }
  EXPECT_EQ(Gunzip("", 512).errorM, "truncated gzip stream") << "no bytes at all is no gzip stream";
}

TEST_F(GzipTest, DuplicateReadsTheRestWithoutDisturbingTheOriginal) {
  const std::string text = SampleText(100000);
  InMemoryBytestream in(Gzip(text, 777));  // writes that never line up with deflate's blocks
  GunzipBytesource original(&in, &poolM);
  std::string head(30000, '\0');
  size_t got = 0;
  while (got < head.size()) got += original.Read(&head[got], head.size() - got);
  EXPECT_TRUE(head == text.substr(0, 30000) && poolM.GetUsedBytes() > 0) << "zlib's state lives in the pool";
  std::unique_ptr<Bytesource> duplicate(original.Duplicate());
  ASSERT_NE(duplicate, nullptr);
  EXPECT_TRUE(ReadAll(*duplicate, 333) == text.substr(30000) && !duplicate->FError());
  EXPECT_EQ(ReadAll(original, 4096), text.substr(30000)) << "the original goes on from where it was";
  duplicate.reset();

  wynbaselib::FdBytesource fd(-1);
  GunzipBytesource overFd(&fd);
  EXPECT_EQ(overFd.Duplicate(), nullptr) << "not duplicable when the source is not";
}

TEST_F(GzipTest, OwnedSourceIsDeletedWithTheReader) {
  int deleted = 0;
  sarntest::TestSource kept({Gzip("kept")}, &deleted);
  {
    GunzipBytesource owning(new sarntest::TestSource({Gzip("owned")}, &deleted), nullptr, true);
    GunzipBytesource borrowing(&kept);
    EXPECT_TRUE(ReadAll(owning, 2) + ReadAll(borrowing, 2) == "ownedkept" && deleted == 0);
  }
  EXPECT_EQ(deleted, 1) << "only the owned source goes with its reader";
}

TEST_F(GzipTest, SinkFailureIsStickyAndReported) {
  sarntest::StringSink failing;
  failing.fFailM = true;
  GzipBytesink sink(&failing, &poolM);
  const std::string text = SampleText(200000);  // more than deflate buffers: it must write
  EXPECT_TRUE(!sink.Write(text.data(), text.size()) && poolM.GetUsedBytes() > 0) << "zlib's state lives in the pool";
  EXPECT_TRUE(sink.FError() && !sink.Write("x", 1) && !sink.Flush());

  InMemoryBytestream out;
  GzipBytesink badLevel(&out, nullptr, 42);
  EXPECT_TRUE(!badLevel.Write("x", 1) && badLevel.FError());
}

}  // namespace
