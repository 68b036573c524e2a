// schemagen: turns a schema description into the C++ of the schema classes and registry.
//
//   schemagen SCHEMA --out DIR [--units N] [--stamp FILE]   write DIR/schema/...
//   schemagen SCHEMA --dump                                 print the tables as text
//   schemagen SCHEMA --check                                only check the schema
//   schemagen SCHEMA --proto TYPE[,TYPE...]                 print a proto2 mirror of those types
//
// --out also checks that the schema carries the types the runtime names, with their ids and
// fields; --dump and --check accept any well-formed schema (test fixtures, drafts).
//
// A bad schema is refused with one "file:line: message" per problem on standard error and exit
// status 1; nothing is written then, so a build never compiles half-generated code.
#include <algorithm>
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <sstream>

#include "SchemaEmitter.h"
#include "SchemaModel.h"

namespace {

int Usage() {
  std::cerr << "usage: schemagen SCHEMA (--out DIR [--units N] [--stamp FILE] | --dump | --check | --proto TYPES)\n";
  return 2;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 3) return Usage();
  std::string schemaPath = argv[1];
  std::string mode = argv[2];
  std::string outDir, stamp;
  int units = 6;
  if (mode == "--out") {
    if (argc < 4) return Usage();
    outDir = argv[3];
    for (int i = 4; i + 1 < argc; i += 2) {
      std::string option = argv[i];
      if (option == "--units") {
        units = std::atoi(argv[i + 1]);
        if (units < 1 || units > 64) return Usage();
      } else if (option == "--stamp") {
        stamp = argv[i + 1];
      } else {
        return Usage();
      }
    }
  } else if (mode == "--proto") {
    if (argc != 4) return Usage();
  } else if (mode != "--dump" && mode != "--check") {
    return Usage();
  }

  std::ifstream in(schemaPath, std::ios::binary);
  if (!in) {
    std::cerr << schemaPath << ": cannot read the schema description\n";
    return 1;
  }
  std::ostringstream text;
  text << in.rdbuf();

  schemagen::Schema schema;
  schema.file = schemaPath;
  std::vector<schemagen::Diagnostic> errors;
  schemagen::ParseSchema(text.str(), schema, errors);
  if (errors.empty()) schemagen::ResolveSchema(schema, errors);
  if (errors.empty() && mode == "--out") schemagen::CheckRuntimeTypes(schema, errors);
  if (!errors.empty()) {
    std::stable_sort(errors.begin(), errors.end(),
                     [](const schemagen::Diagnostic& a, const schemagen::Diagnostic& b) { return a.line < b.line; });
    for (const schemagen::Diagnostic& d : errors) {
      std::cerr << schemaPath;
      if (d.line > 0) std::cerr << ":" << d.line;
      std::cerr << ": " << d.message << "\n";
    }
    return 1;
  }

  if (mode == "--dump") {
    schemagen::DumpSchema(schema, std::cout);
    return 0;
  }
  if (mode == "--check") return 0;
  if (mode == "--proto") {
    std::vector<std::string> names;
    std::stringstream list(argv[3]);
    for (std::string name; std::getline(list, name, ',');) names.push_back(name);
    std::string error;
    if (!schemagen::EmitProto(schema, names, std::cout, error)) {
      std::cerr << schemaPath << ": " << error << "\n";
      return 1;
    }
    return 0;
  }
  std::string error;
  if (!schemagen::EmitSchema(schema, outDir, units, error)) {
    std::cerr << error << "\n";
    return 1;
  }
  if (!stamp.empty()) {
    std::ofstream out(stamp, std::ios::trunc);
    out << schema.types.size() << " types, " << schema.enums.size() << " enums\n";
  }
  return 0;
}
