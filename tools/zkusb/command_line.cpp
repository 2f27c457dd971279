#include "tools/zkusb/command_line.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <charconv>
#include <string_view>

#include "tools/zkusb/help_pages.h"
#include "tools/zkusb/help_texts.h"

namespace zkusb {

namespace {

[[noreturn]] void Refuse(const std::string& reason) {
  throw UsageError(reason + " (see zkusb --help)");
}

std::uint16_t ParseId(const CLI::Option& option) {
  const std::string text = option.as<std::string>();
  std::string_view digits = text;
  if (digits.starts_with("0x") || digits.starts_with("0X")) digits.remove_prefix(2);
  std::uint16_t id = 0;
  const char* const end = digits.data() + digits.size();
  const auto [rest, error] = std::from_chars(digits.data(), end, id, 16);
  if (digits.size() > 4 || error != std::errc() || rest != end) {
    Refuse(option.get_name() + ": \"" + text +
           "\" is not a number of one to four hexadecimal digits");
  }
  return id;
}

// The grammar of the command line. The options of a command are added to it in one place each; its
// texts stand in help_texts.cpp.
class Grammar {
 public:
  Grammar() : m_app(FindHelp("").summary, "zkusb") {
    // That there is one is checked below: here, a misspelt one would not be named.
    m_app.require_subcommand(0, 1);
    // Options look alike on every system, and a path may begin with a slash.
    m_app.allow_windows_style_options(false);
    m_app.footer(ExamplesText(FindHelp("")));
    m_app.get_formatter()->label("SUBCOMMAND", "COMMAND");
    m_app.get_formatter()->label("Subcommands", "Commands");
    m_app.set_version_flag("--version", "zkusb " ZKUSB_VERSION, "Print the version and exit");
    m_app
        .add_option(
            "--machine", m_options.machineFile,
            "Machine file of the PC (default: this PC on Windows, else one that is built in)")
        ->type_name("FILE");
    m_app
        .add_option("--script", m_options.scriptFile,
                    "Steps for watch and page to play; the others look after all of them")
        ->type_name("FILE");
    m_app.add_flag("--json", m_options.json, "Print JSON instead of text")->disable_flag_override();
    m_app
        .add_option("--width", m_options.columns,
                    "Cut lines to so many columns (default: the terminal's width, and no limit "
                    "elsewhere; 0: no limit)")
        ->type_name("N")
        ->check(CLI::Range(0, 100000).description(""));
    m_app.add_flag("--bash-completion", m_bashCompletion, "Print a completion for bash and exit")
        ->disable_flag_override();
    m_app.add_flag("--man-page", m_manPage, "Print the manual page and exit")
        ->disable_flag_override();
    m_letter = m_app.add_option("LETTER", m_firstWord, "A drive letter: the same as find LETTER")
                   ->type_name("");

    Add("tree", Command::kTree);
    Add("dump", Command::kDump);
    CLI::App& find = Add("find", Command::kFind);
    find.add_option("TERM", m_options.terms,
                    "Part of a name or a serial number, an id (0781:5580), a port path (2-1.4), a "
                    "drive letter (E:) or a folder it is mounted in")
        ->type_name("");
    m_vendor =
        find.add_option("--vendor", "Vendor id, 1 to 4 hexadecimal digits")->type_name("HEX");
    m_product =
        find.add_option("--product", "Product id, 1 to 4 hexadecimal digits")->type_name("HEX");
    Add("volumes", Command::kVolumes);
    Add("page", Command::kPage)
        .add_option("OUTPUT", m_options.file, "The file to write, such as usb.html")
        ->type_name("")
        ->required();
    CLI::App& record = Add("record", Command::kRecord);
    record.add_option("OUTPUT", m_options.file, "The machine file to write")
        ->type_name("")
        ->required();
    CLI::Option* anonymous =
        record.add_flag("--anonymous", m_anonymous,
                        "Replace serial numbers and what else leads to a person (the default)");
    record.add_flag("--with-serials", m_options.withSerials, "Replace nothing")
        ->excludes(anonymous);
    CLI::Option* const watch =
        record.add_flag("--watch", m_options.recordWatch,
                        "Go on until Ctrl-C, and write each change into the file's script");
    m_recordFor = &AddFor(record, "End --watch after so long");
    m_recordFor->needs(watch);
    Add("check", Command::kCheck)
        .add_option("INPUT", m_options.file, "The machine file to read")
        ->type_name("")
        ->required();
    m_watchFor = &AddFor(Add("watch", Command::kWatch),
                         "End so long behind the script's end, or behind the start");
    Add("register", Command::kRegister);
    Add("unregister", Command::kUnregister);
  }

  CommandLine Parse(const std::vector<std::string>& args) {
    try {
      m_app.parse(std::vector<std::string>(args.rbegin(), args.rend()));  // taken from the back
    } catch (const CLI::CallForHelp&) {
      return {std::nullopt, m_app.help()};
    } catch (const CLI::CallForVersion& version) {
      return {std::nullopt, version.what()};
    } catch (const CLI::ParseError& error) {
      Refuse(error.what());
    }
    if (m_bashCompletion) return {std::nullopt, BashCompletion(m_app)};
    if (m_manPage) return {std::nullopt, ManPage(m_app, ZKUSB_VERSION)};
    CheckFirstWord();
    if (m_options.command == Command::kFind) {
      if (!m_vendor->empty()) m_options.vendor = ParseId(*m_vendor);
      if (!m_product->empty()) m_options.product = ParseId(*m_product);
      if (m_options.terms.empty() && !m_options.vendor && !m_options.product) {
        Refuse("find needs a TERM, --vendor or --product");
      }
      if (std::ranges::count(m_options.terms, std::string()) != 0) Refuse("TERM: is empty");
    }
    for (const CLI::Option* seconds : {m_watchFor, m_recordFor}) {
      if (seconds->empty()) continue;
      m_options.watchMilliseconds = static_cast<std::uint32_t>(seconds->as<double>() * 1000);
    }
    return {m_options, {}};
  }

 private:
  CLI::App& Add(const char* name, Command value) {
    const CommandHelp& help = FindHelp(name);
    CLI::App* sub = m_app.add_subcommand(name, help.summary);
    sub->fallthrough();
    sub->footer(ExamplesText(help));
    sub->callback([this, value] { m_options.command = value; });
    return *sub;
  }

  static CLI::Option& AddFor(CLI::App& command, const std::string& meaning) {
    return *command.add_option("--for", meaning)
                ->type_name("SECONDS")
                ->check(CLI::Range(0.0, 86400.0).description(""))
                // "nan" is neither below nor above it.
                ->check([](const std::string& text) {
                  return text.find_first_of("nN") == text.npos ? "" : text + " is not a number";
                });
  }

  // What is no command and no option came here, wherever it stood.
  void CheckFirstWord() {
    if (m_letter->empty()) {
      if (m_app.get_subcommands().empty()) Refuse("a command is needed");
      return;
    }
    if (!m_app.get_subcommands().empty()) Refuse("not expected: " + m_firstWord);
    if (!IsDriveLetter(m_firstWord)) Refuse("there is no command \"" + m_firstWord + "\"");
    m_options.command = Command::kFind;
    m_options.terms = {m_firstWord};
  }

  Options m_options;
  bool m_bashCompletion = false;
  bool m_manPage = false;
  bool m_anonymous = true;  // without the flag, too: it is for those who want to be sure
  std::string m_firstWord;
  CLI::App m_app;
  CLI::Option* m_letter = nullptr;
  CLI::Option* m_vendor = nullptr;
  CLI::Option* m_product = nullptr;
  CLI::Option* m_watchFor = nullptr;
  CLI::Option* m_recordFor = nullptr;
};

}  // namespace

CommandLine ParseCommandLine(const std::vector<std::string>& args) { return Grammar().Parse(args); }

bool IsDriveLetter(const std::string& text) {
  const auto isLetter = [](char c) { return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z'); };
  return (text.size() == 2 || (text.size() == 3 && text[2] == '\\')) && isLetter(text[0]) &&
         text[1] == ':';
}

}  // namespace zkusb
