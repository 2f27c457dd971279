#include "bench/storm_model.h"

#include <algorithm>
#include <array>
#include <utility>

namespace bench {

namespace {

std::string Joined(const std::vector<std::string>& names) {
  std::string text;
  for (const std::string& name : names) text += " " + (name.empty() ? "?" : name);
  return text;
}

}  // namespace

// The latest builds are told with a fault: what it comes from lies mostly in the one before.
void StormModel::Remember(const Found& found) {
  m_history.push_back("  " + std::string(found.inAdvise ? "advise" : "run") + ": attached" +
                      Joined(found.attached) + ", connected" + Joined(found.connected) +
                      ", removed" + Joined(found.removed) + ", touched meanwhile" +
                      Joined({found.during.begin(), found.during.end()}) + ", touched since" +
                      Joined({found.since.begin(), found.since.end()}));
  if (m_history.size() > 4) m_history.pop_front();
}

void StormModel::Fault(const std::string& rule, const std::string& device) {
  faults.push_back(rule + ": " + device);
  for (const std::string& build : m_history) faults.back() += "\n" + build;
}

void StormModel::NoChange(const Names& during) { m_disturbed.insert(during.begin(), during.end()); }

void StormModel::JudgeRun(const Found& found, const Names& connected, const Names& attached,
                          const Names& removed) {
  const bool allAnew = std::exchange(m_allAnew, false);
  if (attached.size() != found.attached.size()) Fault("attached twice", "");
  for (const std::string& name : connected) {
    if (m_connected.contains(name) || attached.contains(name)) continue;
    if (!m_disturbed.contains(name)) Fault("came and was not attached", name);
    ++cameBackUntold;
  }
  for (const std::string& name : attached) {
    // One that came and whose volume went in the same build waits for its volume.
    if (!connected.contains(name) && !found.since.contains(name)) {
      Fault("attached and not connected", name);
    }
    if (m_connected.contains(name) && !found.since.contains(name) && !allAnew) {
      Fault("attached and was there", name);
    }
  }
  for (const std::string& name : m_connected) {
    if (connected.contains(name) || removed.contains(name)) continue;
    // Where nothing counts as known, a device that goes between the two halves of the build has
    // never been there for one half, and is there for the other.
    if (!(allAnew && found.during.contains(name))) Fault("went and was not removed", name);
    ++wentUntold;
  }
  m_goneLate.clear();
  for (const std::string& name : removed) {
    if (!m_connected.contains(name)) m_goneLate.insert(name);
    if (connected.contains(name)) Fault("removed and still connected", name);
    if (!m_connected.contains(name) && !found.since.contains(name) && !name.empty() &&
        !m_disturbed.contains(name)) {
      Fault("removed and was not there", name);
    }
  }
}

void StormModel::Judge(const Found& found) {
  const Names connected(found.connected.begin(), found.connected.end());
  const Names attached(found.attached.begin(), found.attached.end());
  const Names removed(found.removed.begin(), found.removed.end());
  Remember(found);
  if (connected.size() != found.connected.size()) Fault("connected twice", "");
  if (found.inAdvise) {
    swallowedByAdvise += attached.size() + removed.size();
  } else {
    JudgeRun(found, connected, attached, removed);
  }
  m_connected = connected;
  for (const std::string& name : connected) m_disturbed.erase(name);
  m_disturbed.insert(found.during.begin(), found.during.end());
  if (found.inAdvise) return;
  // In the order in which the kinds are told.
  const std::array<std::pair<int, const std::vector<std::string>*>, 4> lists{
      {{1, &found.attached}, {0, &found.connected}, {2, &found.removed}, {3, &found.modified}}};
  for (const auto& [kind, names] : lists) {
    for (const std::string& name : *names) {
      m_expected.push_back(std::to_string(kind) + " " + name);
    }
  }
}

void StormModel::ExpectOnly(const std::string& event) {
  std::vector<std::string> changes;
  for (const std::string& told : m_told) {
    // Judged already: gone without a run of its own, for one of the reasons there.
    const bool late = told[0] == '2' && m_goneLate.contains(told.substr(2));
    if ((told[0] == '1' || told[0] == '2') && !late) changes.push_back(told);
  }
  if (changes != std::vector{event}) {
    faults.push_back("told" + Joined(changes) + " where only " + event + " happened");
  }
}

void StormModel::CompareTold() {
  const std::vector<std::string> expected = std::exchange(m_expected, {});
  const std::vector<std::string> told = std::exchange(m_told, {});
  toldEvents += told.size();
  if (expected == told) return;
  const auto at = std::ranges::mismatch(expected, told);
  faults.push_back("told" + Joined({at.in2, told.end()}) + " instead of" +
                   Joined({at.in1, expected.end()}));
}

}  // namespace bench
