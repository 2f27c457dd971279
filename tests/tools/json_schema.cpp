#include "tests/tools/json_schema.h"

#include <algorithm>
#include <fstream>
#include <map>
#include <regex>
#include <set>

namespace zkusb {
namespace {

using Json = nlohmann::ordered_json;

const Json& Schema() {
  static const Json schema = [] {
    std::ifstream stream(ZKUSB_SOURCE_DIR "/docs/zkusb.schema.json");
    return Json::parse(stream);
  }();
  return schema;
}

bool HasType(const Json& value, const std::string& type) {
  if (type == "object") return value.is_object();
  if (type == "array") return value.is_array();
  if (type == "string") return value.is_string();
  if (type == "integer") return value.is_number_integer();
  return false;
}

// To compile an expression takes far longer than to search with it.
bool Matches(const std::string& text, const std::string& pattern) {
  thread_local std::map<std::string, std::regex> compiled;
  return std::regex_search(text, compiled.try_emplace(pattern, pattern).first->second);
}

std::string Fault(const Json& rule, const Json& value, const std::string& place);

// The alternatives are told apart by their constants: the one that gets furthest says what is wrong.
std::string FaultOfAll(const Json& alternatives, const Json& value, const std::string& place) {
  std::string furthest;
  for (const Json& alternative : alternatives) {
    const std::string fault = Fault(alternative, value, place);
    if (fault.empty()) return {};
    if (fault.find(": is not ") == std::string::npos || furthest.empty()) furthest = fault;
  }
  return furthest;
}

std::string FaultOfObject(const Json& rule, const Json& value, const std::string& place) {
  std::set<std::string> lowered;
  for (const auto& [name, member] : value.items()) {
    if (!rule.at("properties").contains(name)) return place + "/" + name + ": stands nowhere in it";
    std::string lower = name;
    std::ranges::transform(lower, lower.begin(), [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    if (!lowered.insert(lower).second) return place + "/" + name + ": stands twice but for case";
    if (std::string fault = Fault(rule["properties"][name], member, place + "/" + name); !fault.empty()) return fault;
  }
  for (const Json& name : rule.value("required", Json::array())) {
    if (!value.contains(name.get<std::string>())) return place + "/" + name.get<std::string>() + ": is missing";
  }
  return {};
}

std::string Fault(const Json& rule, const Json& value, const std::string& place) {
  for (const auto& [word, wanted] : rule.items()) {
    if (word == "$ref") {
      return Fault(Schema().at(Json::json_pointer(wanted.get<std::string>().substr(1))), value, place);
    }
    if (word == "oneOf") {
      if (std::string fault = FaultOfAll(wanted, value, place); !fault.empty()) return fault;
    } else if (word == "type") {
      if (!HasType(value, wanted)) return place + ": has not the type " + wanted.dump();
      if (wanted == "object") {
        if (std::string fault = FaultOfObject(rule, value, place); !fault.empty()) return fault;
      }
    } else if (word == "const") {
      if (value != wanted) return place + ": is not " + wanted.dump();
    } else if (word == "enum") {
      if (std::ranges::count(wanted, value) != 1) return place + ": is none of " + wanted.dump();
    } else if (word == "pattern") {
      if (!Matches(value.get<std::string>(), wanted.get<std::string>())) {
        return place + ": does not match " + wanted.dump();
      }
    } else if (word == "minimum") {
      if (value < wanted) return place + ": is below " + wanted.dump();
    } else if (word == "items") {
      for (std::size_t at = 0; at < value.size(); ++at) {
        if (std::string fault = Fault(wanted, value[at], place + "/" + std::to_string(at)); !fault.empty())
          return fault;
      }
    } else if (!std::ranges::count(std::initializer_list<std::string>{"properties", "required", "description", "title",
                                                                      "$schema", "$defs"},
                                   word)) {
      return "the schema says " + word + ", which is not understood";
    }
  }
  return {};
}

}  // namespace

std::string SchemaFault(const Json& document) { return Fault(Schema(), document, ""); }

}  // namespace zkusb
