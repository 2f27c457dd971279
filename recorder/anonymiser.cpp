#include "recorder/anonymiser.h"

#include <algorithm>
#include <array>

#include "platform/text.h"

namespace recorder {
namespace {

using platform::simulated::Device;

constexpr std::size_t kFewestUnits = 4;     // a shorter serial number tells nobody apart
constexpr std::size_t kFewestAnywhere = 6;  // a shorter one may be part of something else
constexpr std::size_t kAddressUnits = 12;
constexpr std::u16string_view kSeparators = u"\\#&";  // of the parts of ids and paths

bool IsHex(std::u16string_view text) {
  return std::all_of(text.begin(), text.end(), [](char16_t unit) {
    const char16_t lowered = platform::ToLower(unit);
    return (unit >= u'0' && unit <= u'9') || (lowered >= u'a' && lowered <= u'f');
  });
}

bool IsNumber(std::u16string_view text) {
  return std::all_of(text.begin(), text.end(),
                     [](char16_t unit) { return unit >= u'0' && unit <= u'9'; });
}

// "5&1c0e5a7b&0&2": made by Windows from the places above, the same on every PC built like it.
bool IsMadeByWindows(std::u16string_view instance) {
  const std::size_t first = instance.find(u'&');
  if (first == 0 || first > 2 || first == std::u16string_view::npos) return false;
  const std::size_t second = instance.find(u'&', first + 1);
  return second != std::u16string_view::npos && IsHex(instance.substr(0, first)) &&
         IsHex(instance.substr(first + 1, second - first - 1));
}

bool StartsWith(const Text& text, std::u16string_view prefix) {
  return text.size() >= prefix.size() &&
         platform::EqualIgnoringCase(std::u16string_view(text).substr(0, prefix.size()), prefix);
}

bool IsBluetooth(const Text& id) { return StartsWith(id, u"BTH"); }

// Devices whose names people choose, or that stand for a network's things.
bool HasPersonsName(const Device& device) {
  static constexpr std::array<std::u16string_view, 4> kEnumerators = {u"BTH", u"SWD\\", u"UMB\\",
                                                                      u"WPDBUSENUMROOT\\"};
  static constexpr std::array<std::u16string_view, 4> kClasses = {u"WPD", u"Printer", u"PrintQueue",
                                                                  u"WSDPrintDevice"};
  const auto starts = [&](std::u16string_view prefix) { return StartsWith(device.id, prefix); };
  const auto isOf = [&](std::u16string_view name) {
    return device.deviceClass && platform::EqualIgnoringCase(*device.deviceClass, name);
  };
  return std::any_of(kEnumerators.begin(), kEnumerators.end(), starts) ||
         std::any_of(kClasses.begin(), kClasses.end(), isOf);
}

Text WideText(const std::string& bytes) {
  Text text;
  for (const char byte : bytes) text += static_cast<unsigned char>(byte);
  return text;
}

template <class Visit>
void ForEachWord(std::u16string_view text, Visit visit) {
  while (!text.empty()) {
    const auto begin = std::find_if(text.begin(), text.end(), IsWordUnit);
    const auto end = std::find_if_not(begin, text.end(), IsWordUnit);
    if (begin != end) visit(std::u16string_view(begin, end));
    text = std::u16string_view(end, text.end());
  }
}

}  // namespace

void Anonymiser::Anonymise(Machine& machine) {
  Collect(machine);
  Replace(machine);
}

void Anonymiser::Collect(const Machine& machine) {
  for (const auto& entry : machine.interfaces) {
    m_classes.insert(platform::ToLower(platform::GuidText(entry.interfaceClass)));
  }
  for (const Device& device : machine.devices) {
    if (device.classGuid) m_classes.insert(platform::ToLower(*device.classGuid));
  }
  for (const Device& device : machine.devices) CollectDevice(device);
  for (const auto& storage : machine.storage) {
    if (storage.serial) CollectSerial(WideText(*storage.serial));
    if (storage.mediaSerialNumber) CollectSerial(*storage.mediaSerialNumber);
  }
  for (const auto& volume : machine.volumes) {
    const std::size_t brace = volume.name.find(u'{');
    if (brace == Text::npos) continue;
    const std::u16string_view name = std::u16string_view(volume.name).substr(brace);
    if (GuidLength(name) != 0) {
      CollectGuids(name);
    } else {
      m_guids += m_texts.Add(TrimmedToWords(name)) ? 1 : 0;
    }
  }
}

void Anonymiser::CollectDevice(const Device& device) {
  if (IsBluetooth(device.id)) CollectAddresses(device.id);
  const std::size_t last = device.id.rfind(u'\\');
  if (last != Text::npos) CollectInstance(std::u16string_view(device.id).substr(last + 1));
}

void Anonymiser::CollectInstance(std::u16string_view instance) {
  // The symbolic name of another device, with that one's instance.
  constexpr std::u16string_view kNameOfAnother = u"_??_";
  if (const std::size_t other = instance.find(kNameOfAnother); other != instance.npos) {
    std::u16string_view rest = instance.substr(other + kNameOfAnother.size());
    // The last of its parts but for the class; an id with a slash has one # more in its name.
    std::u16string_view last;
    for (int part = 0; !rest.empty(); ++part) {
      const std::size_t end = std::min(rest.find(u'#'), rest.size());
      if (part >= 2 && end > 0 && rest.front() != u'{') last = rest.substr(0, end);
      rest.remove_prefix(std::min(end + 1, rest.size()));
    }
    if (!last.empty()) CollectInstance(last);
    return;
  }
  CollectSignature(instance);
  if (instance.find(u'{') != instance.npos) return CollectGuids(instance);
  if (IsMadeByWindows(instance)) return;
  // The number of a unit behind it.
  const std::size_t unit = instance.rfind(u'&');
  if (unit != instance.npos && instance.size() - unit <= 4 && IsNumber(instance.substr(unit + 1))) {
    instance = instance.substr(0, unit);
  }
  CollectSerial(instance);
}

void Anonymiser::CollectGuids(std::u16string_view text) {
  for (std::size_t brace = text.find(u'{'); brace != text.npos;
       brace = text.find(u'{', brace + 1)) {
    const std::size_t length = GuidLength(text.substr(brace));
    if (length == 0 || m_classes.contains(platform::ToLower(text.substr(brace, length)))) continue;
    m_guids += m_texts.Add(text.substr(brace, length)) ? 1 : 0;
  }
}

void Anonymiser::CollectAddresses(std::u16string_view text) {
  ForEachWord(text, [this](std::u16string_view word) {
    if (word.size() == kAddressUnits && IsHex(word)) m_addresses += m_texts.Add(word) ? 1 : 0;
  });
}

// "SIGNATURE1a2b3c4dOFFSET100000LENGTH...": of several volumes of one disk the first part is equal.
void Anonymiser::CollectSignature(std::u16string_view text) {
  constexpr std::u16string_view kMark = u"signature";
  ForEachWord(text, [&](std::u16string_view word) {
    const Text lowered = platform::ToLower(word);
    const std::size_t end = lowered.find(u"offset");
    if (!lowered.starts_with(kMark) || end == Text::npos) return;
    const Text signature = lowered.substr(kMark.size(), end - kMark.size());
    m_serials += m_signatures.Add(signature) ? 1 : 0;
    m_texts.Add(word, Text(kMark) + m_signatures.Of(signature) + lowered.substr(end));
  });
}

void Anonymiser::CollectSerial(std::u16string_view serial) {
  serial = TrimmedToWords(serial);
  const std::size_t units = CountWordUnits(serial);
  if (units < kFewestUnits || (units == kFewestUnits && IsNumber(serial)) || m_texts.Has(serial)) {
    return;
  }
  // An instance ends at a separator, so one that has a separator is looked for everywhere.
  const bool isPart = units < kFewestAnywhere && serial.find_first_of(kSeparators) == serial.npos;
  m_serials += (isPart ? m_instances : m_texts).Add(serial) ? 1 : 0;
}

void Anonymiser::ReplaceText(Text& text) const {
  text = m_texts.In(text);
  if (m_instances.Size() == 0) return;
  // Between the separators of ids and paths, and alone.
  Text out;
  std::size_t at = 0;
  while (at <= text.size()) {
    const std::size_t end = std::min(text.find_first_of(kSeparators, at), text.size());
    out += m_instances.Of(text.substr(at, end - at));
    if (end < text.size()) out += text[end];
    at = end + 1;
  }
  text = std::move(out);
}

void Anonymiser::ReplaceText(std::string& bytes) const {
  Text text = WideText(bytes);
  ReplaceText(text);
  std::transform(text.begin(), text.end(), bytes.begin(),
                 [](char16_t unit) { return static_cast<char>(static_cast<unsigned char>(unit)); });
}

// Word by word, so that what several names have in common stays common.
void Anonymiser::ReplaceName(std::optional<Text>& name) {
  // One letter is that of a drive.
  if (!name || CountWordUnits(*name) < 2) return;
  Text out;
  std::size_t at = 0;
  ForEachWord(*name, [&](std::u16string_view word) {
    const auto begin = static_cast<std::size_t>(word.data() - name->data());
    m_names.Add(word);
    out += name->substr(at, begin - at) + m_names.Of(word);
    at = begin + word.size();
  });
  *name = out + name->substr(at);
}

// The names between the backslashes, but for a drive's or a volume's own.
void Anonymiser::ReplaceFolders(Text& path) {
  constexpr std::u16string_view kVolume = u"\\\\?\\Volume{";
  std::size_t at = 0;
  if (StartsWith(path, kVolume)) {
    at = std::min(path.find(u'\\', kVolume.size()), path.size());
  } else if (path.size() >= 2 && path[1] == u':') {
    at = 2;
  }
  Text out = m_texts.In(path.substr(0, at));
  while (at < path.size()) {
    const std::size_t end = std::min(path.find_first_of(u"\\;", at), path.size());
    const Text name = path.substr(at, end - at);
    m_folders.Add(name);
    out += m_folders.Of(name);
    if (end < path.size()) out += path[end];
    at = end + 1;
  }
  path = std::move(out);
}

std::uint32_t Anonymiser::SerialOf(std::uint32_t volumeSerial) {
  const auto [known, fresh] = m_volumeSerials.try_emplace(volumeSerial, 0);
  if (fresh) known->second = 0x10000001u * static_cast<std::uint32_t>(m_volumeSerials.size());
  return known->second;
}

void Anonymiser::Replace(Machine& machine) {
  const auto replace = [this](auto&... texts) {
    const auto one = [this](auto& text) {
      if (text) this->ReplaceText(*text);
    };
    (one(texts), ...);
  };
  ReplaceText(machine.name);
  for (Text& note : machine.notes) ReplaceText(note);
  for (Device& device : machine.devices) {
    if (HasPersonsName(device)) {
      ReplaceName(device.friendlyName);
      // A maker describes a device; a network's things are described by whoever set them up.
      if (StartsWith(device.id, u"SWD\\DAF")) ReplaceName(device.description);
    }
    ReplaceText(device.id);
    ReplaceText(device.parent);
    replace(device.service, device.description, device.friendlyName, device.manufacturer,
            device.location, device.physicalName);
    if (device.hardwareIds) {
      for (Text& id : *device.hardwareIds) ReplaceText(id);
    }
  }
  for (auto& entry : machine.interfaces) {
    ReplaceText(entry.path);
    ReplaceText(entry.device);
  }
  for (auto& controller : machine.hostControllers) {
    for (Text& name : controller.names) ReplaceText(name);
    replace(controller.rootHub);
  }
  for (auto& hub : machine.hubs) {
    ReplaceText(hub.name);
    for (auto& port : hub.ports) replace(port.hubName);
  }
  for (auto& storage : machine.storage) {
    ReplaceText(storage.path);
    replace(storage.vendor, storage.product, storage.revision, storage.serial,
            storage.mediaSerialNumber);
  }
  for (auto& volume : machine.volumes) {
    ReplaceText(volume.name);
    ReplaceText(volume.device);
    for (Text& path : volume.paths) ReplaceFolders(path);
    if (volume.serial) volume.serial = SerialOf(*volume.serial);
    for (auto& mount : volume.folderMounts) {
      ReplaceFolders(mount.folder);
      ReplaceText(mount.volume);
    }
  }
  for (auto& drive : machine.drives) {
    ReplaceText(drive.device);
    if (!drive.dosDevice) continue;
    // What lies behind a network's or a substituted drive: server, share, user, folders.
    Text& target = *drive.dosDevice;
    const std::size_t third = target.find(u'\\', target.find(u'\\', 1) + 1);
    if (!StartsWith(target, u"\\Device\\Harddisk") && third != Text::npos) {
      Text rest = target.substr(third);
      ReplaceFolders(rest);
      target.replace(third, Text::npos, rest);
    } else if (StartsWith(target, u"\\??\\")) {
      Text rest = target.substr(4);
      ReplaceFolders(rest);
      target = u"\\??\\" + rest;
    } else {
      ReplaceText(target);
    }
  }
}

ReplacedCounts Anonymiser::Counts() const noexcept {
  return {m_serials,   m_guids,          m_volumeSerials.size(),
          m_addresses, m_folders.Size(), m_names.Size()};
}

Text Anonymiser::Report() const {
  const auto count = [](std::size_t number, const char16_t* one, const char16_t* many) {
    return platform::Decimal(static_cast<std::int32_t>(number)) + u" " + (number == 1 ? one : many);
  };
  const ReplacedCounts counts = Counts();
  return u"Replaced, equal ones by equal ones: " +
         count(counts.serialNumbers, u"serial number", u"serial numbers") + u", " +
         count(counts.ids, u"volume GUID or other id", u"volume GUIDs and other ids") + u", " +
         count(counts.volumeSerialNumbers, u"volume serial number", u"volume serial numbers") +
         u", " + count(counts.bluetoothAddresses, u"Bluetooth address", u"Bluetooth addresses") +
         u", " + count(counts.folderNames, u"folder name", u"folder names") + u", " +
         count(counts.nameWords, u"word", u"words") + u" of names that people gave.";
}

}  // namespace recorder
