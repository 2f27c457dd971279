#include "tools/zkusb/page/page_files.h"

namespace zkusb {

namespace {

constexpr unsigned char kHtmlBytes[] = {
#include "page_html.inc"
};
constexpr unsigned char kCssBytes[] = {
#include "page_css.inc"
};
constexpr unsigned char kJsBytes[] = {
#include "page_js.inc"
};

template <std::size_t size>
std::string_view TextOf(const unsigned char (&bytes)[size]) {
  return {reinterpret_cast<const char*>(bytes), size};
}

}  // namespace

const std::string_view kPageHtml = TextOf(kHtmlBytes);
const std::string_view kPageCss = TextOf(kCssBytes);
const std::string_view kPageJs = TextOf(kJsBytes);

}  // namespace zkusb
