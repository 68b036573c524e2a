// sarn decode: a capture of MRPC/2 frames, one message after the other, as pretty JSON. The
// packetizer delimits each frame and the byte-source reader reads it, each frame in a pool of its
// own, so that memory follows the largest frame and not the capture.
#include <fcntl.h>
#include <sys/resource.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstring>

#include "Cli.h"
#include "Objects.h"

namespace sarncli {
namespace {

const char kHelp[] =
    "Usage: sarn decode [--laziness unparsed|validated|parsed] [--untyped] [--schema-version V]\n"
    "                   [--compact] [--stats] [-o FILE] [FILE|-]\n"
    "Reads a stream of MRPC/2 frames and prints each message as JSON: its headers, then \"body\"\n"
    "converted to its type at the message's schema version and written from the object.\n"
    "\n"
    "  --laziness L        how the reader keeps a body while the frame passes: unparsed,\n"
    "                      validated (default: a malformed body refuses its frame) or parsed\n"
    "  --untyped           print bodies as received, without converting them\n"
    "  --schema-version V  the version for messages that carry none (0: every field)\n"
    "  --compact           one line per message instead of pretty JSON\n"
    "  --stats             report frames, bytes, seconds and peak resident memory at the end\n"
    "  -o FILE             write to FILE instead of standard output\n"
    "\n"
    "A refused frame is reported with the offset of its first byte and decoding goes on after\n"
    "it; a first line that can never become valid ends the input. Body names that are no field\n"
    "of their type at the version are reported as warnings; a body that does not convert is\n"
    "printed as received, with the converter's message. Status 1 when a frame or body was\n"
    "refused.\n";

// The bytes of one input, read in blocks as the frames need them.
class InputStream {
 public:
  explicit InputStream(int fd) : fdM(fd), isEndM(false) {}
  // Reads one more block onto the end of `pending`; false at the end of the input.
  bool ReadMore(std::string& pending, std::string& error) {
    if (isEndM) return false;
    char block[65536];
    for (;;) {
      ssize_t n = read(fdM, block, sizeof block);
      if (n < 0 && errno == EINTR) continue;
      if (n < 0) error = std::strerror(errno);
      if (n <= 0) return isEndM = true, false;
      pending.append(block, static_cast<size_t>(n));
      return true;
    }
  }

 private:
  int fdM;
  bool isEndM;
};

struct Settings {
  sarn::KernoRpcV2BytestreamImpl::LazinessSettings laziness;
  bool isUntyped;
  bool isCompact;
  sarn::KernoVersion fallbackVersion;
};

// The body of a request or response wrapper; null for a cancel.
ref<sarn::LazyDict> BodyOf(sarn::KernoRpcWrapper* message) {
  if (auto* request = dynamic_cast<sarn::RequestWrapper*>(message)) return request->bodyM;
  if (auto* response = dynamic_cast<sarn::ResponseWrapper*>(message)) return response->bodyM;
  return ref<sarn::LazyDict>();
}

// Prints one message; false when its body did not convert.
bool PrintMessage(Context& context, VekMempool* pool, const std::string& label, sarn::KernoRpcWrapper* message,
                  const Settings& settings) {
  ref<sarn::Dict> dict = message->HeadersToDict(pool);
  ref<sarn::LazyDict> body = BodyOf(message);
  bool isConverted = true;
  if (body) {
    ref<sarn::Dict> bodyDict;
    if (!settings.isUntyped) {
      if (body->versionM == 0) body->versionM = settings.fallbackVersion;
      sarn::KernoVersion version = body->versionM;
      VekString error;
      ref<sarn::SarnObject> object = body->ToSarnObjectOrErrorString(error);
      if (!object) {
        context.Report(label, error.Utf8(), STATUS_INVALID);
        isConverted = false;
      } else {
        VekString readError;
        ref<sarn::Dictionary> received = body->ToDictionary(readError);
        if (received) ReportUnknownNames(context, label, received, version, "warning: ", STATUS_OK);
        sarn::DictionarySarnObject converter(pool, sarn::Schema::vStructDefG, sarn::Schema::nStructDefG);
        ref<sarn::Dictionary> typed = converter.SarnObjectToDictionary(object.Get(), version);
        if (typed) bodyDict = MempoolNew<sarn::Dict>(pool, typed);
      }
    }
    if (!bodyDict) bodyDict = message->BodyToDict();
    if (bodyDict) dict->AddDict("body", bodyDict);
  }
  VekString text = dict->ToString(!settings.isCompact);
  context.Write(text.Utf8(), text.NByte());
  context.Write("\n", 1);
  return isConverted;
}

int Main(Context& context) {
  context.Valued("--laziness");
  context.Valued("--schema-version");
  context.Flag("--untyped");
  context.Flag("--compact");
  context.Flag("--stats");
  if (!context.Parse() || context.isHelpM) return context.GetStatus();
  std::string laziness;
  long long version;
  if (!context.Choice("--laziness", {"validated", "unparsed", "parsed"}, laziness) ||
      !context.Number("--schema-version", 0, sarn::Schema::lastSchemaVersionG, 0, version)) {
    return context.GetStatus();
  }
  if (context.positionalM.size() > 1) return context.UsageError("give one input");
  Settings settings = {laziness == "unparsed"  ? sarn::KernoRpcV2BytestreamImpl::LazyUnparsed
                       : laziness == "parsed" ? sarn::KernoRpcV2BytestreamImpl::ParsedToDictionary
                                              : sarn::KernoRpcV2BytestreamImpl::LazyValidated,
                       context.Has("--untyped"), context.Has("--compact"), static_cast<int>(version)};
  std::string input = context.positionalM.empty() ? "-" : context.positionalM[0];
  int fd = input == "-" ? 0 : open(input.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) return context.Report(input, std::strerror(errno), STATUS_USAGE), STATUS_USAGE;
  if (!context.OpenOutput()) return context.GetStatus();

  auto start = std::chrono::steady_clock::now();
  InputStream stream(fd);
  std::string pending, readError;
  size_t offset = 0, frames = 0;
  for (bool isMore = true; isMore;) {
    if (pending.empty() && !stream.ReadMore(pending, readError)) break;
    // Each frame in a pool of its own, empty again before the next.
    VekMempool pool("frame");
    sarn::KernoRpcV2Packetizer packetizer(&pool);
    // The first line is judged on at most its 25 bytes and a little more, never on a copy of
    // everything buffered.
    while (!packetizer.decidedM) {
      size_t look = pending.size() < 64 ? pending.size() : 64;
      packetizer.UpdateInput(VekString::FromUtf8Bytes(&pool, look, pending.data()));
      if (!packetizer.decidedM && !stream.ReadMore(pending, readError)) break;
    }
    std::string label = input + ": frame " + std::to_string(frames + 1) + " at byte " + std::to_string(offset);
    if (packetizer.decidedM && !packetizer.errorStringM.FEmpty()) {
      context.Report(label, packetizer.errorStringM.Utf8(), STATUS_INVALID);
      break;  // the first line can never become valid: nothing after it can be delimited
    }
    size_t length = packetizer.decidedM ? packetizer.packetLengthM : pending.size();
    while (pending.size() < length && stream.ReadMore(pending, readError)) {
    }
    if (pending.size() < length) length = pending.size(), isMore = false;
    ++frames;
    {
      wynbaselib::InMemoryBytestream source(pending.data(), length);
      VekString error;
      ref<sarn::KernoRpcWrapper> message =
          sarn::KernoRpcV2BytestreamImpl::UnmarshalFromBytesource(&pool, source, settings.laziness, error);
      if (!message) {
        context.Report(label, error.Utf8(), STATUS_INVALID);
      } else {
        PrintMessage(context, &pool, label, message.Get(), settings);
      }
    }
    pending.erase(0, length);
    offset += length;
  }
  if (!readError.empty()) context.Report(input, readError, STATUS_USAGE);
  if (fd != 0) close(fd);
  if (context.Has("--stats")) {
    double seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
    struct rusage usage;
    getrusage(RUSAGE_SELF, &usage);
    std::fprintf(stderr, "sarn: decode: %s: %zu frames, %zu bytes, %.3f s, peak resident %ld KiB\n", input.c_str(),
                 frames, offset, seconds, usage.ru_maxrss);
  }
  return context.GetStatus();
}

}  // namespace

const Command kDecodeCommand = {"decode", "print a stream of MRPC/2 frames as JSON messages", kHelp, Main};

}  // namespace sarncli
