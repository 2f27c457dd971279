// Text dumps of connection records and USB descriptors.
//
// Every function appends lines ended by "\r\n" to `out`, each written as `prefix` and its text;
// where a text itself begins with a line end, the prefix stands before that line end. `prefix` must
// not refer into `out`. Pure functions, callable from every thread; they may throw std::bad_alloc,
// and `out` then holds the lines finished so far.
//
// Descriptors come from devices and are not trusted: no byte outside those received is read. The
// line of a field that was not received whole is left out, and all lines of the descriptor behind
// it.
//
// Public source of the layouts: chapter 9 of the USB 2.0 standard, the HID class standard 1.11, and
// the published driver-kit header usbioctl.h.
#pragma once

#include <span>
#include <string>
#include <string_view>

#include "platform/usb_ioctl.h"
#include "records/interface_entry.h"
#include "records/usb_port_info.h"

namespace KelvoUHW {

// The device descriptor and the state of the port, with the endpoints of its open pipes: at most
// 30, whatever NumberOfOpenPipes says. Only the status line for a port without a device.
void DumpConnectionInformation(const platform::ConnectionInformationEx& record,
                               std::u16string_view prefix, std::u16string& out);

// The descriptors of a configuration in order, without its interfaces, which DumpInterface writes.
// `strings` is the device's list of string descriptors, null for none. A span of fewer than two
// bytes is no descriptor and gives nothing.
void DumpConfiguration(std::span<const RawDescriptor> descriptors,
                       const StringDescriptorNode* strings, std::u16string_view prefix,
                       std::u16string& out);

// One interface, with its string where the entry has it.
void DumpInterface(const InterfaceEntry& entry, std::u16string_view prefix, std::u16string& out);

}  // namespace KelvoUHW
