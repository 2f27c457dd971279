// Descriptors and connection records of any content: none may be read outside its bytes, and every
// dump keeps its form.
//
// The input is a count byte and that many bytes of string descriptors, a count byte and that many
// bytes laid over a connection record from its end on down, and for the rest a configuration.
#include <algorithm>
#include <cstring>
#include <iterator>
#include <span>

#include "fuzz/fuzz.h"
#include "records/descriptor_dump.h"

namespace {

using namespace KelvoUHW;
using fuzz::Require;
using Bytes = std::span<const std::uint8_t>;

// The bytes in memory of exactly their size, so that the address sanitizer sees a read behind them.
std::vector<std::uint8_t> Exact(Bytes bytes) { return {bytes.begin(), bytes.end()}; }

Bytes TakeCounted(Bytes& rest) {
  if (rest.empty()) return {};
  const std::size_t count = std::min<std::size_t>(rest[0], rest.size() - 1);
  const Bytes taken = rest.subspan(1, count);
  rest = rest.subspan(1 + count);
  return taken;
}

std::unique_ptr<StringDescriptorNode> MakeStrings(Bytes bytes) {
  std::unique_ptr<StringDescriptorNode> head;
  for (const RawDescriptor& one : SplitConfiguration(bytes)) {
    auto node = std::make_unique<StringDescriptorNode>();
    node->DescriptorIndex = one[1];
    node->LanguageID = 0x409;
    node->StringDescriptor = Exact(one);
    Require(node->Text().size() <= std::max<std::size_t>(one[0] / 2u, 1) - 1,
            "text within bLength");
    node->Next = std::move(head);
    head = std::move(node);
  }
  return head;
}

void RequireForm(const std::u16string& out, std::u16string_view prefix) {
  Require(out.starts_with(prefix), "prefix first");
  Require(out.ends_with(u"\r\n"), "line end last");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  constexpr std::u16string_view kPrefix = u". ";
  Bytes rest(data, size);
  const auto strings = MakeStrings(TakeCounted(rest));

  const auto record = std::make_unique<platform::ConnectionInformationEx>();
  const Bytes laid = TakeCounted(rest);
  // The status and the pipe count stand behind the device: laid bytes cover them first.
  constexpr std::size_t kBehindHead = sizeof(record->Info);
  auto* const bytes = reinterpret_cast<std::uint8_t*>(record.get());
  if (!laid.empty()) {
    const std::size_t from = kBehindHead - std::min(laid.size(), kBehindHead);
    std::memcpy(bytes + from, laid.data(), laid.size());
  }
  std::u16string connection;
  DumpConnectionInformation(*record, kPrefix, connection);
  RequireForm(connection, kPrefix);

  const std::vector<std::uint8_t> configuration = Exact(rest);
  const auto descriptors = SplitConfiguration(configuration);
  const std::uint8_t* next = configuration.data();
  for (const RawDescriptor& one : descriptors) {
    Require(one.data() == next && one.size() >= 2 && one.size() <= one[0], "one after the other");
    next += one.size();
  }
  Require(next <= configuration.data() + configuration.size(), "within the bytes");

  std::u16string out;
  DumpConfiguration(descriptors, strings.get(), kPrefix, out);
  RequireForm(out, kPrefix);
  for (const auto& entry : MakeInterfaceEntries(descriptors, strings.get())) {
    Require(entry->Descriptor.size() == entry->Byte(0), "whole interface");
    out.clear();
    DumpInterface(*entry, kPrefix, out);
    RequireForm(out, kPrefix);
  }
  // Descriptors as a driver might hand them over, each in memory of its own.
  for (const RawDescriptor& one : descriptors) {
    const std::vector<std::uint8_t> alone = Exact(one);
    const RawDescriptor span = alone;
    out.clear();
    DumpConfiguration({&span, 1}, strings.get(), {}, out);
    RequireForm(out, {});
  }
  return 0;
}
