// The frame parser: every case is fed whole, byte by byte and split at every position, and must
// give the same event log each time (body pieces joined) and the same verdict. Logs are written
// as their events joined by " | "; most cases are the tables under tests/data/rpc/.
#include "../fuzz/RpcFuzzSupport.h"
#include "testutil/TestUtil.h"

namespace {

using sarn::RpcV2Parser;

// What the parser reported, fed as a reader feeds it (fuzz/RpcFuzzSupport.h): one line per event,
// body pieces joined into one line; their number is kept apart, as that is the one thing chunking
// changes.
using rpcfuzz::Recorder;

using rpcfuzz::Feed;

// The log of `input` under every feeding must be `expected`.
void ExpectLog(std::string_view input, const std::string& expected) {
  sarntest::ForEachSplit(input, [&](const std::vector<std::string_view>& chunks, const std::string& label) {
    Recorder log = Feed(chunks);
    ASSERT_EQ(log.Text(), expected) << label;
  });
}

std::string Frame(const std::string& block, const std::string& body) {
  return "MRPC/2 " + std::to_string(block.size()) + " " + std::to_string(body.size()) + "\r\n" + block + body;
}

const std::string kBody = "{\"type\": \"kernoCurrentTimeGet\"}";
const std::string kExample =
    "MRPC/2 135 31\r\nContent-Type: application/json\r\nRequestType: kernoCurrentTimeGet\r\n"
    "ResponseCount: single\r\nRpcId: 7\r\nSchemaVersion: 42\r\nType: request\r\n\r\n" + kBody;
const std::string kExampleEvents =
    "headerSize 135 | bodySize 31 | header [Content-Type] [application/json] | "
    "header [RequestType] [kernoCurrentTimeGet] | header [ResponseCount] [single] | header [RpcId] [7] | "
    "header [SchemaVersion] [42] | header [Type] [request] | body " + kBody;

TEST(RpcV2ParserTest, WorkedExampleGivesTheSameCallbacksHoweverSplit) {
  ExpectLog(kExample, kExampleEvents + " | complete | parse true | end true");

  // Only the body pieces differ; they point into the caller's chunk, never into a copy.
  EXPECT_EQ(Feed({kExample}).piecesM, 1u);
  EXPECT_EQ(Feed(sarntest::FixedChunks(kExample, 1)).piecesM, 31u);
  EXPECT_EQ(Feed({std::string_view(kExample).substr(0, 160), std::string_view(kExample).substr(160)}).piecesM, 2u);
  Recorder log;
  RpcV2Parser parser(log);
  EXPECT_TRUE(parser.ParseChunk(kExample.data(), kExample.size()));
  EXPECT_EQ(log.lastBodyChunkM, kExample.data() + 150);
  // Done is kept: every further chunk is refused with the same message, an empty one is not.
  const size_t before = log.eventsM.size();
  EXPECT_FALSE(parser.ParseChunk("x", 1));
  log.errorsM = 0;
  EXPECT_FALSE(parser.ParseChunk("y", 1));
  EXPECT_TRUE(parser.ParseChunk(nullptr, 0));
  const std::string unexpected = "error RpcV2Parser: Unexpected data after the end of the RPC packet";
  EXPECT_EQ(log.Text(before), unexpected + " | " + unexpected);
  EXPECT_EQ(std::vector<long>({parser.stateM, long(parser.headerBytesReadM), long(parser.bodyBytesReadM),
                               parser.messageTypeM,
                               long(parser.rpcIdCountM + parser.requestTypeCountM + parser.responseCountCountM)}),
            std::vector<long>({RpcV2Parser::StateDone, 135, 31, RpcV2Parser::MessageTypeRequest, 3}));
}

TEST(RpcV2ParserTest, FramesFromTables) {
  for (const char* table : {"rpc/first-line.txt", "rpc/frame-logs.txt"}) {
    for (const auto& row : sarntest::ReadTable(table, 2)) {
      SCOPED_TRACE(row[0]);
      ExpectLog(row[0], row[1]);
    }
  }
  // One line after two good ones: what it adds to the log, or its error.
  for (const auto& row : sarntest::ReadTable("rpc/header-lines.txt", 2)) {
    SCOPED_TRACE(row[0]);
    const std::string block = "RpcId: 1\r\nType: response\r\n" + row[0] + "\r\n\r\n";
    const bool isError = row[1].rfind("error", 0) == 0;
    ExpectLog(Frame(block, "{}"), "headerSize " + std::to_string(block.size()) +
                                      " | bodySize 2 | header [RpcId] [1] | header [Type] [response] | " + row[1] +
                                      (isError ? " | parse false | end true" : " | body {} | complete | parse true | end true"));
  }
}

TEST(RpcV2ParserTest, HeaderBlockRequirementsInOrder) {
  for (const auto& row : sarntest::ReadTable("rpc/header-block.txt", 3)) {
    SCOPED_TRACE(row[0]);
    const size_t bodyLength = std::stoul(row[1]);
    const std::string frame = Frame(row[0] + "\r\n\r\n", std::string(bodyLength, '7'));
    const std::vector<std::string> events = Feed({frame}).eventsM;
    ASSERT_GE(events.size(), 3u);
    EXPECT_EQ(events[events.size() - 3], row[2]);
    // Judged as soon as the block is complete, before any body byte is looked at.
    EXPECT_TRUE(row[2] == "complete" ||
                Feed({std::string_view(frame).substr(0, frame.size() - bodyLength)}).eventsM == events);
  }
}

// After an error, and between the header block and its judgement, nothing is reported at the end.
TEST(RpcV2ParserTest, NothingEndsTwice) {
  Recorder log;
  {
    RpcV2Parser parser(log);
    EXPECT_FALSE(parser.ParseChunk("MRPC/2 0 0\r\n", 12));
    EXPECT_FALSE(parser.ParseChunk("MRPC", 4));
    EXPECT_TRUE(parser.EndParse());
    RpcV2Parser judged(log);
    judged.stateM = RpcV2Parser::StateHeaderDone;
    EXPECT_TRUE(judged.EndParse());
  }
  EXPECT_EQ(log.Text(), "error RpcV2Parser: The declared header length is invalid");
}

}  // namespace
