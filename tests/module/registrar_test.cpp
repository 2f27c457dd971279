#include "module/registrar.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <random>
#include <sstream>

#include "module/scripts.h"
#include "platform/wrappers/failing_registry.h"
#include "tests/support/cases.h"
#include "tests/support/golden.h"
#include "tests/support/registry_lines.h"

namespace KelvoUHW {
namespace {

using platform::simulated::SimulatedRegistry;
using platform::wrappers::FailingRegistry;
using testing::IsEmpty;
using testing_support::ExpectAllClosed;
using testing_support::Lines;
using testing_support::LinesOf;
using testing_support::Put;

const std::vector<Replacement> kReplacements = {{u"NAME", u"Some Name"},
                                                {u"QUOTED", u"it''s"},
                                                {u"PERCENT", u"100%NAME%"},
                                                {u"WORDS", u"B { C } D"},
                                                {u"NONE", u""}};

// "Old" is there before, with values and a subkey of others.
void FillWithOthers(platform::Registry& registry) {
  Put(registry, u"Old", u"", u"default");
  Put(registry, u"Old", u"Value", u"theirs");
  Put(registry, u"Old\\Foreign\\Deep", u"", u"x");
}
const Lines kOthers = {"Old",          "Old  (default) = \"default\"", "Old  Value = \"theirs\"",
                       "Old\\Foreign", "Old\\Foreign\\Deep",           "Old\\Foreign\\Deep  (default) = \"x\""};

// A script of the list, and what is there after registering and after unregistering then.
struct ScriptCase {
  std::u16string script;
  Lines written, left;
};
std::vector<ScriptCase> ScriptCases() {
  std::vector<ScriptCase> cases;
  std::istringstream file(testing_support::Golden("registry-scripts"));
  for (std::string line; std::getline(file, line);) {
    const std::string text = line.substr(std::min<std::size_t>(2, line.size()));
    if (line[0] == '>') cases.push_back({platform::FromUtf8(text), {}, {}});
    if (line[0] == ' ' || line[0] == '-') cases.back().written.push_back(text);
    if (line[0] == ' ') cases.back().left.push_back(text);
  }
  EXPECT_EQ(cases.size(), 14u);
  return cases;
}

TEST(Registrar, WritesAndRemovesWhatAScriptSays) {
  for (const auto& [script, written, left] : ScriptCases()) {
    SCOPED_TRACE(platform::ToUtf8(script));
    SimulatedRegistry registry;
    FillWithOthers(registry);
    EXPECT_EQ(RegisterScript(registry, script, kReplacements), S_OK);
    EXPECT_EQ(LinesOf(registry), written);
    EXPECT_EQ(RegisterScript(registry, script, kReplacements), S_OK);
    EXPECT_EQ(LinesOf(registry), written);
    for (int round = 0; round < 2; ++round) {  // what is gone already is no failure
      EXPECT_EQ(UnregisterScript(registry, script, kReplacements), S_OK);
      EXPECT_EQ(LinesOf(registry), left);
    }
    ExpectAllClosed(registry);
  }
}

TEST(Registrar, RefusesMalformedScriptsBeforeItWrites) {
  std::u16string deep = u"HKCR { ";
  for (int i = 0; i < 20'000; ++i) deep += u"A { ";
  // Scripts that merely end too soon have a test of their own.
  const std::u16string kCases[] = {
      u"A", u"HKLM { A }", u"'HKCR' { A }", u"HKCR { A }}", u"HKCR { A } }", u"HKCR A { B }", u"HKCR { { A } }",
      // what stands behind a key
      u"HKCR { A { } { } }", u"HKCR { = s 'x' }", u"HKCR { A = }", u"HKCR { A = s }", u"HKCR { A = s = }",
      u"HKCR { A = x 'y' }", u"HKCR { A = 's' 'y' }", u"HKCR { A = s'y' }", u"HKCR { A = s 'y'' }",
      // numbers and bytes
      u"HKCR { A = d '' }", u"HKCR { A = d '&H' }", u"HKCR { A = d 12a }", u"HKCR { A = d -1 }",
      u"HKCR { A = d 4294967296 }", u"HKCR { A = d 99999999999999999999999 }", u"HKCR { A = b '012' }",
      u"HKCR { A = b '0g' }", u"HKCR { A = b 'g0' }",
      // names
      u"HKCR { '' }", u"HKCR { ForceRemove '%NONE%' }", u"HKCR { A\\B }", std::u16string(u"HKCR { A\0 }", 11),
      u"HKCR { A = s '%UNKNOWN%' }", u"HKCR { A = s '%NAME' }",
      // key words that exclude each other, and what they take
      u"HKCR { ForceRemove NoRemove A }", u"HKCR { NoRemove NoRemove A }", u"HKCR { NoRemove Delete A }",
      u"HKCR { Delete NoRemove A }", u"HKCR { ForceRemove val A = s 'x' }", u"HKCR { Delete A = s 'x' }",
      u"HKCR { Delete A { B } }", u"HKCR { A { val V } }", u"HKCR { A { val V = } }",
      u"HKCR { A { val V = s 'x' { } } }", deep};
  for (const std::u16string& test : kCases) {
    SCOPED_TRACE(platform::ToUtf8(test.substr(0, 80)));
    SimulatedRegistry registry;
    FillWithOthers(registry);
    EXPECT_EQ(RegisterScript(registry, test, kReplacements), DISP_E_EXCEPTION);
    EXPECT_EQ(UnregisterScript(registry, test, kReplacements), DISP_E_EXCEPTION);
    EXPECT_EQ(LinesOf(registry), kOthers);
    ExpectAllClosed(registry);
  }
  // Deeper than the registry takes it: its error, not ours, and no deeper stack.
  SimulatedRegistry registry;
  for (int i = 0; i <= 20'000; ++i) deep += u"} ";
  EXPECT_EQ(RegisterScript(registry, deep, {}), HRESULT_FROM_WIN32(platform::kERROR_INVALID_PARAMETER));
  EXPECT_EQ(LinesOf(registry).size(), 511u);
  EXPECT_EQ(UnregisterScript(registry, deep, {}), S_OK);
  EXPECT_THAT(LinesOf(registry), IsEmpty());
  ExpectAllClosed(registry);
}

TEST(Registrar, TakesNoPrefixOfAScriptForTheWhole) {
  const std::u16string script =
      u"HKCR { NoRemove A = s 'it''s' { val V = d &H2A ForceRemove '%NAME%' { B } } Delete C } ";
  const std::size_t end = script.find_last_of(u'}');
  for (std::size_t length = 0; length <= script.size(); ++length) {
    SimulatedRegistry registry;
    const HRESULT result = RegisterScript(registry, script.substr(0, length), kReplacements);
    EXPECT_EQ(result, length == 0 || length > end ? S_OK : DISP_E_EXCEPTION) << length;
    EXPECT_EQ(LinesOf(registry).size(), length > end ? 5u : 0u) << length;
  }
}

TEST(Registrar, EndsAtTheFirstFailureOfTheRegistry) {
  const std::u16string script =
      u"HKCR { A = s 'a' { val V = s 'v' B } ForceRemove Old = s 'o' { C } Delete Gone NoRemove D { E } }";
  for (const auto run : {&RegisterScript, &UnregisterScript}) {
    const auto prepare = [&](SimulatedRegistry& registry) {
      FillWithOthers(registry);
      Put(registry, u"Gone\\Below");
      if (run == &UnregisterScript) {
        EXPECT_EQ(RegisterScript(registry, script, {}), S_OK);
      }
    };
    SimulatedRegistry whole;
    prepare(whole);
    FailingRegistry counting(whole);
    ASSERT_EQ(run(counting, script, {}), S_OK);
    EXPECT_GT(counting.Calls(), 10u);
    for (std::uint64_t call = 1; call <= counting.Calls(); ++call) {
      SCOPED_TRACE(call);
      SimulatedRegistry registry, stopped;
      prepare(registry);
      prepare(stopped);
      FailingRegistry failing(registry, {.call = call, .error = 1450});
      EXPECT_EQ(run(failing, script, {}), HRESULT_FROM_WIN32(1450));
      EXPECT_EQ(failing.Calls(), call);  // nothing behind it, and nothing taken back
      FailingRegistry dead(stopped, {.call = call, .onwards = true, .error = 0});
      EXPECT_EQ(run(dead, script, {}), E_FAIL);
      EXPECT_EQ(LinesOf(registry), LinesOf(stopped));
      ExpectAllClosed(registry);
      EXPECT_EQ(run(registry, script, {}), S_OK);
      EXPECT_EQ(LinesOf(registry), LinesOf(whole));
    }
  }
}

TEST(Registrar, RandomScriptsEndAndUndoWhatTheyDo) {
  static const char16_t* const kWords[] = {u"{",  u"}",    u"}",   u"{",        u"=",           u"s",    u"'x'",
                                           u"A",  u"B",    u"'C'", u"NoRemove", u"val",         u"%%",   u"d",
                                           u"12", u"HKCR", u"'",   u"Delete",   u"ForceRemove", u"''''", u"%NAME%"};
  std::mt19937 random(7);
  const auto below = [&](std::size_t bound) { return random() % bound; };
  const std::size_t rounds = testing_support::Cases(4'000u, 800u);
  std::size_t taken = 0;
  for (std::size_t round = 0; round < rounds; ++round) {
    std::u16string script = u"HKCR { ";
    // Every other one is made of whole statements, or hardly any would be taken.
    const bool whole = round % 2 == 0;
    std::size_t depth = 1;
    for (std::size_t i = below(12); i != 0; --i) {
      static const char16_t* const kStatements[] = {u"A ", u"ForceRemove B = s 'x' ", u"C = d 1 ", u"val V = s 'v' "};
      const std::size_t kind = below(4);
      script += whole ? kStatements[kind] : std::u16string(kWords[below(std::size(kWords))]) + u" ";
      if (!whole || kind == 3) continue;
      const bool opens = below(2) == 0;
      if (!opens && (depth == 1 || below(2) != 0)) continue;
      script += opens ? u"{ " : u"} ";
      depth = opens ? depth + 1 : depth - 1;
    }
    for (; depth != 0; --depth) script += u"} ";
    SimulatedRegistry registry;
    const HRESULT result = RegisterScript(registry, script, kReplacements);
    SCOPED_TRACE(platform::ToUtf8(script));
    ASSERT_TRUE(result == S_OK || (result == DISP_E_EXCEPTION && !whole)) << result;
    if (result == S_OK) {
      ++taken;
      const Lines written = LinesOf(registry);
      EXPECT_EQ(RegisterScript(registry, script, kReplacements), S_OK);
      EXPECT_EQ(LinesOf(registry), written);
      EXPECT_EQ(UnregisterScript(registry, script, kReplacements), S_OK);
    }
    if (result != S_OK || script.find(u"NoRemove") == script.npos) {
      EXPECT_THAT(LinesOf(registry), IsEmpty());
    }
    ExpectAllClosed(registry);
    ASSERT_FALSE(HasFailure());
  }
  EXPECT_GT(taken, rounds / 2);
}

}  // namespace
}  // namespace KelvoUHW
