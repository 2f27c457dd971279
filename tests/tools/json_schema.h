// Holds JSON against docs/zkusb.schema.json. Stricter than the schema: a member that it does not name is a fault, and
// so is a word of the schema that is not understood here.
#pragma once

#include <nlohmann/json.hpp>
#include <string>

namespace zkusb {

// What is wrong with a document, with the place of it; empty where nothing is.
std::string SchemaFault(const nlohmann::ordered_json& document);

}  // namespace zkusb
