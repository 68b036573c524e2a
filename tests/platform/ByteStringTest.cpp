// Counted byte strings: zero-filled growth, exact-size appends, and the storage a derived
// class grows itself.
#include <climits>
#include <cstring>
#include <string>

#include "testutil/TestUtil.h"

namespace {

using ByteStringTest = sarntest::PoolTest;

std::string Bytes(const unsigned char* data, size_t n) { return std::string(reinterpret_cast<const char*>(data), n); }

TEST_F(ByteStringTest, VekByteStringZeroesNewBytesAndKeepsThePrefix) {
  ref<VekByteString> s = new (&poolM) VekByteString;
  EXPECT_TRUE(s->GetLength() == 0 && s->GetData() == nullptr);
  ASSERT_TRUE(s->SetLength(4));
  EXPECT_EQ(Bytes(s->GetData(), 4), std::string(4, '\0'));
  s->SetBytes(1, 3, reinterpret_cast<const unsigned char*>("xyz"));
  s->SetByte(0, 'w');
  ASSERT_TRUE(s->SetLength(700));  // grows into a large block: the prefix moves along
  EXPECT_EQ(Bytes(s->GetData(), 6), std::string("wxyz\0\0", 6));
  EXPECT_TRUE(s->GetData()[699] == 0 && poolM.GetUsedBytes() == sizeof(VekByteString) + 700);
  ASSERT_TRUE(s->SetLength(2) && Bytes(s->GetData(), 2) == "wx");
  ASSERT_TRUE(s->SetLength(3) && s->GetData()[2] == 0) << "bytes cut off and regrown are zero again";
  EXPECT_TRUE(s->SetLength(0) && poolM.GetUsedBytes() == sizeof(VekByteString));
}

TEST_F(ByteStringTest, ByteBufferAppendsToExactlyTheNewLength) {
  ref<vek::ByteBuffer> empty = vek::ByteBuffer::New(&poolM);
  EXPECT_TRUE(empty->Append(nullptr, 0) && empty->GetLength() == 0 && empty->GetData() == nullptr && empty->GetCapacity() == 0);

  ref<vek::ByteBuffer> b = vek::ByteBuffer::New(&poolM, "abc", 3);
  EXPECT_TRUE(b->GetMempool() == &poolM && b->GetCapacity() == 8) << "at least 8 bytes";
  ASSERT_TRUE(b->Append("defghijkl", 9) && b->GetCapacity() == 12) << "exactly the new length";
  EXPECT_EQ(sarntest::Contents(*b), "abcdefghijkl");
  // A length that would pass 2 GiB is refused before anything is touched.
  EXPECT_FALSE(b->Append("x", static_cast<size_t>(INT_MAX)));
  EXPECT_TRUE(b->GetLength() == 12 && poolM.GetUsedBytes() == 2 * sizeof(vek::ByteBuffer) + 12);
}

// A derived class reaches the storage and grows it with Realloc.
struct GrowingBuffer : vek::ByteBuffer {
  explicit GrowingBuffer(VekMempool* pool) : vek::ByteBuffer(pool) {}
  bool Reserve(int k) { return bytesM.Realloc(k); }
  void Push(unsigned char byte) { bytesM.pDataM[bytesM.lengthM++] = byte; }
  VekMempool* StoragePool() const { return bytesM.pMempoolM; }
};

TEST_F(ByteStringTest, DerivedClassGrowsTheStorageWithRealloc) {
  ref<GrowingBuffer> g = new (&poolM) GrowingBuffer(&poolM);
  ASSERT_TRUE(g->Reserve(3));
  EXPECT_TRUE(g->StoragePool() == &poolM && g->GetCapacity() == 8);
  g->Push('p');
  g->Push('q');
  ASSERT_TRUE(g->Reserve(40) && g->GetCapacity() == 40);
  EXPECT_EQ(Bytes(g->GetData(), 3), std::string("pq\0", 3)) << "copied and zero-filled";
  EXPECT_TRUE(!g->Reserve(1) && !g->Reserve(-1)) << "smaller than the length";
  EXPECT_TRUE(g->GetCapacity() == 40 && g->GetLength() == 2);
  ref<GrowingBuffer> nullPool = new (&poolM) GrowingBuffer(nullptr);
  EXPECT_EQ(nullPool->StoragePool(), &poolM) << "a null pool means the object's own";
}

}  // namespace
