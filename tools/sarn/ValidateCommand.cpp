// sarn validate: checks JSON bodies with the library's converter and its messages.
#include "Cli.h"
#include "Objects.h"

namespace sarncli {
namespace {

const char kHelp[] =
    "Usage: sarn validate [--version V] [--strict] [-o FILE] FILE...|-\n"
    "Checks that each input is the JSON text of an object at the schema version: its syntax, a\n"
    "known type, required fields, enum names and id prefixes, with the library's messages.\n"
    "Prints \"FILE: ok\" for each valid input.\n"
    "\n"
    "  --version V   the schema version (default 42, where required fields count; 0 checks\n"
    "                every field and no required ones)\n"
    "  --strict      names that are no field of their type at the version are errors, not\n"
    "                warnings\n"
    "  -o FILE       write the \"ok\" lines to FILE instead of standard output\n"
    "\n"
    "Inputs past 64 MiB are refused. Status 1 when any input is invalid.\n";

int Main(Context& context) {
  context.Valued("--version");
  context.Flag("--strict");
  if (!context.Parse() || context.isHelpM) return context.GetStatus();
  long long version;
  if (!context.Number("--version", 0, sarn::Schema::lastSchemaVersionG, 42, version)) return context.GetStatus();
  if (context.positionalM.empty()) return context.UsageError("give the inputs to check (\"-\": standard input)");
  if (!context.OpenOutput()) return context.GetStatus();
  bool isStrict = context.Has("--strict");
  for (const std::string& input : context.positionalM) {
    std::string text;
    if (!context.ReadInput(input, text)) continue;
    ref<sarn::Dictionary> dictionary = ReadJson(context, input, text);
    ref<sarn::SarnObject> object;
    if (!dictionary || !DictionaryToObject(context, input, dictionary, nullptr, static_cast<int>(version), object)) {
      continue;
    }
    size_t unknown = ReportUnknownNames(context, input, dictionary, static_cast<int>(version),
                                        isStrict ? "" : "warning: ", isStrict ? STATUS_INVALID : STATUS_OK);
    if (!isStrict || unknown == 0) context.Write(input + ": ok\n");
  }
  return context.GetStatus();
}

}  // namespace

const Command kValidateCommand = {"validate", "check JSON bodies against the schema", kHelp, Main};

}  // namespace sarncli
