// The manual page and the completion for bash, made from the grammar that parses the command line
// and from its help texts: neither can name what is not there.
#pragma once

#include <string>

namespace CLI {
class App;
}

namespace zkusb {

// For man(7).
std::string ManPage(const CLI::App& app, const std::string& version);
// A script to be sourced by bash.
std::string BashCompletion(const CLI::App& app);

}  // namespace zkusb
