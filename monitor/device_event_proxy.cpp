#include "monitor/device_event_proxy.h"

#include <array>
#include <utility>

#include "com/variant.h"
#include "monitor/snapshot_enumerator.h"

namespace KelvoUHW {

namespace {

constexpr DISPID kOnDeviceChanged = 1;

struct HeldConnection {
  ComPtr<IUnknown> sink;
  DWORD cookie;

  void CopyTo(CONNECTDATA& out) const noexcept { out = {ComPtr<IUnknown>(sink).Detach(), cookie}; }
};
using ConnectionEnumerator = SnapshotEnumerator<IEnumConnections, CONNECTDATA, HeldConnection>;

struct HeldPoint {
  ComPtr<IConnectionPoint> point;

  void CopyTo(IConnectionPoint*& out) const noexcept {
    out = ComPtr<IConnectionPoint>(point).Detach();
  }
};
using PointEnumerator = SnapshotEnumerator<IEnumConnectionPoints, IConnectionPoint*, HeldPoint>;

HRESULT CallSink(IUnknown& sink, TDeviceEventType kind, IUnknown* data) {
  if (data != nullptr) data->AddRef();
  // The last argument first, as Invoke wants them.
  std::array<Variant, 2> arguments{Variant::OfUnknown(data), Variant::OfLong(kind)};
  Variant result;
  DISPPARAMS parameters{arguments.data(), nullptr, static_cast<UINT>(arguments.size()), 0};
  // What a sink answers for the event interface's identifier is an IDispatch.
  return static_cast<IDispatch&>(sink).Invoke(kOnDeviceChanged, IID_NULL, LOCALE_USER_DEFAULT,
                                              DISPATCH_METHOD, &parameters, &result, nullptr,
                                              nullptr);
}

}  // namespace

HRESULT EnumerateConnections(const SinkSlots& sinks, IEnumConnections** out) noexcept {
  if (out == nullptr) return E_POINTER;
  *out = nullptr;
  return Guarded([&] {
    auto list = std::make_shared<std::vector<HeldConnection>>();
    for (SinkSlots::Connection& connection : sinks.Occupied()) {
      list->push_back({std::move(connection.sink), connection.cookie});
    }
    return ConnectionEnumerator::Make(std::move(list), 0, out);
  });
}

HRESULT EnumerateConnectionPoint(IConnectionPoint* point, IEnumConnectionPoints** out) noexcept {
  if (out == nullptr) return E_POINTER;
  *out = nullptr;
  return Guarded([&] {
    auto list = std::make_shared<std::vector<HeldPoint>>();
    list->push_back({ComPtr<IConnectionPoint>(point)});
    return PointEnumerator::Make(std::move(list), 0, out);
  });
}

HRESULT FireToSinks(const SinkSlots& sinks, TDeviceEventType kind, IUnknown* data,
                    const IUnknown* filter) {
  HRESULT last = S_OK;
  const LONG slots = sinks.Size();
  for (LONG index = 0; index < slots; ++index) {
    const ComPtr<IUnknown> sink = sinks.At(index);
    if (!sink || (filter != nullptr && filter != sink.Get())) continue;
    last = CallSink(*sink.Get(), kind, data);
  }
  return last;
}

}  // namespace KelvoUHW
