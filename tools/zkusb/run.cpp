#include "tools/zkusb/run.h"

#include <algorithm>
#include <exception>
#include <optional>

#include "platform/text.h"
#include "tools/zkusb/command_line.h"
#include "tools/zkusb/commands.h"
#include "tools/zkusb/component.h"
#include "tools/zkusb/device_facts.h"
#include "tools/zkusb/pc.h"
#include "tools/zkusb/writer.h"

namespace zkusb {

namespace {

void Complain(Writer& errors, std::u16string_view what) {
  errors.Line(std::u16string(u"zkusb: ").append(what));
}

// The PC is looked at once, after the whole script.
int LookOnce(const Options& options, Pc& pc, Writer& out, Writer& errors) {
  pc.ApplyAll();
  const Component component([](TDeviceEventType, IZKUMUsbTreeNode&) {});
  const std::optional<NodeView> root = component.Root();
  // Before something was found the component shows no tree at all, not even the controllers.
  if (!root) {
    Complain(errors, u"no USB device found");
    return kNothingFound;
  }
  if (!HasUsbController(*root)) {
    const bool any = std::ranges::any_of(root->Childs, IsUsbController);
    Complain(errors, any ? u"no USB hub found" : u"no USB host controller found");
    return kNothingFound;
  }
  switch (options.command) {
    case Command::kTree:
      PrintTree(*root, options.json, out);
      return kDone;
    case Command::kDump:
      out.Verbatim(component.Dump());
      return kDone;
    case Command::kFind:
      if (PrintFound(*root, options.vendor, options.product, options.json, out)) return kDone;
      Complain(errors, options.product
                           ? u"no device " + platform::Hex(options.vendor, 4) + u":" +
                                 platform::Hex(*options.product, 4)
                           : u"no device of vendor " + platform::Hex(options.vendor, 4));
      return kNothingFound;
    case Command::kVolumes:
      if (PrintVolumes(*root, options.json, out)) return kDone;
      Complain(errors, u"no device carries a volume or a drive letter");
      return kNothingFound;
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
  Pc pc(options.machineFile, options.scriptFile);
  switch (options.command) {
    case Command::kWatch:
      Watch(pc, options.watchMilliseconds, options.json, out);
      return kDone;
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
    if (out) return code;
    Complain(errors, u"the output cannot be written");
  } catch (const std::exception& error) {
    out.flush();
    Complain(errors, platform::FromUtf8(error.what()));
  }
  return kRefused;
}

}  // namespace zkusb
