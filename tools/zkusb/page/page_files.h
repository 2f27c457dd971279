// The parts of a page, as they stand in the files beside this one.
#pragma once

#include <string_view>

namespace zkusb {

extern const std::string_view kPageHtml;
extern const std::string_view kPageCss;
extern const std::string_view kPageJs;

}  // namespace zkusb
