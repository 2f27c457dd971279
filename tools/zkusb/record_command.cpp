#include "tools/zkusb/record_command.h"

#include <chrono>
#include <filesystem>
#include <fstream>
#include <optional>
#include <stdexcept>
#include <string_view>
#include <thread>
#include <utility>

#include "platform/console.h"
#include "platform/system.h"
#include "platform/text.h"
#include "recorder/anonymiser.h"
#include "recorder/difference.h"
#include "recorder/glance.h"
#include "recorder/recorder.h"
#include "simulation/machine/built_in_machine.h"
#include "simulation/machine/machine_file.h"
#include "simulation/machine/machine_writer.h"
#include "simulation/pc/simulated_pc.h"
#include "tools/zkusb/json_document.h"

namespace zkusb {

namespace {

using Clock = std::chrono::steady_clock;
using platform::simulated::Machine;
using platform::simulated::Script;

// Between two looks at a real PC: a change is written down when two looks see the same.
constexpr std::chrono::milliseconds kBetweenGlances{250};

std::filesystem::path PathOf(const std::string& file) {
  return std::filesystem::path(std::u8string(file.begin(), file.end()));  // UTF-8 on every system
}

void WriteFile(const std::string& file, const std::string& text) {
  std::ofstream stream(PathOf(file), std::ios::binary | std::ios::trunc);
  stream << text;
  stream.flush();
  if (!stream) throw std::runtime_error(file + ": cannot be written");
}

// "pc.json" has its script in "pc.script.json".
std::string ScriptFileOf(const std::string& file) {
  std::filesystem::path path = PathOf(file);
  path.replace_extension(".script.json");
  const std::u8string text = path.u8string();
  return {text.begin(), text.end()};
}

// The PC that is recorded: a simulated one where a file names it or there is no other.
class RecordedPc {
 public:
  explicit RecordedPc(const Options& options) {
    if (options.machineFile.empty() && options.scriptFile.empty()) {
      m_host = platform::CurrentSystem().host;
    }
    if (m_host != nullptr) return;
    const Machine machine =
        options.machineFile.empty()
            ? platform::simulated::ParseMachine(platform::simulated::BuiltInMachine(),
                                                platform::simulated::kBuiltInMachineName)
            : platform::simulated::LoadMachine(options.machineFile);
    if (!options.scriptFile.empty()) {
      m_script = platform::simulated::LoadScript(options.scriptFile, machine);
    }
    m_host = &m_simulated.emplace(machine);
  }

  platform::Host& Host() const noexcept { return *m_host; }
  bool IsSimulated() const noexcept { return m_simulated.has_value(); }
  const Script& Steps() const noexcept { return m_script; }
  // What is read from a script was carried out once already, so no step is refused.
  void Apply(const platform::simulated::Step& step) { m_simulated->Apply(step); }

 private:
  platform::Host* m_host = nullptr;
  std::optional<platform::simulated::SimulatedPc> m_simulated;
  Script m_script;
};

std::u16string Counted(std::size_t number, std::u16string_view one) {
  std::u16string text = platform::Decimal(static_cast<std::int32_t>(number)) + u" ";
  text += one;
  return number == 1 ? text : text + u"s";
}

// Tells what is written, to people or as JSON Lines.
class Report {
 public:
  Report(const Options& options, Writer& out) : m_options(options), m_out(out) {
    if (options.recordWatch) out.FlushEachLine();
  }

  void TellFile(const Machine& machine, const recorder::ReplacedCounts& replaced) {
    if (!m_options.json) {
      m_out.Line(platform::FromUtf8(m_options.file) + u": " +
                 Counted(machine.devices.size(), u"device") + u", " +
                 Counted(machine.hubs.size(), u"hub") + u", " +
                 Counted(machine.volumes.size(), u"volume"));
      for (const std::u16string& note : machine.notes) m_out.Line(u"  " + note);
      return;
    }
    TellJson("file", {{"file", m_options.file},
                      {"devices", machine.devices.size()},
                      {"hubs", machine.hubs.size()},
                      {"volumes", machine.volumes.size()},
                      {"notes", TextsJson(machine.notes)},
                      {"replaced",
                       {{"serialNumbers", replaced.serialNumbers},
                        {"ids", replaced.ids},
                        {"volumeSerialNumbers", replaced.volumeSerialNumbers},
                        {"bluetoothAddresses", replaced.bluetoothAddresses},
                        {"folderNames", replaced.folderNames},
                        {"nameWords", replaced.nameWords}}}});
  }

  void TellScript(const std::string& file, bool inRealTime) {
    if (m_options.json) return TellJson("script", {{"file", file}});
    const bool untilCtrlC = inRealTime && !m_options.watchMilliseconds;
    m_out.Line(platform::FromUtf8(file) + u": what changes" +
               (untilCtrlC ? u", until Ctrl-C" : u""));
  }

  void TellStep(const platform::simulated::Step& step) {
    if (m_options.json) {
      return TellJson("step", {{"at", step.atMilliseconds}, {"step", TextJson(step.name)}});
    }
    m_out.Line(u"  +" + platform::Decimal(static_cast<std::int32_t>(step.atMilliseconds)) +
               u" ms  " + step.name);
  }

  void TellEnd(std::size_t steps, std::size_t incomplete) {
    if (m_options.json) return TellJson("end", {{"steps", steps}, {"incomplete", incomplete}});
    m_out.Line(Counted(steps, u"step"));
  }

  bool IsHeard() const { return m_out.Good(); }

 private:
  void TellJson(const char* line, const Json& members) {
    Json document = DocumentHead("record");
    document["line"] = line;
    document.update(members);
    m_out.JsonLine(document);
  }

  const Options& m_options;
  Writer& m_out;
};

class RecordCommand {
 public:
  RecordCommand(const Options& options, Writer& out)
      : m_options(options),
        m_report(options, out),
        m_pc(options),
        m_scriptFile(ScriptFileOf(options.file)) {}

  void Run() {
    // A change during the recording is one that comes after it.
    if (!m_pc.IsSimulated() && m_options.recordWatch) {
      platform::CatchInterrupts();
      m_seen = recorder::Glance(m_pc.Host());
    }
    m_state = Look();
    Machine written = m_state;
    written.name = u"Recorded PC";
    written.notes.insert(written.notes.begin(), Origin());
    WriteChecked(written);
    m_report.TellFile(written, m_anonymiser.Counts());
    if (m_options.recordWatch) Watch();
  }

 private:
  Machine Look() {
    Machine machine = recorder::RecordMachine(m_pc.Host());
    if (!m_options.withSerials) m_anonymiser.Anonymise(machine);
    return machine;
  }

  std::u16string Origin() const {
    return m_options.withSerials ? u"Recorded with its serial numbers. Nothing was replaced."
                                 : m_anonymiser.Report();
  }

  // What cannot be read back is not worth a file.
  void WriteChecked(const Machine& machine) const {
    const std::string text = platform::simulated::WriteMachine(machine);
    platform::simulated::ParseMachine(text, "what was recorded");
    WriteFile(m_options.file, text);
  }

  void Watch() {
    WriteScript();
    m_report.TellScript(m_scriptFile, !m_pc.IsSimulated());
    if (m_pc.IsSimulated()) {
      for (const auto& step : m_pc.Steps()) {
        m_pc.Apply(step);
        NoteChange(step.atMilliseconds);
      }
    } else {
      WatchInRealTime();
    }
    m_report.TellEnd(m_script.size(), m_incomplete);
  }

  void WatchInRealTime() {
    const Clock::time_point start = Clock::now();
    const auto milliseconds = [&] {
      return static_cast<std::uint32_t>(
          std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - start).count());
    };
    bool changing = false;
    std::uint32_t changedAt = 0;
    bool ends = false;
    while (!ends) {
      std::this_thread::sleep_for(kBetweenGlances);
      // What has changed by then is written down, be it over or not.
      ends = platform::Interrupted() || !m_report.IsHeard() ||
             (m_options.watchMilliseconds && milliseconds() >= *m_options.watchMilliseconds);
      std::u16string now = recorder::Glance(m_pc.Host());
      const bool same = now == m_seen;
      if (!same && !changing) {
        changing = true;
        changedAt = milliseconds();
      }
      if (changing && (same || ends)) {
        NoteChange(changedAt);
        changing = false;
      }
      m_seen = std::move(now);
    }
  }

  void NoteChange(std::uint32_t at) {
    recorder::Difference difference = recorder::StepsBetween(m_state, Look(), at);
    m_state = std::move(difference.after);
    if (!difference.complete) ++m_incomplete;
    if (difference.steps.empty()) return;
    for (const auto& step : difference.steps) m_report.TellStep(step);
    m_script.insert(m_script.end(), difference.steps.begin(), difference.steps.end());
    WriteScript();
  }

  void WriteScript() const {
    platform::simulated::ScriptText about{u"Recorded changes", {Origin()}};
    about.notes.push_back(u"Runs over the machine file that was written with it.");
    if (m_incomplete != 0) {
      about.notes.push_back(Counted(m_incomplete, u"change") +
                            u" told more than steps can say; that is left out.");
    }
    WriteFile(m_scriptFile, platform::simulated::WriteScript(m_script, about));
  }

  const Options& m_options;
  Report m_report;
  RecordedPc m_pc;
  const std::string m_scriptFile;
  recorder::Anonymiser m_anonymiser;
  std::u16string m_seen;  // at the last look in real time
  Machine m_state;        // as the script knows the PC
  Script m_script;
  std::size_t m_incomplete = 0;
};

}  // namespace

void Record(const Options& options, Writer& out) { RecordCommand(options, out).Run(); }

}  // namespace zkusb
