#include "tests/tools/json_schema.h"

#include "tests/tools/client.h"

namespace zkusb {
namespace {

// Each kind of document is made by its command, fits the schema, and is what the schema takes for that command: without
// any one member, or with one more, it fits no more.
TEST(JsonSchema, HasTheDocumentsOfEveryCommand) {
  const TemporaryFile file(""), faulty(R"({"devices": [{"id": "USB\\A\\1", "colour": "red"}]})");
  const std::string script = (MachinesFolder() / "scripts" / "stick-comes-and-goes.json").string();
  const std::pair<Args, std::size_t> cases[] = {
      {{"tree"}, 1},
      {{"dump"}, 1},
      {{"find", "D:"}, 1},
      {{"volumes"}, 1},
      {{"page", file.Path()}, 1},
      {{"record", file.Path()}, 1},
      {{"record", file.Path(), "--watch", "--script", script}, 5},
      {{"check", faulty.Path()}, 1},
      {{"watch", "--for", "0"}, 4},
#ifndef _WIN32  // there it would be written for the whole machine
      {{"register"}, 1},
      {{"unregister"}, 1},
#endif
  };
  std::size_t damaged = 0;
  for (auto [args, least] : ProgramCases(cases)) {
    SCOPED_TRACE(testing::PrintToString(args));
    args.push_back("--json");
    const ProgramResult result = RunOverSimulatedPc(args);
    EXPECT_NE(result.code, kRefused) << result.err;
    const bool byLine = args[0] == "watch" || args[0] == "record";
    const std::vector<std::string> documents = byLine ? Lines(result.out) : std::vector{result.out};
    EXPECT_GE(documents.size(), least);
    for (const std::string& text : documents) {
      const Json whole = Json::parse(text);
      EXPECT_EQ(SchemaFault(whole), "");
      EXPECT_EQ(whole.at("command"), args[0]);
      Json more = whole;
      more["surplus"] = 1;
      EXPECT_NE(SchemaFault(more), "");
      Json less = whole;
      for (const auto& [name, value] : whole.items()) {
        // What the device manager alone knows of a device may be missing in an event.
        const bool isNeeded = !whole.contains("event") || name == "event" || name == "at" || name == "portPath";
        if (!isNeeded) continue;
        less.erase(name);
        EXPECT_NE(SchemaFault(less), "") << name;
        less[name] = value;
        ++damaged;
      }
    }
  }
  EXPECT_GE(damaged, std::size(ProgramCases(cases)) * 5);
  std::filesystem::remove(file.Path() + ".script.json");
}

}  // namespace
}  // namespace zkusb
