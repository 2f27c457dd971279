#include "tools/zkusb/help_pages.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <initializer_list>

#include "tools/zkusb/help_texts.h"

namespace zkusb {

namespace {

// A hyphen that is typed is no typographic one, and a line that begins with a dot is no request.
std::string Roff(const std::string& text) {
  std::string result;
  for (const char c : text) {
    if (c == '\\') {
      result += "\\e";
    } else if (c == '-') {
      result += "\\-";
    } else {
      result += c;
    }
  }
  return result.starts_with('.') || result.starts_with('\'') ? "\\&" + result : result;
}

std::string OptionsRoff(const CLI::App& app) {
  std::string text;
  for (const CLI::Option* option : app.get_options()) {
    const bool takesValue = option->get_items_expected_max() != 0;
    text += ".TP\n.B " + Roff(option->get_name(option->get_positional(), true));
    if (!option->get_positional() && takesValue && !option->get_type_name().empty()) {
      text += " \\fI" + Roff(option->get_type_name()) + "\\fP";
    }
    text += "\n" + Roff(option->get_description()) + ".\n";
  }
  return text;
}

std::string ExamplesRoff(const CommandHelp& help) {
  std::string text;
  for (const auto& [command, meaning] : help.examples) {
    text += ".TP\n.B zkusb " + Roff(command) + "\n" + Roff(meaning) + "\n";
  }
  return text;
}

enum class Kind { kFlag, kFile, kOtherValue };

Kind KindOf(const CLI::Option& option) {
  if (option.get_items_expected_max() == 0) return Kind::kFlag;
  return option.get_type_name() == "FILE" ? Kind::kFile : Kind::kOtherValue;
}

// The long names of the options of some kinds, each behind `before`.
std::string Names(const CLI::App& app, const std::string& before,
                  std::initializer_list<Kind> kinds) {
  std::string names;
  for (const CLI::Option* option : app.get_options()) {
    if (std::ranges::count(kinds, KindOf(*option)) == 0) continue;
    for (const std::string& name : option->get_lnames())
      names.append(before).append("--").append(name);
  }
  return names;
}

}  // namespace

std::string ManPage(const CLI::App& app, const std::string& version) {
  const CommandHelp& program = FindHelp("");
  std::string text = ".TH ZKUSB 1 \"\" \"zkusb " + Roff(version) + "\" \"User Commands\"\n";
  text += ".SH NAME\nzkusb \\- shows the USB topology of a PC, its devices and their volumes\n";
  text +=
      ".SH SYNOPSIS\n.B zkusb\n[\\fIOPTION\\fP...] \\fICOMMAND\\fP [\\fIARGUMENT\\fP...]\n.br\n";
  text += ".B zkusb\n\\fILETTER\\fP\\fB:\\fP\n";
  text += ".SH DESCRIPTION\n" + Roff(program.description) + "\n";
  text += ".SH OPTIONS\nThey may stand before and behind the command.\n" + OptionsRoff(app);
  text += ".SH COMMANDS\n";
  for (const CLI::App* command : app.get_subcommands(nullptr)) {
    const CommandHelp& help = FindHelp(command->get_name());
    text += ".SS " + Roff(help.name) + "\n" + Roff(help.summary) + ".\n.PP\n";
    text += Roff(help.description) + "\n" + OptionsRoff(*command) + ExamplesRoff(help);
  }
  text +=
      ".SH EXIT STATUS\n.TP\n.B 0\nIt did what was asked.\n.TP\n.B 1\nNothing was found, which is "
      "said on standard error.\n.TP\n.B 2\nWrong usage, a bad file, or output that cannot be "
      "written; the reason is on standard error.\n";
  text += ".SH EXAMPLES\n" + ExamplesRoff(program);
  return text;
}

std::string BashCompletion(const CLI::App& app) {
  const auto all = {Kind::kFlag, Kind::kFile, Kind::kOtherValue};
  const std::string options = Names(app, " ", all).substr(1);
  const std::string files = Names(app, "|", {Kind::kFile}).substr(1);
  // Nothing can be offered for them.
  std::string values = Names(app, "|", {Kind::kOtherValue});
  std::string commands;
  std::string cases;
  std::string withFiles;  // commands that take a file without an option before it
  for (const CLI::App* command : app.get_subcommands(nullptr)) {
    commands += (commands.empty() ? "" : " ") + command->get_name();
    values += Names(*command, "|", {Kind::kOtherValue});
    const auto isFile = [](const CLI::Option* option) {
      return option->get_positional() && option->get_required();
    };
    if (std::ranges::any_of(command->get_options(), isFile)) {
      withFiles += (withFiles.empty() ? "" : "|") + command->get_name();
    }
    cases +=
        "    " + command->get_name() + ") words=\"$options" + Names(*command, " ", all) + "\" ;;\n";
  }
  return "# Completion of zkusb for bash: source this file.\n"
         "_zkusb() {\n"
         "  local current=${COMP_WORDS[COMP_CWORD]} previous=${COMP_WORDS[COMP_CWORD-1]}\n"
         "  local commands=\"" +
         commands + "\" options=\"" + options +
         "\"\n"
         "  local command= word words=\n"
         "  case $previous in\n"
         "    " +
         files +
         ") COMPREPLY=($(compgen -f -- \"$current\")); return ;;\n"
         "    " +
         values.substr(1) +
         ") return ;;\n"
         "  esac\n"
         "  for word in \"${COMP_WORDS[@]:1:COMP_CWORD-1}\"; do\n"
         "    case \" $commands \" in *\" $word \"*) command=$word; break ;; esac\n"
         "  done\n"
         "  case $command in\n" +
         cases +
         "    *) words=\"$commands $options\" ;;\n"
         "  esac\n"
         "  COMPREPLY=($(compgen -W \"$words\" -- \"$current\"))\n"
         "  case $command in\n"
         "    " +
         withFiles +
         ") [[ $current == -* ]] || COMPREPLY=($(compgen -f -- \"$current\")) ;;\n"
         "  esac\n"
         "}\n"
         "complete -o filenames -F _zkusb zkusb\n";
}

}  // namespace zkusb
