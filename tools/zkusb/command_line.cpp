#include "tools/zkusb/command_line.h"

#include <CLI/CLI.hpp>
#include <charconv>
#include <string_view>

namespace zkusb {

namespace {

[[noreturn]] void Refuse(const std::string& reason) {
  throw UsageError(reason + " (see zkusb --help)");
}

std::uint16_t ParseId(const std::string& option, const std::string& text) {
  std::string_view digits = text;
  if (digits.starts_with("0x") || digits.starts_with("0X")) digits.remove_prefix(2);
  std::uint16_t id = 0;
  const char* const end = digits.data() + digits.size();
  const auto [rest, error] = std::from_chars(digits.data(), end, id, 16);
  if (digits.size() > 4 || error != std::errc() || rest != end) {
    Refuse(option + ": \"" + text + "\" is not a number of one to four hexadecimal digits");
  }
  return id;
}

}  // namespace

CommandLine ParseCommandLine(const std::vector<std::string>& args) {
  Options options;
  std::string vendor;
  std::string product;

  CLI::App app("Shows the USB topology of a PC, its devices and their volumes.", "zkusb");
  // That there is one is checked below: here, a misspelt one would not be named.
  app.require_subcommand(0, 1);
  app.set_version_flag("--version", "zkusb " ZKUSB_VERSION, "Print the version and exit");
  app.add_option("--machine", options.machineFile,
                 "Machine file of the PC (default: this PC on Windows, else one that is built in)")
      ->type_name("FILE");
  app.add_option("--script", options.scriptFile,
                 "Steps for watch to play; the others look after all of them")
      ->type_name("FILE");
  app.add_flag("--json", options.json, "Print JSON instead of text")->disable_flag_override();

  const auto command = [&](const char* name, const char* description, Command value) {
    CLI::App* sub = app.add_subcommand(name, description);
    sub->fallthrough();
    sub->callback([&options, value] { options.command = value; });
    return sub;
  };
  command("tree", "Controllers, hubs, ports and what is plugged in", Command::kTree);
  command("dump", "Everything the component knows, as it prints it", Command::kDump);
  CLI::App* find = command("find", "The devices of a vendor, or one product", Command::kFind);
  find->add_option("--vendor", vendor, "Vendor id, 1 to 4 hexadecimal digits")
      ->type_name("HEX")
      ->required();
  CLI::Option* productOption =
      find->add_option("--product", product, "Product id, 1 to 4 hexadecimal digits")
          ->type_name("HEX");
  command("volumes", "The devices that carry volumes, and where they are mounted",
          Command::kVolumes);
  double seconds = 0;
  command("watch", "Play a script and tell what comes and goes", Command::kWatch)
      ->add_option("--for", seconds, "Watch so long behind the script's end")
      ->type_name("SECONDS")
      ->check(CLI::Range(0.0, 86400.0))
      // "nan" is neither below nor above it.
      ->check([](const std::string& text) {
        return text.find_first_of("nN") == text.npos ? "" : text + " is not a number";
      });
  command("register", "Register the component and show what that writes", Command::kRegister);
  command("unregister", "Take the registration back and show what goes", Command::kUnregister);

  try {
    app.parse(std::vector<std::string>(args.rbegin(), args.rend()));  // it takes them from the back
  } catch (const CLI::CallForHelp&) {
    return {std::nullopt, app.help()};
  } catch (const CLI::CallForVersion& version) {
    return {std::nullopt, version.what()};
  } catch (const CLI::ParseError& error) {
    Refuse(error.what());
  }
  if (app.get_subcommands().empty()) Refuse("a command is needed");
  if (options.command == Command::kFind) {
    options.vendor = ParseId("--vendor", vendor);
    if (!productOption->empty()) options.product = ParseId("--product", product);
  }
  if (options.command == Command::kWatch && options.scriptFile.empty() && seconds == 0) {
    Refuse("watch needs --script FILE or --for SECONDS");
  }
  options.watchMilliseconds = static_cast<std::uint32_t>(seconds * 1000);
  return {options, {}};
}

}  // namespace zkusb
