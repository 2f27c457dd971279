// Strict reading of JSON: every value knows its place in the file, and what does not fit is an
// error that names file, place and reason.
//
// Pure functions and values, callable from every thread. A JsonValue refers to the parsed document
// and to the FileReport; both must outlive it. Every failure is a MachineFileError, which ends the
// reading or is collected by the FileReport.
#pragma once

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <limits>
#include <nlohmann/json.hpp>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

#include "simulation/machine/machine.h"
#include "simulation/machine/machine_file.h"

namespace platform::simulated {

using Json = nlohmann::json;

// The file that is read, and where what is wrong in it goes.
class FileReport {
 public:
  // Without `faults`, which this refers to, the first fault ends the reading.
  explicit FileReport(std::string name, std::vector<std::string>* faults = nullptr)
      : m_name(std::move(name)), m_faults(faults) {}

  const std::string& Name() const noexcept { return m_name; }

  // The faults collected so far.
  std::size_t Count() const noexcept { return m_faults == nullptr ? 0 : m_faults->size(); }

  // Runs a part of the reading; false where it met a fault and faults are collected. The thousandth
  // ends the reading all the same.
  template <class Part>
  bool Try(Part part) const {
    try {
      part();
      return true;
    } catch (const MachineFileError& fault) {
      if (m_faults == nullptr || m_faults->size() + 1 >= kMostFaults) throw;
      m_faults->emplace_back(fault.what());
      return false;
    }
  }

 private:
  static constexpr std::size_t kMostFaults = 1000;

  std::string m_name;
  std::vector<std::string>* m_faults;
};

// The bytes of a file of at most 64 MiB.
std::string ReadFileBytes(const std::string& path);

// Parses a whole file. Beyond what JSON itself asks for, two members of one name in an object and
// more than 16 levels of nesting are refused.
Json ParseJson(std::string_view bytes, const FileReport& file);

// "FILE: PLACE: reason"; an empty place is "(file)".
[[noreturn]] void FailAt(const FileReport& file, const std::string& place,
                         const std::string& reason);

// In double quotes and fit for one line of a message: no control characters, cut when very long.
std::string Quoted(std::string_view utf8);
std::string Quoted(std::u16string_view text);

class JsonValue {
 public:
  JsonValue(const Json& json, const FileReport& file, std::string place);

  const Json& Raw() const noexcept { return *m_json; }
  const FileReport& File() const noexcept { return *m_file; }
  const std::string& Place() const noexcept { return m_place; }
  [[noreturn]] void Fail(const std::string& reason) const;

  // The value as what is asked for; anything else fails.
  Text AsText() const;          // without zero characters
  std::string AsBytes() const;  // a text of 8-bit characters, without zeros
  bool AsBool() const;
  std::int64_t AsNumber(std::int64_t least, std::int64_t most) const;    // or a text "0x1F"
  std::size_t AsChoice(std::initializer_list<const char*> names) const;  // the index in `names`
  std::vector<JsonValue> AsList() const;

 private:
  const std::string& AsUtf8() const;

  const Json* m_json;
  const FileReport* m_file;
  std::string m_place;
};

// Conversions by target; readers of records add overloads of their own in this namespace.
inline void FromJson(const JsonValue& value, Text& out) { out = value.AsText(); }
inline void FromJson(const JsonValue& value, std::string& out) { out = value.AsBytes(); }
inline void FromJson(const JsonValue& value, bool& out) { out = value.AsBool(); }

template <class T>
requires std::is_integral_v<T>
void FromJson(const JsonValue& value, T& out) {
  out =
      static_cast<T>(value.AsNumber(std::numeric_limits<T>::min(), std::numeric_limits<T>::max()));
}

template <class T>
void FromJson(const JsonValue& value, std::optional<T>& out) {
  FromJson(value, out.emplace());
}

template <class T>
void FromJson(const JsonValue& value, std::vector<T>& out) {
  const std::vector<JsonValue> elements = value.AsList();
  out.reserve(elements.size());
  for (const JsonValue& element : elements) {
    value.File().Try([&] { FromJson(element, out.emplace_back()); });
  }
}

// An object whose members are asked for by name. Finish() refuses the members nobody asked for,
// then reports those that were needed and are not there: so a misspelt name is called unknown,
// not missing. "filledIn" is understood in every object.
class JsonObject {
 public:
  explicit JsonObject(const JsonValue& value);

  const JsonValue& Value() const noexcept { return m_value; }

  // Sets `out` and returns true; returns false when there is no such member or it does not fit, and
  // leaves `out` where there is none.
  template <class T>
  bool Read(const char* name, T& out) {
    const std::optional<JsonValue> member = Find(name);
    return member && Convert(*member, out);
  }

  // The same for a member that must be there; its absence is reported by Finish().
  template <class T>
  bool Need(const char* name, T& out) {
    const std::optional<JsonValue> member = Find(name);
    if (!member) m_missing.emplace_back(name);
    return member && Convert(*member, out);
  }

  // `name` must be a literal.
  std::optional<JsonValue> Find(const char* name);
  // The place of a member, there or not.
  std::string PlaceOf(std::string_view name) const;
  void Finish() const;

 private:
  template <class T>
  bool Convert(const JsonValue& member, T& out) const {
    return m_value.File().Try([&] { FromJson(member, out); });
  }
  void CheckFilledIn() const;

  JsonValue m_value;
  std::vector<std::string_view> m_known;
  std::vector<std::string> m_missing;
};

}  // namespace platform::simulated
