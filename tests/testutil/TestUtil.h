// Shared test helpers: chunk splitting for incremental readers, pool checks, corpus paths.
#pragma once

#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "vek/Vek.h"
#include "wynbaselib/Bytestream.h"

namespace sarntest {

// The bytes of a string or a byte string, NUL bytes included.
inline std::string Str(const VekString& text) { return std::string(text.Utf8(), text.NByte()); }
inline std::string Str(const ref<vek::ByteBuffer>& bytes) {
  return std::string(reinterpret_cast<const char*>(bytes->GetData()), bytes->GetLength());
}

// The ways an incremental reader is fed one input: whole, one byte at a time, and split in
// two at every position. Each call of `feed` receives one complete feeding as a list of
// chunks and a label describing it (for failure messages).
void ForEachSplit(std::string_view input,
                  const std::function<void(const std::vector<std::string_view>& chunks, const std::string& label)>& feed);

// Splits `input` into chunks of `size` bytes (the last one shorter).
std::vector<std::string_view> FixedChunks(std::string_view input, size_t size);

// A pool that a test uses for everything it allocates; at the end of the test every byte
// must have been returned (a leak fails the test, not just the sanitizer build).
class PoolTest : public ::testing::Test {
 protected:
  PoolTest() : poolM("test") {}
  void TearDown() override { EXPECT_EQ(poolM.GetUsedBytes(), 0u) << "bytes left in the test pool"; }
  VekMempool poolM;
};

// Runs `work` on a thread with a native stack of `bytes` (256 KiB is what the depth limits
// promise a whole read, write, compare and release fits in). Sanitizers and unoptimised builds
// multiply frame sizes, so they get eight times the room; the promise is about release builds.
void RunOnStack(size_t bytes, const std::function<void()>& work);

// A byte source that hands out the given chunks, one per Read (a chunk larger than the request
// goes in pieces), counts its reads, reports an error at its end when `isFailing`, and adds one
// to `*pDeleted` when it is deleted.
class TestSource : public wynbaselib::Bytesource {
 public:
  TestSource(const std::vector<std::string_view>& chunks, int* pDeleted = nullptr, bool isFailing = false)
      : chunksM(chunks.begin(), chunks.end()), pDeletedM(pDeleted), isFailingM(isFailing) {}
  ~TestSource() override {
    if (pDeletedM != nullptr) ++*pDeletedM;
  }
  size_t Read(void* buffer, size_t size) override;
  Bytesource* Duplicate() override { return nullptr; }
  bool FError() const override { return isFailingM; }
  const char* GetErrorText() const override { return isFailingM ? "truncated stream" : ""; }
  int nReadM = 0;

 private:
  std::vector<std::string> chunksM;
  size_t indexM = 0, offsetM = 0;
  int* pDeletedM;
  bool isFailingM;
};

// A sink that keeps what it is given; with `fFailM` set every write and flush fails.
struct StringSink : wynbaselib::Bytesink {
  bool Write(const char* data, size_t size) override {
    textM.append(data, size);
    return !fFailM;
  }
  bool Flush() override { return !fFailM; }
  std::string textM;
  bool fFailM = false;
};

// A folder of the shared public corpora, or "" when it is absent (tests then skip).
std::string CorpusDir(const std::string& name);

// Reads a whole file; false when it cannot be read.
bool ReadFile(const std::string& path, std::string& out);

// A table of text cases kept under tests/data (`name` is relative to it): one case a line, its
// `nFields` fields separated by " => ", with the escapes \\ \n \r \t \0 and \xHH (two digits)
// decoded; empty lines and lines starting with '#' are skipped. A missing file or a line with
// another number of fields fails the test.
std::vector<std::vector<std::string>> ReadTable(const std::string& name, size_t nFields);

}  // namespace sarntest
