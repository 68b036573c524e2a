// The frame parser: every case is fed whole, byte by byte and split at every position, and must
// give the same event log each time (body pieces joined) and the same verdict.
#include "sarn/Sarn.h"
#include "testutil/EventLog.h"
#include "testutil/TestUtil.h"

#include <map>
#include <memory>

namespace {

using sarn::RpcV2Parser;
using sarntest::EventLog;

class Recorder : public RpcV2Parser::Callbacks {
 public:
  explicit Recorder(EventLog& log) : logM(log) {}
  void OnError(const char* message) override { logM.Add(std::string("error ") + message); }
  void OnHeaderSize(size_t length) override { logM.Add("headerSize " + std::to_string(length)); }
  void OnBodySize(size_t length) override { logM.Add("bodySize " + std::to_string(length)); }
  void OnHeaderPair(const char* key, const char* value) override {
    logM.Add(std::string("header [") + key + "] [" + value + "]");
  }
  void OnBodyChunk(const char* data, size_t length) override {
    lastBodyChunkM = data;
    logM.AddPiece("body", std::string_view(data, length));
  }
  void OnParsingComplete() override { logM.Add("complete"); }
  const char* lastBodyChunkM = nullptr;

 private:
  EventLog& logM;
};

// Feeds the chunks as a reader does (stopping at the first refusal), then ends the input; the
// log closes with the verdicts of ParseChunk and EndParse.
// Destroying the parser ends the input once more, so a frame cut short repeats its error.
EventLog Feed(const std::vector<std::string_view>& chunks) {
  EventLog log;
  {
    Recorder recorder(log);
    RpcV2Parser parser(recorder);
    bool isOk = true;
    for (std::string_view chunk : chunks) {
      if (!(isOk = parser.ParseChunk(chunk.data(), chunk.size()))) break;
    }
    log.Add(std::string("parse ") + (isOk ? "true" : "false"));
    log.Add(std::string("end ") + (parser.EndParse() ? "true" : "false"));
  }
  return log;
}

std::string Joined(const std::vector<std::string>& lines) {
  std::string text;
  for (const std::string& line : lines) text += line + "\n";
  return text;
}

// The log of `input` under every feeding must be `expected`.
void ExpectLog(std::string_view input, const std::vector<std::string>& expected) {
  sarntest::ForEachSplit(input, [&](const std::vector<std::string_view>& chunks, const std::string& label) {
    EventLog log = Feed(chunks);
    ASSERT_EQ(log.ToString(), Joined(expected)) << label;
    ASSERT_EQ(log.EmptyPieceCount(), 0u) << label;
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
    "MRPC/2 135 31\r\n"
    "Content-Type: application/json\r\n"
    "RequestType: kernoCurrentTimeGet\r\n"
    "ResponseCount: single\r\n"
    "RpcId: 7\r\n"
    "SchemaVersion: 42\r\n"
    "Type: request\r\n"
    "\r\n" +
    kBody;
const std::vector<std::string> kExampleLog = {
    "headerSize 135",
    "bodySize 31",
    "header [Content-Type] [application/json]",
    "header [RequestType] [kernoCurrentTimeGet]",
    "header [ResponseCount] [single]",
    "header [RpcId] [7]",
    "header [SchemaVersion] [42]",
    "header [Type] [request]",
    "body " + kBody,
    "complete",
    "parse true",
    "end true",
};

const char kInvalidFirstLine[] = "error RpcV2Parser: The first line of the message is invalid";
const char kInvalidHeaderSize[] = "error RpcV2Parser: The declared header length is invalid";
const char kFirstLineSize[] = "error RpcV2Parser: The length of the first line exceeds the 25 characters limit";

TEST(RpcV2ParserTest, WorkedExampleGivesTheSameCallbacksHoweverSplit) {
  ASSERT_EQ(kExample.size(), 15u + 135u + 31u);
  ExpectLog(kExample, kExampleLog);

  // Only the body pieces differ; they point into the caller's chunk, never into a copy.
  EXPECT_EQ(Feed({kExample}).PieceCount(), 1u);
  EXPECT_EQ(Feed(sarntest::FixedChunks(kExample, 1)).PieceCount(), 31u);
  EXPECT_EQ(Feed({std::string_view(kExample).substr(0, 160), std::string_view(kExample).substr(160)}).PieceCount(), 2u);
  EventLog log;
  Recorder recorder(log);
  RpcV2Parser parser(recorder);
  EXPECT_TRUE(parser.ParseChunk(kExample.data(), kExample.size()));
  EXPECT_EQ(recorder.lastBodyChunkM, kExample.data() + 150);
  EXPECT_EQ(parser.stateM, RpcV2Parser::StateDone);
  EXPECT_EQ(parser.headerBytesReadM, 135u);
  EXPECT_EQ(parser.bodyBytesReadM, 31u);
  EXPECT_EQ(parser.messageTypeM, RpcV2Parser::MessageTypeRequest);
  EXPECT_EQ(parser.rpcIdCountM + parser.requestTypeCountM + parser.responseCountCountM, 3u);
}

TEST(RpcV2ParserTest, FirstLine) {
  const std::string kEndOfFirstLine = "error RpcV2Parser: Unexpected end of first line";
  const std::string kBodyLength = "error RpcV2Parser: The declared body length is invalid";
  const std::string tail = "\r\nType: cancel\r\nRpcId: 1\r\n\r\n";  // 26 header bytes
  using Log = std::vector<std::string>;
  auto refused = [](std::string error) { return Log{error, "parse false", "end true"}; };
  const Log cancel = {"headerSize 26", "bodySize 0", "header [Type] [cancel]", "header [RpcId] [1]", "parse true",
                      "end true"};
  const std::vector<std::pair<std::string, Log>> cases = {
      {"MRPC/2 0 5\r\n", refused(kInvalidHeaderSize)},
      {"MRPC/2 -27 0\r\n", refused(kInvalidHeaderSize)},
      {"MRPC/2 1048577 0\r\n", refused(kInvalidHeaderSize)},
      {"MRPC/2 10 5242881\r\n", {"headerSize 10", kBodyLength, "parse false", "end true"}},
      {"MRPC/2 10 -1\r\n", {"headerSize 10", kBodyLength, "parse false", "end true"}},
      {"MRPC/2 1048576 5242880\r\n",
       {"headerSize 1048576", "bodySize 5242880", "parse true", "error RpcV2Parser: Unexpected end of header",
        "end false", "error RpcV2Parser: Unexpected end of header"}},
      // The blanks match any run of white space, none included; numbers may carry a sign.
      {"MRPC/226\t-0" + tail, cancel},
      {"MRPC/2 +26 0" + tail, cancel},
      // Exactly 25 bytes with CR LF is the longest first line.
      {"MRPC/2 0000000000026 000" + tail, refused(kFirstLineSize)},
      {"MRPC/2 000000000026 000" + tail, cancel},
      {"MRPC/2 10 20x\r\n", refused(kInvalidFirstLine)},
      {"MRPC/2 10 20 30\r\n", refused(kInvalidFirstLine)},
      {"MRPC/2 10 20 \r\n", refused(kInvalidFirstLine)},
      {"MRPC/2 10\r\n", refused(kInvalidFirstLine)},
      {"MRPC/2 + 10 20\r\n", refused(kInvalidFirstLine)},
      {"MRPC/1 10 20\r\n", refused(kInvalidFirstLine)},
      {std::string("MRPC/2 10\0 20\r\n", 15), refused(kInvalidFirstLine)},
      // A lone LF does not end the line; 25 bytes without CR LF are refused at once.
      {"MRPC/2 10 20\nabcdefghijkl", refused(kFirstLineSize)},
      {"MRPC/2 1 2 xxxxxxxxxxxxxx\r\n", refused(kFirstLineSize)},
      {"MRPC/2 1 2 xxxxxxxxxxxx", {"parse true", kEndOfFirstLine, "end false", kEndOfFirstLine}},
      {"", {"parse true", kEndOfFirstLine, "end false", kEndOfFirstLine}},
  };
  for (const auto& [input, log] : cases) {
    SCOPED_TRACE(input);
    ExpectLog(input, log);
  }
}

TEST(RpcV2ParserTest, HeaderLinesAreTrimmedAndChecked) {
  const std::vector<std::string> ok = {"parse true", "end true"};
  struct Case {
    std::string line;
    std::vector<std::string> log;  // what the line adds, or its error
  };
  const char* kRpcId = "error RpcV2Parser: Invalid RpcId value";
  const char* kContentType = "error RpcV2Parser: Invalid Content-Type value";
  const char* kCount = "error RpcV2Parser: Invalid ResponseCount value";
  const char* kType = "error RpcV2Parser: Invalid Type value";
  const std::vector<Case> cases = {
      {" \tX-Key \t:  a: b \t", {"header [X-Key] [a: b]"}},
      {"X-Key:a\nb", {"header [X-Key] [a\nb]"}},
      {"rpcid: x", {"header [rpcid] [x]"}},
      {": v", {"header [] [v]"}},
      {std::string("X-Key: a\0b", 10), {"header [X-Key] [a]"}},
      // Empty and all-white-space values are the empty string for every key.
      {"X-Key:", {"header [X-Key] []"}},
      {"RequestType: \t ", {"header [RequestType] []"}},
      {"RpcId:", {"header [RpcId] []"}},
      {"RpcId:  ", {"header [RpcId] []"}},
      {"RpcId: 0042", {"header [RpcId] [0042]"}},
      {"RpcId: 12a", {kRpcId}},
      {"RpcId: -1", {kRpcId}},
      {"Content-Type: application/json", {"header [Content-Type] [application/json]"}},
      {"Content-Type: application/json; charset=utf-8", {kContentType}},
      {"Content-Type: Application/json", {kContentType}},
      {"Content-Type:  ", {kContentType}},
      {"ResponseCount: none", {"header [ResponseCount] [none]"}},
      {"ResponseCount: multiple", {"header [ResponseCount] [multiple]"}},
      {"ResponseCount: Single", {kCount}},
      {"ResponseCount:", {kCount}},
      {"Type: Request", {kType}},
      {"Type: ", {kType}},
      {"abc", {"error RpcV2Parser: Invalid header line"}},
      {std::string("ab\0:c", 5), {"error RpcV2Parser: Invalid header line"}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.line);
    std::vector<std::string> log = {"headerSize 0", "bodySize 2", "header [RpcId] [1]", "header [Type] [response]"};
    const std::string block = Block({"RpcId: 1", "Type: response", c.line});
    log[0] = "headerSize " + std::to_string(block.size());
    log.insert(log.end(), c.log.begin(), c.log.end());
    const bool isError = c.log.back().rfind("error", 0) == 0;
    if (!isError) log.insert(log.end(), {"body {}", "complete"});
    log.insert(log.end(), {isError ? "parse false" : "parse true", "end true"});
    ExpectLog(Frame(block, "{}"), log);
  }
}

TEST(RpcV2ParserTest, HeaderBlockBoundaries) {
  // The last line may lack CR LF: it ends where the declared block ends, the rest is body.
  ExpectLog(Frame("RpcId: 1\r\n\r\nType: cancel", ""),
            {"headerSize 24", "bodySize 0", "header [RpcId] [1]", "header [Type] [cancel]", "parse true", "end true"});
  ExpectLog("MRPC/2 24 2\r\nRpcId: 1\r\nType: response{}",
            {"headerSize 24", "bodySize 2", "header [RpcId] [1]", "header [Type] [response]", "body {}", "complete",
             "parse true", "end true"});
  // A last line of two bytes is skipped like the empty line; a repeated Type overrides.
  ExpectLog(Frame("Type: cancel\r\nRpcId: 1\r\nRpcId: 2\r\nType: response\r\nab", "{}"),
            {"headerSize 52", "bodySize 2", "header [Type] [cancel]", "header [RpcId] [1]", "header [RpcId] [2]",
             "header [Type] [response]", "body {}", "complete", "parse true", "end true"});

  // A line of 1,024 bytes with its CR LF is accepted; one more byte is out of memory, also when
  // the extra byte is the LF of a CR LF.
  const std::string head = "RpcId: 1\r\nType: response\r\n";
  const std::string v1014(1014, 'v');  // "X-Long: " + 1014 bytes + CR LF is 1,024 bytes
  ExpectLog(Frame(head + "X-Long: " + v1014 + "\r\n\r\n", "{}"),
            {"headerSize 1052", "bodySize 2", "header [RpcId] [1]", "header [Type] [response]",
             "header [X-Long] [" + v1014 + "]", "body {}", "complete", "parse true", "end true"});
  const std::vector<std::string> outOfMemory = {"headerSize 1053", "bodySize 2", "header [RpcId] [1]",
                                                "header [Type] [response]",
                                                "error RpcV2Parser: Out of memory (header line too long)",
                                                "parse false", "end true"};
  ExpectLog(Frame(head + "X-Long: " + v1014 + "v\r\n\r\n", "{}"), outOfMemory);
  // 1,024 bytes without CR LF are fine when they close the block.
  ExpectLog(Frame(head + "X-Long: " + v1014 + "vv", "{}"),
            {"headerSize 1050", "bodySize 2", "header [RpcId] [1]", "header [Type] [response]",
             "header [X-Long] [" + v1014 + "vv]", "body {}", "complete", "parse true", "end true"});
}

TEST(RpcV2ParserTest, HeaderBlockRequirementsInOrder) {
  struct Case {
    std::string block;
    size_t bodyLength;
    const char* error;  // nullptr: accepted
  };
  const std::vector<Case> cases = {
      {Block({"Type: request"}), 2, "MissingRpcId"},
      {Block({"X: y"}), 0, "MissingRpcId"},
      {Block({"RpcId: 1"}), 2, "MissingType"},
      {Block({"RpcId: 1", "Type: cancel"}), 3, "UnexpectedBody"},
      {Block({"RpcId: 1", "Type: response"}), 0, "MissingBody"},
      {Block({"RpcId: 1", "Type: request"}), 0, "MissingBody"},
      {Block({"RpcId: 1", "Type: request"}), 2, "MissingResponseCount"},
      {Block({"RpcId: 1", "Type: request", "ResponseCount: none"}), 2, "MissingRequestType"},
      {Block({"RpcId: 1", "Type: requestUpdate", "ResponseCount: none"}), 2, "MissingRequestType"},
      {Block({"RpcId: 1", "Type: requestUpdate", "RequestType:"}), 2, nullptr},
      {Block({"RpcId: 1", "Type: request", "RequestType: x", "ResponseCount: none"}), 2, nullptr},
  };
  const std::map<std::string, std::string> texts = {
      {"MissingRpcId", "RpcV2Parser: Missing RpcId value"},
      {"MissingType", "RpcV2Parser: Missing Type value"},
      {"UnexpectedBody", "RpcV2Parser: 'cancel' should not have a body"},
      {"MissingBody", "RpcV2Parser: The declared body length is zero for non-cancel message type"},
      {"MissingResponseCount", "RpcV2Parser: Missing ResponseCount value"},
      {"MissingRequestType", "RpcV2Parser: Missing RequestType value"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.block);
    const std::string frame = Frame(c.block, std::string(c.bodyLength, '7'));
    EventLog log = Feed({frame});
    const std::vector<std::string>& events = log.Events();
    if (c.error != nullptr) {
      // Judged as soon as the block is complete, before any body byte is looked at.
      ASSERT_GE(events.size(), 3u);
      EXPECT_EQ(events[events.size() - 3], "error " + texts.at(c.error));
      EXPECT_EQ(Feed({std::string_view(frame).substr(0, frame.size() - c.bodyLength)}).Events(), events);
    } else {
      EXPECT_EQ(events[events.size() - 3], "complete");
    }
  }
}

TEST(RpcV2ParserTest, DataAfterTheFrame) {
  const std::vector<std::string> expected = [] {
    std::vector<std::string> log(kExampleLog.begin(), kExampleLog.end() - 2);
    log.insert(log.end(), {"error RpcV2Parser: Unexpected data after the end of the RPC packet", "parse false",
                           "end true"});
    return log;
  }();
  ExpectLog(kExample + "x", expected);

  // Done is kept: every further chunk is refused with the same message, an empty one is not.
  EventLog log;
  Recorder recorder(log);
  RpcV2Parser parser(recorder);
  ASSERT_TRUE(parser.ParseChunk(kExample.data(), kExample.size()));
  log.Clear();
  EXPECT_FALSE(parser.ParseChunk("x", 1));
  EXPECT_FALSE(parser.ParseChunk("y", 1));
  EXPECT_TRUE(parser.ParseChunk(nullptr, 0));
  EXPECT_EQ(parser.stateM, RpcV2Parser::StateDone);
  const std::string unexpectedData = "error RpcV2Parser: Unexpected data after the end of the RPC packet";
  EXPECT_EQ(log.Events(), std::vector<std::string>({unexpectedData, unexpectedData}));
}

TEST(RpcV2ParserTest, EndParseAndDestructorInEveryState) {
  struct Case {
    size_t prefix;  // bytes of the worked example fed first
    RpcV2Parser::State state;
    const char* error;  // what EndParse reports, nullptr for nothing
  };
  const std::vector<Case> cases = {
      {0, RpcV2Parser::StateFirstLine, "RpcV2Parser: Unexpected end of first line"},
      {14, RpcV2Parser::StateFirstLine, "RpcV2Parser: Unexpected end of first line"},
      {15, RpcV2Parser::StateHeader, "RpcV2Parser: Unexpected end of header"},
      {149, RpcV2Parser::StateHeader, "RpcV2Parser: Unexpected end of header"},
      {150, RpcV2Parser::StateBody, "RpcV2Parser: Unexpected end of body"},
      {180, RpcV2Parser::StateBody, "RpcV2Parser: Unexpected end of body"},
      {181, RpcV2Parser::StateDone, nullptr},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.prefix);
    EventLog log;
    Recorder recorder(log);
    auto parser = std::make_unique<RpcV2Parser>(recorder);
    ASSERT_TRUE(parser->ParseChunk(kExample.data(), c.prefix));
    ASSERT_EQ(parser->stateM, c.state);
    const size_t before = log.Events().size();
    EXPECT_EQ(parser->EndParse(), c.error == nullptr);
    parser.reset();  // ends the input once more
    const std::vector<std::string> added(log.Events().begin() + before, log.Events().end());
    if (c.error == nullptr) {
      EXPECT_TRUE(added.empty());
    } else {
      EXPECT_EQ(added, std::vector<std::string>(2, std::string("error ") + c.error));
    }
  }

  // After an error, and between the header block and its judgement, nothing is reported.
  EventLog log;
  Recorder recorder(log);
  {
    RpcV2Parser parser(recorder);
    EXPECT_FALSE(parser.ParseChunk("MRPC/2 0 0\r\n", 12));
    EXPECT_FALSE(parser.ParseChunk("MRPC", 4));
    EXPECT_TRUE(parser.EndParse());
    RpcV2Parser judged(recorder);
    judged.stateM = RpcV2Parser::StateHeaderDone;
    EXPECT_TRUE(judged.EndParse());
  }
  EXPECT_EQ(log.ToString(), std::string(kInvalidHeaderSize) + "\n");
}

TEST(RpcV2ParserTest, LargeBodyStreamsThroughWithoutCopies) {
  const std::string body(RpcV2Parser::BODY_LENGTH_LIMIT, 'b');
  const std::string frame = Frame(Block({"RpcId: 1", "Type: response"}), body);
  EventLog log;
  Recorder recorder(log);
  RpcV2Parser parser(recorder);
  size_t chunks = 0;
  for (std::string_view chunk : sarntest::FixedChunks(frame, 512)) {
    ASSERT_TRUE(parser.ParseChunk(chunk.data(), chunk.size()));
    if (parser.bodyBytesReadM > 0) {
      ASSERT_GE(recorder.lastBodyChunkM, chunk.data());
      ASSERT_LT(recorder.lastBodyChunkM, chunk.data() + chunk.size());
    }
    ++chunks;
  }
  EXPECT_EQ(parser.bodyBytesReadM, body.size());
  EXPECT_EQ(parser.stateM, RpcV2Parser::StateDone);
  EXPECT_EQ(log.Events()[log.Events().size() - 2], "body " + body);
  EXPECT_EQ(log.PieceCount(), chunks);  // the first chunk holds the head and the body's start
}

}  // namespace
