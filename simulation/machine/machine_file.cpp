#include "simulation/machine/machine_file.h"

#include "simulation/machine/json_reader.h"
#include "simulation/machine/machine_check.h"
#include "simulation/machine/machine_sections.h"

namespace platform::simulated {

Machine ParseMachine(std::string_view json, const std::string& file) {
  const Json document = ParseJson(json, file);
  JsonObject object(JsonValue(document, file, ""));
  Machine machine;
  object.Read("name", machine.name);
  object.Read("notes", machine.notes);
  ReadSections(object, machine);
  object.Finish();
  CheckMachine(Machine{}, machine, file, "");
  return machine;
}

Machine LoadMachine(const std::string& path) { return ParseMachine(ReadFileBytes(path), path); }

}  // namespace platform::simulated
