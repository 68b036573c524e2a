// What several commands do with one object: read it from JSON text at a version, write it as
// compact or pretty JSON, and find the names the typed form leaves out.
#pragma once

#include <string>
#include <vector>

#include "Cli.h"

namespace sarncli {

// Every type name of the registry, by id.
std::vector<std::string> TypeNames();
// "no KIND 'WORD'", with up to five of `names` within a few edits (ignoring case) as suggestions.
std::string NotFoundMessage(const char* kind, const std::string& word, const std::vector<std::string>& names);

// The type named by `name` (a schema name), or null after a usage error with suggestions.
const sarn::StructInfo* TypeOption(Context& context, const std::string& name);

// Reads JSON text into a Dictionary; null after reporting the reader's message on `input`.
ref<sarn::Dictionary> ReadJson(Context& context, const std::string& input, const std::string& text);

// The Dictionary as an object at `version`: `type` (when not null) must agree with the type the
// dictionary names, or is supplied to one that names none. False after reporting the converter's
// message on `input` (status 1).
bool DictionaryToObject(Context& context, const std::string& input, const ref<sarn::Dictionary>& dictionary,
                        const sarn::StructInfo* type, sarn::KernoVersion version, ref<sarn::SarnObject>& out);

// The object's compact JSON (as it goes on the wire) or pretty JSON (its Dictionary written
// with line breaks), at `version`; empty when memory runs out.
std::string ObjectToJson(VekMempool* pool, const sarn::SarnObject* object, sarn::KernoVersion version, bool pretty);

// Reports, through `context`, every name in `dictionary` that is no field of its type at
// `version`, nested objects included: PREFIX"'NAME' is no field of 'TYPE' at version V". Returns
// how many it found. The dictionary has passed a reader's depth limit, so the walk may recurse.
size_t ReportUnknownNames(Context& context, const std::string& input, const ref<sarn::Dictionary>& dictionary,
                          sarn::KernoVersion version, const char* prefix, int status);

}  // namespace sarncli
