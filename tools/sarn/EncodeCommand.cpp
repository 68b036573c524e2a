// sarn encode: one MRPC/2 frame from a JSON body and the header options.
#include <cstring>

#include "Cli.h"
#include "Objects.h"

namespace sarncli {
namespace {

const char kHelp[] =
    "Usage: sarn encode request|request-update|response|cancel --rpc-id N\n"
    "                   [--response-count none|single|multiple] [--final] [--schema-version V]\n"
    "                   [--header KEY=VALUE]... [--raw] [--pretty] [-o FILE] [BODY|-]\n"
    "Writes one MRPC/2 frame. The JSON body (a file, or standard input when BODY is \"-\" or\n"
    "missing; a cancel has none) is converted to its object at the schema version and the\n"
    "message is built from the object, so a request's type is the body's own.\n"
    "\n"
    "  --rpc-id N               the RpcId (0 to 4294967295)\n"
    "  --response-count C       what a request expects: none, single (default) or multiple\n"
    "  --final                  a response is the last one to its request\n"
    "  --schema-version V       the body's schema version (default 42); on a response an\n"
    "                           explicit version is also sent as the header SchemaVersion\n"
    "  --header KEY=VALUE       one more optional header (repeatable); a message's own keys\n"
    "                           are refused\n"
    "  --raw                    send the body text as given, checked only as JSON\n"
    "  --pretty                 write the body as pretty JSON\n"
    "  -o FILE                  write to FILE instead of standard output\n";

int Main(Context& context) {
  context.Valued("--rpc-id");
  context.Valued("--response-count");
  context.Valued("--schema-version");
  context.Valued("--header");
  context.Flag("--final");
  context.Flag("--raw");
  context.Flag("--pretty");
  if (!context.Parse() || context.isHelpM) return context.GetStatus();
  if (context.positionalM.empty()) return context.UsageError("give the kind: request, request-update, response or cancel");
  std::string kind = context.positionalM[0];
  if (kind != "request" && kind != "request-update" && kind != "response" && kind != "cancel") {
    return context.UsageError("unknown kind '" + kind + "' (request, request-update, response or cancel)");
  }
  std::string count;
  long long rpcId, version;
  if (!context.Has("--rpc-id")) return context.UsageError("--rpc-id is required");
  if (!context.Number("--rpc-id", 0, 4294967295LL, 0, rpcId) ||
      !context.Number("--schema-version", 0, sarn::Schema::lastSchemaVersionG, 42, version) ||
      !context.Choice("--response-count", {"single", "none", "multiple"}, count)) {
    return context.GetStatus();
  }
  bool isCancel = kind == "cancel";
  if (context.positionalM.size() > (isCancel ? 1u : 2u)) {
    return context.UsageError(isCancel ? "a cancel has no body" : "give one body");
  }
  std::vector<std::pair<std::string, std::string>> headers;
  for (const std::string& header : context.Values("--header")) {
    size_t equals = header.find('=');
    if (equals == std::string::npos) return context.UsageError("--header takes KEY=VALUE, not '" + header + "'");
    if (isCancel) return context.UsageError("a cancel carries no optional headers");
    headers.emplace_back(header.substr(0, equals), header.substr(equals + 1));
  }

  VekMempool* pool = &context.poolM;
  ref<sarn::KernoRpcWrapper> message;
  if (isCancel) {
    message = sarn::CancelWrapper::New(pool, static_cast<unsigned>(rpcId), ref<sarn::Dict>());
  } else {
    std::string input = context.positionalM.size() > 1 ? context.positionalM[1] : "-", text;
    if (!context.ReadInput(input, text)) return context.GetStatus();
    ref<sarn::Dictionary> dictionary = ReadJson(context, input, text);
    if (!dictionary) return context.GetStatus();
    int v = static_cast<int>(version);
    auto id = static_cast<unsigned>(rpcId);
    auto responseCount = count == "none"     ? sarn::RequestWrapper::ResponseCountNone
                         : count == "single" ? sarn::RequestWrapper::ResponseCountSingle
                                             : sarn::RequestWrapper::ResponseCountMultiple;
    if (context.Has("--raw")) {
      ref<sarn::LazyDict> body = sarn::LazyDict::New(
          pool, sarn::LazyDict::REP_JSON, ref<sarn::Dict>(), vek::ByteBuffer::New(pool, text.data(), text.size()),
          ref<sarn::SarnObject>(), nullptr, v);
      VekString type = dictionary->GetString(VekString::FromUtf8Bytes(pool, 4, "type"));
      if (kind == "request") {
        message = sarn::RequestWrapper::New(pool, id, type, responseCount, v, body, ref<sarn::Dict>());
      } else if (kind == "request-update") {
        message = sarn::RequestUpdateWrapper::New(pool, id, type, body, ref<sarn::Dict>());
      } else {
        message = sarn::ResponseWrapper::New(pool, id, context.Has("--final"), body, ref<sarn::Dict>());
      }
    } else {
      ref<sarn::SarnObject> object;
      if (!DictionaryToObject(context, input, dictionary, nullptr, v, object)) return context.GetStatus();
      if (kind == "request") {
        message = sarn::RequestWrapper::New(pool, id, responseCount, v, object, ref<sarn::Dict>());
      } else if (kind == "request-update") {
        message = sarn::RequestUpdateWrapper::New(pool, id, object, ref<sarn::Dict>());
      } else {
        message = sarn::ResponseWrapper::New(pool, id, context.Has("--final"), object, v, ref<sarn::Dict>());
      }
    }
    if (kind == "response" && context.Has("--schema-version")) {
      headers.emplace(headers.begin(), sarn::RpcV2Parser::HeaderKeys::SchemaVersion, std::to_string(v));
    }
    for (const auto& header : headers) {
      VekString key = VekString::FromUtf8Bytes(pool, header.first.size(), header.first.data());
      VekString value = VekString::FromUtf8Bytes(pool, header.second.size(), header.second.data());
      bool isAdded = kind == "response"
                         ? static_cast<sarn::ResponseWrapper*>(message.Get())->AddOptionalHeader(key, value)
                         : static_cast<sarn::RequestWrapper*>(message.Get())->AddOptionalHeader(key, value);
      if (!isAdded) return context.UsageError("--header: '" + header.first + "' is one of the message's own headers");
    }
  }
  sarn::ByteBuffer frame(pool);
  VekString error;
  if (!sarn::KernoRpcV2::MarshalToString(message, frame, error, pool, context.Has("--pretty"))) {
    context.Report(context.positionalM.size() > 1 ? context.positionalM[1] : "-", error.Utf8(), STATUS_INVALID);
    return context.GetStatus();
  }
  if (!context.OpenOutput()) return context.GetStatus();
  context.Write(reinterpret_cast<const char*>(frame.GetData()), frame.GetLength());
  return context.GetStatus();
}

}  // namespace

const Command kEncodeCommand = {"encode", "write one MRPC/2 frame from a JSON body", kHelp, Main};

}  // namespace sarncli
