// All text properties of node objects, and what each answers where it cannot give its text.
#pragma once

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "tests/support/com_objects.h"

namespace KelvoUHW {

// What a text property answers where it cannot give its text; null: no such case.
struct TextRules {
  const char* nullOut;
  const char* firstFails;  // the text's first allocation
  const char* secondFails;
  const char* nullOutFirstFails;
  const char* noRecord;
  const char* noRecordNullOut;
};
// The text is made before the out pointer is looked at, the record is asked for before both.
inline constexpr TextRules kBase = {
    "E_POINTER", "raised E_OUTOFMEMORY null", "E_OUTOFMEMORY null", "raised E_OUTOFMEMORY", "E_FAIL null", "E_FAIL"};
// The typed record is not tested.
inline constexpr TextRules kTyped = {
    "E_POINTER", "raised E_OUTOFMEMORY null", "E_OUTOFMEMORY null", "raised E_OUTOFMEMORY", nullptr, nullptr};
// Nothing is read for a null out pointer.
inline constexpr TextRules kSerialNumber = {
    "E_POINTER", "raised E_OUTOFMEMORY null", "E_OUTOFMEMORY null", "E_POINTER", "E_FAIL null", "E_POINTER"};
// Out of memory is not noticed.
inline constexpr TextRules kUntested = {"E_POINTER", "S_OK null", nullptr, "E_POINTER", "E_POINTER null", "E_POINTER"};

struct TextRow {
  const char* name;
  TextProperty property;
  std::vector<const char*> kinds;  // of the sample tree
  TextRules rules;
  const char* source = nullptr;  // whose text it is, where not the object's own
};

inline std::vector<TextRow> TextRows() {
  const std::vector<const char*> all = {"root", "plain", "controller", "hub", "port", "device", "info", "disk"};
  const std::vector<const char*> noDevice = {"root", "plain", "controller", "hub", "port", "info", "disk"};
  return {{"InstanceId", &Read<&IZKUMUsbTreeNode::get_InstanceId>, all, kBase},
          {"Description", &Read<&IZKUMUsbDevice::get_Description>, all, kBase},
          {"SerialNumber", &Read<&IZKUMUsbDevice::get_SerialNumber>, all, kSerialNumber},
          {"DriverKeyName", &Read<&IZKUMUsbDevice::get_DriverKeyName>, all, kBase},
          {"Vendor", &Read<&IZKUMUsbDevice::get_Vendor>, all, kUntested},
          {"Product", &Read<&IZKUMUsbDevice::get_Product>, noDevice, kUntested},
          {"Product", &Read<&IZKUMUsbDevice::get_Product>, {"device"}, kTyped},
          {"Product", &Read<&IZKUMPortDevice::get_Product>, {"device"}, kTyped},
          {"Manufacturer1", &Read<&IZKUMPortDevice::get_Manufacturer1>, {"device"}, kTyped},
          {"LeafName", &Read<&IZKUMHostController::get_LeafName>, {"controller"}, kTyped},
          {"PathName", &Read<&IZKUMHubDevice::get_PathName>, {"hub"}, kTyped},
          {"ConnectionName", &Read<&IZKUMHubDevice::get_ConnectionName>, {"hub"}, kTyped},
          // A port device shows those of its device-manager node.
          {"Service", &Read<&IZKUMInfoDevice::get_Service>, {"info", "device"}, kTyped, "info"},
          {"FriendlyName", &Read<&IZKUMInfoDevice::get_FriendlyName>, {"info", "device"}, kTyped, "info"},
          {"Location", &Read<&IZKUMInfoDevice::get_Location>, {"info", "device"}, kTyped, "info"},
          {"Manufacturer", &Read<&IZKUMInfoDevice::get_Manufacturer>, {"info", "device"}, kTyped, "info"},
          {"HardwareId", &Read<&IZKUMInfoDevice::get_HardwareId>, {"info", "device"}, kTyped, "info"},
          {"PhysicalName", &Read<&IZKUMInfoDevice::get_PhysicalName>, {"info", "device"}, kTyped, "info"},
          {"DevClass", &Read<&IZKUMInfoDevice::get_DevClass>, {"info", "device"}, kTyped, "info"},
          {"EnumName", &Read<&IZKUMInfoDevice::get_EnumName>, {"info", "device"}, kTyped, "info"},
          {"VolumeName", &Read<&IZKUMInterfaceDevice::get_VolumeName>, {"disk"}, kTyped},
          {"VendorId", &Read<&IZKUMInterfaceDevice::get_VendorId>, {"disk"}, kTyped},
          {"ProductId", &Read<&IZKUMInterfaceDevice::get_ProductId>, {"disk"}, kTyped},
          {"ProductRev", &Read<&IZKUMInterfaceDevice::get_ProductRev>, {"disk"}, kTyped},
          {"DevicePath", &Read<&IZKUMInterfaceDevice::get_DevicePath>, {"disk"}, kTyped},
          {"MountPoint", &Read<&IZKUMInterfaceDevice::get_MountPoint>, {"disk"}, kTyped}};
}

// Reads the text, and once for each of its rules but those without record.
inline void CheckText(TextProperty property, IUnknown* object, const TextRules& rules, const std::string& text) {
  const std::string success = "S_OK " + text;
  const ULONG references = References(object);
  EXPECT_EQ(TextOf(property, object), success);
  EXPECT_EQ(TextOf(property, object, false), rules.nullOut);
  const struct {
    std::uint64_t allocation;
    bool giveOut;
    const char* expected;
  } faults[] = {{1, true, rules.firstFails}, {2, true, rules.secondFails}, {1, false, rules.nullOutFirstFails}};
  for (const auto& fault : faults) {
    const platform::native::FailingBstr failing(fault.allocation);
    EXPECT_EQ(TextOf(property, object, fault.giveOut), fault.expected ? fault.expected : success);
  }
  EXPECT_EQ(References(object), references);
}

}  // namespace KelvoUHW
