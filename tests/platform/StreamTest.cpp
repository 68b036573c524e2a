// Byte sources and sinks: in-memory streams sharing one content, duplicates that leave the
// original alone, counting and file descriptors.
#include <fcntl.h>
#include <unistd.h>

#include <memory>
#include <string>

#include "testutil/TestUtil.h"
#include "wynbaselib/Bytestream.h"

namespace {

using wynbaselib::Bytesource;
using wynbaselib::InMemoryBytestream;
using sarntest::ReadAll;

TEST(StreamTest, InMemoryCopiesShareContentAndReadFromTheirOwnPosition) {
  InMemoryBytestream stream("hello");
  char buffer[16];
  ASSERT_EQ(stream.Read(buffer, 2), 2u);
  InMemoryBytestream copy = stream;  // shares the content, starts at position 2
  EXPECT_TRUE(copy.Write(" world", 6)) << "appends to the shared content";
  EXPECT_EQ(stream.GetContent(), "hello world");
  EXPECT_EQ(ReadAll(copy, 3), "llo world");
  EXPECT_EQ(stream.GetPosition(), 2u) << "reading the copy leaves the original where it was";

  std::unique_ptr<Bytesource> duplicate(stream.Duplicate());
  EXPECT_EQ(ReadAll(*duplicate, 1), "llo world");
  EXPECT_EQ(ReadAll(stream, 4), "llo world");
  EXPECT_TRUE(stream.Read(buffer, sizeof buffer) == 0 && !stream.FError() && std::string(stream.GetErrorText()).empty())
      << "0 again after the end";

  stream.Seek(6);
  EXPECT_EQ(ReadAll(stream, 16), "world");
  stream.Seek(1000);
  EXPECT_TRUE(stream.GetPosition() == 11 && stream.Read(buffer, 0) == 0) << "seek clamps to the content";
  InMemoryBytestream bytes("a\0b", 3);
  EXPECT_EQ(ReadAll(bytes, 8), std::string("a\0b", 3));
}

TEST(StreamTest, CountingSinkCountsAndPassesOn) {
  InMemoryBytestream target;
  wynbaselib::ByteCountingBytesink counter(&target);
  EXPECT_TRUE(counter.Write("abc", 3) && counter.Write("", 0) && counter.Write("de", 2) && counter.Flush());
  EXPECT_TRUE(counter.GetCount() == 5 && target.GetContent() == "abcde");
  wynbaselib::ByteCountingBytesink alone;
  EXPECT_TRUE(alone.Write("xyz", 3) && alone.GetCount() == 3);
}

TEST(StreamTest, FileDescriptorSourceAndSink) {
  int fds[2];
  ASSERT_EQ(pipe(fds), 0);
  wynbaselib::FdBytesink sink(fds[1]);
  EXPECT_TRUE(sink.Write("through a pipe", 14) && sink.Flush());
  close(fds[1]);
  wynbaselib::FdBytesource source(fds[0]);
  EXPECT_EQ(source.Duplicate(), nullptr) << "a descriptor has one shared position";
  EXPECT_TRUE(ReadAll(source, 5) == "through a pipe" && !source.FError()) << "end of file is a clean end";
  close(fds[0]);

  wynbaselib::FdBytesource closed(fds[0]);
  char c;
  EXPECT_TRUE(closed.Read(&c, 1) == 0 && closed.FError() && std::string(closed.GetErrorText()) == "read error");
  wynbaselib::FdBytesink broken(-1);
  EXPECT_FALSE(broken.Write("x", 1));
}

}  // namespace
