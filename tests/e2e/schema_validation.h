// Documents held against their schemas by another program, jsonschema. It takes as long to start as a test to
// run, so it is started for many documents at once.
#pragma once

#include <map>
#include <string>

namespace pinwell::test {

/// The document must conform to the schema, which is a file. All documents are checked at the end of the
/// program, which fails if one does not; the complaint names the test. For the test's own thread.
void expectConforms(const std::string& document, const std::string& schema);

/// Checks documents now, each under its name. Returns what is wrong: for each document that does not conform,
/// `refusalOf(name)` and the reasons; an empty string if all do.
std::string refusalsOf(const std::map<std::string, std::string>& documents, const std::string& schema);

/// The beginning of what refusalsOf() returns for that document.
std::string refusalOf(const std::string& name);

}  // namespace pinwell::test
