#include "tools/zkusb/json_document.h"

#include <sstream>

#include "tests/tools/client.h"
#include "tools/zkusb/commands.h"

namespace zkusb {
namespace {

// The most that comes at once: what a document holds back is in memory beside what it is made of.
struct Pieces final : std::stringbuf {
  std::streamsize xsputn(const char* text, std::streamsize size) override {
    largest = std::max(largest, size);
    return std::stringbuf::xsputn(text, size);
  }
  std::streamsize largest = 0;
};

TEST(JsonDocument, ATreeOfAnySizeIsWrittenWhileItIsMade) {
  NodeView root, controller, device;
  root.Type = KUDTRoot;
  controller.Type = KUDTHostController;
  device.Type = KUDTPortDevice;
  device.InstanceId = std::u16string(100, u'x');
  controller.Childs.assign(200, device);
  root.Childs.assign(3, controller);
  Pieces pieces;
  std::ostream stream(&pieces);
  Writer writer(stream);
  PrintTree(root, true, writer);
  const Json json = Json::parse(pieces.str());
  EXPECT_EQ(json["RootNode"]["Childs"].at(2)["Childs"].size(), 200u);
  EXPECT_GT(pieces.str().size(), 1u << 18);
  EXPECT_LT(pieces.largest, 1 << 10);
}

TEST(JsonDocument, IsWhatItWouldBeAsAWhole) {
  std::u16string text = u"\x1B\"\\\r\n\u202E";
  for (int i = 0; i < 20000; ++i) text += u"\U0001F5B4";  // cut in parts, and never within one
  Json expected = DocumentHead("dump");
  const Json facts = {{"a\"b", {1, "two", nullptr}}, {"none", Json::array()}};
  expected.update(facts);
  expected["Inner"] = {{"List", {{{"x", 1}}, Json::object(), 5}}, {"Empty", Json::array()}};
  expected["Text"] = TextJson(text);

  Pieces pieces;
  std::ostream stream(&pieces);
  Writer writer(stream);
  JsonDocument document("dump", writer);
  document.Members(facts);
  document.BeginObject("Inner");
  document.BeginArray("List");
  document.BeginElement();
  document.Members({{"x", 1}});
  document.End();
  document.BeginElement();
  document.End();
  document.Element(5);
  document.End();
  document.BeginArray("Empty");
  document.End();
  document.End();
  document.Text("Text", text);
  document.Finish();
  EXPECT_EQ(Json::parse(pieces.str()), expected);
  EXPECT_LT(pieces.largest, 1 << 16);
  // Laid out alike, and nothing in it that a terminal would obey.
  expected.erase("Text");
  const std::string whole = expected.dump(2);
  EXPECT_EQ(pieces.str().substr(0, whole.size() - 2), whole.substr(0, whole.size() - 2));
  EXPECT_NE(pieces.str().find("\"Text\": \"\\u001b\\\"\\\\\\r\\n\\u202e"), std::string::npos);
}

// The schema would be worth nothing if it took everything.
TEST(JsonSchema, RefusesWhatIsWrong) {
  const Json good = JsonOutput({"find", "sandisk"});
  const std::pair<std::function<void(Json&)>, std::string> cases[] = {
      {[](Json& json) { json["schema"] = 2; }, "/schema: is not 1"},
      {[](Json& json) { json.erase("version"); }, "/version: is missing"},
      {[](Json& json) { json["Schema"] = 1; }, "/Schema: stands nowhere in it"},
      {[](Json& json) { json["command"] = "look"; }, "/command: is not"},
      {[](Json& json) { json["devices"][0]["portPath"] = "1-3.0"; }, "/devices/0/portPath: does not match"},
      {[](Json& json) { json["devices"][0]["VendorId"] = "0781"; },
       "/devices/0/VendorId: has not the type \"integer\""},
      {[](Json& json) { json["devices"][0]["disks"][0]["volumes"][0].erase("VolumeName"); }, "VolumeName: is missing"},
  };
  EXPECT_EQ(SchemaFault(good), "");
  for (const auto& [spoil, fault] : cases) {
    Json json = good;
    spoil(json);
    EXPECT_THAT(SchemaFault(json), testing::HasSubstr(fault));
  }
}

}  // namespace
}  // namespace zkusb
