// The frame parser: every case is fed whole, byte by byte and split at every position, and must
// give the same event log each time (body pieces joined) and the same verdict. Logs are written
// as their events joined by " | ".
#include "sarn/Sarn.h"
#include "testutil/TestUtil.h"

#include <memory>

namespace {

using sarn::RpcV2Parser;

// What the parser reported, one line per event. Body pieces are joined into one line; their
// number is kept apart, as that is the one thing chunking changes.
struct Recorder : RpcV2Parser::Callbacks {
  void OnError(const char* message) override { Add(std::string("error ") + message); }
  void OnHeaderSize(size_t length) override { Add("headerSize " + std::to_string(length)); }
  void OnBodySize(size_t length) override { Add("bodySize " + std::to_string(length)); }
  void OnHeaderPair(const char* key, const char* value) override { Add(std::string("header [") + key + "] [" + value + "]"); }
  void OnParsingComplete() override { Add("complete"); }
  void OnBodyChunk(const char* data, size_t length) override {
    lastBodyChunkM = data;
    ++piecesM;
    emptyPiecesM += length == 0;
    if (isInBodyM) {
      eventsM.back().append(data, length);
    } else {
      Add("body " + std::string(data, length));
      isInBodyM = true;
    }
  }
  void Add(std::string event) {
    eventsM.push_back(std::move(event));
    isInBodyM = false;
  }
  std::string Text(size_t from = 0) const {
    std::string text;
    for (size_t i = from; i < eventsM.size(); ++i) text += (i > from ? " | " : "") + eventsM[i];
    return text;
  }
  std::vector<std::string> eventsM;
  size_t piecesM = 0, emptyPiecesM = 0;
  bool isInBodyM = false;
  const char* lastBodyChunkM = nullptr;
};

// Feeds the chunks as a reader does (stopping at the first refusal), then ends the input; the
// log closes with the verdicts of ParseChunk and EndParse.
// Destroying the parser ends the input once more, so a frame cut short repeats its error.
Recorder Feed(const std::vector<std::string_view>& chunks) {
  Recorder log;
  {
    RpcV2Parser parser(log);
    bool isOk = true;
    for (std::string_view chunk : chunks) {
      if (!(isOk = parser.ParseChunk(chunk.data(), chunk.size()))) break;
    }
    log.Add(std::string("parse ") + (isOk ? "true" : "false"));
    log.Add(std::string("end ") + (parser.EndParse() ? "true" : "false"));
  }
  return log;
}

// The log of `input` under every feeding must be `expected`.
void ExpectLog(std::string_view input, const std::string& expected) {
  sarntest::ForEachSplit(input, [&](const std::vector<std::string_view>& chunks, const std::string& label) {
    Recorder log = Feed(chunks);
    ASSERT_EQ(log.Text(), expected) << label;
    ASSERT_EQ(log.emptyPiecesM, 0u) << label;
  });
}

std::string Frame(const std::string& block, const std::string& body) {
  return "MRPC/2 " + std::to_string(block.size()) + " " + std::to_string(body.size()) + "\r\n" + block + body;
}

// A header block: each line with CR LF, then the empty line.
std::string Block(std::initializer_list<std::string> lines) {
  std::string block;
  for (const std::string& line : lines) block += line + "\r\n";
  return block + "\r\n";
}

const std::string kBody = "{\"type\": \"kernoCurrentTimeGet\"}";
const std::string kExample =
    "MRPC/2 135 31\r\nContent-Type: application/json\r\nRequestType: kernoCurrentTimeGet\r\n"
    "ResponseCount: single\r\nRpcId: 7\r\nSchemaVersion: 42\r\nType: request\r\n\r\n" + kBody;
const std::string kExampleEvents =
    "headerSize 135 | bodySize 31 | header [Content-Type] [application/json] | "
    "header [RequestType] [kernoCurrentTimeGet] | header [ResponseCount] [single] | header [RpcId] [7] | "
    "header [SchemaVersion] [42] | header [Type] [request] | body " + kBody;

const std::string kInvalidHeaderSize = "error RpcV2Parser: The declared header length is invalid";
const std::string kRefused = " | parse false | end true";

TEST(RpcV2ParserTest, WorkedExampleGivesTheSameCallbacksHoweverSplit) {
  ASSERT_EQ(kExample.size(), 15u + 135u + 31u);
  ExpectLog(kExample, kExampleEvents + " | complete | parse true | end true");

  // Only the body pieces differ; they point into the caller's chunk, never into a copy.
  EXPECT_EQ(Feed({kExample}).piecesM, 1u);
  EXPECT_EQ(Feed(sarntest::FixedChunks(kExample, 1)).piecesM, 31u);
  EXPECT_EQ(Feed({std::string_view(kExample).substr(0, 160), std::string_view(kExample).substr(160)}).piecesM, 2u);
  Recorder log;
  RpcV2Parser parser(log);
  EXPECT_TRUE(parser.ParseChunk(kExample.data(), kExample.size()));
  EXPECT_EQ(log.lastBodyChunkM, kExample.data() + 150);
  EXPECT_EQ(std::vector<long>({parser.stateM, long(parser.headerBytesReadM), long(parser.bodyBytesReadM),
                               parser.messageTypeM,
                               long(parser.rpcIdCountM + parser.requestTypeCountM + parser.responseCountCountM)}),
            std::vector<long>({RpcV2Parser::StateDone, 135, 31, RpcV2Parser::MessageTypeRequest, 3}));
}

TEST(RpcV2ParserTest, FirstLineAndHeaderLines) {
  for (const auto& row : sarntest::ReadTable("rpc/first-line.txt", 2)) {
    SCOPED_TRACE(row[0]);
    ExpectLog(row[0], row[1]);
  }
  // One line after two good ones: what it adds to the log, or its error.
  for (const auto& row : sarntest::ReadTable("rpc/header-lines.txt", 2)) {
    SCOPED_TRACE(row[0]);
    const std::string block = Block({"RpcId: 1", "Type: response", row[0]});
    const bool isError = row[1].rfind("error", 0) == 0;
    ExpectLog(Frame(block, "{}"), "headerSize " + std::to_string(block.size()) +
                                      " | bodySize 2 | header [RpcId] [1] | header [Type] [response] | " + row[1] +
                                      (isError ? kRefused : " | body {} | complete | parse true | end true"));
  }
}

TEST(RpcV2ParserTest, HeaderBlockBoundaries) {
  const std::string head = "RpcId: 1\r\nType: response\r\n";
  const std::string headEvents = "bodySize 2 | header [RpcId] [1] | header [Type] [response] | ";
  const std::string done = " | body {} | complete | parse true | end true";
  const std::string v1014(1014, 'v');  // "X-Long: " + 1014 bytes + CR LF is 1,024 bytes
  const std::pair<std::string, std::string> cases[] = {
      // The last line may lack CR LF: it ends where the declared block ends, the rest is body.
      {Frame("RpcId: 1\r\n\r\nType: cancel", ""),
       "headerSize 24 | bodySize 0 | header [RpcId] [1] | header [Type] [cancel] | parse true | end true"},
      {"MRPC/2 24 2\r\nRpcId: 1\r\nType: response{}",
       "headerSize 24 | bodySize 2 | header [RpcId] [1] | header [Type] [response]" + done},
      // A last line of two bytes is skipped like the empty line; a repeated Type overrides.
      {Frame("Type: cancel\r\nRpcId: 1\r\nRpcId: 2\r\nType: response\r\nab", "{}"),
       "headerSize 52 | bodySize 2 | header [Type] [cancel] | header [RpcId] [1] | header [RpcId] [2] | "
       "header [Type] [response]" + done},
      // A line of 1,024 bytes with its CR LF is accepted; one more byte is out of memory, also
      // when the extra byte is the LF of a CR LF; 1,024 bytes without CR LF close the block.
      {Frame(head + "X-Long: " + v1014 + "\r\n\r\n", "{}"),
       "headerSize 1052 | " + headEvents + "header [X-Long] [" + v1014 + "]" + done},
      {Frame(head + "X-Long: " + v1014 + "v\r\n\r\n", "{}"),
       "headerSize 1053 | " + headEvents + "error RpcV2Parser: Out of memory (header line too long)" + kRefused},
      {Frame(head + "X-Long: " + v1014 + "vv", "{}"),
       "headerSize 1050 | " + headEvents + "header [X-Long] [" + v1014 + "vv]" + done},
  };
  for (const auto& [frame, log] : cases) ExpectLog(frame, log);
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

TEST(RpcV2ParserTest, DataAfterTheFrame) {
  const std::string unexpectedData = "error RpcV2Parser: Unexpected data after the end of the RPC packet";
  ExpectLog(kExample + "x", kExampleEvents + " | complete | " + unexpectedData + kRefused);
  // Done is kept: every further chunk is refused with the same message, an empty one is not.
  Recorder log;
  RpcV2Parser parser(log);
  ASSERT_TRUE(parser.ParseChunk(kExample.data(), kExample.size()));
  const size_t before = log.eventsM.size();
  EXPECT_FALSE(parser.ParseChunk("x", 1));
  EXPECT_FALSE(parser.ParseChunk("y", 1));
  EXPECT_TRUE(parser.ParseChunk(nullptr, 0));
  EXPECT_EQ(parser.stateM, RpcV2Parser::StateDone);
  EXPECT_EQ(log.Text(before), unexpectedData + " | " + unexpectedData);
}

TEST(RpcV2ParserTest, EndParseAndDestructorInEveryState) {
  const struct {
    size_t prefix;  // bytes of the worked example fed first
    RpcV2Parser::State state;
    std::string error;  // what EndParse reports
  } cases[] = {
      {0, RpcV2Parser::StateFirstLine, "first line"}, {14, RpcV2Parser::StateFirstLine, "first line"},
      {15, RpcV2Parser::StateHeader, "header"}, {149, RpcV2Parser::StateHeader, "header"},
      {150, RpcV2Parser::StateBody, "body"}, {180, RpcV2Parser::StateBody, "body"}, {181, RpcV2Parser::StateDone, ""},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.prefix);
    Recorder log;
    auto parser = std::make_unique<RpcV2Parser>(log);
    ASSERT_TRUE(parser->ParseChunk(kExample.data(), c.prefix));
    ASSERT_EQ(parser->stateM, c.state);
    const size_t before = log.eventsM.size();
    EXPECT_EQ(parser->EndParse(), c.error.empty());
    parser.reset();  // ends the input once more
    const std::string error = "error RpcV2Parser: Unexpected end of " + c.error;
    EXPECT_EQ(log.Text(before), c.error.empty() ? "" : error + " | " + error);
  }
  // After an error, and between the header block and its judgement, nothing is reported.
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
  EXPECT_EQ(log.Text(), kInvalidHeaderSize);
}

}  // namespace
