#include <array>
#include <optional>

#include "platform/text.h"
#include "simulation/machine/json_reader.h"
#include "simulation/machine/machine_check.h"
#include "simulation/machine/machine_file.h"
#include "simulation/machine/machine_sections.h"
#include "simulation/machine/steps.h"

namespace platform::simulated {

void FromJson(const JsonValue& value, PortChange& out) {
  JsonObject object(value);
  object.Need("hub", out.hub);
  if (const auto index = object.Find("index")) {
    value.File().Try([&] { out.index = static_cast<std::uint32_t>(index->AsNumber(1, 255)); });
  }
  ReadPort(object, out.port);
  object.Finish();
  if (!object.Find("index")) FailAt(value.File(), object.PlaceOf("index"), "is missing");
}

void FromJson(const JsonValue& value, Plug& out) {
  JsonObject object(value);
  ReadSections(object, out.fragment);
  object.Read("ports", out.ports);
  object.Finish();
}

namespace {

// The two members of "mount" and "dismount".
template <class Change>
Change VolumeAndPath(const JsonValue& value) {
  Change change;
  JsonObject object(value);
  object.Need("volume", change.volume);
  object.Need("path", change.path);
  object.Finish();
  return change;
}

Step ReadStep(const JsonValue& value) {
  JsonObject object(value);
  Step step;
  object.Read("at", step.atMilliseconds);
  object.Read("name", step.name);
  if (const auto when = object.Find("broadcast")) {
    step.broadcast = std::array{BroadcastTime::After, BroadcastTime::Before,
                                BroadcastTime::None}[when->AsChoice({"after", "before", "none"})];
  }

  const char* kind = nullptr;
  std::optional<JsonValue> content;
  for (const char* name : {"plug", "unplug", "mount", "dismount", "wait"}) {
    auto member = object.Find(name);
    if (!member) continue;
    if (kind != nullptr) {
      value.Fail("has both " + Quoted(std::string_view(kind)) + " and " +
                 Quoted(std::string_view(name)));
    }
    kind = name;
    content = std::move(member);
  }
  object.Finish();
  if (kind == nullptr) {
    value.Fail("needs one of \"plug\", \"unplug\", \"mount\", \"dismount\", \"wait\"");
  }

  const std::string_view what = kind;
  if (what == "plug") {
    FromJson(*content, step.change.emplace<Plug>());
  } else if (what == "unplug") {
    step.change = Unplug{content->AsText()};
  } else if (what == "mount") {
    step.change = VolumeAndPath<Mount>(*content);
  } else if (what == "dismount") {
    step.change = VolumeAndPath<Dismount>(*content);
  } else if (!content->AsBool()) {
    content->Fail("must be true");
  }
  return step;
}

// Carries the step out, where it can be.
void AddStep(const JsonValue& element, Machine& left, Script& script) {
  const FileReport& file = element.File();
  const std::size_t faults = file.Count();
  Step step = ReadStep(element);
  if (!script.empty() && step.atMilliseconds < script.back().atMilliseconds) {
    FailAt(file, element.Place() + ".at",
           std::to_string(step.atMilliseconds) + " goes back (the step before is at " +
               std::to_string(script.back().atMilliseconds) + ")");
  }
  if (const auto* plug = std::get_if<Plug>(&step.change)) {
    CheckMachine(left, plug->fragment, file, element.Place() + ".plug.");
  }
  if (file.Count() != faults) return;
  Machine next = left;
  const Text reason =
      std::visit([&](const auto& change) { return CarryOut(next, change); }, step.change);
  if (!reason.empty()) element.Fail(ToUtf8(reason));
  left = std::move(next);
  script.push_back(std::move(step));
}

Script ReadScript(std::string_view json, const FileReport& file, const Machine& machine) {
  const Json document = ParseJson(json, file);
  std::optional<JsonValue> steps;
  file.Try([&] {
    JsonObject object(JsonValue(document, file, ""));
    Text name;
    std::vector<Text> notes;
    object.Read("name", name);
    object.Read("notes", notes);
    steps = object.Find("steps");
    object.Finish();
    if (!steps) FailAt(file, "steps", "is missing");
  });

  Script script;
  if (!steps) return script;
  Machine left = machine;  // by the steps so far
  file.Try([&] {
    for (const JsonValue& element : steps->AsList()) {
      file.Try([&] { AddStep(element, left, script); });
    }
  });
  return script;
}

}  // namespace

Script ParseScript(std::string_view json, const std::string& file, const Machine& machine) {
  return ReadScript(json, FileReport(file), machine);
}

Script ParseScript(std::string_view json, const std::string& file, const Machine& machine,
                   std::vector<std::string>& faults) {
  Script script;
  try {
    script = ReadScript(json, FileReport(file, &faults), machine);
  } catch (const MachineFileError& last) {
    faults.emplace_back(last.what());
  }
  return script;
}

Script LoadScript(const std::string& path, const Machine& machine) {
  return ParseScript(ReadFileBytes(path), path, machine);
}

}  // namespace platform::simulated
