// The binary form is the protocol-buffer encoding: a protocol-buffer library reading our bytes
// through the generated mirror writes back exactly the same bytes, for filled objects of the
// mirrored types (every data type, arrays, nested and known objects, free-form dictionaries).
#include <gtest/gtest.h>

#include <string>

#include "mirror.pb.h"
#include "sarn/Sarn.h"
#include "testutil/ObjectFill.h"

using namespace sarn;

TEST(ProtoBufMirrorTest, APeerLibraryReadsAndRewritesTheSameBytes) {
  VekMempool pool("mirror");
  {
    ProtoBuf codec(&pool, Schema::vStructDefG, Schema::nStructDefG);
    for (const char* name : {"testAllTypes", "recordingList", "error", "kernoRpcCancel"}) {
      for (unsigned seed : {1u, 2u, 3u}) {
        const StructInfo* info = StructInfoMap::LookupStructByName(name);
        ASSERT_NE(info, nullptr) << name;
        ref<SarnObject> object = info->pFactory(&pool);
        sarntest::FillObject(&pool, object.Get(), seed, 2, seed);
        ProtoBufByteOutputStream out;
        codec.MarshalKnownDict(object.Get(), &out);
        const unsigned char* data;
        unsigned long length;
        out.Finish(data, length);
        std::string ours(reinterpret_cast<const char*>(data), length);
        ASSERT_GT(ours.size(), 20u) << name;
        sarnmirror::KnownDict peer;
        ASSERT_TRUE(peer.ParseFromString(ours)) << name << " " << seed;
        EXPECT_EQ(peer.SerializeAsString(), ours) << name << " " << seed;
      }
    }
  }
  EXPECT_EQ(pool.GetLiveBlocks(), 0u);
}
