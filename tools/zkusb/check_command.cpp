#include "tools/zkusb/check_command.h"

#include <string>
#include <vector>

#include "platform/text.h"
#include "simulation/machine/json_reader.h"
#include "simulation/machine/machine_file.h"
#include "simulation/machine/suspicions.h"
#include "tools/zkusb/json.h"
#include "tools/zkusb/json_document.h"
#include "tools/zkusb/run.h"

namespace zkusb {

namespace {

using platform::simulated::Machine;

class Findings {
 public:
  Findings(bool json, Writer& out) : m_json(json), m_out(out) {}

  void Tell(const char* kind, const std::string& finding) {
    ++m_count;
    if (m_json) {
      m_list.push_back({{"kind", kind}, {"text", finding}});
    } else {
      m_out.Line(platform::FromUtf8(std::string(kind) + ": " + finding));
    }
  }

  int Finish(const std::string& file, const std::string& script) {
    if (m_json) {
      Json document = DocumentHead("check");
      document["file"] = file;
      document["script"] = script;
      document["findings"] = m_list;
      m_out.JsonLine(document);
    } else if (m_count == 0) {
      m_out.Line(platform::FromUtf8(file) + u": nothing to find fault with");
    }
    return m_count == 0 ? kDone : kNothingFound;
  }

 private:
  const bool m_json;
  Writer& m_out;
  Json m_list = Json::array();
  std::size_t m_count = 0;
};

}  // namespace

int Check(const Options& options, Writer& out) {
  Findings findings(options.json, out);
  std::vector<std::string> faults;
  const Machine machine = platform::simulated::ParseMachine(
      platform::simulated::ReadFileBytes(options.file), options.file, faults);
  if (!options.scriptFile.empty()) {
    platform::simulated::ParseScript(platform::simulated::ReadFileBytes(options.scriptFile),
                                     options.scriptFile, machine, faults);
  }
  for (const std::string& fault : faults) findings.Tell("wrong", fault);
  for (const std::string& suspicion : platform::simulated::Suspicions(machine)) {
    findings.Tell("suspicious", options.file + ": " + suspicion);
  }
  return findings.Finish(options.file, options.scriptFile);
}

}  // namespace zkusb
