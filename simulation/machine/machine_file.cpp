#include "simulation/machine/machine_file.h"

#include "simulation/machine/json_reader.h"
#include "simulation/machine/machine_check.h"
#include "simulation/machine/machine_sections.h"

namespace platform::simulated {

namespace {

Machine ReadMachine(std::string_view json, const FileReport& file) {
  const Json document = ParseJson(json, file);
  Machine machine;
  file.Try([&] {
    JsonObject object(JsonValue(document, file, ""));
    object.Read("name", machine.name);
    object.Read("notes", machine.notes);
    ReadSections(object, machine);
    object.Finish();
  });
  CheckMachine(Machine{}, machine, file, "");
  return machine;
}

}  // namespace

Machine ParseMachine(std::string_view json, const std::string& file) {
  return ReadMachine(json, FileReport(file));
}

Machine ParseMachine(std::string_view json, const std::string& file,
                     std::vector<std::string>& faults) {
  Machine machine;
  try {
    machine = ReadMachine(json, FileReport(file, &faults));
  } catch (const MachineFileError& last) {
    faults.emplace_back(last.what());
  }
  return machine;
}

Machine LoadMachine(const std::string& path) { return ParseMachine(ReadFileBytes(path), path); }

}  // namespace platform::simulated
