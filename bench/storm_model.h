// What the sinks of the storm have to be told, judged build by build.
#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <string>
#include <vector>

#include "bench/storm_tree.h"

namespace bench {

// The rules, in the words of docs/contract.md: a device that was not connected and is gets an
// "attached", one that was and is not gets a "removed", and nothing else does. A device that was
// touched while a build read it is the exception: it may come back without "attached". So is what
// the build of an Advise finds: nobody else is told of it. Called under the notification lock.
class StormModel {
 public:
  // Judges the lists; what A, which is advised all the time, has to hear of them is expected.
  void Judge(const Found& found);
  void NoChange(const Names& during);
  // A sink has advised from inside a call: all count as new once more.
  void AdvisedInside() { m_allAnew = true; }
  // A was told: "1 S1".
  void ToldToA(std::string event) { m_told.push_back(std::move(event)); }

  // At a quiet point: everything expected was told, in its order.
  void CompareTold();
  // That nothing came or went, as A was told, but this.
  void ExpectOnly(const std::string& event);
  const Names& Connected() const { return m_connected; }

  std::vector<std::string> faults;
  // How often an exception of the rules was needed.
  std::size_t cameBackUntold = 0, wentUntold = 0, swallowedByAdvise = 0;
  std::size_t toldEvents = 0;

 private:
  // Of a run: what the build of an Advise found to come or go is told to nobody.
  void JudgeRun(const Found& found, const Names& connected, const Names& attached,
                const Names& removed);
  void Remember(const Found& found);
  void Fault(const std::string& rule, const std::string& device);

  Names m_connected;  // by the last build that found a change
  Names m_goneLate;   // removed in the last run, and not connected before it
  Names m_disturbed;  // touched during a build since they were connected last
  std::deque<std::string> m_history;
  bool m_allAnew = false;
  std::vector<std::string> m_expected, m_told;
};

}  // namespace bench
