using System.Reflection;
using System.Runtime.InteropServices;
using System.Runtime.InteropServices.ComTypes;

namespace ZKUsbMonitor.Interop;

/// <summary>What happened to a device.</summary>
public sealed class UsbDeviceEventArgs(DeviceEventType kind, UsbDevice device) : EventArgs
{
    public DeviceEventType Kind { get; } = kind;
    public UsbDevice Device { get; } = device;
}

/// <summary>
/// Watches the PC's USB devices until it is disposed, from a thread of its own in the multithreaded apartment: so a program
/// with a window uses it like any other. Events are raised on threads of the component, one at a time. A handler must not
/// wait for the thread that disposes the watcher: Dispose waits for a handler that is at work.
/// </summary>
public sealed class UsbWatcher : IDisposable
{
    /// <summary>A device came.</summary>
    public event EventHandler<UsbDeviceEventArgs>? DeviceAttached;
    /// <summary>A device went; it still says which drive letters it had.</summary>
    public event EventHandler<UsbDeviceEventArgs>? DeviceRemoved;
    /// <summary>Every event of the component as it comes, "connected" and "modified" among them.</summary>
    public event EventHandler<UsbDeviceEventArgs>? DeviceEvent;

    private readonly string m_library;
    private readonly object m_calls = new();
    private readonly ManualResetEventSlim m_started = new(), m_end = new();
    private readonly Thread m_thread;
    private IZKUMUsbTree? m_tree;
    private Exception? m_failure;
    private bool m_closed;

    /// <summary>Begins to watch when Start is called.</summary>
    /// <param name="library">The DLL; another one than ZKUsbMonitor.dll is the one over a simulated PC.</param>
    public UsbWatcher(string library = "ZKUsbMonitor.dll")
    {
        m_library = library;
        m_thread = new Thread(Live) { IsBackground = true, Name = "USB watcher" };
        m_thread.SetApartmentState(ApartmentState.MTA);
    }

    /// <summary>
    /// Raises "connected" for each device that is there, before it returns. What kept the component from being used is thrown.
    /// </summary>
    public void Start()
    {
        m_thread.Start();
        m_started.Wait();
        if (m_failure != null) throw new InvalidOperationException("The component cannot be used: " + m_failure.Message, m_failure);
    }

    /// <summary>All devices on the PC's ports as they are now.</summary>
    public IReadOnlyList<UsbDevice> Devices()
    {
        IReadOnlyList<UsbDevice> devices = [];
        var reader = new Thread(() => devices = ReadDevices());
        reader.SetApartmentState(ApartmentState.MTA);
        reader.Start();
        reader.Join();
        return devices;
    }

    /// <summary>No event is raised after it.</summary>
    public void Dispose()
    {
        lock (m_calls) m_closed = true;
        m_end.Set();
        if (m_thread.IsAlive) m_thread.Join();
    }

    private IReadOnlyList<UsbDevice> ReadDevices()
    {
        // A PC without USB has no root.
        if (m_tree == null || m_tree.get_RootNode(out IZKUMUsbTreeNode? root) < 0 || root == null) return [];
        return UsbDevice.Nodes(root.get_InSubtreeDevicesOfType(UsbDeviceType.PortDevice)).Select(UsbDevice.Read).ToArray();
    }

    private void Live()
    {
        IConnectionPoint? point = null;
        int cookie = 0;
        try
        {
            // Without registration: both classes for this process, where the component's own creation finds them too.
            IntPtr module = NativeLibrary.Load(m_library, Assembly.GetExecutingAssembly(), null);
            var getClassObject = Marshal.GetDelegateForFunctionPointer<DllGetClassObject>(
                NativeLibrary.GetExport(module, "DllGetClassObject"));
            IClassFactory tree = Register(getClassObject, new Guid("34349D2D-14C6-414B-9771-A7BD2A7C7180"));
            IClassFactory notifier = Register(getClassObject, new Guid("1D7E7A5B-648D-4236-8604-8F5F3C82433A"));
            var created = (IZKUMEventNotifier)Create(notifier, typeof(IZKUMEventNotifier).GUID);
            m_tree = (IZKUMUsbTree)Create(tree, typeof(IZKUMUsbTree).GUID);
            Guid events = typeof(IZKDeviceEventCallBack).GUID;
            ((IConnectionPointContainer)created).FindConnectionPoint(ref events, out point);
            point!.Advise(new Sink(this), out cookie);
        }
        catch (Exception failure)
        {
            m_failure = failure;
        }
        m_started.Set();
        m_end.Wait();
        if (cookie != 0) point!.Unadvise(cookie);
        m_tree = null;
    }

    private void Tell(DeviceEventType kind, IZKUMUsbTreeNode node)
    {
        lock (m_calls)
        {
            if (m_closed) return;
            var told = new UsbDeviceEventArgs(kind, UsbDevice.Read(node));
            DeviceEvent?.Invoke(this, told);
            if (kind == DeviceEventType.Attached) DeviceAttached?.Invoke(this, told);
            if (kind == DeviceEventType.Removed) DeviceRemoved?.Invoke(this, told);
        }
    }

    private static IClassFactory Register(DllGetClassObject getClassObject, Guid clsid)
    {
        Guid iid = typeof(IClassFactory).GUID;
        Marshal.ThrowExceptionForHR(getClassObject(ref clsid, ref iid, out IClassFactory factory));
        const uint inprocServer = 1, multipleUse = 1;
        Marshal.ThrowExceptionForHR(CoRegisterClassObject(ref clsid, factory, inprocServer, multipleUse, out _));
        return factory;
    }

    private static object Create(IClassFactory factory, Guid iid)
    {
        factory.CreateInstance(null, ref iid, out object created);
        return created;
    }

    [UnmanagedFunctionPointer(CallingConvention.StdCall)]
    private delegate int DllGetClassObject(ref Guid clsid, ref Guid iid, out IClassFactory factory);

    [DllImport("ole32.dll")]
    private static extern int CoRegisterClassObject(ref Guid clsid, [MarshalAs(UnmanagedType.IUnknown)] object factory,
                                                    uint context, uint flags, out uint cookie);

    [ComImport, Guid("00000001-0000-0000-C000-000000000046"), InterfaceType(ComInterfaceType.InterfaceIsIUnknown)]
    private interface IClassFactory
    {
        void CreateInstance([MarshalAs(UnmanagedType.IUnknown)] object? outer, ref Guid iid,
                            [MarshalAs(UnmanagedType.IUnknown)] out object created);
        void LockServer(bool locked);
    }

    /// <summary>Visible to COM alone.</summary>
    [ComVisible(true), ClassInterface(ClassInterfaceType.None)]
    public sealed class Sink : IZKDeviceEventCallBack
    {
        private readonly UsbWatcher m_watcher;
        internal Sink(UsbWatcher watcher) => m_watcher = watcher;
        public void OnDeviceChanged(int changeStatus, object pDeviceData) =>
            m_watcher.Tell((DeviceEventType)changeStatus, (IZKUMUsbTreeNode)pDeviceData);
        public void UnAdvise()
        {
        }
    }
}
