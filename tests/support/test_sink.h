// A client's sink that writes down what it is called with, and holds each call to its exact form.
#pragma once

#include <array>
#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "com/com_ptr.h"
#include "platform/text.h"
#include "tests/support/counting_sink.h"

namespace KelvoUHW {

// Its identity and what it answers for the event interface are different pointers. It stands on the stack of a test,
// which has to get every reference back. Sinks that share a log are called by one thread at a time.
class TestSink final : public IUnknown {
 public:
  using Log = std::vector<std::string>;

  TestSink(Log& log, std::string name) : m_log(log), m_name(std::move(name)) {}
  ~TestSink() { EXPECT_EQ(m_references, 1) << m_name << ": references of others"; }
  TestSink(const TestSink&) = delete;
  TestSink& operator=(const TestSink&) = delete;

  HRESULT unknownCode = S_OK;
  // Of the first, second question for the event interface, in front of S_OK for all behind; 0x1 throws.
  std::vector<HRESULT> eventCodes;
  bool severalFaces = false;                       // another pointer for each question
  std::function<HRESULT()> onEvent;                // inside each call, which answers what it answers
  std::vector<ComPtr<IUnknown>>* keeps = nullptr;  // the device data of each call

  std::int32_t References() const { return m_references; }
  // How often the n-th pointer was called.
  int Calls(std::size_t face) const { return m_faces.at(face).calls; }

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override {
    *out = nullptr;
    if (iid == platform::IidOf<IUnknown>()) {
      if (FAILED(unknownCode)) return unknownCode;
      *out = static_cast<IUnknown*>(this);
    } else if (iid == DIID_IZKDeviceEventCallBack) {
      const std::size_t question = m_questions++;
      if (question < eventCodes.size() && eventCodes[question] == kThrows) throw 3;
      if (question < eventCodes.size() && FAILED(eventCodes[question])) return eventCodes[question];
      *out = static_cast<IDispatch*>(&m_faces.at(severalFaces ? question : 0));
    } else {
      return E_NOINTERFACE;
    }
    AddRef();
    return S_OK;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return static_cast<ULONG>(++m_references); }
  ULONG STDMETHODCALLTYPE Release() override { return static_cast<ULONG>(--m_references); }

  static constexpr HRESULT kThrows = 1;

 private:
  struct Face final : testing_support::Callable {
    explicit Face(TestSink& s) : sink(s) {}
    HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override { return sink.QueryInterface(iid, out); }
    ULONG STDMETHODCALLTYPE AddRef() override { return sink.AddRef(); }
    ULONG STDMETHODCALLTYPE Release() override { return sink.Release(); }
    HRESULT STDMETHODCALLTYPE Invoke(DISPID member, REFIID iid, LCID locale, WORD flags, DISPPARAMS* parameters,
                                     VARIANT* result, EXCEPINFO* exception, UINT* argumentError) override {
      ++calls;
      return sink.Called(member, iid, locale, flags, parameters, result, exception, argumentError);
    }
    TestSink& sink;
    int calls = 0;
  };

  HRESULT Called(DISPID member, REFIID iid, LCID locale, WORD flags, DISPPARAMS* parameters, VARIANT* result,
                 EXCEPINFO* exception, UINT* argumentError) {
    EXPECT_TRUE(member == 1 && iid == IID_NULL && locale == 0x400 && flags == DISPATCH_METHOD);
    EXPECT_TRUE(exception == nullptr && argumentError == nullptr);
    EXPECT_TRUE(parameters->cNamedArgs == 0 && parameters->rgdispidNamedArgs == nullptr);
    if (parameters->cArgs != 2) {
      ADD_FAILURE() << parameters->cArgs << " arguments";
      return E_FAIL;
    }
    const VARIANT& device = parameters->rgvarg[0];
    const VARIANT& kind = parameters->rgvarg[1];
    EXPECT_TRUE(device.vt == VT_UNKNOWN && kind.vt == VT_I4 && result->vt == VT_EMPTY);
    const auto node = ComPtr<IUnknown>(device.punkVal).As<IZKUMUsbTreeNode>();
    EXPECT_TRUE(node.As<IUnknown>().Get() == device.punkVal) << "not its identity";
    m_log.push_back(m_name + " " + std::to_string(kind.lVal) + " " + NameOf(node));
    if (keeps) keeps->push_back(ComPtr<IUnknown>(device.punkVal));
    // The caller has to clear it.
    result->vt = VT_BSTR;
    result->bstrVal = platform::MakeBstr(u"result");
    return onEvent ? onEvent() : S_OK;
  }
  static std::string NameOf(const ComPtr<IZKUMUsbTreeNode>& node) {
    BSTR id = nullptr;
    if (!node || FAILED(node->get_InstanceId(&id))) return "?";
    const std::u16string text(platform::BstrText(id));
    SysFreeString(id);
    return platform::ToUtf8(text.substr(text.rfind(u'\\') + 1));
  }

  Log& m_log;
  const std::string m_name;
  std::array<Face, 2> m_faces{Face(*this), Face(*this)};
  std::size_t m_questions = 0;
  std::int32_t m_references = 1;
};

// "A 1 S1, B 1 S1", and the log is empty again.
inline std::string Taken(TestSink::Log& log) {
  std::string text;
  for (const std::string& entry : std::exchange(log, {})) text += (text.empty() ? "" : ", ") + entry;
  return text;
}

}  // namespace KelvoUHW
