#include "tools/zkusb/run.h"

#include <algorithm>
#include <exception>
#include <optional>

#include "platform/console.h"
#include "platform/text.h"
#include "tools/zkusb/check_command.h"
#include "tools/zkusb/command_line.h"
#include "tools/zkusb/commands.h"
#include "tools/zkusb/component.h"
#include "tools/zkusb/device_facts.h"
#include "tools/zkusb/pc.h"
#include "tools/zkusb/record_command.h"
#include "tools/zkusb/writer.h"

namespace zkusb {

namespace {

void Complain(Writer& errors, std::u16string_view what) {
  errors.Line(std::u16string(u"zkusb: ").append(what));
}

int NothingFound(Writer& errors, const std::u16string& what) {
  Complain(errors, what);
  return kNothingFound;
}

std::u16string WhatIsMissing(const std::optional<NodeView>& top) {
  // Before something was found the component shows no tree at all, not even the controllers.
  if (!top) return u"no USB device found";
  const bool any = std::ranges::any_of(top->Childs, IsUsbController);
  return any ? u"no USB hub found" : u"no USB host controller found";
}

// The PC is looked at once, after the whole script.
int LookOnce(const Options& options, Pc& pc, Writer& out, Writer& errors) {
  pc.ApplyAll();
  const Component component([](TDeviceEventType, IZKUMUsbTreeNode&) {});
  const std::optional<NodeView> top = component.Top();
  const bool hasUsb = top && HasUsbController(*top);
  if (!hasUsb) {
    Complain(errors, WhatIsMissing(top));
    if (!options.json) return kNothingFound;
  }
  const int code = hasUsb ? kDone : kNothingFound;
  if (options.command == Command::kDump) {
    PrintDump(hasUsb ? &component : nullptr, options.json, out);
    return code;
  }
  NodeView none;
  none.Type = KUDTRoot;
  const NodeView root = hasUsb ? component.Root().value_or(none) : none;
  switch (options.command) {
    case Command::kTree:
      PrintTree(root, options.json, out);
      return code;
    case Command::kFind: {
      Wanted wanted{{}, options.vendor, options.product};
      for (const std::string& term : options.terms) {
        wanted.terms.push_back(platform::FromUtf8(term));
      }
      if (PrintFound(root, wanted, options.json, out) || !hasUsb) return code;
      return NothingFound(errors, u"no device " + WantedText(wanted));
    }
    case Command::kVolumes:
      if (PrintVolumes(root, options.json, out) || !hasUsb) return code;
      return NothingFound(errors, u"no device carries a volume or a drive letter");
    default:
      return kRefused;
  }
}

int RunCommand(const std::vector<std::string>& args, Writer& out, Writer& errors) {
  const CommandLine line = ParseCommandLine(args);
  if (!line.options) {
    out.Paragraph(platform::FromUtf8(line.information));
    return kDone;
  }
  const Options& options = *line.options;
  out.SetColumns(options.columns.value_or(platform::OutputColumns()));
  // Neither needs the component.
  if (options.command == Command::kCheck) return Check(options, out);
  if (options.command == Command::kRecord) {
    Record(options, out);
    return kDone;
  }
  Pc pc(options.machineFile, options.scriptFile);
  switch (options.command) {
    case Command::kWatch:
      Watch(pc, options.watchMilliseconds, options.json, out);
      return kDone;
    case Command::kPage:
      if (PrintPage(pc, options.file, options.json, out)) return kDone;
      return NothingFound(errors, u"no USB device found; the page is empty");
    case Command::kRegister:
      PrintRegistration(pc, options.json, out);
      return kDone;
    case Command::kUnregister:
      PrintUnregistration(pc, options.json, out);
      return kDone;
    default:
      return LookOnce(options, pc, out, errors);
  }
}

}  // namespace

int Run(const std::vector<std::string>& args, std::ostream& out, std::ostream& err) {
  Writer output(out);
  Writer errors(err);
  try {
    const int code = RunCommand(args, output, errors);
    out.flush();
    // Whoever closes a pipe has read enough.
    if (out || platform::OutputIsClosedPipe()) return code;
    Complain(errors, u"the output cannot be written");
  } catch (const std::exception& error) {
    out.flush();
    Complain(errors, platform::FromUtf8(error.what()));
  }
  return kRefused;
}

}  // namespace zkusb
