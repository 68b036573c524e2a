// Shared test helpers: chunk splitting for incremental readers, pool checks, corpus paths.
#pragma once

#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "testutil/TestStreams.h"

namespace sarntest {

// The ways an incremental reader is fed one input: whole, one byte at a time, and split in
// two at every position. Each call of `feed` receives one complete feeding as a list of
// chunks and a label describing it (for failure messages).
void ForEachSplit(std::string_view input,
                  const std::function<void(const std::vector<std::string_view>& chunks, const std::string& label)>& feed);

// A pool that a test uses for everything it allocates; at the end of the test every byte
// must have been returned (a leak fails the test, not just the sanitizer build).
class PoolTest : public ::testing::Test {
 protected:
  PoolTest() : poolM("test") {}
  void TearDown() override { EXPECT_EQ(poolM.GetUsedBytes(), 0u) << "bytes left in the test pool"; }
  VekMempool poolM;
};

// The current record of the field named `name` of a type (a failure, and the last record, when
// there is none).
inline const sarn::FieldInfo& FieldNamed(const sarn::StructInfo* info, const char* name) {
  unsigned n = 0;
  while (n + 1 < info->nFieldInfo && (info->vFieldInfo[n].arity == sarn::SARN_ARITY_NONE ||
                                      std::string_view(sarn::FieldName(info, info->vFieldInfo[n])) != name)) {
    ++n;
  }
  EXPECT_STREQ(sarn::FieldName(info, info->vFieldInfo[n]), name);
  return info->vFieldInfo[n];
}

// Runs `work` on a thread with a native stack of `bytes` (256 KiB is what the depth limits
// promise a whole read, write, compare and release fits in). Sanitizers and unoptimised builds
// multiply frame sizes, so they get eight times the room; the promise is about release builds.
void RunOnStack(size_t bytes, const std::function<void()>& work);

// Reads a whole file; false when it cannot be read.
bool ReadFile(const std::string& path, std::string& out);

// A table of text cases kept under tests/data (`name` is relative to it): one case a line, its
// `nFields` fields separated by " => ", with the escapes \\ \n \r \t \0 and \xHH (two digits)
// decoded; empty lines and lines starting with '#' are skipped. A missing file or a line with
// another number of fields fails the test.
std::vector<std::vector<std::string>> ReadTable(const std::string& name, size_t nFields);

}  // namespace sarntest
