// docs/properties.md against four real PCs: every property of every kind of node has its row, each example is what such
// a node says on one of them, and what a row calls always empty, sometimes empty or never empty is so.
#include <fstream>
#include <map>
#include <set>

#include "bench/object_reader.h"
#include "module/server_description.h"
#include "platform/text.h"
#include "simulation/machine/machine_file.h"
#include "tests/support/tree_desk.h"

namespace KelvoUHW::properties_page {
namespace {

using Values = std::multiset<std::string>;
using Page = std::map<std::string, Values>;  // "hub | PathName"

const char* NameOf(std::int64_t type) {
  static const char* const kNames[] = {"unknown",  "root",        "host controller", "hub",
                                       "hub port", "port device", "info device",     "interface device"};
  return kNames[type];
}

// What the nodes of all PCs say.
Page Read() {
  Page page;
  for (const char* machine : {"asus-b560", "dell-precision", "hp-cardreader", "vmware-win7"}) {
    TreeDesk desk{platform::simulated::LoadMachine(std::string(ZKUSB_SOURCE_DIR "/machines/") + machine + ".json")};
    EXPECT_EQ(desk.Rebuild(), S_OK) << machine;
    testing_support::WalkChilds(desk.Root(), [&](const ComPtr<IZKUMUsbTreeNode>& node) {
      TUsbDeviceType type = KUDTUnknown;
      node->get_Type(&type);
      testing_support::ReadProperties(node, [&](const char* name, HRESULT result, const auto& value) {
        std::string text;
        if constexpr (std::is_integral_v<std::decay_t<decltype(value)>>) {
          text = std::to_string(value);
        } else {
          text = platform::ToUtf8(value);
        }
        // A collection is shown by its elements.
        const std::string_view shown = name;
        if (shown == "MountPoints") return;
        const std::string property(shown == "one of MountPoints" ? "MountPoints" : shown);
        page[std::string(NameOf(type)) + " | " + property].insert(FAILED(result) ? "fails" : text);
      });
    });
  }
  return page;
}

struct Row {
  std::string filled, example;
};

// The rows of the page: a heading names the kind of node.
std::map<std::string, Row> Rows() {
  std::map<std::string, Row> rows;
  std::ifstream file(ZKUSB_SOURCE_DIR "/docs/properties.md");
  std::string kind;
  for (std::string line; std::getline(file, line);) {
    if (line.starts_with("## ")) kind = line.substr(3);
    if (!line.starts_with("| ") || line.starts_with("| property")) continue;
    std::vector<std::string> cells;
    for (std::size_t at = 2, end; (end = line.find(" |", at)) != std::string::npos; at = end + 3) {
      cells.push_back(at > end ? "" : line.substr(at, end - at));
    }
    if (cells.size() != 4) {
      ADD_FAILURE() << line;
      continue;
    }
    EXPECT_TRUE(rows.emplace(kind + " | " + cells[0], Row{cells[1], cells[3]}).second) << "twice: " << line;
  }
  return rows;
}

std::string Filled(const Values& values) {
  const std::size_t without = values.count("") + values.count("-1") + values.count("fails");
  return without == values.size() ? "never" : without == 0 ? "always" : "sometimes";
}

TEST(PropertiesPage, IsTrueOfFourPcs) {
  const Page page = Read();
  std::map<std::string, Row> rows = Rows();
  EXPECT_GE(page.size(), 90u);
  for (const auto& [key, values] : page) {
    const auto row = rows.find(key);
    if (row == rows.end()) {
      ADD_FAILURE() << "no row: " << key;
      continue;
    }
    EXPECT_EQ(row->second.filled, Filled(values)) << key;
    const std::string& example = row->second.example;
    EXPECT_EQ(example.empty(), row->second.filled == "never") << key;
    EXPECT_TRUE(example.empty() || values.contains(example.substr(1, example.size() - 2))) << key << example;
    rows.erase(row);
  }
  for (const auto& row : rows) ADD_FAILURE() << "no such property: " << row.first;
}

// No device shows more than full speed.
TEST(PropertiesPage, SpeedIsLowOrFull) {
  const auto read = Read();
  for (const std::string& speed : read.at("port device | Speed")) EXPECT_TRUE(speed == "0" || speed == "1") << speed;
}

// docs/identifiers.md has the classes as they are registered.
TEST(PropertiesPage, IdentifiersAreThoseThatAreRegistered) {
  std::ifstream file(ZKUSB_SOURCE_DIR "/docs/identifiers.md");
  const std::string text{std::istreambuf_iterator<char>(file), {}};
  EXPECT_EQ(ModuleDescription().classes.size(), 2u);
  for (const RegisteredClass& registered : ModuleDescription().classes) {
    const std::string progId = platform::ToUtf8(registered.progId);
    const std::string row = "`" + progId + "` | `" + progId + "." + platform::ToUtf8(registered.version) + "` | `" +
                            platform::ToUtf8(platform::GuidText(registered.clsid)) + "`";
    EXPECT_NE(text.find(row), std::string::npos) << row;
  }
}

}  // namespace
}  // namespace KelvoUHW::properties_page
