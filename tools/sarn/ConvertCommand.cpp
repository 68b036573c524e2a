// sarn convert: one object between compact JSON, pretty JSON and the binary form.
#include <unistd.h>

#include <cstdio>
#include <cstring>

#include "Cli.h"
#include "Objects.h"

namespace sarncli {
namespace {

const char kHelp[] =
    "Usage: sarn convert [--from json|binary] [--to json|pretty|binary] [--type T] [--version V]\n"
    "                    [--bare] [-o FILE] [IN|-]\n"
    "Converts one object between its text and binary forms (standard input when IN is \"-\" or\n"
    "missing).\n"
    "\n"
    "  --from json|binary         the input's form (default json)\n"
    "  --to json|pretty|binary    compact JSON as it goes on the wire, pretty JSON, or the\n"
    "                             binary form (default pretty)\n"
    "  --type T                   the object's type: must agree with the type the input names,\n"
    "                             or supplies it to an input that names none\n"
    "  --version V                schema version of the JSON read and written (default 0: every\n"
    "                             field); the binary form carries every field\n"
    "  --bare                     the binary form without the leading type: the fields only\n"
    "                             (binary input then needs --type)\n"
    "  -o FILE                    write to FILE instead of standard output\n"
    "\n"
    "Inputs past 64 MiB are refused. What the binary reader reports about unknown field numbers\n"
    "goes to standard error.\n";

// The binary reader reports unknown field numbers on standard output, which carries results
// only: while it runs, standard output is standard error.
class StdoutToStderr {
 public:
  StdoutToStderr() {
    std::fflush(stdout);
    savedM = dup(1);
    dup2(2, 1);
  }
  ~StdoutToStderr() {
    std::fflush(stdout);
    if (savedM >= 0) dup2(savedM, 1), close(savedM);
  }

 private:
  int savedM;
};

bool ReadBinary(Context& context, const std::string& input, const std::string& bytes, const sarn::StructInfo* type,
                ref<sarn::SarnObject>& out) {
  sarn::ProtoBuf reader(&context.poolM, sarn::Schema::vStructDefG, sarn::Schema::nStructDefG);
  const auto* data = reinterpret_cast<const unsigned char*>(bytes.data());
  int length = static_cast<int>(bytes.size());
  bool isRead;
  {
    StdoutToStderr redirect;
    if (context.Has("--bare")) {
      unsigned typeId = 0;
      while (sarn::Schema::vStructDefG[typeId] != type) ++typeId;
      isRead = reader.Unmarshal(data, length, typeId, &out);
    } else {
      isRead = reader.UnmarshalKnownDict(data, length, &out);
    }
  }
  if (!isRead) {
    context.Report(input,
                   context.Has("--bare") ? std::string("not the binary form of type '") + type->pName + "'"
                                         : "not the binary form of an object",
                   STATUS_INVALID);
    return false;
  }
  if (type != nullptr && out->GetStructInfo() != type) {
    context.Report(input, std::string("the input is of type '") + out->GetTypeName().Utf8() + "', not '" +
                              type->pName + "'",
                   STATUS_INVALID);
    return false;
  }
  return true;
}

int Main(Context& context) {
  context.Valued("--from");
  context.Valued("--to");
  context.Valued("--type");
  context.Valued("--version");
  context.Flag("--bare");
  if (!context.Parse() || context.isHelpM) return context.GetStatus();
  std::string from, to;
  long long version;
  if (!context.Choice("--from", {"json", "binary"}, from) || !context.Choice("--to", {"pretty", "json", "binary"}, to) ||
      !context.Number("--version", 0, sarn::Schema::lastSchemaVersionG, 0, version)) {
    return context.GetStatus();
  }
  if (context.positionalM.size() > 1) return context.UsageError("give one input");
  const sarn::StructInfo* type = nullptr;
  if (context.Has("--type") && (type = TypeOption(context, context.Value("--type"))) == nullptr) {
    return context.GetStatus();
  }
  if (from == "binary" && context.Has("--bare") && type == nullptr) {
    return context.UsageError("--bare binary input needs --type");
  }
  std::string input = context.positionalM.empty() ? "-" : context.positionalM[0], bytes;
  if (!context.ReadInput(input, bytes)) return context.GetStatus();

  ref<sarn::SarnObject> object;
  if (from == "binary") {
    if (!ReadBinary(context, input, bytes, type, object)) return context.GetStatus();
  } else {
    ref<sarn::Dictionary> dictionary = ReadJson(context, input, bytes);
    if (!dictionary || !DictionaryToObject(context, input, dictionary, type, static_cast<int>(version), object)) {
      return context.GetStatus();
    }
  }

  std::string result;
  if (to == "binary") {
    sarn::ProtoBuf writer(&context.poolM, sarn::Schema::vStructDefG, sarn::Schema::nStructDefG);
    sarn::ProtoBufByteOutputStream stream;
    if (context.Has("--bare")) {
      writer.Marshal(object.Get(), &stream);
    } else {
      writer.MarshalKnownDictValue(object.Get(), &stream);
    }
    const unsigned char* data = nullptr;
    unsigned long length = 0;
    stream.Finish(data, length);
    if (!stream.IsOutOfMemory()) result.assign(reinterpret_cast<const char*>(data), length);
    if (stream.IsOutOfMemory()) return context.Report(input, sarn::kOutOfMemoryMessage, STATUS_INVALID), 1;
  } else {
    result = ObjectToJson(&context.poolM, object.Get(), static_cast<int>(version), to == "pretty");
    if (result.empty()) return context.Report(input, sarn::kOutOfMemoryMessage, STATUS_INVALID), 1;
    result += "\n";
  }
  if (!context.OpenOutput()) return context.GetStatus();
  context.Write(result);
  return context.GetStatus();
}

}  // namespace

const Command kConvertCommand = {"convert", "convert one object between JSON and the binary form", kHelp, Main};

}  // namespace sarncli
