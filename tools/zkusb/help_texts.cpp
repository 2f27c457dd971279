#include "tools/zkusb/help_texts.h"

#include <algorithm>
#include <stdexcept>

namespace zkusb {

const std::vector<CommandHelp>& AllHelp() {
  static const std::vector<CommandHelp> all{
      {"",
       "Shows the USB topology of a PC, its devices and their volumes.",
       "zkusb shows what the component ZKUsbMonitor knows about a PC: controllers, hubs, ports, "
       "the "
       "devices on them, and the disks, volumes and drive letters that belong to each device. It "
       "looks at the PC it runs on, or at one that a machine file describes.",
       {{"tree", "what is plugged in, and where"},
        {"E:", "the device behind the drive letter E:"},
        {"find --help", "the help of one command, with examples"}}},
      {"tree",
       "Controllers, hubs, ports and what is plugged in",
       "A tree for people. A line that is too long for the terminal loses the end of its name; in "
       "a "
       "pipe nothing is cut.",
       {{"tree", "the PC as it stands"},
        {"tree --machine machines/asus-b560.json", "another PC"},
        {"tree --json", "every property of every node, for programs"}}},
      {"dump",
       "Everything the component knows, as it prints it",
       "The component's own text, byte for byte, with its line ends.",
       {{"dump > pc.txt", "for a report"}}},
      {"find",
       "The devices that match: names, letters, ids",
       "One line for each device that matches all that is given. A term is found anywhere in a "
       "name or a serial number, in either case; a drive letter, an id, a port path or a folder "
       "must be the device's own.",
       {{"find E:", "the device behind the drive letter E:"},
        {"find sandisk extreme", "both words in its names"},
        {"find 0781:5580", "by vendor and product id"},
        {"find --vendor 781", "every device of a vendor"},
        {"find 2-1.4", "the device on a port"}}},
      {"volumes",
       "The devices that carry volumes, and where they are mounted",
       "Each device with its disks, and each disk with its volumes, their letters and folders.",
       {{"volumes", "disks and volumes of every device"},
        {"volumes --json", "the same for programs"}}},
      {"page",
       "Write the PC as one HTML file to look at and to send",
       "One file that needs no network: the topology, the volumes and, with a script, the events. "
       "It opens in any browser. It holds serial numbers and names as the PC has them; a page of a "
       "recording holds what the recording holds, which is without serial numbers by default.",
       {{"page usb.html", "the PC as it stands"},
        {"page usb.html --script machines/scripts/card-in-slot.json --machine "
         "machines/hp-cardreader.json",
         "with the events of a script"},
        {"page usb.html --machine pc.json --script pc.script.json",
         "of what record --watch has written, without serial numbers"}}},
      {"record",
       "Write the PC into a machine file",
       "What leads to a person is replaced, equal by equal, unless --with-serials keeps it. The "
       "file "
       "says what was replaced. With --watch it goes on, and writes each change into a script "
       "beside "
       "the file, which it writes anew each time.",
       {{"record pc.json", "the PC, without serial numbers"},
        {"record --watch pc.json", "and then each change, as a step of pc.script.json"},
        {"record --watch --for 60 pc.json", "the same for a minute"}}},
      {"check",
       "What is wrong or suspicious in a machine file, or in the script over it",
       "One line for each fault. It exits with 1 where there is one.",
       {{"check pc.json", "the file"},
        {"check pc.json --script pc.script.json", "the script, too"}}},
      {"watch",
       "Tell what comes and goes, one line for each event",
       "Runs until Ctrl-C, until nobody reads its output any more, or as long as --for says. With "
       "a "
       "script it plays the script and ends with it.",
       {{"watch", "until Ctrl-C"},
        {"watch --for 60 --json", "for a minute, one JSON document a line"},
        {"watch --script machines/scripts/stick-comes-and-goes.json", "what a script sets off"}}},
      {"register",
       "Register the component and show what that writes",
       "On Windows the registration is written for the whole machine, which needs an "
       "administrator; elsewhere into a registry that ends with the command.",
       {{"register", "what stands in the registry afterwards"}}},
      {"unregister",
       "Take the registration back and show what goes",
       "The counterpart of register.",
       {{"unregister", "what went, and what is left"}}},
  };
  return all;
}

const CommandHelp& FindHelp(std::string_view name) {
  const std::vector<CommandHelp>& all = AllHelp();
  const auto found = std::ranges::find(all, name, &CommandHelp::name);
  if (found == all.end()) throw std::out_of_range("no help for " + std::string(name));
  return *found;
}

std::string ExamplesText(const CommandHelp& help) {
  std::size_t widest = 0;
  for (const Example& example : help.examples) {
    if (example.command.size() <= 30) widest = std::max(widest, example.command.size());
  }
  std::string text = "Examples:";
  for (const auto& [command, meaning] : help.examples) {
    text += "\n  zkusb " + command;
    // A long one has its meaning on a line of its own.
    const bool isLong = command.size() > widest;
    if (isLong) text += '\n';
    text.append(isLong ? widest + 8 : widest - command.size(), ' ');
    text += "  " + meaning;
  }
  return text;
}

}  // namespace zkusb
