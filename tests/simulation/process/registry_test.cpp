#include <gmock/gmock.h>

#include <thread>

#include "platform/wrappers/failing_registry.h"
#include "tests/support/registry_lines.h"

namespace platform::simulated {
namespace {

using testing::ElementsAre;
using testing_support::ExpectAllClosed, testing_support::Lines, testing_support::LinesOf, testing_support::Put;

constexpr std::uint32_t kOk = 0, kBadPathname = 161;

std::uint32_t Code(Status status) { return status ? kOk : status.error; }

RegistryKeyHandle Opened(SimulatedRegistry& registry, const char16_t* path,
                         std::uint32_t access = kKEY_READ | kKEY_WRITE) {
  RegistryKeyHandle key = kNoRegistryKey;
  EXPECT_TRUE(registry.OpenKey(kHKEY_CLASSES_ROOT, path, access, key));
  return key;
}

TEST(SimulatedRegistry, FindsKeysAsTheSystemDoes) {
  const std::u16string longest(kMaxKeyNameChars, u'n'), tooLong = longest + u"n";
  std::u16string tooDeep;
  for (int level = 0; level < 512; ++level) tooDeep += u"d\\";
  // What the path is, and the codes of opening, of creating and then deleting it.
  const std::tuple<const char*, std::u16string, std::uint32_t, std::uint32_t, std::uint32_t> kCases[] = {
      {"a key with another below", u"Top", kOk, kOk, kERROR_ACCESS_DENIED},
      {"without case, a backslash at the end", u"tOP\\sub\\", kOk, kOk, kOk},
      {"not there", u"Top\\Other\\Below", kERROR_FILE_NOT_FOUND, kOk, kOk},
      {"the root itself", u"", kOk, kOk, kERROR_ACCESS_DENIED},
      {"a backslash in front", u"\\Top", kBadPathname, kBadPathname, kBadPathname},
      {"the longest name", longest, kERROR_FILE_NOT_FOUND, kOk, kOk},
      {"a longer name", tooLong, kERROR_INVALID_PARAMETER, kERROR_INVALID_PARAMETER, kERROR_INVALID_PARAMETER},
      {"too many levels", tooDeep, kERROR_FILE_NOT_FOUND, kERROR_INVALID_PARAMETER, kERROR_FILE_NOT_FOUND}};
  for (const auto& [what, path, open, create, remove] : kCases) {
    SCOPED_TRACE(what);
    SimulatedRegistry registry;
    Put(registry, u"Top\\Sub");
    RegistryKeyHandle key = 77;
    EXPECT_EQ(Code(registry.OpenKey(kHKEY_CLASSES_ROOT, path.c_str(), kKEY_READ, key)), open);
    EXPECT_EQ(key != kNoRegistryKey, open == kOk);
    EXPECT_TRUE(open != kOk || registry.CloseKey(key));
    std::uint32_t disposition = 0;
    EXPECT_EQ(Code(registry.CreateKey(kHKEY_CLASSES_ROOT, path.c_str(), kKEY_READ, key, disposition)), create);
    if (create == kOk) {
      EXPECT_EQ(disposition, open == kOk ? kREG_OPENED_EXISTING_KEY : kREG_CREATED_NEW_KEY);
      EXPECT_TRUE(registry.CloseKey(key));
    }
    EXPECT_EQ(Code(registry.DeleteKey(kHKEY_CLASSES_ROOT, path.c_str())), remove);
    ExpectAllClosed(registry);
  }
}

TEST(SimulatedRegistry, HoldsValuesWithTheirTypes) {
  SimulatedRegistry registry;
  Put(registry, u"b");
  Put(registry, u"A_", u"", u"x = \"y\"");
  Put(registry, u"A_\\Sub");
  Put(registry, u"AB");
  const RegistryKeyHandle key = Opened(registry, u"AB");
  const std::uint32_t number = 0x2A;
  const std::uint8_t bytes[] = {1, 0xFF};
  EXPECT_TRUE(registry.SetValue(key, u"Number", kREG_DWORD, &number, sizeof number));
  EXPECT_TRUE(registry.SetValue(key, u"number", kREG_DWORD, &number, sizeof number));  // keeps its name
  EXPECT_TRUE(registry.SetValue(key, nullptr, kREG_SZ, u"ab", 4));                     // no terminator
  EXPECT_TRUE(registry.SetValue(key, u"Bytes", kREG_BINARY, bytes, sizeof bytes));
  EXPECT_TRUE(registry.SetValue(key, u"Empty", kREG_SZ, nullptr, 0));
  EXPECT_EQ(Code(registry.SetValue(key, u"Bad", kREG_SZ, nullptr, 2)), kERROR_INVALID_PARAMETER);
  EXPECT_THAT(LinesOf(registry), ElementsAre("AB", "AB  (default) = type 1: 61 00 62 00", "AB  Bytes = type 3: 01 FF",
                                             "AB  Empty = type 1:", "AB  Number = dword 0x0000002A", "A_",
                                             "A_  (default) = \"x = \"y\"\"", "A_\\Sub", "b"));
  std::uint32_t type = 0, size = 3;
  std::uint8_t buffer[4] = {9, 9, 9, 9};
  EXPECT_EQ(Code(registry.QueryValue(key, u"NUMBER", &type, buffer, size)), kERROR_MORE_DATA);
  EXPECT_THAT(buffer, testing::Each(9));
  EXPECT_EQ(size, 4u);
  EXPECT_TRUE(registry.QueryValue(key, u"NUMBER", &type, buffer, size));
  EXPECT_THAT(buffer, ElementsAre(0x2A, 0, 0, 0));
  EXPECT_EQ(type, kREG_DWORD);
  EXPECT_TRUE(registry.QueryValue(key, u"Bytes", nullptr, nullptr, size));
  EXPECT_EQ(size, 2u);
  EXPECT_EQ(Code(registry.QueryValue(key, u"None", nullptr, nullptr, size)), kERROR_FILE_NOT_FOUND);
  EXPECT_TRUE(registry.DeleteValue(key, u"BYTES"));
  EXPECT_EQ(Code(registry.DeleteValue(key, u"BYTES")), kERROR_FILE_NOT_FOUND);
  RegistryKey owner(registry, key);
  std::u16string text = u"old";
  EXPECT_TRUE(owner.Text(u"", text));
  EXPECT_EQ(text, u"ab");
  EXPECT_EQ(Code(owner.Text(u"Number", text)), kERROR_INVALID_DATA);
  EXPECT_TRUE(owner.Text(u"Empty", text));
  EXPECT_EQ(text, u"");
}

TEST(SimulatedRegistry, GivesEachHandleOnlyWhatItWasOpenedFor) {
  SimulatedRegistry registry;
  Put(registry, u"Key\\Sub", u"", u"text");
  const RegistryKeyHandle reader = Opened(registry, u"Key", kKEY_READ);
  const RegistryKeyHandle writer = Opened(registry, u"Key", kKEY_WRITE);
  const RegistryKeyHandle gone = Opened(registry, u"Key\\Sub");
  EXPECT_TRUE(registry.DeleteKey(writer, u"Sub"));
  Put(registry, u"Key\\Sub");  // a new one, of which the old handle knows nothing
  const RegistryKeyHandle closed = Opened(registry, u"Key");
  EXPECT_TRUE(registry.CloseKey(closed));
  const std::tuple<RegistryKeyHandle, std::uint32_t, std::uint32_t, std::uint32_t> kCases[] = {
      {kHKEY_CLASSES_ROOT, kOk, kOk, kERROR_FILE_NOT_FOUND},
      {reader, kOk, kERROR_ACCESS_DENIED, kOk},
      {writer, kERROR_ACCESS_DENIED, kOk, kOk},
      {gone, kERROR_KEY_DELETED, kERROR_KEY_DELETED, kERROR_KEY_DELETED},
      {closed, kERROR_INVALID_HANDLE, kERROR_INVALID_HANDLE, kERROR_INVALID_HANDLE},
      {kNoRegistryKey, kERROR_INVALID_HANDLE, kERROR_INVALID_HANDLE, kERROR_INVALID_HANDLE}};
  for (const auto& [key, read, write, openBelow] : kCases) {
    char16_t name[kMaxKeyNameChars + 1];
    std::uint32_t size = 0, chars = kMaxKeyNameChars + 1;
    EXPECT_EQ(Code(registry.SetValue(key, u"v", kREG_SZ, u"", 2)), write);
    Put(registry, u"Key", u"v");  // for those that cannot write it
    EXPECT_EQ(Code(registry.QueryValue(key, u"v", nullptr, nullptr, size)), read);
    EXPECT_EQ(Code(registry.EnumKey(key, 0, name, chars)), read);
    EXPECT_EQ(Code(registry.DeleteValue(key, u"v")), write);
    EXPECT_EQ(Code(RegistryKey(registry).Open(key, u"Sub")), openBelow);
  }
  std::uint32_t chars = 3;  // "Sub" and its terminator need four
  char16_t name[4] = u"???";
  EXPECT_EQ(Code(registry.EnumKey(reader, 0, name, chars)), kERROR_MORE_DATA);
  EXPECT_EQ(chars, 3u);
  chars = 4;
  EXPECT_TRUE(registry.EnumKey(reader, 0, name, chars));
  EXPECT_EQ(std::u16string(name, chars + 1), std::u16string(u"Sub\0", 4));
  EXPECT_EQ(Code(registry.EnumKey(reader, 1, name, chars)), kERROR_NO_MORE_ITEMS);
  EXPECT_THAT(registry.OpenKeys(), testing::UnorderedElementsAre(u"HKEY_CLASSES_ROOT\\Key", u"HKEY_CLASSES_ROOT\\Key",
                                                                 u"HKEY_CLASSES_ROOT\\Key\\Sub"));
  for (const RegistryKeyHandle key : {reader, writer, gone}) EXPECT_TRUE(registry.CloseKey(key));
  EXPECT_EQ(Code(registry.CloseKey(gone)), kERROR_INVALID_HANDLE);
  EXPECT_EQ(Code(registry.CloseKey(0x1000)), kERROR_INVALID_HANDLE);
  EXPECT_TRUE(registry.CloseKey(kHKEY_CLASSES_ROOT));
  EXPECT_THAT(registry.Misuses(),
              ElementsAre(u"second close of HKEY_CLASSES_ROOT\\Key\\Sub", u"close of what never was a key"));
}

TEST(SimulatedRegistry, DeletesTreesAndTakesNoHiddenKeyForGone) {
  SimulatedRegistry registry;
  Put(registry, u"Tree\\Other\\Leaf", u"", u"text");
  Put(registry, u"Stays");
  wrappers::FailingRegistry failing(registry);
  RegistryKey root(failing, kHKEY_CLASSES_ROOT);
  // The second opening is that of a key that was listed.
  failing.SetPlan({.call = 3, .error = kERROR_FILE_NOT_FOUND});
  EXPECT_EQ(Code(root.DeleteTree(u"Tree")), kERROR_ACCESS_DENIED);
  failing.SetPlan({});
  EXPECT_TRUE(root.DeleteTree(u"tree"));
  EXPECT_EQ(Code(root.DeleteTree(u"Tree")), kERROR_FILE_NOT_FOUND);
  EXPECT_THAT(LinesOf(registry), ElementsAre("Stays"));
  EXPECT_TRUE(registry.DeleteKey(kHKEY_CLASSES_ROOT, u"Stays"));
  EXPECT_EQ(Code(registry.DeleteKey(kHKEY_CLASSES_ROOT, u"")), kERROR_ACCESS_DENIED);  // even an empty root
}

TEST(SimulatedRegistry, TakesThreads) {
  SimulatedRegistry registry;
  std::vector<std::jthread> threads;
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([&registry, path = u"Shared\\Own" + Decimal(i)] {
      for (int round = 0; round < 50; ++round) {
        Put(registry, path, u"", Decimal(round));
        Put(registry, path + u"\\Sub");
        EXPECT_TRUE(registry.DeleteKey(kHKEY_CLASSES_ROOT, (path + u"\\Sub").c_str()));
      }
    });
  }
  threads.clear();
  EXPECT_EQ(LinesOf(registry, false).size(), 4u);
  EXPECT_EQ(LinesOf(registry).back(), "Shared\\Own3  (default) = \"49\"");
  ExpectAllClosed(registry);
}

}  // namespace
}  // namespace platform::simulated
