// Machine files and scripts of any content: each is read or refused with its place, and a PC that
// was read can be built over, step by step, and gives back what was opened.
//
// The input is a machine file and, behind a byte 1, a script over it.
#include <string>

#include "fuzz/fuzz.h"
#include "simulation/machine/machine_file.h"
#include "simulation/pc/simulated_pc.h"
#include "tree/tree_builder.h"

namespace {

using namespace KelvoUHW;
using fuzz::Require;
using platform::simulated::MachineFileError;

void CheckRefusal(const MachineFileError& error, std::string_view file) {
  const std::string_view what = error.what();
  Require(what.starts_with(file), "names the file");
  for (const char each : what) {
    Require(static_cast<unsigned char>(each) >= 0x20 && each != 0x7F, "one printable line");
  }
  Require(what.size() < 2000, "a message and not the file");
}

void Build(CZKUMUsbTreeBuilder& builder, const platform::simulated::SimulatedPc& pc) {
  builder.Build();
  builder.CommitDeviceCache();
  const auto open = pc.Open();
  Require(open.files + open.searches + open.imageLists == 0, "closed");
  if (!builder.Root()) return;
  std::u16string dump;
  builder.Root()->ToString(dump, u"");
  Require(!dump.empty(), "dump");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  const std::size_t end = text.find('\x01');
  platform::simulated::Machine machine;
  try {
    machine = platform::simulated::ParseMachine(text.substr(0, end), "pc.json");
  } catch (const MachineFileError& error) {
    CheckRefusal(error, "pc.json: ");
    return 0;
  }
  platform::simulated::Script script;
  if (end != std::string_view::npos) {
    try {
      script = platform::simulated::ParseScript(text.substr(end + 1), "script.json", machine);
    } catch (const MachineFileError& error) {
      CheckRefusal(error, "script.json: ");
    }
  }
  platform::simulated::SimulatedPc pc(machine);
  {
    CZKUMUsbTreeBuilder builder(pc);
    Build(builder, pc);
    for (const platform::simulated::Step& step : script) {
      Require(pc.Apply(step).empty(), "a step that was read is carried out");
      Build(builder, pc);
    }
  }
  Require(pc.Misuses().empty(), "closed once");
  return 0;
}
