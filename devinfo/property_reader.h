// Registry properties of device-information elements, read into info-device records.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "devinfo/device_answers.h"
#include "platform/host.h"
#include "records/info_device.h"

namespace KelvoUHW {

// The buffer that goes from read to read. From the start it holds all but the longest values, so
// that few have to be asked for twice; it only grows.
class PropertyBuffer {
 public:
  static constexpr std::uint32_t kFirstBytes = 1024;

  PropertyBuffer() : m_chars(kFirstBytes / sizeof(char16_t) + 1) {}

  void* Address() noexcept { return m_chars.data(); }
  // The bytes that may be offered; a terminating zero has room behind them.
  std::uint32_t Bytes() const noexcept {
    return static_cast<std::uint32_t>((m_chars.size() - 1) * sizeof(char16_t));
  }
  // Makes room for a value of `valueBytes`.
  void Grow(std::uint32_t valueBytes);
  // How many bytes the last successful read left.
  void SetReceived(std::uint32_t bytes) noexcept;
  // What was received, an odd byte at the end with a zero behind it.
  std::uint32_t Received() const noexcept { return m_received; }
  std::u16string_view Chars() const noexcept;

 private:
  std::vector<char16_t> m_chars;
  std::uint32_t m_received = 0;
};

// Reads a property into the buffer, again while the value outgrows it. On success `type` is its
// registry data type. A failure is the system's, and may carry the code 0. A system that asks for
// more without end, or for more than kMostPropertyBytes, has failed with
// kERROR_INSUFFICIENT_BUFFER.
inline constexpr int kMostPropertyReads = 8;
inline constexpr std::uint32_t kMostPropertyBytes = 1U << 20;
platform::Status ReadDeviceProperty(platform::DeviceSets& sets, platform::DeviceSetHandle set,
                                    const platform::SP_DEVINFO_DATA& element,
                                    std::uint32_t property, std::uint32_t& type,
                                    PropertyBuffer& buffer);

// The whole characters of an answer, up to the first zero.
std::u16string_view TextOf(const PropertyAnswer& answer) noexcept;
// What a reader with a zeroed buffer of `bufferBytes` (an even number) gets: none where the value
// does not fit, or leaves no zero at its end.
std::optional<std::u16string_view> TextWithin(const PropertyAnswer& answer,
                                              std::uint32_t bufferBytes) noexcept;

// The element's instance id with / turned into \, or empty on failure.
std::u16string GetInstanceId(platform::DeviceSets& sets, platform::DeviceSetHandle set,
                             const platform::SP_DEVINFO_DATA& element);

// The properties of the elements of one set, asked for once in a build. One thread; sets and
// answers must outlive it.
class ElementReader {
 public:
  ElementReader(platform::DeviceSets& sets, platform::DeviceSetHandle set, DeviceAnswers& answers)
      : m_sets(sets), m_set(set), m_answers(answers) {}

  // False when the property cannot be read. What `answer` refers to is valid until the next read.
  bool Read(const platform::SP_DEVINFO_DATA& element, std::uint32_t property,
            PropertyAnswer& answer);
  // The same, and what comes of it is kept for whoever asks later in the build.
  bool ReadAndKeep(const platform::SP_DEVINFO_DATA& element, std::uint32_t property,
                   PropertyAnswer& answer);
  // How many reads have failed for another reason than that the device lacks the property.
  std::size_t Failures() const noexcept { return m_failures; }
  std::u16string InstanceId(const platform::SP_DEVINFO_DATA& element) const {
    return GetInstanceId(m_sets, m_set, element);
  }
  // For texts that many elements have alike.
  SharedTexts& Texts() noexcept { return m_texts; }

 private:
  platform::Status Ask(const platform::SP_DEVINFO_DATA& element, std::uint32_t property,
                       PropertyAnswer& answer);

  platform::DeviceSets& m_sets;
  platform::DeviceSetHandle m_set;
  DeviceAnswers& m_answers;
  PropertyBuffer m_buffer;
  SharedTexts m_texts;
  std::size_t m_failures = 0;
};

// Stores class or service of an element, which become empty when they cannot be read. False for one
// that has no place below a USB device: the node is excluded.
bool ReadClass(ElementReader& reader, const platform::SP_DEVINFO_DATA& element,
               CZKUMInfoDeviceImpl& record);
bool ReadService(ElementReader& reader, const platform::SP_DEVINFO_DATA& element,
                 CZKUMInfoDeviceImpl& record);

// The elements that were passed over since the last one that got a record. Deliberate: a new record
// shows what they have and it lacks itself. Which of their properties that are is known only then,
// so nothing else of them is ever read.
//
// An element that is excluded leaves all its properties. One that is rejected for its parent leaves
// location, enumerator and serial number, and nothing of those before it but the same three.
class PassedElements {
 public:
  void AddExcluded(const platform::SP_DEVINFO_DATA& element) {
    m_elements.push_back({element, Kind::Excluded});
  }
  // One whose class is not excluded and whose parent is not admitted: rejected, unless its service
  // excludes it.
  void AddUnwanted(const platform::SP_DEVINFO_DATA& element) {
    m_elements.push_back({element, Kind::Unwanted});
  }
  void Clear() noexcept { m_elements.clear(); }

  // Whether one of them has the property, and then what the last of those has.
  bool Read(ElementReader& reader, std::uint32_t property, PropertyAnswer& answer);
  // The serial number in the id of the last rejected one that has any.
  std::u16string SerialNumber(ElementReader& reader);

 private:
  enum class Kind : std::uint8_t { Excluded, Rejected, Unwanted };
  struct Passed {
    platform::SP_DEVINFO_DATA element;
    Kind kind;
  };
  static bool IsExcluded(ElementReader& reader, Passed& passed);

  std::vector<Passed> m_elements;
};

// Stores all other properties of an element; one that neither the element nor those passed over
// have leaves its field as it was.
//
// Deliberate: LegacyBusType and UiNumber take the registry data type of their property (4 for an
// ordinary node), not its value.
void ReadOtherProperties(ElementReader& reader, const platform::SP_DEVINFO_DATA& element,
                         PassedElements& passed, CZKUMInfoDeviceImpl& record);

}  // namespace KelvoUHW
