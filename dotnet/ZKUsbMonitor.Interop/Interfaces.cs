// The component's interfaces, slot by slot as the type library has them. Parent is a slot without a name on purpose: its
// object owns the parent, and a language that releases by itself has no right moment for that.
using System.Runtime.InteropServices;
using System.Runtime.InteropServices.ComTypes;

namespace ZKUsbMonitor.Interop;

/// <summary>What happened to a device.</summary>
public enum DeviceEventType
{
    Connected = 0,
    Attached = 1,
    Removed = 2,
    Modified = 3,
}

/// <summary>Kinds of nodes.</summary>
public enum UsbDeviceType
{
    Unknown = 0,
    Root = 1,
    HostController = 2,
    Hub = 3,
    HubPort = 4,
    PortDevice = 5,
    InfoDevice = 6,
    InterfaceDevice = 7,
}

[ComImport, Guid("565B8FB4-EE30-4EE3-9B5B-E285678F1F9D"), InterfaceType(ComInterfaceType.InterfaceIsIUnknown)]
public interface IZKUMEventNotifier
{
}

/// <summary>What a sink is asked for; it is called through IDispatch.</summary>
[ComVisible(true), Guid("8C4D3DF5-889F-434C-BA1C-22F23FD7CB1B"), InterfaceType(ComInterfaceType.InterfaceIsIDispatch)]
public interface IZKDeviceEventCallBack
{
    [DispId(1)]
    void OnDeviceChanged(int changeStatus, [MarshalAs(UnmanagedType.IUnknown)] object pDeviceData);
    [DispId(2)]
    void UnAdvise();
}

[ComImport, Guid("8080AF8D-857A-45C4-8296-AB1301ADFA28"), InterfaceType(ComInterfaceType.InterfaceIsIUnknown)]
public interface IZKUMUsbTreeNode
{
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_InstanceId();
    UsbDeviceType get_Type();
    void NotForUse();
    IZKUMUsbTreeNodeEnumerator get_Childs();
    IZKUMUsbTreeNodeEnumerator get_InSubtreeDevicesOfType(UsbDeviceType nType);
}

[ComImport, Guid("904023D8-3EB6-4079-B062-45C68095682E"), InterfaceType(ComInterfaceType.InterfaceIsIUnknown)]
public interface IZKUMUsbTreeNodeEnumerator
{
    [return: MarshalAs(UnmanagedType.VariantBool)]
    bool MoveNext();
    IZKUMUsbTreeNode GetCurrent();
}

[ComImport, Guid("5B584C94-8FB4-4647-AFE6-879085600DBF"), InterfaceType(ComInterfaceType.InterfaceIsIUnknown)]
public interface IZKUMUsbDevice
{
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_Description();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_SerialNumber();
    int get_VendorId();
    int get_ProductId();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_DriverKeyName();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_ToString();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_Vendor();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_Product();
}

[ComImport, Guid("DFDABA17-D518-42A6-81DE-C90C8EC32BCF"), InterfaceType(ComInterfaceType.InterfaceIsIUnknown)]
public interface IZKUMHostController
{
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_LeafName();
}

[ComImport, Guid("92A25D95-3963-45EF-895F-EA42B4DD37AA"), InterfaceType(ComInterfaceType.InterfaceIsIUnknown)]
public interface IZKUMHubDevice
{
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_PathName();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_ConnectionName();
}

[ComImport, Guid("A49B9696-751E-4402-A733-3AD46F48A5A0"), InterfaceType(ComInterfaceType.InterfaceIsIUnknown)]
public interface IZKUMHubPort
{
    int get_PortIndex();
}

[ComImport, Guid("E5E8F6BE-7753-4041-880B-16D31F61397E"), InterfaceType(ComInterfaceType.InterfaceIsIUnknown)]
public interface IZKUMPortDevice
{
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_Product();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_Manufacturer1();
    uint get_Speed();
    byte get_NumberInterfaces();
    IEnumVARIANT get_InterfaceDescriptors();
    [PreserveSig]
    int get_FirstChildOfType(IZKUMUsbTreeNode pNode, UsbDeviceType nType, out IntPtr ppNodeOfType);
}

[ComImport, Guid("D107033F-3A53-4406-AF19-13543470DDB2"), InterfaceType(ComInterfaceType.InterfaceIsIUnknown)]
public interface IZKUMInterfaceDescr
{
    byte get_InterfaceClass();
    byte get_InterfaceSubClass();
    byte get_InterfaceProtocol();
}

[ComImport, Guid("F089A5D3-01B2-4B44-817B-200F94489BBD"), InterfaceType(ComInterfaceType.InterfaceIsIUnknown)]
public interface IZKUMInfoDevice
{
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_Service();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_FriendlyName();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_Location();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_Manufacturer();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_HardwareId();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_PhysicalName();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_DevClass();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_EnumName();
    Guid get_ClassGuid();
}

[ComImport, Guid("B67689B6-7C60-465C-A541-9878368A6AE5"), InterfaceType(ComInterfaceType.InterfaceIsIUnknown)]
public interface IZKUMInterfaceDevice
{
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_VolumeName();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_VendorId();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_ProductId();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_ProductRev();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_DevicePath();
    [return: MarshalAs(UnmanagedType.BStr)]
    string get_MountPoint();
    IEnumVARIANT get_MountPoints();
}

[ComImport, Guid("236C9B37-B991-48C2-B14A-340A28638282"), InterfaceType(ComInterfaceType.InterfaceIsIUnknown)]
public interface IZKUMUsbTree
{
    [PreserveSig]
    int get_RootNode(out IZKUMUsbTreeNode? ppIUsbTreeNode);
    IZKUMUsbTreeNodeEnumerator get_PortDevicesWithVendorId(uint nVendorId);
    IZKUMUsbTreeNodeEnumerator get_VendorProductDevices(uint nVendorId, uint nProductId);
    IZKUMUsbTreeNodeEnumerator get_PortDevicesWithVolume();
}
