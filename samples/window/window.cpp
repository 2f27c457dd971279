// A window with a list of the PC's USB devices that follows what comes and goes. The window's thread is in the
// single-threaded apartment, as those of most programs are; the watcher's thread is not.
#include <windows.h>
// Behind windows.h, on which it builds.
#include <commctrl.h>

#include "zkusb_monitor_watcher.h"

namespace {

constexpr UINT kDeviceEvent = WM_APP;

void AddColumn(HWND list, int index, const wchar_t* title, int width) {
  LVCOLUMNW column = LVCOLUMNW();
  column.mask = LVCF_TEXT | LVCF_WIDTH;
  column.pszText = const_cast<wchar_t*>(title);
  column.cx = width;
  SendMessageW(list, LVM_INSERTCOLUMNW, static_cast<WPARAM>(index), reinterpret_cast<LPARAM>(&column));
}

void SetCell(HWND list, int row, int column, const std::wstring& text) {
  LVITEMW item = LVITEMW();
  item.mask = LVIF_TEXT;
  item.iItem = row;
  item.iSubItem = column;
  item.pszText = const_cast<wchar_t*>(text.c_str());
  SendMessageW(list, column == 0 ? LVM_INSERTITEMW : LVM_SETITEMW, 0, reinterpret_cast<LPARAM>(&item));
}

class DeviceWindow {
 public:
  bool Open(HINSTANCE instance, int show) {
    WNDCLASSW windowClass = WNDCLASSW();
    windowClass.lpfnWndProc = &DeviceWindow::Procedure;
    windowClass.hInstance = instance;
    windowClass.hCursor = LoadCursorW(nullptr, MAKEINTRESOURCEW(32512));  // IDC_ARROW
    windowClass.lpszClassName = L"DeviceWindow";
    RegisterClassW(&windowClass);
    HWND window = CreateWindowW(windowClass.lpszClassName, L"USB devices", WS_OVERLAPPEDWINDOW, CW_USEDEFAULT,
                                CW_USEDEFAULT, 760, 300, nullptr, nullptr, instance, this);
    if (window == nullptr) return false;
    m_list = CreateWindowW(L"SysListView32", nullptr, WS_CHILD | WS_VISIBLE | LVS_REPORT, 0, 0, 0, 0, window, nullptr,
                           instance, nullptr);
    AddColumn(m_list, 0, L"Drive", 60);
    AddColumn(m_list, 1, L"Vendor", 190);
    AddColumn(m_list, 2, L"Product", 230);
    AddColumn(m_list, 3, L"Serial number", 190);
    AddColumn(m_list, 4, L"Port", 70);
    m_watcher.reset(new zkum::Watcher(window, kDeviceEvent));
    if (FAILED(m_watcher->Error())) return false;
    Fill();
    RECT area;
    GetClientRect(window, &area);
    MoveWindow(m_list, 0, 0, area.right, area.bottom, TRUE);
    ShowWindow(window, show);
    return true;
  }

 private:
  static LRESULT CALLBACK Procedure(HWND window, UINT message, WPARAM first, LPARAM second) {
    if (message == WM_NCCREATE) {
      SetWindowLongPtrW(window, GWLP_USERDATA,
                        reinterpret_cast<LONG_PTR>(reinterpret_cast<CREATESTRUCTW*>(second)->lpCreateParams));
    }
    DeviceWindow* self = reinterpret_cast<DeviceWindow*>(GetWindowLongPtrW(window, GWLP_USERDATA));
    if (self != nullptr && self->Handle(message, second)) return 0;
    return DefWindowProcW(window, message, first, second);
  }

  bool Handle(UINT message, LPARAM second) {
    switch (message) {
      case kDeviceEvent:
        TakeEvents();
        return true;
      case WM_SIZE:
        MoveWindow(m_list, 0, 0, LOWORD(second), HIWORD(second), TRUE);
        return true;
      case WM_DESTROY:
        m_closed = true;
        if (!m_looking) m_watcher.reset();  // no event comes after it
        PostQuitMessage(0);
        return true;
      default:
        return false;
    }
  }

  // One look at the tree for all events that wait.
  void TakeEvents() {
    zkum::Event event;
    bool changed = false;
    while (m_watcher && m_watcher->Next(event)) changed = changed || event.kind != KDeviceConnected;
    if (changed) Fill();
  }

  // While it waits, the watcher lets this thread take messages: more events, or the end of the window.
  void Fill() {
    m_stale = true;
    if (m_looking) return;
    std::vector<zkum::Device> devices;
    m_looking = true;
    while (m_stale && !m_closed) {
      m_stale = false;
      devices = m_watcher->Devices();
    }
    m_looking = false;
    if (m_closed) return m_watcher.reset();
    SendMessageW(m_list, LVM_DELETEALLITEMS, 0, 0);
    int row = 0;
    for (const zkum::Device& device : devices) {
      SetCell(m_list, row, 0, device.Letters());
      SetCell(m_list, row, 1, device.vendor);
      SetCell(m_list, row, 2, device.product);
      SetCell(m_list, row, 3, device.serial);
      SetCell(m_list, row++, 4, device.portPath);
    }
  }

  bool m_looking = false;  // at the tree
  bool m_stale = false;    // what was seen there
  bool m_closed = false;
  HWND m_list = nullptr;
  std::unique_ptr<zkum::Watcher> m_watcher;
};

}  // namespace

int WINAPI WinMain(HINSTANCE instance, HINSTANCE, LPSTR, int show) {
  if (FAILED(CoInitializeEx(nullptr, COINIT_APARTMENTTHREADED))) return 1;
  InitCommonControls();
  DeviceWindow window;
  if (!window.Open(instance, show)) return 1;
  MSG message;
  while (GetMessageW(&message, nullptr, 0, 0) > 0) {
    TranslateMessage(&message);
    DispatchMessageW(&message);
  }
  CoUninitialize();
  return 0;
}
